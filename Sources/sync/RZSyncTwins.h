#pragma once

#include <QSet>
#include <QString>

class RZSyncTrack;
class WTObject;
class WTObjectContext;

// Records made on two devices before either synced meet as one when the second device merges the first
// one's. A client, project or task inserted here and not sent yet, named as one that arrived under the
// same owner, is folded into it: what is filed under it moves there, and it goes. An entry inserted here
// and not sent yet goes when one arrived from the same row of an import (the same importId): one file
// imported on two machines bills once. What was set here and differs (a rate typed, a name edited) is
// carried over to the record it meets, as if typed there after the sync: nothing typed is lost, and
// nothing is billed twice. Records that both bill by their own rate, rounding or currency, and differently,
// stay two: meeting would bill one side's work by the other's terms. What goes is journaled as deleted (a
// save that was lost on its way may have taken it to the server after all), the moves and the carried values
// as changes.
class RZSyncTwins {
 public:
  RZSyncTwins(WTObjectContext& context, RZSyncTrack& track) : context_(context), track_(track) {}

  struct Outcome {
    QSet<QString> carried;  // the records that took values from here
    QSet<QString> apart;    // the records made here kept apart from their namesakes, billing differently
  };
  // `arrived`: the uuids of the records a head inserted, merged already.
  Outcome fold(const QSet<QString>& arrived);

  // Whether both bill by terms of their own (rate, rounding, currency) that differ.
  static bool billApart(const WTObject& a, const WTObject& b);

 private:
  WTObjectContext& context_;
  RZSyncTrack& track_;
};
