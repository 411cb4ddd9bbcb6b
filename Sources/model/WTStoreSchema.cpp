#include "WTStoreSchema.h"

#include "WTStore.h"

#include <QByteArray>

#include <sqlite3.h>

#include <iterator>

namespace {

// Schema version 2: partial indexes of the few rows that starting and stopping timers read, the owners
// and the running entries. They hold a handful of rows each and cost the saves of items nothing.
int addTimerIndexes(sqlite3* db) {
  return sqlite3_exec(db,
                      "CREATE INDEX records_owners ON records(entity) WHERE " WT_STORE_OWNERS
                      "; CREATE INDEX records_running ON records(uuid) WHERE " WT_STORE_RUNNING ";",
                      nullptr, nullptr, nullptr);
}

// Schema version 3: the items by their task, so a report of a few projects reads their items alone.
int addItemIndex(sqlite3* db) {
  return sqlite3_exec(db, "CREATE INDEX records_items ON records(taskUuid);", nullptr, nullptr, nullptr);
}

// Schema version 4: a client's currency and address, and the rounding rule of clients, projects and tasks.
// A project's budget shares the task's column.
int addBillingColumns(sqlite3* db) {
  return sqlite3_exec(db,
                      "ALTER TABLE records ADD COLUMN currency TEXT;"
                      "ALTER TABLE records ADD COLUMN address TEXT;"
                      "ALTER TABLE records ADD COLUMN roundingMinutes INTEGER;"
                      "ALTER TABLE records ADD COLUMN roundingMode TEXT;",
                      nullptr, nullptr, nullptr);
}

// Schema version 5: where an imported item came from, so that importing the same file again adds nothing.
int addImportColumn(sqlite3* db) {
  return sqlite3_exec(db, "ALTER TABLE records ADD COLUMN importId TEXT;", nullptr, nullptr, nullptr);
}

// Schema version 6: the sync's journal of unsent changes, which was a file of its own beside the store (a
// crash between writing the two could leave a change saved but never sent). Per record and section ('i'
// inserted, 'u' updated) the pending values as a JSON object's text; the pending deletions in the order
// they were made; the server iteration.
int addJournalTables(sqlite3* db) {
  return sqlite3_exec(
      db,
      "CREATE TABLE journal (uuid TEXT NOT NULL, section TEXT NOT NULL, changes TEXT NOT NULL,"
      "  PRIMARY KEY (uuid, section)) WITHOUT ROWID;"
      "CREATE TABLE journal_deletions (position INTEGER PRIMARY KEY, uuid TEXT NOT NULL UNIQUE);"
      "CREATE TABLE journal_state (name TEXT PRIMARY KEY NOT NULL, value) WITHOUT ROWID;"
      "INSERT INTO journal_state VALUES ('iteration', 0);",
      nullptr, nullptr, nullptr);
}

// Schema version 1. Money is the decimal's text (exact, with its exponent), dates are seconds since 1970,
// colours "#aarrggbb"; NULL stands for "none" and is kept apart from an empty text. No index on the
// owner columns: the whole graph is read at once and never queried by owner.
int createVersion1(sqlite3* db) {
  return sqlite3_exec(db,
                      "CREATE TABLE records ("
                      "  uuid TEXT PRIMARY KEY NOT NULL,"
                      "  entity TEXT NOT NULL,"
                      "  name TEXT,"
                      "  notes TEXT,"
                      "  rate TEXT,"
                      "  color TEXT,"
                      "  archived INTEGER NOT NULL DEFAULT 0,"
                      "  addressBookUID TEXT,"
                      "  totalsUID TEXT,"
                      "  clientUuid TEXT,"
                      "  projectUuid TEXT,"
                      "  position INTEGER NOT NULL DEFAULT 0,"
                      "  budget TEXT,"
                      "  taskUuid TEXT,"
                      "  startDate REAL,"
                      "  endDate REAL,"
                      "  running INTEGER NOT NULL DEFAULT 0,"
                      "  minutes INTEGER,"
                      "  expense TEXT,"
                      "  completed INTEGER NOT NULL DEFAULT 0"
                      ");"
                      "PRAGMA application_id = 1416852332;",
                      nullptr, nullptr, nullptr);
}
static_assert(WTStoreSchema::kApplicationId == 1416852332);

// kMigrations[n] takes a file from version n to n + 1. A new schema version appends its step here and
// raises WTStore::kSchemaVersion; every step runs inside the one migration transaction.
using Migration = int (*)(sqlite3*);
constexpr Migration kMigrations[] = {createVersion1,    addTimerIndexes, addItemIndex,
                                     addBillingColumns, addImportColumn, addJournalTables};
constexpr int kJournalVersion = 6;
static_assert(std::size(kMigrations) == WTStore::kSchemaVersion);

}  // namespace

namespace WTStoreSchema {

int migrate(sqlite3* db, int version, const std::function<int()>& fillJournal) {
  int code = sqlite3_exec(db, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr);
  if (code != SQLITE_OK) return code;
  for (int step = version; step < WTStore::kSchemaVersion && code == SQLITE_OK; ++step)
    code = kMigrations[step](db);
  if (code == SQLITE_OK && version < kJournalVersion) code = fillJournal();
  if (code == SQLITE_OK) {
    const QByteArray setVersion = "PRAGMA user_version = " + QByteArray::number(WTStore::kSchemaVersion);
    code = sqlite3_exec(db, setVersion.constData(), nullptr, nullptr, nullptr);
  }
  if (code == SQLITE_OK) code = sqlite3_exec(db, "COMMIT", nullptr, nullptr, nullptr);
  if (code != SQLITE_OK && !sqlite3_get_autocommit(db))
    sqlite3_exec(db, "ROLLBACK", nullptr, nullptr, nullptr);
  return code;
}

int addMissingBillingColumns(sqlite3* db, qint64 version) {
  return sqlite3_exec(db,
                      version < 4
                          ? "CREATE TEMP VIEW records AS SELECT *, NULL AS currency, NULL AS address, "
                            "NULL AS roundingMinutes, NULL AS roundingMode, NULL AS importId "
                            "FROM main.records"
                          : "CREATE TEMP VIEW records AS SELECT *, NULL AS importId FROM main.records",
                      nullptr, nullptr, nullptr);
}

}  // namespace WTStoreSchema
