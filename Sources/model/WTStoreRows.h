#pragma once

// The row shape of the store file's one table, for WTStore: its columns in the order of every statement,
// and a record bound to a statement or read from a row.
#include "WTStoreRecord.h"

#include <QByteArray>
#include <QHash>

struct sqlite3_stmt;

namespace WTStoreRows {

// The columns, in this order in every statement: binding index = column + 1.
enum Column {
  kUuid,
  kEntity,
  kName,
  kNotes,
  kRate,
  kColor,
  kArchived,
  kAddressBookUID,
  kTotalsUID,
  kClientUuid,
  kProjectUuid,
  kPosition,
  kBudget,
  kTaskUuid,
  kStartDate,
  kEndDate,
  kRunning,
  kMinutes,
  kExpense,
  kCompleted,
  // Version 4.
  kCurrency,
  kAddress,
  kRoundingMinutes,
  kRoundingMode,
  // Version 5.
  kImportId,
};

#define WT_STORE_COLUMNS                                                                                   \
  "uuid, entity, name, notes, rate, color, archived, addressBookUID, totalsUID, clientUuid, projectUuid, " \
  "position, budget, taskUuid, startDate, endDate, running, minutes, expense, completed, currency, "       \
  "address, roundingMinutes, roundingMode, importId"

// Binds a text (null stays NULL) to `column`'s parameter; SQLite reads it where it is, so the text must
// outlive the statement's step.
int bindString(sqlite3_stmt* statement, int column, const QString& text);
// Binds every column of `record`, which must outlive the statement's step.
int bindRecord(sqlite3_stmt* statement, const WTStoreRecord& record);
// The owners' identities a load has read so far, each kept as one string: a hundred thousand items name
// a few hundred tasks, and a string shared is one not allocated, converted and freed again per row.
class SharedUuids {
 public:
  void read(sqlite3_stmt* statement, int column, QString& out);

 private:
  QHash<QByteArray, QString> known_;
};

// Reads the row into `record`, assigning every field (the record may be reused from row to row). False
// when a money column holds text that is not a number. `owners`, when given, shares the owner columns'
// strings between the rows of one load.
bool readRecord(sqlite3_stmt* statement, WTStoreRecord& record, SharedUuids* owners = nullptr);

}  // namespace WTStoreRows
