#include "TestFiles.h"
#include "WTStore.h"
#include "WTStoreBackup.h"

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QTemporaryDir>

#include <array>
#include <functional>
#include <map>
#include <memory>
#include <random>
#include <ranges>
#include <thread>

#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

// The default SQLite VFS, but once armed it fails the N-th write or sync (with `persistent`, every later
// one).
namespace FaultInjectingVfs {
enum class Operation { Write, Sync };
struct {
  bool armed = false;
  Operation kind = Operation::Write;
  int remaining = 0;  // operations of `kind` until the one that fails
  bool persistent = false, fired = false;
} state;
sqlite3_vfs* base = nullptr;
sqlite3_vfs vfs;
// The default VFS's sets of file calls, each with its copy whose write and sync may fail.
std::pair<const sqlite3_io_methods*, sqlite3_io_methods> wrapped[4];
const sqlite3_io_methods* baseOf(sqlite3_file* f) {
  for (const auto& [original, copy] : wrapped)
    if (&copy == f->pMethods) return original;
  return nullptr;
}
bool shouldFail(Operation kind) {
  if (!state.armed || state.kind != kind) return false;
  return state.fired ? state.persistent : (state.fired = --state.remaining <= 0);
}
int xWrite(sqlite3_file* f, const void* buffer, int amount, sqlite3_int64 offset) {
  return shouldFail(Operation::Write) ? SQLITE_IOERR_WRITE : baseOf(f)->xWrite(f, buffer, amount, offset);
}
int xSync(sqlite3_file* f, int flags) {
  return shouldFail(Operation::Sync) ? SQLITE_IOERR_FSYNC : baseOf(f)->xSync(f, flags);
}
int xOpen(sqlite3_vfs*, sqlite3_filename name, sqlite3_file* file, int flags, int* outFlags) {
  const int code = base->xOpen(base, name, file, flags, outFlags);
  if (code != SQLITE_OK || !file->pMethods) return code;
  for (auto& [original, copy] : wrapped) {
    if (!original) {
      original = file->pMethods;
      copy = *original;
      copy.xWrite = xWrite;
      copy.xSync = xSync;
    }
    if (original == file->pMethods) {
      file->pMethods = &copy;
      return SQLITE_OK;
    }
  }
  file->pMethods->xClose(file);
  file->pMethods = nullptr;
  return SQLITE_CANTOPEN;
}
// Registers the VFS (once; not as the default) and returns its name for WTStore::open.
const char* name() {
  static const bool registered = [] {
    base = sqlite3_vfs_find(nullptr);
    vfs = *base;  // every other call is the default VFS's own, with its own data
    vfs.pNext = nullptr;
    vfs.zName = "tessal-faults";
    vfs.xOpen = xOpen;
    return sqlite3_vfs_register(&vfs, 0) == SQLITE_OK;
  }();
  return registered ? vfs.zName : nullptr;
}
}  // namespace FaultInjectingVfs

using Records = std::map<QString, WTStoreRecord>;

const auto decimal = [](const char16_t* text) { return Decimal::fromString(QStringView(text)); };

// Compares whole records, decimals also by representation (12.30 is not 12.3), strings also by null-ness.
void expectSameRecords(const Records& actual, const Records& expected) {
  ASSERT_EQ(actual.size(), expected.size());
  for (const auto& [uuid, want] : expected) {
    SCOPED_TRACE(uuid.toStdString());
    ASSERT_TRUE(actual.contains(uuid));
    const WTStoreRecord& got = actual.at(uuid);
    EXPECT_TRUE(got == want);
    for (auto field : {&WTStoreRecord::rate, &WTStoreRecord::budget, &WTStoreRecord::expense})
      EXPECT_TRUE(want.*field ? got.*field && (got.*field)->isIdenticalTo(*(want.*field)) : !(got.*field));
    for (auto field : {&WTStoreRecord::name, &WTStoreRecord::notes, &WTStoreRecord::color,
                       &WTStoreRecord::addressBookUID, &WTStoreRecord::clientUuid, &WTStoreRecord::taskUuid})
      EXPECT_EQ((got.*field).isNull(), (want.*field).isNull());
  }
}

// Records are written with designated fields; those left out stay empty on purpose.
#pragma GCC diagnostic ignored "-Wmissing-field-initializers"

WTStoreRecord record(const QString& uuid, const QString& entity, const QString& task = {},
                     const QString& name = {}) {
  return {.uuid = uuid, .entity = entity, .name = name, .taskUuid = task};
}

// Every entity and field, with awkward values: 38 digits, a NUL, dates before 1970, minutes beyond a double.
Records sampleRecords() {
  Records records;
  // clang-format off
  for (WTStoreRecord r : {
           WTStoreRecord{.uuid = "C1@WTClient", .entity = "WTClient", .name = "Müller & Söhne ☕ 日本",
                         .notes = "line one\nline two\ttab, \"quoted\"", .rate = decimal(u"85.50"),
                         .color = "#80ff0000", .archived = true, .addressBookUID = "AB-1:ABPerson",
                         .totalsUID = QString(QLatin1StringView("")), .currency = "KWD",
                         .address = "1 Main St\nSpringfield", .roundingMinutes = 15, .roundingMode = "up"},
           {.uuid = "P1@WTProject", .entity = "WTProject", .name = QString(QLatin1StringView("")),
            .rate = decimal(u"1E+3"), .roundingMinutes = 0, .clientUuid = "C1@WTClient", .budget = decimal(u"2500.00")},
           {.uuid = "T1@WTTask", .entity = "WTTask", .name = "Design", .rate = decimal(u"0.00"),
            .roundingMode = "nearest", .projectUuid = "P1@WTProject", .position = 3,
            .budget = decimal(u"12345678901234567890123456789012345678")},
           {.uuid = "I1@WTTime", .entity = "WTTime", .name = QString::fromUtf16(u"nul \0 inside", 12),
            .taskUuid = "T1@WTTask", .startDate = Date::fromSeconds(1767261600.25),
            .endDate = Date::fromSeconds(1767265200.75), .running = true, .importId = "toggl:3f2a"},
           {.uuid = "I2@WTFlat", .entity = "WTFlat", .taskUuid = "T1@WTTask",
            .startDate = Date::fromSeconds(-86400.5), .minutes = 0},
           {.uuid = "I3@WTExpense", .entity = "WTExpense", .rate = decimal(u"0.0000000000000000000001"),
            .taskUuid = "T1@WTTask", .startDate = Date::fromSeconds(0), .expense = decimal(u"-12.30")},
           {.uuid = "I4@WTNote", .entity = "WTNote", .notes = QString(20000, QChar(u'é')), .taskUuid = "T1@WTTask"},
           {.uuid = "I5@WTToDo", .entity = "WTToDo", .name = "Call back", .position = -1,
            .minutes = 9007199254740993LL, .completed = true},
           {.uuid = "X1@WTFuture", .entity = "WTFuture"}})
    // clang-format on
    records[r.uuid] = r;
  return records;
}

const auto values = [](const Records& r) {
  return std::vector(std::views::values(r).begin(), std::views::values(r).end());
};

Records loadAll(WTStore& store, WTStore::Records which = WTStore::Records::All,
                const QStringList& tasks = {}) {
  Records records;
  const Result<void> loaded =
      store.loadAll([&](WTStoreRecord&& r) { records[r.uuid] = std::move(r); }, which, tasks);
  EXPECT_TRUE(loaded.ok()) << loaded.error().message.toStdString();
  return records;
}

// Plain sqlite3 on a file, as another program would see it.
class RawDatabase {
 public:
  explicit RawDatabase(const QString& path) { sqlite3_open(QFile::encodeName(path).constData(), &db_); }
  ~RawDatabase() { sqlite3_close(db_); }
  void exec(const char* sql) {
    EXPECT_EQ(sqlite3_exec(db_, sql, nullptr, nullptr, nullptr), SQLITE_OK) << sql;
  }
  QString text(const char* sql) {
    sqlite3_stmt* statement = nullptr;
    EXPECT_EQ(sqlite3_prepare_v2(db_, sql, -1, &statement, nullptr), SQLITE_OK) << sql;
    QString result;
    if (sqlite3_step(statement) == SQLITE_ROW)
      result = QString::fromUtf8((const char*)sqlite3_column_text(statement, 0));
    sqlite3_finalize(statement);
    return result;
  }
  sqlite3* db_ = nullptr;
};

// The version, the journal mode, the records and the indexes of a store file.
QStringList shape(const QString& path) {
  RawDatabase raw(path);
  return {raw.text("PRAGMA user_version"), raw.text("PRAGMA journal_mode"),
          raw.text("SELECT count(*) FROM records"),
          raw.text("SELECT count(*) FROM sqlite_schema WHERE type = 'index' AND name LIKE 'records_%'")};
}

class WTStoreTest : public ::testing::Test {
 protected:
  QString path() const { return dir.filePath(QStringLiteral("Tessal.sqlite")); }

  std::unique_ptr<WTStore> open(const char* vfs = nullptr) {
    auto store = WTStore::open(path(), vfs);
    EXPECT_TRUE(store.ok()) << store.error().message.toStdString();
    return store.ok() ? std::move(store.value()) : nullptr;
  }

  void makeStore(const Records& records) {
    auto store = open();
    ASSERT_TRUE(store);
    ASSERT_TRUE(store->save(values(records), {}).ok());
  }

  QList<QByteArray> allBytes() const {
    QList<QByteArray> bytes;
    for (const char* suffix : {"", "-wal", "-journal"})
      bytes.append(fileBytes(path() + QLatin1StringView(suffix)));
    bytes.append(QFileInfo::exists(path() + QStringLiteral("-shm")) ? "index" : "");
    return bytes;
  }
  void removeFiles() const {
    for (const char* suffix : {"", "-wal", "-shm", "-journal"})
      QFile::remove(path() + QLatin1StringView(suffix));
  }
  template <class T>
  void expectError(const Result<T>& result, int code) {
    ASSERT_FALSE(result.ok());
    EXPECT_EQ(result.error().code, code);
    EXPECT_TRUE(result.error().message.contains(path())) << result.error().message.toStdString();
  }

  QTemporaryDir dir;
};

// Cleared fields come back as none, not as their old values; an amount that is not a number fails the load.
TEST_F(WTStoreTest, EveryFieldSurvivesSavesThatReplaceWholeRecordsAndDelete) {
  Records records = sampleRecords();
  makeStore(records);
  auto store = open();
  ASSERT_TRUE(store);
  expectSameRecords(loadAll(*store), records);
  // A row needs its identity: a save holding a row or a deletion without one writes nothing of itself.
  const WTStoreRecord good = record("good@WTNote", "WTNote");
  for (const auto& [writes, deletes] :
       {std::pair{std::vector{good, record({}, "WTNote")}, QStringList{"I1@WTTime"}},
        std::pair{std::vector{good}, QStringList{QString()}}}) {
    expectError(store->save(writes, deletes), WTStore::WriteFailed);
    expectSameRecords(loadAll(*store), records);
  }
  WTStoreRecord cleared = record("C1@WTClient", "WTClient", {}, "Renamed");
  const WTStoreRecord added = record("I9@WTNote", "WTNote", "T1@WTTask");
  ASSERT_TRUE(store->save({cleared, added}, {"I3@WTExpense", "never@WTTime"}).ok());
  records[cleared.uuid] = cleared;
  records[added.uuid] = added;
  records.erase("I3@WTExpense");
  expectSameRecords(loadAll(*store), records);
  store.reset();
  ASSERT_TRUE(store = open());
  expectSameRecords(loadAll(*store), records);
  EXPECT_TRUE(store->save({}, {}).ok());
  RawDatabase(path()).exec("UPDATE records SET budget = '12,50' WHERE uuid = 'T1@WTTask'");
  expectError(store->loadAll([](WTStoreRecord&&) {}), WTStore::ReadFailed);
}

// Nothing makes a missing folder, a reader no missing file; an empty file reads as empty and only a writer
// changes it.
TEST_F(WTStoreTest, NewMissingAndEmptyFiles) {
  ASSERT_TRUE(open());
  for (const char* suffix : {"-wal", "-shm"})  // closing folds the log back into the file
    EXPECT_FALSE(QFileInfo::exists(path() + QLatin1StringView(suffix))) << suffix;
  EXPECT_EQ(shape(path()), QStringList({"6", "wal", "0", "3"}));
  const QString folder = dir.filePath(QStringLiteral("Tessal2"));
  auto inMissingFolder = WTStore::open(folder + QStringLiteral("/Tessal.sqlite"));
  ASSERT_FALSE(inMissingFolder.ok());
  EXPECT_TRUE(inMissingFolder.error().code == WTStore::OpenFailed &&
              inMissingFolder.error().message.contains(folder) && !QFileInfo::exists(folder));

  removeFiles();
  expectError(WTStore::openReadOnly(path()), WTStore::OpenFailed);
  EXPECT_FALSE(QFileInfo::exists(path()));
  writeFile(path(), QByteArray());
  auto empty = WTStore::openReadOnly(path());
  ASSERT_TRUE(empty) << empty.error().message.toStdString();
  EXPECT_TRUE(loadAll(*empty.value()).empty());
  EXPECT_FALSE(empty.value()->save({record("x@WTNote", "WTNote")}, {}).ok());
  empty.value().reset();
  EXPECT_TRUE(fileBytes(path()).isEmpty());
  auto store = open();
  ASSERT_TRUE(store);
  EXPECT_TRUE(store->path() == path() && loadAll(*store).empty());
  EXPECT_TRUE(store->save(values(sampleRecords()), {}).ok());
}

// Reports open the store beside the running application: readers see what it saved and change nothing. Files
// of version 1 (the first), 3 (before the billing columns) and 4 (before importId) keep their data.
TEST_F(WTStoreTest, AnOlderFileIsMigratedOnlyByAWriterAndReadersSeeWhatWritersSaved) {
  for (const int version : {1, 3, 4}) {
    SCOPED_TRACE(version);
    removeFiles();
    RawDatabase(path()).exec(
        "CREATE TABLE records (uuid TEXT PRIMARY KEY NOT NULL, entity TEXT NOT NULL, name TEXT, notes TEXT,"
        " rate TEXT, color TEXT, archived INTEGER NOT NULL DEFAULT 0, addressBookUID TEXT, totalsUID TEXT,"
        " clientUuid TEXT, projectUuid TEXT, position INTEGER NOT NULL DEFAULT 0, budget TEXT, taskUuid TEXT,"
        " startDate REAL, endDate REAL, running INTEGER NOT NULL DEFAULT 0, minutes INTEGER, expense TEXT,"
        " completed INTEGER NOT NULL DEFAULT 0);"
        "PRAGMA application_id = 1416852332;");
    RawDatabase(path()).exec(version == 1
                                 ? "PRAGMA user_version = 1;"
                                 : "CREATE INDEX records_owners ON records(entity) WHERE entity IN "
                                   "('WTClient', 'WTProject', 'WTTask'); CREATE INDEX records_running ON "
                                   "records(uuid) WHERE running <> 0; CREATE INDEX records_items ON "
                                   "records(taskUuid); PRAGMA user_version = 3;");
    if (version == 4)
      RawDatabase(path()).exec(
          "ALTER TABLE records ADD COLUMN currency TEXT; ALTER TABLE records ADD COLUMN address TEXT;"
          "ALTER TABLE records ADD COLUMN roundingMinutes INTEGER;"
          "ALTER TABLE records ADD COLUMN roundingMode TEXT;"
          "PRAGMA user_version = 4;");
    RawDatabase(path()).exec(
        "INSERT INTO records (uuid, entity, name, rate, archived, color) VALUES"
        " ('C@WTClient', 'WTClient', 'Acme', '80.00', 1, '#ff112233'),"
        " ('T@WTTask', 'WTTask', 'Sketch', NULL, 0, NULL);"
        "INSERT INTO records (uuid, entity, taskUuid, startDate, minutes, expense, completed) VALUES"
        " ('F@WTFlat', 'WTFlat', 'T@WTTask', 1700000000.5, 90, '-0.10', 1);");
    // clang-format off
  Records expected = {
      {"C@WTClient", {.uuid = "C@WTClient", .entity = "WTClient", .name = "Acme", .rate = decimal(u"80.00"),
                      .color = "#ff112233", .archived = true}},
      {"T@WTTask", {.uuid = "T@WTTask", .entity = "WTTask", .name = "Sketch"}},
      {"F@WTFlat", {.uuid = "F@WTFlat", .entity = "WTFlat", .taskUuid = "T@WTTask",
                    .startDate = Date::fromSeconds(1700000000.5), .minutes = 90, .expense = decimal(u"-0.10"),
                    .completed = true}}};
    // clang-format on
    const QByteArray before = fileBytes(path());
    {
      auto reader = WTStore::openReadOnly(path());
      ASSERT_TRUE(reader) << reader.error().message.toStdString();
      expectSameRecords(loadAll(*reader.value()), expected);
      expectSameRecords(loadAll(*reader.value(), WTStore::Records::RunningAndNamed, {"sketch"}),
                        {{"T@WTTask", expected["T@WTTask"]}});
    }
    EXPECT_EQ(fileBytes(path()), before);
    auto writer = open();
    ASSERT_TRUE(writer);
    expectSameRecords(loadAll(*writer), expected);
    // The file as the older version left it stays in the backups, one file of its own, the owner's alone.
    const QStringList copies =
        QDir(dir.filePath("Backups")).entryList({QStringLiteral("*-version-%1.sqlite").arg(version)});
    ASSERT_EQ(copies.size(), 1);
    const QString copy = dir.filePath("Backups/" + copies[0]);
    EXPECT_TRUE(WTStoreBackup::check(copy).ok());
    EXPECT_EQ(shape(copy), QStringList({QString::number(version), "delete", "3", version == 1 ? "0" : "3"}));
    EXPECT_EQ(int(QFileInfo(dir.filePath("Backups")).permissions() & 0x0777), 0x0700);
    EXPECT_EQ(QFileInfo(copy).permissions(),
              QFile::ReadOwner | QFile::WriteOwner | QFile::ReadUser | QFile::WriteUser);
    WTStoreRecord added = record("N@WTClient", "WTClient");
    added.currency = "JPY";
    added.roundingMinutes = 6;
    ASSERT_TRUE(writer->save({added}, {}).ok());  // still in the writer's log, not yet in the file
    expected[added.uuid] = added;
    EXPECT_EQ(shape(path()), QStringList({"6", "wal", "4", "3"}));

    auto reader = WTStore::openReadOnly(path());
    ASSERT_TRUE(reader) << reader.error().message.toStdString();
    expectSameRecords(loadAll(*reader.value()), expected);
    expectError(reader.value()->save({record("x@WTNote", "WTNote")}, {}), WTStore::WriteFailed);
    EXPECT_TRUE(writer->save({record("later@WTNote", "WTNote")}, {}).ok());  // the writer goes on saving
  }
}

TEST_F(WTStoreTest, PartialLoadsReadTheOwnersAndTheChosenItemsOnly) {
  Records records = sampleRecords();
  (records["R@WTTime"] = record("R@WTTime", "WTTime", "T1@WTTask")).running = true;
  // Tasks whose uuids hold what JSON must escape still find their items.
  const QString quoted = QStringLiteral("T\"quoted\\@WTTask");
  for (const QString& task : {quoted, QStringLiteral("T9@WTTask")}) {
    records[task] = record(task, "WTTask");
    records[task + "-item@WTNote"] = record(task + "-item@WTNote", "WTNote", task);
  }
  // Names as the commands look for them: case and accents folded, nothing else.
  for (const auto& [uuid, name, project] :
       std::initializer_list<std::array<QString, 3>>{{"T2@WTTask", "Review ", "P1@WTProject"},
                                                     {"E@WTTask", "École", "P2@WTProject"},
                                                     {"X@WTTask", "Other", "P2@WTProject"},
                                                     {"K@WTTask", "\u212Aelvin", "P3@WTProject"},
                                                     {"O@WTTask", "ÉCOLE", {}},
                                                     {"S@WTTask", "Straße", "P4@WTProject"}})
    records[uuid] = {.uuid = uuid, .entity = "WTTask", .name = name, .projectUuid = project};
  for (const auto& [uuid, client] :
       {std::pair{"P2@WTProject", "C2@WTClient"}, {"P3@WTProject", ""}, {"P4@WTProject", "C4@WTClient"}})
    records[uuid] = {.uuid = uuid, .entity = "WTProject", .clientUuid = *client ? client : QString()};
  for (const char* client : {"C2@WTClient", "C4@WTClient"}) records[client] = record(client, "WTClient");
  makeStore(records);
  auto store = open();
  ASSERT_TRUE(store);
  // Every load but the one by names reads all clients, projects and tasks.
  const QStringList owners = {"C1@WTClient",  "C2@WTClient",  "C4@WTClient",  "P1@WTProject",
                              "P2@WTProject", "P3@WTProject", "P4@WTProject", "T1@WTTask",
                              "T2@WTTask",    "T9@WTTask",    quoted,         "E@WTTask",
                              "X@WTTask",     "K@WTTask",     "O@WTTask",     "S@WTTask"};
  const QStringList running = {"I1@WTTime", "R@WTTime"};
  // The load by names reads the running entries and their tasks, the tasks named, their projects with
  // every task of those, and their clients.
  const QStringList runningTask =
      running + QStringList{"T1@WTTask", "T2@WTTask", "P1@WTProject", "C1@WTClient"};
  // The statement is used again: the next load's tasks replace the last one's.
  const std::tuple<WTStore::Records, QStringList, QStringList> cases[] = {
      {WTStore::Records::Timers, {"T1@WTTask"}, owners + running},
      {WTStore::Records::ItemsOfTasks,
       {"T1@WTTask", quoted},
       owners + running + QStringList{"I2@WTFlat", "I3@WTExpense", "I4@WTNote", quoted + "-item@WTNote"}},
      {WTStore::Records::ItemsOfTasks, {}, owners},
      {WTStore::Records::ItemsOfTasks, {quoted}, owners + QStringList{quoted + "-item@WTNote"}},
      {WTStore::Records::RunningAndNamed, {}, runningTask},
      {WTStore::Records::RunningAndNamed,
       {"école", "KELVIN"},
       runningTask + QStringList{"E@WTTask", "O@WTTask", "K@WTTask", "X@WTTask", "P2@WTProject",
                                 "P3@WTProject", "C2@WTClient"}},
      {WTStore::Records::RunningAndNamed, {"STRASSE", "Review", " other"}, runningTask}};
  for (const auto& [which, keys, picked] : cases) {
    SCOPED_TRACE(keys.join(',').toStdString());
    Records expected;
    for (const QString& uuid : picked) expected[uuid] = records.at(uuid);
    expectSameRecords(loadAll(*store, which, keys), expected);
  }
}

// A real store with enough rows for several levels of pages, damaged.
enum class Damage { Truncated, NoisyPages, GarbledLastPage };
void damagedStore(const QString& path, Damage damage) {
  std::vector<WTStoreRecord> records;
  for (int i = 0; i < 3000; ++i)
    records.push_back(
        record(QStringLiteral("item-%1@WTNote").arg(i), "WTNote", {}, QStringLiteral("A note %1").arg(i)));
  ASSERT_TRUE(WTStore::open(path).value()->save(records, {}).ok());
  QByteArray bytes = fileBytes(path);
  std::mt19937 random(7);
  if (damage == Damage::Truncated) bytes.truncate(bytes.size() / 2);
  // Every page but the first (the header and schema) gets noise in its middle.
  for (qsizetype page = 4096; damage == Damage::NoisyPages && page < bytes.size(); page += 4096)
    for (int i = 1000; i < 1200; ++i) bytes[page + i] = char(random());
  if (damage == Damage::GarbledLastPage) bytes.replace(bytes.size() - 4096, 4096, QByteArray(4096, 0x5a));
  writeFile(path, bytes);
}

void newerVersion(const QString& path, bool wal) {
  RawDatabase raw(path);
  if (wal) raw.exec("PRAGMA journal_mode = WAL");
  raw.exec(
      "CREATE TABLE records (uuid TEXT PRIMARY KEY, entity TEXT, colour BLOB); CREATE TABLE later (x);"
      "INSERT INTO records VALUES ('a@WTClient', 'WTClient', x'00ff');"
      "PRAGMA application_id = 1416852332; PRAGMA user_version = 99;");
}

// Files that must be refused by writers and readers alike, and left exactly as they were, log included.
TEST_F(WTStoreTest, RefusedFilesAreLeftAsTheyWere) {
  const std::map<int, const char*> messages = {
      {WTStore::NotAStore, "The file “%1” is not a Tessal data file and cannot be opened."},
      {WTStore::NewerVersion,
       "The data file “%1” was written by a newer version of Tessal and cannot be opened."},
      {WTStore::Damaged, "The data file “%1” is damaged and cannot be opened."}};
  using Make = std::function<void(const QString& path)>;
  const std::tuple<const char*, Make, int> files[] = {
      // clang-format off
      {"a text file", [](auto& p) { writeFile(p, QByteArray("Not a database.\n").repeated(300)); }, WTStore::NotAStore},
      {"another program's database", [](auto& p) { RawDatabase(p).exec("CREATE TABLE songs (t)"); }, WTStore::NotAStore},
      {"another program's database with a version",
       [](auto& p) { RawDatabase(p).exec("CREATE TABLE records (uuid); PRAGMA user_version = 1;"); }, WTStore::NotAStore},
      {"a newer version", [](auto& p) { newerVersion(p, false); }, WTStore::NewerVersion},
      {"a newer version in WAL mode", [](auto& p) { newerVersion(p, true); }, WTStore::NewerVersion},
      {"a newer version only its log knows about", [](auto& p) {
         RawDatabase raw(p);
         raw.exec("CREATE TABLE records (uuid TEXT PRIMARY KEY); PRAGMA application_id = 1416852332;"
                  "PRAGMA user_version = 1; PRAGMA journal_mode = WAL;");
         // The newer version's changes are still in the log when it stops.
         raw.exec("PRAGMA user_version = 99; INSERT INTO records VALUES ('a@WTClient')");
         ASSERT_EQ(sqlite3_db_config(raw.db_, SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, 1, nullptr), SQLITE_OK);
       }, WTStore::NewerVersion},
      {"a truncated store", [](auto& p) { damagedStore(p, Damage::Truncated); }, WTStore::Damaged},
      {"a store with garbled pages", [](auto& p) { damagedStore(p, Damage::NoisyPages); }, WTStore::Damaged},
      {"a store whose last page is garbled", [](auto& p) { damagedStore(p, Damage::GarbledLastPage); }, WTStore::Damaged},
      // clang-format on
  };
  enum Way { Writing, Reading, CheckingBesideTheLoading };
  for (const auto& [name, make, code] : files) {
    for (Way way : {Writing, Reading, CheckingBesideTheLoading}) {
      const bool readOnly = way == Reading;
      SCOPED_TRACE(std::string(name) + " " + std::to_string(way));
      removeFiles();
      make(path());
      const QList<QByteArray> before = allBytes();
      ASSERT_FALSE(before[0].isEmpty());
      auto store = readOnly         ? WTStore::openReadOnly(path())
                   : way == Writing ? WTStore::open(path())
                                    : WTStore::open(path(), nullptr, WTStore::Check::WholeFileBeforeSaving);
      if (store && way == CheckingBesideTheLoading) {
        // Damage that loading does not meet is found by the check, at the latest by the first save.
        const Result<void> saved = store.value()->save({record("x@WTNote", "WTNote")}, {});
        ASSERT_FALSE(saved.ok());
        EXPECT_EQ(saved.error().code, code);
        store.value().reset();
      } else {
        ASSERT_FALSE(store.ok());
        EXPECT_EQ(store.error().code, code);
        EXPECT_EQ(store.error().message, QString::fromUtf8(messages.at(code)).arg(path()));
      }
      QList<QByteArray> after = allBytes();
      if (readOnly) after.back() = before.back();  // a reader may leave the log's index behind
      EXPECT_EQ(after, before);
    }
  }
}

// Whatever write or sync fails, a failed first open or save leaves nothing of itself and a usable store.
TEST_F(WTStoreTest, AFailedFirstOpenOrSaveLeavesNothingBehindAndTheStoreUsable) {
  const char* vfs = FaultInjectingVfs::name();
  ASSERT_TRUE(vfs);
  const Records committed = sampleRecords();
  Records changed = committed;
  std::vector<WTStoreRecord> writes;
  for (int i = 0; i < 200; ++i)
    writes.push_back(record(QStringLiteral("new-%1@WTTime").arg(i), "WTTime", {},
                            QStringLiteral("entry %1 ").arg(i).repeated(10)));
  writes.push_back(committed.at("T1@WTTask"));
  writes.back().name = QStringLiteral("Renamed");
  for (const WTStoreRecord& r : writes) changed[r.uuid] = r;
  const QStringList deletes = {"I1@WTTime", "C1@WTClient"};
  for (const QString& uuid : deletes) changed.erase(uuid);
  const WTStoreRecord probe = record("probe@WTNote", "WTNote");
  using Operation = FaultInjectingVfs::Operation;
  for (bool opening : {true, false}) {
    const Records before = opening ? Records{} : committed;
    Records withProbe = before;
    withProbe[probe.uuid] = probe;
    // clang-format off
    for (const auto& [operation, persistent] :
         {std::pair{Operation::Write, false}, {Operation::Write, true}, {Operation::Sync, false}, {Operation::Sync, true}}) {
      // clang-format on
      SCOPED_TRACE(testing::Message() << (opening ? "open" : "save") << ", sync "
                                      << (operation == Operation::Sync) << ", persistent " << persistent);
      int failures = 0;
      for (int n = 1;; ++n) {
        SCOPED_TRACE(n);
        ASSERT_LT(n, 500) << "never got through";
        removeFiles();
        std::unique_ptr<WTStore> store;
        if (!opening) {
          makeStore(committed);
          ASSERT_TRUE(store = open(vfs));
        }
        FaultInjectingVfs::state = {true, operation, n, persistent, false};
        std::optional<Error> error;
        if (opening) {
          auto opened = WTStore::open(path(), vfs);
          opened ? void(store = std::move(opened.value())) : void(error = opened.error());
        } else if (const Result<void> saved = store->save(writes, deletes); !saved) {
          error = saved.error();
        }
        const bool fired = FaultInjectingVfs::state.fired;
        FaultInjectingVfs::state = {};
        if (!error) {
          EXPECT_FALSE(fired);
          store.reset();
          ASSERT_TRUE(store = open());
          expectSameRecords(loadAll(*store), opening ? before : changed);
          break;
        }
        ++failures;
        ASSERT_TRUE(fired) << error->message.toStdString();
        EXPECT_TRUE(error->message.contains(path()));
        if (store) {  // the same store object sees none of the save and saves again
          EXPECT_EQ(error->code, WTStore::WriteFailed);
        } else {
          ASSERT_TRUE(store = open());
        }
        expectSameRecords(loadAll(*store), before);
        ASSERT_TRUE(store->save({probe}, {}).ok());
        store.reset();
        EXPECT_EQ(RawDatabase(path()).text("PRAGMA integrity_check"), "ok");
        ASSERT_TRUE(store = open());
        expectSameRecords(loadAll(*store), withProbe);
      }
      EXPECT_GT(failures, 0);  // the loop must have met the I/O at least once
    }
  }
}

// Save k adds its items, deletes the extra item of save k - 1, adds its own and sets the counter to k; its
// journal rows (written in the same transaction) name save k for each record and the deletion.
constexpr int kRecordsPerSave = 10;
const QString kCounter = QStringLiteral("counter@WTTask");

QString itemUuid(int save, int index) {
  return index < kRecordsPerSave ? QStringLiteral("s%1-%2@WTNote").arg(save).arg(index)
                                 : QStringLiteral("extra-%1@WTNote").arg(save);
}

std::vector<WTStoreRecord> recordsOfSave(int save) {
  std::vector<WTStoreRecord> records;
  for (int i = 0; i <= kRecordsPerSave; ++i)
    records.push_back(record(itemUuid(save, i), "WTNote", kCounter,
                             QStringLiteral("Save %1, item %2. ").arg(save).arg(i).repeated(3)));
  records.push_back(record(kCounter, "WTTask"));
  records.back().position = save;
  return records;
}

TEST_F(WTStoreTest, AKilledSaverLosesNoSaveItReported) {
  const std::vector<WTStoreRecord> initial = recordsOfSave(0);  // the counter and the first extra item
  makeStore(Records{{initial[kRecordsPerSave].uuid, initial[kRecordsPerSave]}, {kCounter, initial.back()}});
  const unsigned seed = std::random_device()();
  SCOPED_TRACE(testing::Message() << "seed " << seed);
  std::mt19937 random(seed);
  // The kill comes after 0 to 3 reported saves, then 0 to 20 ms into what follows (the open, a save, the
  // next): counted in saves rather than in time alone, so a slow machine (sanitizers, a loaded builder)
  // gets as far as a fast one.
  std::uniform_int_distribution<int> savesFirst(0, 3), delayMs(0, 20);
  constexpr int kRounds = 50;
  int committed = 0;  // the last save found in the file
  for (int round = 0; round < kRounds; ++round) {
    SCOPED_TRACE(testing::Message() << "round " << round);
    int fds[2];
    ASSERT_EQ(pipe(fds), 0);
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {  // saves until killed, reporting each completed save's number
      close(fds[0]);
      auto store = WTStore::open(path());
      if (!store) _exit(2);
      for (int save = committed + 1;; ++save) {
        const std::vector<WTStoreRecord> records = recordsOfSave(save);
        const QString gone = itemUuid(save - 1, kRecordsPerSave);
        auto next = records.begin();
        const auto journal = [&](WTStore::JournalWriter& rows) -> Result<void> {
          for (const WTStoreRecord& record : records)
            if (Result<void> written = rows.setEntry(record.uuid, 'u', QByteArray::number(save)); !written)
              return written;
          return rows.setDeletion(gone, save);
        };
        if (!store.value()->saveFrom([&] { return next == records.end() ? nullptr : &*next++; }, {gone},
                                     journal))
          _exit(3);
        if (write(fds[1], &save, sizeof save) != sizeof save) _exit(4);
      }
    }
    close(fds[1]);
    int reported = committed, save = 0;
    for (int wanted = savesFirst(random); wanted > 0; --wanted)
      if (read(fds[0], &save, sizeof save) == sizeof save) reported = save;
    std::this_thread::sleep_for(std::chrono::milliseconds(delayMs(random)));
    kill(child, SIGKILL);
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    ASSERT_TRUE(WIFSIGNALED(status)) << "the saver stopped by itself with status " << WEXITSTATUS(status);
    while (read(fds[0], &save, sizeof save) == sizeof save) reported = save;
    close(fds[0]);

    Records records;
    std::map<QString, QByteArray> entries;
    std::vector<std::pair<QString, qint64>> deletions;
    if (auto store = open()) {
      records = loadAll(*store);
      ASSERT_TRUE(
          store
              ->readJournal(
                  [&](const QString& uuid, char, const QByteArray& changes) { entries[uuid] = changes; },
                  [&](const QString& uuid, qint64 order) { deletions.emplace_back(uuid, order); }, nullptr)
              .ok());
    }
    ASSERT_EQ(RawDatabase(path()).text("PRAGMA integrity_check"), "ok");
    ASSERT_TRUE(records.contains(kCounter));
    const int last = records.at(kCounter).position;
    ASSERT_GE(last, reported);
    ASSERT_LE(last, reported + 1);
    ASSERT_EQ(records.size(), std::size_t(last) * kRecordsPerSave + 2);
    for (int k = 1; k <= last; ++k)
      for (int i = 0; i < kRecordsPerSave; ++i)
        ASSERT_TRUE(records.contains(itemUuid(k, i))) << k << "/" << i;
    ASSERT_TRUE(records.contains(itemUuid(last, kRecordsPerSave)));
    // Every save found is journaled, and none that is not.
    ASSERT_EQ(entries.size(), last == 0 ? 0 : std::size_t(last) * (kRecordsPerSave + 1) + 1);
    ASSERT_EQ(deletions.size(), std::size_t(last));
    if (last > 0) {
      ASSERT_EQ(entries[kCounter], QByteArray::number(last));
      ASSERT_EQ(deletions.back(), std::pair(itemUuid(last - 1, kRecordsPerSave), qint64(last)));
    }
    committed = last;
  }
  EXPECT_GT(committed, kRounds / 2);  // the saver got through many saves, not just its open
}

}  // namespace
