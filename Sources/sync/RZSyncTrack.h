#pragma once

#include "Result.h"
#include "WTChangeJournal.h"

#include <QMap>
#include <QSet>
#include <QString>
#include <QStringList>
#include <QVariant>

#include <optional>

// The change journal: which records were inserted ("i"), updated ("u") or deleted ("x") here since the
// server last confirmed a save, with their values in JSON form, keyed by uuid; and the server iteration
// this client has caught up with. The sync manager keeps it in memory, writes it after every save, sends
// it with "save" and forgets what the server confirmed.
//
// Values go in through transformedValue: dates as whole seconds since 1970, records as their uuid,
// ordered relationships as arrays of uuids, unordered relationships not at all, a cleared value as
// null, colours as "#AARRGGBB" text, decimals exactly.
class RZSyncTrack final : public WTChangeJournal {
 public:
  enum class Section { Inserted, Updated };    // "i" and "u"
  using Entries = QMap<QString, QVariantMap>;  // uuid -> key -> JSON value

  // An empty journal at iteration 0.
  RZSyncTrack() = default;
  // Loads the journal at `path`; never fails. A missing file gives an empty journal; a file that cannot
  // be read as a journal is logged ("Can not parse json - %@"), moved aside to `path` + ".corrupt" (a
  // number is added when that name is taken) so that nothing in it is lost, and the journal starts
  // empty at iteration 0.
  explicit RZSyncTrack(const QString& path);
  // The journal a file's text holds ({"iteration", "track"}, as writeToFile writes it); none, with the
  // reason in `problem`, when the text is not one.
  static std::optional<RZSyncTrack> fromJSON(QByteArrayView text, QString* problem = nullptr);

  // Writes {"iteration", "track"} as pretty-printed JSON, atomically: a temporary file beside `path`,
  // synced to disk, then renamed over it. On failure the old file and this journal are unchanged.
  Result<void> writeToFile(const QString& path) const;

  // Forgets every change; keeps the iteration.
  void resetChanges();

  // One attribute value in its JSON form (a null QVariant for a cleared value, JSON null); none for
  // values that are not journaled (unordered relationships).
  static std::optional<QVariant> transformedValue(const QVariant& value);

  // Merges transformed values into the entry of `uuid` in `section` (made if missing, even when every
  // value is dropped); a later value of a key replaces the earlier one. The uuid is no longer deleted.
  void updateValues(const QVariantMap& values, const QString& uuid, Section section);
  // Into "i" while "i" holds the uuid (an insertion changed before it was sent stays an insertion),
  // else into "u".
  void updateValues(const QVariantMap& values, const QString& uuid) override;
  // Logs "INSERT(%@) %@" and merges into "i".
  void insertValues(const QVariantMap& values, const QString& uuid) override;
  // Logs "DELETE(%@)" and adds the uuid to "x" (once); an empty uuid is ignored. Entries under "i" and
  // "u" stay: the server receives both.
  void deleteObjectWithId(const QString& uuid) override;
  // The deletions the server confirmed while this journal was in memory: the server keeps a deletion for
  // good and drops everything sent later under the identity.
  bool isRetired(const QString& uuid) const override { return retired_.contains(uuid); }

  bool hasChanges() const { return !inserted_.isEmpty() || !updated_.isEmpty() || !deleted_.isEmpty(); }
  qint64 iteration() const { return iteration_; }
  void setIteration(qint64 iteration) { iteration_ = iteration; }

  // The change dictionary {"i": {uuid: values}, "u": {uuid: values}, "x": [uuid]} as a JSON value: the
  // "data" of a save. A copy; change the journal through the operations here.
  QVariantMap dictionary() const;

  // Direct access to the sections, for the merge.
  const Entries& entries(Section section) const {
    return section == Section::Inserted ? inserted_ : updated_;
  }
  // The pending values of `uuid` in `section`; empty when none.
  QVariantMap entry(Section section, const QString& uuid) const { return entries(section).value(uuid); }
  // Replaces the entry; an empty map removes the uuid from the section.
  void setEntry(Section section, const QString& uuid, const QVariantMap& values);
  const QStringList& deletedIds() const { return deleted_; }
  bool isPendingDeletion(const QString& uuid) const { return deleted_.contains(uuid); }
  // Drops every pending change of `uuid`: its entries under "i" and "u" and its place in "x".
  void forget(const QString& uuid);

  // Forgets what a confirmed save sent (`sent` is the dictionary() of that request): each value that is
  // still the same as sent, and each deletion sent, whose identity is retired from then on. Values changed
  // since stay pending; what remains of a confirmed insertion moves to "u", since the server now has the
  // record.
  void removeSentChanges(const QVariantMap& sent);

 private:
  Entries& entriesFor(Section section) { return section == Section::Inserted ? inserted_ : updated_; }
  void load(const QString& path);

  qint64 iteration_ = 0;
  Entries inserted_;
  Entries updated_;
  QStringList deleted_;
  QSet<QString> retired_;
};
