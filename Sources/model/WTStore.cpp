#include "WTStore.h"

#include "WTStoreBackup.h"
#include "WTStoreRows.h"
#include "WTStoreSchema.h"

#include <QCoreApplication>
#include <QDateTime>
#include <QDir>
#include <QFile>
#include <QFileInfo>

#include <sqlite3.h>

#include <algorithm>
#include <array>
#include <iterator>
#include <optional>
#include <string>
#include <utility>

namespace {

using WTStoreSchema::kApplicationId;

// Another process may hold the write lock for a moment (a second copy of the application).
constexpr int kBusyTimeoutMs = 2000;

QString tr(const char* text) {
  return QCoreApplication::translate("WTStore", text);
}

// A row that is there already is changed in place: replacing it would take it out of every index and put it
// back, though a save mostly changes a name or a date and leaves the uuid and the task as they were. The
// entity is part of the uuid and never changes.
constexpr char kReplaceSql[] =
    "INSERT INTO main.records (" WT_STORE_COLUMNS
    ") VALUES (?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9, ?10, ?11, ?12, ?13, ?14, ?15, ?16, "
    "?17, ?18, ?19, ?20, ?21, ?22, ?23, ?24, ?25) ON CONFLICT(uuid) DO UPDATE SET name = ?3, notes = ?4, "
    "rate = ?5, color = ?6, archived = ?7, addressBookUID = ?8, totalsUID = ?9, clientUuid = ?10, "
    "projectUuid = ?11, "
    "position = ?12, budget = ?13, taskUuid = ?14, startDate = ?15, endDate = ?16, running = ?17, "
    "minutes = ?18, expense = ?19, completed = ?20, currency = ?21, address = ?22, roundingMinutes = ?23, "
    "roundingMode = ?24, importId = ?25";
constexpr char kDeleteSql[] = "DELETE FROM main.records WHERE uuid = ?1";

#undef WT_STORE_COLUMNS

// The journal's statements (WTStore::JournalStatement), bound alike: ?1 the uuid, ?2 the section, ?3 the
// changes' text, ?4 a number.
constexpr const char* kJournalSql[] = {
    "INSERT INTO journal (uuid, section, changes) VALUES (?1, ?2, ?3) "
    "ON CONFLICT (uuid, section) DO UPDATE SET changes = ?3",
    "DELETE FROM journal WHERE uuid = ?1 AND section = ?2",
    "INSERT OR REPLACE INTO journal_deletions (position, uuid) VALUES (?4, ?1)",
    "DELETE FROM journal_deletions WHERE uuid = ?1",
    "INSERT OR REPLACE INTO journal_state (name, value) VALUES ('iteration', ?4)",
    "DELETE FROM journal",
    "DELETE FROM journal_deletions",
    "SELECT section, changes FROM journal WHERE uuid = ?1 "
    "UNION ALL SELECT 'x', position FROM journal_deletions WHERE uuid = ?1",
    "SELECT uuid, section, changes FROM journal",
    "SELECT uuid, position FROM journal_deletions ORDER BY position",
    "SELECT value FROM journal_state WHERE name = 'iteration'",
    "SELECT coalesce(max(position), 0) FROM journal_deletions",
    "SELECT NOT EXISTS (SELECT 1 FROM journal) AND NOT EXISTS (SELECT 1 FROM journal_deletions)",
};

// What went wrong, in words for the user, for SQLite's result code.
QString reason(int code) {
  switch (code & 0xff) {
    case SQLITE_FULL:
      return tr("the disk is full");
    case SQLITE_CORRUPT:
    case SQLITE_NOTADB:
      return tr("the file is damaged");
    case SQLITE_BUSY:
    case SQLITE_LOCKED:
      return tr("the file is in use by another program");
    case SQLITE_READONLY:
      return tr("the file cannot be written to");
    case SQLITE_PERM:
    case SQLITE_AUTH:
      return tr("access to the file was denied");
    case SQLITE_CANTOPEN:
      return tr("the file cannot be opened");
    case SQLITE_IOERR:
      return tr("the disk could not be read or written");
    case SQLITE_NOMEM:
      return tr("there is not enough memory");
    default:
      return QString::fromUtf8(sqlite3_errstr(code));
  }
}

bool isDamage(int code) {
  return (code & 0xff) == SQLITE_CORRUPT || (code & 0xff) == SQLITE_NOTADB;
}

Error damagedError(const QString& path) {
  return {WTStore::Damaged, tr("The data file “%1” is damaged and cannot be opened.").arg(path)};
}

Error notAStoreError(const QString& path) {
  return {WTStore::NotAStore, tr("The file “%1” is not a Tessal data file and cannot be opened.").arg(path)};
}

// Runs a query to its end (a pragma that writes finishes its transaction only there) and keeps the
// first value it answers: `read` is called with the first row.
template <class Read>
int query(sqlite3* db, const char* sql, Read read) {
  sqlite3_stmt* statement = nullptr;
  int code = sqlite3_prepare_v2(db, sql, -1, &statement, nullptr);
  for (bool first = true; code == SQLITE_OK || code == SQLITE_ROW; first = false) {
    code = sqlite3_step(statement);
    if (code == SQLITE_ROW && first) read(statement);
  }
  const int finished = sqlite3_finalize(statement);
  return code == SQLITE_DONE ? finished : code;
}

int readInteger(sqlite3* db, const char* sql, qint64* value) {
  return query(db, sql, [&](sqlite3_stmt* statement) { *value = sqlite3_column_int64(statement, 0); });
}

// The first text a query answers; null when it answers none.
int readText(sqlite3* db, const char* sql, QByteArray* text) {
  return query(db, sql, [&](sqlite3_stmt* statement) {
    *text = QByteArray(reinterpret_cast<const char*>(sqlite3_column_text(statement, 0)));
  });
}

// PRAGMA quick_check reads every page: what loading never visits (the identity index) too.
int checkWholeFile(sqlite3* db, bool* damaged) {
  QByteArray verdict;
  const int code = readText(db, "PRAGMA quick_check(1)", &verdict);
  *damaged = isDamage(code) || (code == SQLITE_OK && verdict != "ok");
  return code;
}

// The check on a connection of its own, for a thread of its own: a connection serves one thread at a
// time. A check that cannot run finds nothing, as a header check would.
bool wholeFileIsDamaged(const QString& path, const std::string& vfs) {
  sqlite3* db = nullptr;
  bool damaged = false;
  if (sqlite3_open_v2(QFile::encodeName(path).constData(), &db, SQLITE_OPEN_READONLY | SQLITE_OPEN_NOMUTEX,
                      vfs.empty() ? nullptr : vfs.c_str()) == SQLITE_OK) {
    sqlite3_busy_timeout(db, kBusyTimeoutMs);
    sqlite3_exec(db, "PRAGMA mmap_size = 268435456", nullptr, nullptr, nullptr);
    checkWholeFile(db, &damaged);
  }
  sqlite3_close(db);
  return damaged;
}

int stepOnce(sqlite3_stmt* statement) {
  const int code = sqlite3_step(statement);
  sqlite3_reset(statement);
  return code == SQLITE_DONE ? SQLITE_OK : code;
}

}  // namespace

WTStore::WTStore(QString path, sqlite3* db) : path_(std::move(path)), db_(db) {}

WTStore::~WTStore() {
  for (sqlite3_stmt* statement : {begin_, commit_, rollback_, replace_, remove_}) sqlite3_finalize(statement);
  for (sqlite3_stmt* statement : load_) sqlite3_finalize(statement);
  for (sqlite3_stmt* statement : journal_) sqlite3_finalize(statement);
  sqlite3_close(db_);
}

Result<std::unique_ptr<WTStore>> WTStore::open(const QString& path, const char* vfs, Check check,
                                               const JournalImport& import, LogOnClose logOnClose) {
  return open(path, vfs, false, check, import, logOnClose);
}

Result<std::unique_ptr<WTStore>> WTStore::openReadOnly(const QString& path, Check check) {
  if (!QFileInfo::exists(path)) return Error{OpenFailed, tr("There is no data file at “%1”.").arg(path)};
  return open(path, nullptr, true, check, {}, LogOnClose::Fold);
}

Result<std::unique_ptr<WTStore>> WTStore::open(const QString& path, const char* vfs, bool readOnly,
                                               Check check, const JournalImport& import,
                                               LogOnClose logOnClose) {
  const QFileInfo file(path);
  const bool existed = file.exists();
  if (!existed && !file.dir().exists()) {
    return Error{OpenFailed,
                 tr("The data file “%1” cannot be created because its folder does not exist.").arg(path)};
  }
  if (existed && !file.isFile()) return notAStoreError(path);

  // Until the file is accepted nothing may write to it. A connection that closes checkpoints what a
  // leftover write-ahead log holds into the file; when there is such a log, keep it where it is. The
  // setting is changed as seldom as may be: each change makes SQLite compile every statement again.
  const bool logHasFrames = QFileInfo(path + QStringLiteral("-wal")).size() > 0;
  const bool keepsLog = logOnClose == LogOnClose::KeepWhileShort && !readOnly;

  sqlite3* db = nullptr;
  const int flags = SQLITE_OPEN_NOMUTEX | (readOnly ? SQLITE_OPEN_READONLY : SQLITE_OPEN_READWRITE) |
                    (existed ? 0 : SQLITE_OPEN_CREATE);
  int code = sqlite3_open_v2(QFile::encodeName(path).constData(), &db, flags, vfs);
  std::unique_ptr<WTStore> store(new WTStore(path, db));  // closes the connection on every way out
  if (code != SQLITE_OK) {
    return Error{OpenFailed, tr("The data file “%1” could not be opened: %2.").arg(path, reason(code))};
  }
  sqlite3_extended_result_codes(db, 1);
  sqlite3_busy_timeout(db, kBusyTimeoutMs);
  if (logHasFrames || keepsLog) sqlite3_db_config(db, SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, 1, nullptr);
  // The whole-file check reads every page; a command that reads a few records reads them unmapped.
  if (check != Check::Header) store->readInPlace();

  // Reads only: what the file is and which version wrote it.
  qint64 applicationId = 0, version = 0, objects = 0;
  code = readInteger(db, "PRAGMA application_id", &applicationId);
  if (code == SQLITE_OK) code = readInteger(db, "PRAGMA user_version", &version);
  if (code == SQLITE_OK) code = readInteger(db, "SELECT count(*) FROM sqlite_schema", &objects);
  if ((code & 0xff) == SQLITE_NOTADB) return notAStoreError(path);
  if (isDamage(code)) return damagedError(path);
  if (code != SQLITE_OK) {
    return Error{OpenFailed, tr("The data file “%1” could not be opened: %2.").arg(path, reason(code))};
  }

  const bool empty = applicationId == 0 && version == 0 && objects == 0;
  if (!empty) {
    if (applicationId != kApplicationId) return notAStoreError(path);
    if (version > kSchemaVersion) {
      return Error{
          NewerVersion,
          tr("The data file “%1” was written by a newer version of Tessal and cannot be opened.").arg(path)};
    }
    if (version < 1) return damagedError(path);
    // A file to migrate is checked before the migration changes it; one to read only, before it is read.
    const bool checkBeforeSaving =
        check == Check::WholeFileBeforeSaving && !readOnly && version == kSchemaVersion;
    if (checkBeforeSaving) {
      store->damageCheck_ =
          std::async(std::launch::async, wholeFileIsDamaged, path, vfs ? std::string(vfs) : std::string());
    } else if (check != Check::Header) {
      bool damaged = false;
      code = checkWholeFile(db, &damaged);
      if (damaged) return damagedError(path);
      if (code != SQLITE_OK) {
        return Error{OpenFailed, tr("The data file “%1” could not be opened: %2.").arg(path, reason(code))};
      }
    }
    // A current file must also have the shape this version reads and writes.
    const bool current = version == kSchemaVersion || (readOnly && version >= kOldestReadableVersion);
    if (current && version < kSchemaVersion &&
        WTStoreSchema::addMissingBillingColumns(db, version) != SQLITE_OK)
      return damagedError(path);
    if (current && !store->prepareStatements(!readOnly)) return damagedError(path);
  }
  if (readOnly) {
    if (!empty && version < kOldestReadableVersion) {
      return Error{MigrationFailed,
                   tr("The data file “%1” needs to be updated by starting Tessal once before it can be read.")
                       .arg(path)};
    }
    return store;
  }
  if (sqlite3_db_readonly(db, "main") == 1) {
    return Error{OpenFailed,
                 tr("The data file “%1” could not be opened: %2.").arg(path, reason(SQLITE_READONLY))};
  }

  // Accepted: from here on the file may change.
  if (keepsLog) {
    store->keepLogWhileShort();
  } else if (logHasFrames) {
    sqlite3_db_config(db, SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, 0, nullptr);
  }
  QByteArray mode;
  code = readText(db, "PRAGMA journal_mode = WAL", &mode);
  if (code == SQLITE_OK && mode != "wal") code = SQLITE_CANTOPEN;
  if (code == SQLITE_OK) code = sqlite3_exec(db, "PRAGMA synchronous = FULL", nullptr, nullptr, nullptr);
  // A save touches pages all over the file (rows and the index of items by task): with the default 2 MB
  // cache a large merge spills dirty pages to the log before it commits, and writes many twice.
  if (code == SQLITE_OK) code = sqlite3_exec(db, "PRAGMA cache_size = -32768", nullptr, nullptr, nullptr);
  if (code != SQLITE_OK) {
    return Error{OpenFailed, tr("The data file “%1” could not be opened: %2.").arg(path, reason(code))};
  }
  if (version < kSchemaVersion) {
    // The file as the older version left it stays in the backups: a migration that went wrong, or a
    // return to that version, still has the data it knew.
    if (!empty) {
      const QString copy = WTStoreBackup::unusedPath(
          WTStoreBackup::beforeMigrationPath(path, QDateTime::currentDateTime(), int(version)));
      if (const Result<void> copied = WTStoreBackup::copy(db, copy); !copied) {
        return Error{MigrationFailed,
                     tr("The data file “%1” was not updated for this version of Tessal, because it could not "
                        "be copied first: %2")
                         .arg(path, copied.error().message)};
      }
    }
    std::optional<Error> importFailed;
    code = WTStoreSchema::migrate(db, int(version), [&] {
      if (!import) return SQLITE_OK;
      JournalWriter writer(*store);
      Result<void> imported = import(writer);
      if (imported) return SQLITE_OK;
      importFailed = imported.error();
      return SQLITE_ABORT;
    });
    if (importFailed) {
      return Error{MigrationFailed,
                   tr("The data file “%1” could not be updated for this version of Tessal: %2")
                       .arg(path, importFailed->message)};
    }
    if (code != SQLITE_OK) {
      return Error{MigrationFailed,
                   tr("The data file “%1” could not be updated for this version of Tessal: %2.")
                       .arg(path, reason(code))};
    }
    if (!store->prepareStatements(true)) return damagedError(path);
  }
  return store;
}

void WTStore::readInPlace() {
  // Opening reads the whole file twice (the check, then the rows) and a merge visits pages all over it:
  // mapped, the pages are read in place instead of copied through a system call each. A command that
  // reads a few pages reads them faster through system calls: each mapped page costs a page fault.
  sqlite3_exec(db_, "PRAGMA mmap_size = 268435456", nullptr, nullptr, nullptr);
}

void WTStore::keepLogWhileShort() {
  // The hook takes the place of SQLite's own folding-in at 1,000 pages, so it does that too.
  sqlite3_wal_hook(
      db_,
      [](void*, sqlite3* db, const char* name, int frames) {
        if (frames >= 1000) sqlite3_wal_checkpoint(db, name);
        if (frames > kLogFramesKeptOnClose)
          sqlite3_db_config(db, SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, 0, nullptr);
        return SQLITE_OK;
      },
      nullptr);
}

Result<void> WTStore::prepareStatements(bool writing) {
  // A reader has no writing statements: its save() fails before it begins (an older file could not even
  // prepare them). They name every column, and so check the file's shape; a reader's whole load does that
  // for it.
  int code = SQLITE_OK;
  if (!writing && !loadStatement(int(Records::All), &code)) return Error{ReadFailed, reason(code)};
  const std::pair<sqlite3_stmt**, const char*> statements[] = {
      {&begin_, "BEGIN IMMEDIATE"}, {&commit_, "COMMIT"},   {&rollback_, "ROLLBACK"},
      {&replace_, kReplaceSql},     {&remove_, kDeleteSql},
  };
  for (size_t i = 0; writing && i < std::size(statements); ++i) {
    const auto& [statement, sql] = statements[i];
    code = sqlite3_prepare_v3(db_, sql, -1, SQLITE_PREPARE_PERSISTENT, statement, nullptr);
    if (code != SQLITE_OK) return Error{ReadFailed, reason(code)};
  }
  shaped_ = true;
  return {};
}

Error WTStore::writeError(int code) const {
  return {WriteFailed, tr("Changes could not be saved to the data file “%1”: %2.").arg(path_, reason(code))};
}

Result<void> WTStore::save(const std::vector<WTStoreRecord>& records, const QStringList& deletedUuids) {
  // A row without identity could never be found, replaced or removed again: refuse the whole save
  // before the file is touched.
  if (std::any_of(records.begin(), records.end(),
                  [](const WTStoreRecord& record) { return record.uuid.isEmpty(); }))
    return namelessError();
  auto next = records.begin();
  return saveFrom([&]() -> const WTStoreRecord* { return next == records.end() ? nullptr : &*next++; },
                  deletedUuids);
}

Error WTStore::namelessError() const {
  return Error{WriteFailed,
               tr("A record without identity cannot be written to the data file “%1”.").arg(path_)};
}

Result<void> WTStore::saveFrom(const RecordSource& records, const QStringList& deletedUuids,
                               const JournalStep& journal) {
  // Deleting "" would silently remove nothing.
  if (deletedUuids.contains(QString())) return namelessError();
  if (damageCheck_.valid()) damaged_ = damageCheck_.get();
  if (damaged_)
    return Error{Damaged, tr("The data file “%1” is damaged; nothing was written to it.").arg(path_)};
  if (!begin_) return writeError(SQLITE_READONLY);  // opened for reading
  int code = stepOnce(begin_);
  bool nameless = false;
  while (code == SQLITE_OK) {
    const WTStoreRecord* record = records();
    if (!record) break;
    // Found on the way: the transaction is undone below, and the file stays as it was.
    if (record->uuid.isEmpty()) {
      nameless = true;
      break;
    }
    code = WTStoreRows::bindRecord(replace_, *record);
    if (code == SQLITE_OK) code = stepOnce(replace_);
  }
  for (auto uuid = deletedUuids.begin(); !nameless && code == SQLITE_OK && uuid != deletedUuids.end();
       ++uuid) {
    code = WTStoreRows::bindString(remove_, WTStoreRows::kUuid, *uuid);
    if (code == SQLITE_OK) code = stepOnce(remove_);
  }
  std::optional<Error> journalFailed;
  if (!nameless && code == SQLITE_OK && journal) {
    JournalWriter writer(*this);
    if (Result<void> written = journal(writer); !written) journalFailed = written.error();
  }
  if (!nameless && !journalFailed && code == SQLITE_OK) code = stepOnce(commit_);
  // The statements must not keep pointers into the caller's records.
  sqlite3_clear_bindings(replace_);
  sqlite3_clear_bindings(remove_);
  if (!nameless && !journalFailed && code == SQLITE_OK) {
    // What the save wrote is in the file and its log now: the cache a large save filled goes back, and
    // the next save reads the pages it needs through the map.
    sqlite3_db_release_memory(db_);
    return {};
  }
  // Some errors end the transaction by themselves; whatever is left of it is undone.
  if (!sqlite3_get_autocommit(db_)) stepOnce(rollback_);
  if (nameless) return namelessError();
  if (journalFailed) return *journalFailed;
  return writeError(code);
}

Result<void> WTStore::writeJournal(const JournalStep& step) {
  return saveFrom([]() -> const WTStoreRecord* { return nullptr; }, {}, step);
}

Error WTStore::readError(int code) const {
  if (isDamage(code))
    return Error{ReadFailed, tr("The data file “%1” is damaged and cannot be read.").arg(path_)};
  return Error{ReadFailed, tr("The data file “%1” could not be read: %2.").arg(path_, reason(code))};
}

sqlite3_stmt* WTStore::journalStatement(int which, int* code) {
  *code = SQLITE_OK;
  if (!journal_[which])
    *code =
        sqlite3_prepare_v3(db_, kJournalSql[which], -1, SQLITE_PREPARE_PERSISTENT, &journal_[which], nullptr);
  return journal_[which];
}

Result<void> WTStore::JournalWriter::step(int which, const QString& uuid, char section,
                                          const QByteArray& text, qint64 number) {
  int code = SQLITE_OK;
  sqlite3_stmt* s = store_.journalStatement(which, &code);
  const int parameters = s ? sqlite3_bind_parameter_count(s) : 0;
  if (code == SQLITE_OK && parameters >= 1 && !uuid.isNull())
    code = WTStoreRows::bindString(s, WTStoreRows::kUuid, uuid);
  if (code == SQLITE_OK && parameters >= 2 && section)
    code = sqlite3_bind_text(s, 2, &section, 1, SQLITE_TRANSIENT);
  if (code == SQLITE_OK && parameters >= 3 && !text.isNull())
    code = sqlite3_bind_text(s, 3, text.constData(), int(text.size()), SQLITE_STATIC);
  if (code == SQLITE_OK && parameters >= 4) code = sqlite3_bind_int64(s, 4, number);
  if (code == SQLITE_OK) code = stepOnce(s);
  if (s) sqlite3_clear_bindings(s);
  if (code != SQLITE_OK) return store_.writeError(code);
  return {};
}

Result<void> WTStore::JournalWriter::setEntry(const QString& uuid, char section, const QByteArray& changes) {
  if (uuid.isEmpty()) return store_.namelessError();
  return step(changes.isNull() ? RemoveEntry : SetEntry, uuid, section, changes, 0);
}

Result<void> WTStore::JournalWriter::setDeletion(const QString& uuid, qint64 order) {
  if (uuid.isEmpty()) return store_.namelessError();
  return step(order < 0 ? RemoveDeletion : SetDeletion, uuid, 0, {}, order);
}

Result<void> WTStore::JournalWriter::setIteration(qint64 iteration) {
  return step(SetIteration, {}, 0, {}, iteration);
}

Result<void> WTStore::JournalWriter::clear() {
  if (Result<void> entries = step(ClearEntries, {}, 0, {}, 0); !entries) return entries;
  return step(ClearDeletions, {}, 0, {}, 0);
}

namespace {

QByteArray columnBytes(sqlite3_stmt* s, int column) {
  const char* text = reinterpret_cast<const char*>(sqlite3_column_text(s, column));
  return text ? QByteArray(text, sqlite3_column_bytes(s, column)) : QByteArray();
}

QString columnString(sqlite3_stmt* s, int column) {
  const char* text = reinterpret_cast<const char*>(sqlite3_column_text(s, column));
  return text ? QString::fromUtf8(text, sqlite3_column_bytes(s, column)) : QString();
}

}  // namespace

Result<WTStore::JournalRecord> WTStore::journalRecord(const QString& uuid) {
  int code = SQLITE_OK;
  sqlite3_stmt* s = journalStatement(ReadRecord, &code);
  if (code == SQLITE_OK) code = WTStoreRows::bindString(s, WTStoreRows::kUuid, uuid);
  JournalRecord record;
  while (code == SQLITE_OK && (code = sqlite3_step(s)) == SQLITE_ROW) {
    code = SQLITE_OK;
    const char section = char(sqlite3_column_text(s, 0)[0]);
    if (section == 'x') {
      record.deletion = sqlite3_column_int64(s, 1);
    } else {
      (section == 'i' ? record.inserted : record.updated) = columnBytes(s, 1);
    }
  }
  if (s) {
    sqlite3_reset(s);
    sqlite3_clear_bindings(s);
  }
  if (code != SQLITE_DONE) return readError(code);
  return record;
}

Result<void> WTStore::readJournal(
    const std::function<void(const QString& uuid, char section, const QByteArray& changes)>& entry,
    const std::function<void(const QString& uuid, qint64 order)>& deletion, qint64* iteration) {
  int code = SQLITE_OK;
  for (int which : {ReadEntries, ReadDeletions, ReadIteration}) {
    sqlite3_stmt* s = journalStatement(which, &code);
    while (code == SQLITE_OK && (code = sqlite3_step(s)) == SQLITE_ROW) {
      code = SQLITE_OK;
      if (which == ReadEntries) {
        entry(columnString(s, 0), char(sqlite3_column_text(s, 1)[0]), columnBytes(s, 2));
      } else if (which == ReadDeletions) {
        deletion(columnString(s, 0), sqlite3_column_int64(s, 1));
      } else {
        if (iteration) *iteration = sqlite3_column_int64(s, 0);
      }
    }
    if (s) sqlite3_reset(s);
    if (code != SQLITE_DONE) return readError(code);
  }
  return {};
}

Result<bool> WTStore::journalIsEmpty() {
  const Result<qint64> empty = journalNumber(IsEmpty);
  if (!empty) return empty.error();
  return empty.value() != 0;
}

Result<qint64> WTStore::lastJournalDeletion() {
  return journalNumber(LastDeletion);
}

Result<qint64> WTStore::journalNumber(int which) {
  int code = SQLITE_OK;
  sqlite3_stmt* s = journalStatement(which, &code);
  qint64 number = 0;
  if (code == SQLITE_OK && (code = sqlite3_step(s)) == SQLITE_ROW) {
    number = sqlite3_column_int64(s, 0);
    code = sqlite3_step(s);
  }
  if (s) sqlite3_reset(s);
  if (code != SQLITE_DONE) return readError(code);
  return number;
}
