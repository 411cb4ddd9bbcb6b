#pragma once

#include <QtGlobal>

#include <functional>

struct sqlite3;

// The conditions of the two partial indexes that starting and stopping timers read through. A query must
// say them as the index does for SQLite to use the index, so both take them from here.
#define WT_STORE_OWNERS "entity IN ('WTClient', 'WTProject', 'WTTask')"
#define WT_STORE_RUNNING "running <> 0"

// The store file's tables, version by version, and the steps between them (WTStore opens, checks and
// migrates; this says what each version holds).
namespace WTStoreSchema {

// "Tssl" in the header's application id marks a SQLite file as ours, so that another program's database
// is never taken for a store and changed.
constexpr int kApplicationId = 0x5473736c;

// Runs the migration steps from `version` to WTStore::kSchemaVersion in one transaction, rolled back
// whole when a step fails; `fillJournal` runs in it when the journal's tables were made. SQLite's code.
int migrate(sqlite3* db, int version, const std::function<int()>& fillJournal);

// A file older than version 5 read without migrating it: a view in the connection's own temporary schema
// stands in for its table where reading names it unqualified (the temporary schema is searched first) and
// answers the columns it lacks as NULL. Writing names the table itself, "main.records".
int addMissingBillingColumns(sqlite3* db, qint64 version);

}  // namespace WTStoreSchema
