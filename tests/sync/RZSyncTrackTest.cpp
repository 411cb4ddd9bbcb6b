#include "RZSyncTrack.h"

#include "Date.h"
#include "SyncTestSupport.h"
#include "TestFiles.h"
#include "WTClient.h"
#include "WTExpense.h"
#include "WTProject.h"
#include "WTTask.h"

#include <QColor>
#include <QFile>
#include <QUuid>

#include <sqlite3.h>

#include <sys/resource.h>
#include <csignal>

using synctest::compact;
using synctest::dec;
using Section = RZSyncTrack::Section;

namespace {

constexpr const char* kEmpty = R"({"i":{},"u":{},"x":[]})";

// A store file as the version before the journal moved into it wrote it.
void makeOlderStore(const QString& path) {
  ASSERT_TRUE(WTStore::open(path).ok());
  sqlite3* db = nullptr;
  ASSERT_EQ(sqlite3_open(QFile::encodeName(path).constData(), &db), SQLITE_OK);
  EXPECT_EQ(sqlite3_exec(db,
                         "DROP TABLE journal; DROP TABLE journal_deletions; DROP TABLE journal_state;"
                         "PRAGMA user_version = 5;",
                         nullptr, nullptr, nullptr),
            SQLITE_OK);
  sqlite3_close(db);
}

}  // namespace

// Each save writes the rows of what it journaled, and values read back exactly; a save that cannot be
// written leaves the rows, and the journal in memory, as they were.
TEST(RZSyncTrackStore, RowsFollowEachSaveAndAFailedSaveLeavesThemAsTheyWere) {
  QTemporaryDir dir;
  const QString path = dir.filePath("Tessal.sqlite");
  WTObjectContext context;
  ASSERT_TRUE(context.attachStore(std::move(WTStore::open(path).value())).ok());
  RZSyncTrack track(context.store(), RZSyncTrack::Loading::Whole);
  context.setChangeJournal(&track);
  auto* task = context.insertNewObject<WTTask>();
  task->setUuid("T@WTTask");
  task->setBudget(dec("12.30"));
  auto* client = context.insertNewObject<WTClient>();
  client->setUuid("C@WTClient");
  ASSERT_TRUE(context.save().ok());
  track.setIteration(12);
  track.updateValues({{"endDate", QVariant::fromValue(Date::fromSeconds(1700000000.75))}}, "E@WTTime");
  ASSERT_TRUE(track.write().ok());
  context.deleteObject(client);
  ASSERT_TRUE(context.save().ok());
  const std::string saved = compact(track.dictionary());
  EXPECT_EQ(saved, R"({"i":{"C@WTClient":{"archived":false,"uuid":"C@WTClient"},)"
                   R"("T@WTTask":{"archived":false,"budget":12.30,"uuid":"T@WTTask"}},)"
                   R"("u":{"E@WTTime":{"endDate":1700000000}},"x":["C@WTClient"]})");
  const auto stored = [&] { return synctest::storedJournal(path); };
  EXPECT_EQ(stored(), "12 " + saved);  // 12.30 keeps its places

  task->setName("Design");
  task->setNotes(QString(64 * 1024, u'x'));
  struct rlimit old {};
  ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &old), 0);
  const auto oldHandler = std::signal(SIGXFSZ, SIG_IGN);
  const rlimit small{4096, old.rlim_max};
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &small), 0);
  const Result<void> failed = context.save();
  setrlimit(RLIMIT_FSIZE, &old);
  std::signal(SIGXFSZ, oldHandler);
  EXPECT_FALSE(failed.ok());
  EXPECT_EQ(compact(track.dictionary()), saved);
  EXPECT_EQ(stored(), "12 " + saved);
  EXPECT_TRUE(context.hasChanges());
  ASSERT_TRUE(context.save().ok());
  EXPECT_EQ(synctest::StoredJournal(path).track.entry(Section::Inserted, "T@WTTask").value("name"), "Design");

  // A store replaced as a whole is journaled again: every record as updated, from iteration 0.
  task->setNotes("n");
  ASSERT_TRUE(context.save().ok());
  ASSERT_TRUE(track.journalEveryRecord(context).ok());
  EXPECT_EQ(stored(), R"(0 {"i":{},"u":{"T@WTTask":{"archived":false,"budget":12.30,"name":"Design",)"
                      R"("notes":"n","uuid":"T@WTTask"}},"x":[]})");
}

// A command's journal writes a large save in pieces as its records are reported, holding none of them
// afterwards, each entry as the text a journal held in memory writes; a record saved again later in the
// same run keeps what its first save journaled.
TEST(RZSyncTrackStore, ALargeSaveIsJournaledInPiecesAndEachEntryStaysWhole) {
  QTemporaryDir dir;
  const QString path = dir.filePath("Tessal.sqlite");
  WTObjectContext context;
  ASSERT_TRUE(context.attachStore(std::move(WTStore::open(path).value())).ok());
  RZSyncTrack track(context.store(), RZSyncTrack::Loading::OnDemand);
  context.setChangeJournal(&track);
  QList<WTTask*> tasks;
  for (int i = 0; i < 10000; ++i)
    (tasks << context.insertNewObject<WTTask>()).last()->setName(QString::number(i));
  // Every kind of value a new record reports.
  auto* client = context.insertNewObject<WTClient>();
  client->setName("Ann \"A\" \\ \u00e9\n\t\x01");
  client->setRate(dec("12.30"));
  client->setColor(QColor(255, 0, 0, 128));
  auto* project = context.insertNewObject<WTProject>();
  project->setClient(client);
  tasks[1]->setProject(project);
  tasks[0]->setProject(project);
  auto* expense = context.insertNewObject<WTExpense>();
  expense->setTask(tasks[0]);
  expense->setStartDate(Date::fromSeconds(-1.5));
  expense->setExpense(dec("7.05"));
  RZSyncTrack held;
  const QList<WTObject*> records = *context.fetchObjectsForEntityName("WTObject");
  for (const WTObject* record : records) held.insertValues(record->changedValues(), record->uuid());
  ASSERT_TRUE(context.save().ok());
  EXPECT_FALSE(track.hasChanges());
  for (const WTObject* record : records) {
    const QString uuid = record->uuid();
    const QUuid drawn(uuid.section(u'@', 0, 0));
    ASSERT_TRUE(drawn.version() == QUuid::Random && drawn.variant() == QUuid::DCE &&
                uuid == drawn.toString(QUuid::WithoutBraces).toUpper() + '@' + record->entityName())
        << uuid.toStdString();
    ASSERT_EQ(context.store()->journalRecord(uuid).value().inserted.toStdString(),
              compact(held.entry(Section::Inserted, uuid)));
  }
  tasks.first()->setNotes("later");
  tasks.last()->setNotes("later");
  ASSERT_TRUE(context.save().ok());
  const synctest::StoredJournal journal(path);
  EXPECT_EQ(journal.track.entries(Section::Inserted).size(), records.size());
  for (const WTTask* task : {tasks.first(), tasks.last()}) {
    const QVariantMap entry = journal.track.entry(Section::Inserted, task->uuid());
    EXPECT_EQ(entry.value("name"), task->name());
    EXPECT_EQ(entry.value("notes"), "later");
  }
}

// An older store's journal file is read into the store once, as it is updated, and kept as ".migrated";
// an unreadable one is kept aside as ".corrupt" and the journal starts empty. A journal file found beside
// the store later is set aside as ".ignored", once.
TEST(RZSyncTrackStore, AnOlderStoresJournalFileMovesIntoItOnce) {
  const struct {
    const char* text;  // null: no file
    qint64 iteration;
    const char* loaded;  // null: kept aside
  } rows[] = {
      // clang-format off
      {nullptr, 0, kEmpty},
      {R"({"iteration": 3, "track": {"i": {"B@WTTask": {}}, "u": {"A@WTTask": {"name": "a", "rate": 12.30}},)"
       R"( "x": ["D@WTNote", "C@WTNote"]}})",
       3, R"({"i":{"B@WTTask":{}},"u":{"A@WTTask":{"name":"a","rate":12.30}},"x":["D@WTNote","C@WTNote"]})"},
      {"", 0, nullptr}, {"{\"iteration\": 3, \"track\": {\"i\": {", 0, nullptr} /* cut short */, {"[1, 2]", 0, nullptr},
      {R"({"iteration": "7", "track": {}})", 0, nullptr}, {R"({"iteration": 7, "track": []})", 0, nullptr},
      {R"({"iteration": 7, "track": {"i": {"A@WTTask": 5}}})", 0, nullptr},
      {R"({"iteration": 7, "track": {"x": ["A@WTTask", 5]}})", 0, nullptr},
      // clang-format on
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.text ? row.text : "(no file)");
    QTemporaryDir folder;
    const QString path = folder.filePath("Tessal.sqlite");
    const QString file = folder.filePath("Tessal.sync");
    makeOlderStore(path);
    if (row.text) writeFile(file, row.text);
    const auto journal = [&] {
      Result<std::unique_ptr<WTStore>> store = RZSyncTrack::openStore(path);
      EXPECT_TRUE(store.ok());
      if (!store) return std::string();
      const RZSyncTrack track(store.value().get(), RZSyncTrack::Loading::Whole);
      return std::to_string(track.iteration()) + ' ' + compact(track.dictionary());
    };
    {
      LogCapture log;
      EXPECT_EQ(journal(), std::to_string(row.iteration) + ' ' + (row.loaded ? row.loaded : kEmpty));
      EXPECT_EQ(log.contains("Can not parse json - "), !row.loaded);
    }
    EXPECT_FALSE(QFile::exists(file));
    EXPECT_EQ(fileBytes(file + (row.loaded ? ".migrated" : ".corrupt")), row.text ? row.text : "");
    EXPECT_EQ(QFile::exists(file + ".migrated"), row.loaded && row.text);
    EXPECT_EQ(QFile::exists(file + ".corrupt"), !row.loaded);

    writeFile(file, R"({"iteration": 9})");
    for (const bool again : {false, true}) {
      LogCapture later;
      EXPECT_EQ(journal(), std::to_string(row.iteration) + ' ' + (row.loaded ? row.loaded : kEmpty));
      EXPECT_EQ(later.contains("Ignoring " + file), !again) << later.lines.join('\n').toStdString();
    }
    EXPECT_EQ(fileBytes(file + ".ignored"), R"({"iteration": 9})");
  }
}

// Changes combine per record, and leave once confirmed.
TEST(RZSyncTrackSections, ChangesCombinePerRecord) {
  RZSyncTrack track;
  track.insertValues({{"name", "a"}, {"notes", "n"}}, "A@WTTask");
  track.updateValues({{"name", "b"}, {"rate", 50}}, "A@WTTask");
  track.updateValues({{"name", "a"}}, "D@WTTask");
  track.deleteObjectWithId("D@WTTask");
  track.deleteObjectWithId("D@WTTask");
  track.deleteObjectWithId({});
  track.updateValues({{"items", QVariant::fromValue(WTUnorderedRelationship{})}}, "B@WTTask");
  track.updateValues({{"rate", synctest::money("5")}}, "C@WTTask");
  track.updateValues({{"rate", QVariant()}}, "C@WTTask");
  EXPECT_EQ(compact(track.dictionary()),
            R"({"i":{"A@WTTask":{"name":"b","notes":"n","rate":50}},)"
            R"("u":{"B@WTTask":{},"C@WTTask":{"rate":null},"D@WTTask":{"name":"a"}},"x":["D@WTTask"]})");
  EXPECT_TRUE(track.isPendingDeletion("D@WTTask"));
  track.updateValues({{"name", "b"}}, "D@WTTask");
  EXPECT_FALSE(track.isPendingDeletion("D@WTTask"));
  track.resetChanges();
  EXPECT_FALSE(track.hasChanges());

  // A confirmed save forgets what it carried and nothing the user did while it was on its way.
  track.insertValues({{"name", "new"}, {"rate", synctest::money("12.3")}}, "N@WTTask");
  track.updateValues({{"name", "kept"}, {"notes", "old"}}, "U@WTTask");
  track.updateValues({{"name", "sent"}}, "E@WTTask");
  track.deleteObjectWithId("D@WTNote");
  const QVariantMap sent = track.dictionary();
  track.updateValues({{"rate", synctest::money("12.30")}}, "N@WTTask");  // same value, other text
  track.updateValues({{"notes", "newer"}, {"archived", true}}, "U@WTTask");
  track.deleteObjectWithId("L@WTNote");
  track.removeSentChanges(sent);
  EXPECT_EQ(
      compact(track.dictionary()),
      R"({"i":{},"u":{"N@WTTask":{"rate":12.30},"U@WTTask":{"archived":true,"notes":"newer"}},"x":["L@WTNote"]})");
  // Without edits in between, nothing is left, an entry without keys included.
  track.updateValues({{"items", QVariant::fromValue(WTUnorderedRelationship{})}}, "E@WTTask");
  track.removeSentChanges(track.dictionary());
  EXPECT_FALSE(track.hasChanges());
}

// Saves fill the journal, once per record; unordered sides are left out and cleared values go out as null;
// dates before 1970 are whole seconds toward zero, colours "#aarrggbb".
TEST(RZSyncTrackContext, SavesReportInsertionsUpdatesAndDeletions) {
  QTemporaryDir dir;
  WTObjectContext context;
  auto store = WTStore::open(dir.filePath("Tessal.sqlite"));
  ASSERT_TRUE(store.ok() && context.attachStore(std::move(store.value())).ok());
  RZSyncTrack track;
  context.setChangeJournal(&track);
  const auto make = [&]<class T>(T*, const char* id) {
    T* object = context.insertNewObject<T>();
    object->setUuid(QString::fromLatin1(id) + u'@' + object->entityName());
    return object;
  };
  const auto saved = [&] {  // what the save journaled, starting the journal afresh
    EXPECT_TRUE(context.save().ok());
    const std::string journaled = compact(track.dictionary());
    track.resetChanges();
    return journaled;
  };
  auto* project = make((WTProject*)nullptr, "P");
  project->setName("Site");
  project->setClient(make((WTClient*)nullptr, "C"));
  project->client()->setColor(QColor(255, 0, 0, 128));
  auto* task = make((WTTask*)nullptr, "T");
  task->setProject(project);
  task->setName("Draft");
  task->setName("Design");  // changed before the save: still one insertion
  task->setBudget(dec("120.50"));
  auto* expense = make((WTExpense*)nullptr, "E");
  expense->setTask(task);
  expense->setStartDate(Date::fromSeconds(-1.5));
  expense->setExpense(dec("12.30"));
  EXPECT_EQ(saved(),
            R"({"i":{"C@WTClient":{"archived":false,"color":"#80ff0000","uuid":"C@WTClient"},"E@WTExpense":{)"
            R"("archived":false,"expense":12.30,"startDate":-1,"task":"T@WTTask","uuid":"E@WTExpense"},)"
            R"("P@WTProject":{"archived":false,"client":"C@WTClient","name":"Site","tasks":["T@WTTask"],)"
            R"("uuid":"P@WTProject"},"T@WTTask":{"archived":false,"budget":120.50,"name":"Design",)"
            R"("project":"P@WTProject","uuid":"T@WTTask"}},"u":{},"x":[]})");
  auto* second = make((WTTask*)nullptr, "S");
  second->setProject(project);
  project->moveTask(second, 0);
  expense->setExpense(dec("7.05"));
  context.deleteObject(make((WTTask*)nullptr, "G"));  // made and removed between two saves: no trace
  EXPECT_EQ(saved(),
            R"({"i":{"S@WTTask":{"archived":false,"project":"P@WTProject","uuid":"S@WTTask"}},"u":{)"
            R"("E@WTExpense":{"expense":7.05},"P@WTProject":{"tasks":["S@WTTask","T@WTTask"]}},"x":[]})");
  task->setBudget(std::nullopt);
  project->setClient(nullptr);
  expense->setNotes("n");
  EXPECT_EQ(saved(),
            R"({"i":{},"u":{"C@WTClient":{},"E@WTExpense":{"notes":"n"},"P@WTProject":{"client":null},)"
            R"("T@WTTask":{"budget":null}},"x":[]})");
  context.deleteObject(expense);
  EXPECT_EQ(saved(), R"({"i":{},"u":{"T@WTTask":{}},"x":["E@WTExpense"]})");
}
