#pragma once

#include "Result.h"

#include <QString>
#include <QVariant>

#include <optional>

// A server's answer, taken only when it has exactly the protocol's shape. Nothing of a reply that is not
// (an iteration that is no non-negative integer, a "result" that is no change set, an unknown action)
// may reach the journal or the store: the caller treats it as a failed exchange and tries again later.
struct RZSyncReply {
  // An error answer: its text, its code (0 when it gave none) and the iteration it names, if any.
  std::optional<QString> error;
  qint64 code = 0;
  // "head" or "save" for a regular answer.
  QString action;
  std::optional<qint64> iteration;
  // A "head" answer's change set: {"i": {uuid: values}, "u": {uuid: values}, "x": [uuid]}, each optional.
  QVariantMap result;

  // The reply of a parsed JSON document, or an error saying what is wrong with it.
  static Result<RZSyncReply> fromJSON(const QVariant& document);
};
