#include "FaultInjectingVfs.h"
#include "WTStore.h"

#include <gtest/gtest.h>

#include <QSet>
#include <sqlite3.h>

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QTemporaryDir>

#include <functional>
#include <map>
#include <memory>
#include <random>

namespace {

using Records = std::map<QString, WTStoreRecord>;

std::optional<Decimal> decimal(const char16_t* text) {
  auto value = Decimal::fromString(QStringView(text));
  EXPECT_TRUE(value) << QString::fromUtf16(text).toStdString();
  return value;
}

// Compares whole records, decimals by representation (12.30 is not 12.3).
void expectSameRecords(const Records& actual, const Records& expected) {
  ASSERT_EQ(actual.size(), expected.size());
  for (const auto& [uuid, record] : expected) {
    const auto found = actual.find(uuid);
    ASSERT_NE(found, actual.end()) << uuid.toStdString();
    const WTStoreRecord& got = found->second;
    EXPECT_TRUE(got == record) << uuid.toStdString();
    for (auto field : {&WTStoreRecord::rate, &WTStoreRecord::budget, &WTStoreRecord::expense}) {
      ASSERT_EQ((got.*field).has_value(), (record.*field).has_value()) << uuid.toStdString();
      if (record.*field) {
        EXPECT_TRUE((got.*field)->isIdenticalTo(*(record.*field)))
            << uuid.toStdString() << ": " << (got.*field)->toString().toStdString() << " vs "
            << (record.*field)->toString().toStdString();
      }
    }
    for (auto field :
         {&WTStoreRecord::name, &WTStoreRecord::notes, &WTStoreRecord::color, &WTStoreRecord::addressBookUID,
          &WTStoreRecord::clientUuid, &WTStoreRecord::taskUuid}) {
      EXPECT_EQ((got.*field).isNull(), (record.*field).isNull()) << uuid.toStdString();
    }
  }
}

WTStoreRecord record(const QString& uuid, const QString& entity) {
  WTStoreRecord r;
  r.uuid = uuid;
  r.entity = entity;
  return r;
}

// One record of every entity, every field used somewhere, with the awkward values a store must keep.
Records sampleRecords() {
  Records records;
  auto add = [&](WTStoreRecord r) { records[r.uuid] = std::move(r); };

  WTStoreRecord client = record(QStringLiteral("C1@WTClient"), QStringLiteral("WTClient"));
  client.name = QStringLiteral("Müller & Söhne ☕ 日本");
  client.notes = QStringLiteral("line one\nline two\ttab, \"quoted\"");
  client.rate = decimal(u"85.50");
  client.color = QStringLiteral("#80ff0000");
  client.archived = true;
  client.addressBookUID = QStringLiteral("AB-1:ABPerson");
  client.totalsUID = QString(QLatin1StringView(""));  // empty, not none
  add(client);

  WTStoreRecord project = record(QStringLiteral("P1@WTProject"), QStringLiteral("WTProject"));
  project.name = QString(QLatin1StringView(""));
  project.clientUuid = client.uuid;
  project.rate = decimal(u"1E+3");  // a positive exponent: 1000 with exponent 3
  add(project);

  WTStoreRecord task = record(QStringLiteral("T1@WTTask"), QStringLiteral("WTTask"));
  task.name = QStringLiteral("Design");
  task.projectUuid = project.uuid;
  task.position = 3;
  task.budget = decimal(u"12345678901234567890123456789012345678");  // 38 digits
  task.rate = decimal(u"0.00");
  add(task);

  WTStoreRecord time = record(QStringLiteral("I1@WTTime"), QStringLiteral("WTTime"));
  time.name = QString::fromUtf16(u"nul \0 inside", 12);
  time.taskUuid = task.uuid;
  time.startDate = Date::fromSeconds(1767261600.25);
  time.endDate = Date::fromSeconds(1767265200.75);
  time.running = true;
  add(time);

  WTStoreRecord flat = record(QStringLiteral("I2@WTFlat"), QStringLiteral("WTFlat"));
  flat.taskUuid = task.uuid;
  flat.startDate = Date::fromSeconds(-86400.5);  // before 1970
  flat.minutes = 0;                              // zero, not none
  add(flat);

  WTStoreRecord expense = record(QStringLiteral("I3@WTExpense"), QStringLiteral("WTExpense"));
  expense.taskUuid = task.uuid;
  expense.startDate = Date::fromSeconds(0);
  expense.expense = decimal(u"-12.30");
  expense.rate = decimal(u"0.0000000000000000000001");
  add(expense);

  WTStoreRecord note = record(QStringLiteral("I4@WTNote"), QStringLiteral("WTNote"));
  note.notes = QString(20000, QChar(u'é'));
  note.taskUuid = task.uuid;
  add(note);

  WTStoreRecord toDo = record(QStringLiteral("I5@WTToDo"), QStringLiteral("WTToDo"));
  toDo.name = QStringLiteral("Call back");
  toDo.completed = true;
  toDo.position = -1;
  toDo.minutes = 9007199254740993LL;  // beyond a double's exact integers
  add(toDo);

  // A record of an entity this version does not know is kept as it is.
  add(record(QStringLiteral("X1@WTFuture"), QStringLiteral("WTFuture")));
  return records;
}

std::vector<WTStoreRecord> values(const Records& records) {
  std::vector<WTStoreRecord> list;
  for (const auto& entry : records) list.push_back(entry.second);
  return list;
}

Records loadAll(WTStore& store) {
  Records records;
  const Result<void> loaded = store.loadAll([&](WTStoreRecord&& r) {
    const QString uuid = r.uuid;
    records[uuid] = std::move(r);
  });
  EXPECT_TRUE(loaded.ok()) << loaded.error().message.toStdString();
  return records;
}

QByteArray fileBytes(const QString& path) {
  QFile file(path);
  return file.open(QIODevice::ReadOnly) ? file.readAll() : QByteArray();
}

// Plain sqlite3 on a file, as another program would see it.
class RawDatabase {
 public:
  explicit RawDatabase(const QString& path) {
    EXPECT_EQ(sqlite3_open(QFile::encodeName(path).constData(), &db_), SQLITE_OK);
  }
  ~RawDatabase() { sqlite3_close(db_); }
  void exec(const char* sql) {
    char* message = nullptr;
    EXPECT_EQ(sqlite3_exec(db_, sql, nullptr, nullptr, &message), SQLITE_OK)
        << (message ? message : "") << sql;
    sqlite3_free(message);
  }
  QString text(const char* sql) {
    sqlite3_stmt* statement = nullptr;
    QString result;
    EXPECT_EQ(sqlite3_prepare_v2(db_, sql, -1, &statement, nullptr), SQLITE_OK) << sql;
    if (sqlite3_step(statement) == SQLITE_ROW)
      result = QString::fromUtf8(reinterpret_cast<const char*>(sqlite3_column_text(statement, 0)));
    sqlite3_finalize(statement);
    return result;
  }
  sqlite3* handle() const { return db_; }

 private:
  sqlite3* db_ = nullptr;
};

class WTStoreTest : public ::testing::Test {
 protected:
  QString path() const { return dir.filePath(QStringLiteral("Tessal.sqlite")); }

  std::unique_ptr<WTStore> open(const char* vfs = nullptr) {
    auto store = WTStore::open(path(), vfs);
    EXPECT_TRUE(store.ok()) << store.error().message.toStdString();
    return store.ok() ? std::move(store.value()) : nullptr;
  }

  // A store file holding `records`, closed again.
  void makeStore(const Records& records) {
    auto store = open();
    ASSERT_TRUE(store);
    const Result<void> saved = store->save(values(records), {});
    ASSERT_TRUE(saved.ok()) << saved.error().message.toStdString();
  }

  bool sideFilesExist() const {
    return QFileInfo::exists(path() + QStringLiteral("-wal")) ||
           QFileInfo::exists(path() + QStringLiteral("-shm")) ||
           QFileInfo::exists(path() + QStringLiteral("-journal"));
  }

  QTemporaryDir dir;
};

TEST_F(WTStoreTest, EveryFieldSurvivesTheFileExactly) {
  const Records records = sampleRecords();
  makeStore(records);
  auto store = open();
  ASSERT_TRUE(store);
  expectSameRecords(loadAll(*store), records);
}

TEST_F(WTStoreTest, ANewFileIsACurrentStoreInWalMode) {
  ASSERT_TRUE(open());
  EXPECT_FALSE(sideFilesExist());  // closing folds the log back into the file
  RawDatabase raw(path());
  EXPECT_EQ(raw.text("PRAGMA user_version"), QStringLiteral("3"));
  EXPECT_EQ(raw.text("PRAGMA journal_mode"), QStringLiteral("wal"));
  EXPECT_EQ(raw.text("SELECT count(*) FROM records"), QStringLiteral("0"));
}

TEST_F(WTStoreTest, AMissingFolderIsNotCreated) {
  const QString folder = dir.filePath(QStringLiteral("Tessal2"));
  const QString file = folder + QStringLiteral("/Tessal.sqlite");
  auto store = WTStore::open(file);
  ASSERT_FALSE(store.ok());
  EXPECT_EQ(store.error().code, WTStore::OpenFailed);
  EXPECT_TRUE(store.error().message.contains(file)) << store.error().message.toStdString();
  EXPECT_FALSE(QFileInfo::exists(folder));
}

TEST_F(WTStoreTest, SavingReplacesWholeRecordsAndDeletes) {
  Records records = sampleRecords();
  makeStore(records);
  auto store = open();
  ASSERT_TRUE(store);

  // Cleared fields must come back as none, not as their old values.
  WTStoreRecord cleared = record(QStringLiteral("C1@WTClient"), QStringLiteral("WTClient"));
  cleared.name = QStringLiteral("Renamed");
  WTStoreRecord added = record(QStringLiteral("I9@WTNote"), QStringLiteral("WTNote"));
  added.taskUuid = QStringLiteral("T1@WTTask");
  ASSERT_TRUE(
      store->save({cleared, added}, {QStringLiteral("I3@WTExpense"), QStringLiteral("never@WTTime")}).ok());
  records[cleared.uuid] = cleared;
  records[added.uuid] = added;
  records.erase(QStringLiteral("I3@WTExpense"));
  expectSameRecords(loadAll(*store), records);

  store.reset();
  store = open();
  ASSERT_TRUE(store);
  expectSameRecords(loadAll(*store), records);
  EXPECT_TRUE(store->save({}, {}).ok());
}

TEST_F(WTStoreTest, ASaveThatFailsHalfwayWritesNothing) {
  const Records records = sampleRecords();
  makeStore(records);
  auto store = open();
  ASSERT_TRUE(store);
  const WTStoreRecord good = record(QStringLiteral("good@WTNote"), QStringLiteral("WTNote"));
  const WTStoreRecord nameless = record(QString(), QStringLiteral("WTNote"));  // a row needs its identity
  const Result<void> saved = store->save({good, nameless}, {QStringLiteral("I1@WTTime")});
  ASSERT_FALSE(saved.ok());
  EXPECT_EQ(saved.error().code, WTStore::WriteFailed);
  EXPECT_TRUE(saved.error().message.contains(path())) << saved.error().message.toStdString();
  expectSameRecords(loadAll(*store), records);

  ASSERT_TRUE(store->save({good}, {}).ok());
  store.reset();
  store = open();
  ASSERT_TRUE(store);
  Records expected = records;
  expected[good.uuid] = good;
  expectSameRecords(loadAll(*store), expected);
}

TEST_F(WTStoreTest, AVersionOneFileWrittenBySqlReadsBack) {
  {
    // Version 1 as it was first written; later versions must keep reading such files.
    RawDatabase raw(path());
    raw.exec(
        "CREATE TABLE records (uuid TEXT PRIMARY KEY NOT NULL, entity TEXT NOT NULL, name TEXT, notes TEXT,"
        " rate TEXT, color TEXT, archived INTEGER NOT NULL DEFAULT 0, addressBookUID TEXT, totalsUID TEXT,"
        " clientUuid TEXT, projectUuid TEXT, position INTEGER NOT NULL DEFAULT 0, budget TEXT, taskUuid TEXT,"
        " startDate REAL, endDate REAL, running INTEGER NOT NULL DEFAULT 0, minutes INTEGER, expense TEXT,"
        " completed INTEGER NOT NULL DEFAULT 0);"
        "PRAGMA application_id = 1416852332;"
        "PRAGMA user_version = 1;"
        "INSERT INTO records (uuid, entity, name, rate, archived, color) VALUES"
        " ('C@WTClient', 'WTClient', 'Acme', '80.00', 1, '#ff112233');"
        "INSERT INTO records (uuid, entity, name, projectUuid, position, budget) VALUES"
        " ('T@WTTask', 'WTTask', '', 'P@WTProject', 2, '5E+2');"
        "INSERT INTO records (uuid, entity, taskUuid, startDate, endDate, running, notes) VALUES"
        " ('I@WTTime', 'WTTime', 'T@WTTask', 1700000000.5, 1700003600, 0, 'x');"
        "INSERT INTO records (uuid, entity, taskUuid, startDate, minutes, expense, completed) VALUES"
        " ('F@WTFlat', 'WTFlat', 'T@WTTask', 1700000000, 90, '-0.10', 1);");
  }
  Records expected;
  WTStoreRecord client = record(QStringLiteral("C@WTClient"), QStringLiteral("WTClient"));
  client.name = QStringLiteral("Acme");
  client.rate = decimal(u"80.00");
  client.archived = true;
  client.color = QStringLiteral("#ff112233");
  expected[client.uuid] = client;
  WTStoreRecord task = record(QStringLiteral("T@WTTask"), QStringLiteral("WTTask"));
  task.name = QString(QLatin1StringView(""));
  task.projectUuid = QStringLiteral("P@WTProject");
  task.position = 2;
  task.budget = decimal(u"5E+2");
  expected[task.uuid] = task;
  WTStoreRecord time = record(QStringLiteral("I@WTTime"), QStringLiteral("WTTime"));
  time.taskUuid = task.uuid;
  time.startDate = Date::fromSeconds(1700000000.5);
  time.endDate = Date::fromSeconds(1700003600);
  time.notes = QStringLiteral("x");
  expected[time.uuid] = time;
  WTStoreRecord flat = record(QStringLiteral("F@WTFlat"), QStringLiteral("WTFlat"));
  flat.taskUuid = task.uuid;
  flat.startDate = Date::fromSeconds(1700000000);
  flat.minutes = 90;
  flat.expense = decimal(u"-0.10");
  flat.completed = true;
  expected[flat.uuid] = flat;

  // A reader that may not migrate reads it as it is, and leaves it so.
  const QByteArray before = fileBytes(path());
  {
    auto reader = WTStore::openReadOnly(path());
    ASSERT_TRUE(reader) << reader.error().message.toStdString();
    expectSameRecords(loadAll(*reader.value()), expected);
  }
  EXPECT_EQ(fileBytes(path()), before);

  auto store = open();
  ASSERT_TRUE(store);
  expectSameRecords(loadAll(*store), expected);
  ASSERT_TRUE(store->save({record(QStringLiteral("N@WTNote"), QStringLiteral("WTNote"))}, {}).ok());
  store.reset();
  RawDatabase raw(path());
  EXPECT_EQ(raw.text("PRAGMA journal_mode"), QStringLiteral("wal"));
  EXPECT_EQ(raw.text("PRAGMA user_version"), QStringLiteral("3"));
  EXPECT_EQ(raw.text("SELECT count(*) FROM records"), QStringLiteral("5"));
  EXPECT_EQ(raw.text("SELECT count(*) FROM sqlite_schema WHERE type = 'index' AND name LIKE 'records_%'"),
            QStringLiteral("3"));
}

TEST_F(WTStoreTest, TimersReadTheOwnersAndTheRunningEntriesOnly) {
  Records records = sampleRecords();
  WTStoreRecord running = record(QStringLiteral("R@WTTime"), QStringLiteral("WTTime"));
  running.taskUuid = QStringLiteral("T1@WTTask");
  running.startDate = Date::fromSeconds(1700000000);
  running.running = true;
  records[running.uuid] = running;
  makeStore(records);
  Records expected;
  for (const auto& [uuid, stored] : records) {
    if (stored.entity == QLatin1String("WTClient") || stored.entity == QLatin1String("WTProject") ||
        stored.entity == QLatin1String("WTTask") || stored.running)
      expected[uuid] = stored;
  }
  ASSERT_GT(expected.size(), 1u);
  ASSERT_LT(expected.size(), records.size());
  auto store = open();
  ASSERT_TRUE(store);
  Records loaded;
  ASSERT_TRUE(store->loadAll([&](WTStoreRecord&& r) { loaded[r.uuid] = r; }, WTStore::Records::Timers).ok());
  expectSameRecords(loaded, expected);
}

TEST_F(WTStoreTest, ItemsOfTasksReadTheOwnersAndThoseTasksItemsOnly) {
  Records records = sampleRecords();
  // Tasks whose uuids hold what JSON must escape still find their items.
  for (const QString& task : {QStringLiteral("T\"quoted\\@WTTask"), QStringLiteral("T9@WTTask")}) {
    WTStoreRecord owner = record(task, QStringLiteral("WTTask"));
    records[task] = owner;
    WTStoreRecord item = record(task + QStringLiteral("-item@WTNote"), QStringLiteral("WTNote"));
    item.taskUuid = task;
    records[item.uuid] = item;
  }
  makeStore(records);
  QSet<QString> tasks;
  for (const auto& [uuid, stored] : records) {
    if (stored.entity == QLatin1String("WTTask") && uuid != QLatin1String("T9@WTTask")) tasks.insert(uuid);
  }
  auto store = open();
  ASSERT_TRUE(store);
  for (const QStringList& chosen : {QStringList(tasks.begin(), tasks.end()), QStringList()}) {
    Records expected;
    for (const auto& [uuid, stored] : records) {
      const bool owner = stored.entity == QLatin1String("WTClient") || stored.entity == QLatin1String("WTProject") ||
                         stored.entity == QLatin1String("WTTask");
      if (owner || chosen.contains(stored.taskUuid)) expected[uuid] = stored;
    }
    Records loaded;
    ASSERT_TRUE(store->loadAll([&](WTStoreRecord&& r) { loaded[r.uuid] = r; }, WTStore::Records::ItemsOfTasks, chosen).ok());
    expectSameRecords(loaded, expected);
    // The statement is used again: the next load's tasks replace this one's.
  }
  Records items;
  ASSERT_TRUE(store->loadAll([&](WTStoreRecord&& r) { items[r.uuid] = r; }, WTStore::Records::ItemsOfTasks,
                             {QStringLiteral("T\"quoted\\@WTTask")}).ok());
  EXPECT_EQ(items.count(QStringLiteral("T\"quoted\\@WTTask-item@WTNote")), 1u);
  EXPECT_EQ(items.count(QStringLiteral("T9@WTTask-item@WTNote")), 0u);
}

TEST_F(WTStoreTest, AnEmptyFileBecomesAStore) {
  QFile file(path());
  ASSERT_TRUE(file.open(QIODevice::WriteOnly));
  file.close();
  auto store = open();
  ASSERT_TRUE(store);
  EXPECT_TRUE(loadAll(*store).empty());
  EXPECT_TRUE(store->save(values(sampleRecords()), {}).ok());
}

// Files that must be refused, and left exactly as they were.
struct RefusedFile {
  const char* name;
  std::function<void(WTStoreTest&, const QString& path)> make;
  int code;
  const char* message;  // %1 is the path
};

void writeFile(const QString& path, const QByteArray& bytes) {
  QFile file(path);
  ASSERT_TRUE(file.open(QIODevice::WriteOnly | QIODevice::Truncate));
  file.write(bytes);
}

// A real store with enough rows for several levels of pages.
void makeLargeStore(WTStoreTest& test, const QString& path) {
  std::vector<WTStoreRecord> records;
  for (int i = 0; i < 3000; ++i) {
    WTStoreRecord r = record(QStringLiteral("item-%1@WTNote").arg(i), QStringLiteral("WTNote"));
    r.name = QStringLiteral("A note of some length, number %1").arg(i);
    records.push_back(r);
  }
  auto store = WTStore::open(path);
  ASSERT_TRUE(store.ok());
  ASSERT_TRUE(store.value()->save(records, {}).ok());
  (void)test;
}

void newerVersion(const QString& path, bool wal) {
  RawDatabase raw(path);
  if (wal) raw.exec("PRAGMA journal_mode = WAL");
  raw.exec(
      "CREATE TABLE records (uuid TEXT PRIMARY KEY, entity TEXT, colour BLOB);"
      "CREATE TABLE later (x);"
      "INSERT INTO records VALUES ('a@WTClient', 'WTClient', x'00ff');"
      "PRAGMA application_id = 1416852332;"
      "PRAGMA user_version = 99;");
}

const RefusedFile kRefusedFiles[] = {
    {"a text file",
     [](WTStoreTest&, const QString& path) {
       writeFile(path, QByteArray("Not a database at all.\n").repeated(300));
     },
     WTStore::NotAStore, "The file “%1” is not a Tessal data file and cannot be opened."},
    {"another program's database",
     [](WTStoreTest&, const QString& path) { RawDatabase(path).exec("CREATE TABLE songs (title TEXT)"); },
     WTStore::NotAStore, "The file “%1” is not a Tessal data file and cannot be opened."},
    {"another program's database with a version",
     [](WTStoreTest&, const QString& path) {
       RawDatabase(path).exec("CREATE TABLE records (uuid TEXT); PRAGMA user_version = 1;");
     },
     WTStore::NotAStore, "The file “%1” is not a Tessal data file and cannot be opened."},
    {"a newer version", [](WTStoreTest&, const QString& path) { newerVersion(path, false); },
     WTStore::NewerVersion,
     "The data file “%1” was written by a newer version of Tessal and cannot be opened."},
    {"a newer version in WAL mode", [](WTStoreTest&, const QString& path) { newerVersion(path, true); },
     WTStore::NewerVersion,
     "The data file “%1” was written by a newer version of Tessal and cannot be opened."},
    {"a truncated store",
     [](WTStoreTest& test, const QString& path) {
       makeLargeStore(test, path);
       writeFile(path, fileBytes(path).left(fileBytes(path).size() / 2));
     },
     WTStore::Damaged, "The data file “%1” is damaged and cannot be opened."},
    {"a store with garbled pages",
     [](WTStoreTest& test, const QString& path) {
       makeLargeStore(test, path);
       QByteArray bytes = fileBytes(path);
       std::mt19937 random(7);
       // Every page but the first (the header and schema) gets noise in its middle.
       for (qsizetype page = 4096; page < bytes.size(); page += 4096) {
         for (int i = 1000; i < 1200; ++i) bytes[page + i] = char(random());
       }
       writeFile(path, bytes);
     },
     WTStore::Damaged, "The data file “%1” is damaged and cannot be opened."},
    {"a store whose last page is garbled",
     [](WTStoreTest& test, const QString& path) {
       makeLargeStore(test, path);
       QByteArray bytes = fileBytes(path);
       for (qsizetype i = bytes.size() - 4096; i < bytes.size(); ++i) bytes[i] = char(0x5a);
       writeFile(path, bytes);
     },
     WTStore::Damaged, "The data file “%1” is damaged and cannot be opened."},
};

TEST_F(WTStoreTest, RefusedFilesAreLeftAsTheyWere) {
  for (const RefusedFile& refused : kRefusedFiles) {
    SCOPED_TRACE(refused.name);
    QFile::remove(path());
    refused.make(*this, path());
    ASSERT_FALSE(sideFilesExist());
    const QByteArray before = fileBytes(path());
    ASSERT_FALSE(before.isEmpty());

    auto store = WTStore::open(path());
    ASSERT_FALSE(store.ok());
    EXPECT_EQ(store.error().code, refused.code);
    EXPECT_EQ(store.error().message, QString::fromUtf8(refused.message).arg(path()));
    EXPECT_EQ(fileBytes(path()), before);
    EXPECT_FALSE(sideFilesExist());
  }
}

TEST_F(WTStoreTest, ANewerVersionOnlyItsLogKnowsAboutIsRefusedWithTheLogKept) {
  {
    RawDatabase raw(path());
    raw.exec(
        "CREATE TABLE records (uuid TEXT PRIMARY KEY); PRAGMA application_id = 1416852332;"
        "PRAGMA user_version = 1; PRAGMA journal_mode = WAL;");
    // The newer version's changes are still in the log when it stops.
    raw.exec("PRAGMA user_version = 99; INSERT INTO records VALUES ('a@WTClient')");
    ASSERT_EQ(sqlite3_db_config(raw.handle(), SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, 1, nullptr), SQLITE_OK);
  }
  const QString log = path() + QStringLiteral("-wal");
  const QByteArray fileBefore = fileBytes(path());
  const QByteArray logBefore = fileBytes(log);
  ASSERT_FALSE(logBefore.isEmpty());

  auto store = WTStore::open(path());
  ASSERT_FALSE(store.ok());
  EXPECT_EQ(store.error().code, WTStore::NewerVersion);
  EXPECT_EQ(fileBytes(path()), fileBefore);
  EXPECT_EQ(fileBytes(log), logBefore);
}

TEST_F(WTStoreTest, AnAmountThatIsNotANumberFailsTheLoad) {
  makeStore(sampleRecords());
  RawDatabase(path()).exec("UPDATE records SET budget = '12,50' WHERE uuid = 'T1@WTTask'");
  auto store = open();
  ASSERT_TRUE(store);
  const Result<void> loaded = store->loadAll([](WTStoreRecord&&) {});
  ASSERT_FALSE(loaded.ok());
  EXPECT_EQ(loaded.error().code, WTStore::ReadFailed);
  EXPECT_TRUE(loaded.error().message.contains(path()));
}

// ---- Fault loops: fail the N-th write or sync, raise N until the operation gets through.

struct FaultKind {
  FaultInjectingVfs::Operation operation;
  bool persistent;
  const char* name;
};
const FaultKind kFaultKinds[] = {
    {FaultInjectingVfs::Operation::Write, false, "one failed write"},
    {FaultInjectingVfs::Operation::Write, true, "every write from the N-th on"},
    {FaultInjectingVfs::Operation::Sync, false, "one failed sync"},
    {FaultInjectingVfs::Operation::Sync, true, "every sync from the N-th on"},
};

void expectIntact(const QString& path) {
  RawDatabase raw(path);
  EXPECT_EQ(raw.text("PRAGMA integrity_check"), QStringLiteral("ok"));
}

TEST_F(WTStoreTest, AFailedSaveLeavesNothingBehindAndTheStoreUsable) {
  const char* vfs = FaultInjectingVfs::name();
  ASSERT_TRUE(vfs);
  const Records committed = sampleRecords();

  // The save under test changes, adds and deletes; enough rows to span several pages.
  Records changed = committed;
  std::vector<WTStoreRecord> writes;
  for (int i = 0; i < 200; ++i) {
    WTStoreRecord r = record(QStringLiteral("new-%1@WTTime").arg(i), QStringLiteral("WTTime"));
    r.name = QStringLiteral("entry %1 ").arg(i).repeated(10);
    r.startDate = Date::fromSeconds(i);
    writes.push_back(r);
  }
  WTStoreRecord renamed = committed.at(QStringLiteral("T1@WTTask"));
  renamed.name = QStringLiteral("Renamed");
  writes.push_back(renamed);
  for (const WTStoreRecord& r : writes) changed[r.uuid] = r;
  const QStringList deletes = {QStringLiteral("I1@WTTime"), QStringLiteral("C1@WTClient")};
  for (const QString& uuid : deletes) changed.erase(uuid);

  const WTStoreRecord probe = record(QStringLiteral("probe@WTNote"), QStringLiteral("WTNote"));

  for (const FaultKind& kind : kFaultKinds) {
    SCOPED_TRACE(kind.name);
    int failures = 0;
    for (int n = 1;; ++n) {
      SCOPED_TRACE(n);
      ASSERT_LT(n, 500) << "the save never got through";
      for (const char* suffix : {"", "-wal", "-shm"}) QFile::remove(path() + QLatin1StringView(suffix));
      makeStore(committed);

      auto store = open(vfs);
      ASSERT_TRUE(store);
      FaultInjectingVfs::arm(kind.operation, n, kind.persistent);
      const Result<void> saved = store->save(writes, deletes);
      const bool fired = FaultInjectingVfs::fired();
      FaultInjectingVfs::disarm();
      if (saved) {
        EXPECT_FALSE(fired);
        store.reset();
        store = open();
        ASSERT_TRUE(store);
        expectSameRecords(loadAll(*store), changed);
        break;
      }
      ++failures;
      ASSERT_TRUE(fired) << saved.error().message.toStdString();
      EXPECT_EQ(saved.error().code, WTStore::WriteFailed);
      EXPECT_TRUE(saved.error().message.contains(path()));

      // The same store object sees none of it and can save again.
      expectSameRecords(loadAll(*store), committed);
      ASSERT_TRUE(store->save({probe}, {}).ok());
      Records withProbe = committed;
      withProbe[probe.uuid] = probe;
      expectSameRecords(loadAll(*store), withProbe);

      // So does the file, opened afresh.
      store.reset();
      expectIntact(path());
      store = open();
      ASSERT_TRUE(store);
      expectSameRecords(loadAll(*store), withProbe);
    }
    EXPECT_GT(failures, 0);  // the loop must have met the save's I/O at least once
    RecordProperty(std::string("failed saves, ") + kind.name, failures);
  }
}

TEST_F(WTStoreTest, AFailedFirstOpenLeavesAFileThatOpensLater) {
  const char* vfs = FaultInjectingVfs::name();
  ASSERT_TRUE(vfs);
  for (const FaultKind& kind : kFaultKinds) {
    SCOPED_TRACE(kind.name);
    int failures = 0;
    for (int n = 1;; ++n) {
      SCOPED_TRACE(n);
      ASSERT_LT(n, 200) << "opening never got through";
      for (const char* suffix : {"", "-wal", "-shm"}) QFile::remove(path() + QLatin1StringView(suffix));
      FaultInjectingVfs::arm(kind.operation, n, kind.persistent);
      auto store = WTStore::open(path(), vfs);
      const bool fired = FaultInjectingVfs::fired();
      FaultInjectingVfs::disarm();
      if (store) {
        EXPECT_FALSE(fired);
        break;
      }
      ++failures;
      ASSERT_TRUE(fired) << store.error().message.toStdString();
      EXPECT_TRUE(store.error().message.contains(path()));
      auto reopened = open();
      ASSERT_TRUE(reopened);
      EXPECT_TRUE(loadAll(*reopened).empty());
      ASSERT_TRUE(reopened->save(values(sampleRecords()), {}).ok());
      reopened.reset();
      expectIntact(path());
    }
    EXPECT_GT(failures, 0);
    RecordProperty(std::string("failed opens, ") + kind.name, failures);
  }
}

}  // namespace

// Commands that only read (reports, exports) open the store beside a running application that writes it.
TEST_F(WTStoreTest, AReaderSeesWhatAWriterSavedAndCannotChangeIt) {
  const Records records = sampleRecords();
  makeStore(records);
  auto writer = open();
  ASSERT_TRUE(writer);
  WTStoreRecord added = record(QStringLiteral("late@WTNote"), QStringLiteral("WTNote"));
  added.taskUuid = QStringLiteral("T1@WTTask");
  ASSERT_TRUE(writer->save({added}, {}).ok());  // still in the writer's log, not yet in the file

  auto reader = WTStore::openReadOnly(path());
  ASSERT_TRUE(reader) << reader.error().message.toStdString();
  Records expected = records;
  expected[added.uuid] = added;
  expectSameRecords(loadAll(*reader.value()), expected);

  const Result<void> refused = reader.value()->save({record(QStringLiteral("x@WTNote"), QStringLiteral("WTNote"))}, {});
  ASSERT_FALSE(refused.ok());
  EXPECT_EQ(refused.error().code, WTStore::WriteFailed);
  // The writer goes on saving while the reader is open.
  EXPECT_TRUE(writer->save({record(QStringLiteral("later@WTNote"), QStringLiteral("WTNote"))}, {}).ok());
}

TEST_F(WTStoreTest, ReadingNeverCreatesOrChangesAFile) {
  auto missing = WTStore::openReadOnly(path());
  ASSERT_FALSE(missing.ok());
  EXPECT_EQ(missing.error().code, WTStore::OpenFailed);
  EXPECT_TRUE(missing.error().message.contains(path()));
  EXPECT_FALSE(QFileInfo::exists(path()));

  // An empty file (made but never written) reads as a store without records and stays empty.
  writeFile(path(), QByteArray());
  auto empty = WTStore::openReadOnly(path());
  ASSERT_TRUE(empty) << empty.error().message.toStdString();
  EXPECT_TRUE(loadAll(*empty.value()).empty());
  EXPECT_FALSE(empty.value()->save({record(QStringLiteral("x@WTNote"), QStringLiteral("WTNote"))}, {}).ok());
  empty.value().reset();
  EXPECT_TRUE(fileBytes(path()).isEmpty());

  for (const RefusedFile& refused : kRefusedFiles) {
    SCOPED_TRACE(refused.name);
    QFile::remove(path());
    refused.make(*this, path());
    const QByteArray before = fileBytes(path());
    auto store = WTStore::openReadOnly(path());
    ASSERT_FALSE(store.ok());
    EXPECT_EQ(store.error().code, refused.code);
    EXPECT_EQ(fileBytes(path()), before);
  }
}
