#include "RZSyncManager.h"

#include "Decimal.h"
#include "RZSyncJSON.h"
#include "SyncTestSupport.h"
#include "WTClient.h"
#include "WTExpense.h"
#include "WTNote.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTTime.h"

#include <gtest/gtest.h>

#include <QSignalSpy>

#include <sstream>

using namespace synctest;
using Section = RZSyncTrack::Section;
using Records = std::vector<std::pair<QString, std::string>>;

namespace {

class RZSyncManagerTest : public ::testing::Test {
 public:
  // Answers heads with nothing new at `head` and saves with `head` + 1 unless a test says otherwise.
  void SetUp() override {
    server.handler = [this](const HttpRequest& r) {
      return r.json().value("action") == "save" ? saveReply(++head) : headReply(head);
    };
  }
  // From now on heads get `head` and saves get `save`.
  void answer(const QByteArray& head, const QByteArray& save) {
    server.handler = [=](const HttpRequest& r) { return r.json().value("action") == "save" ? save : head; };
  }
  // The bodies of the requests with this action since the last synced().
  QList<QVariantMap> sent(const QString& action) const {
    QList<QVariantMap> bodies;
    for (const HttpRequest& request : server.requests.mid(setUpRequests))
      if (request.json().value("action") == action) bodies.append(request.json());
    return bodies;
  }
  // Saves and syncs, so the journal starts empty.
  void synced() {
    client.save();
    EXPECT_TRUE(client.syncOnce());
    EXPECT_FALSE(client.track().hasChanges());
    setUpRequests = server.requests.size();
  }
  // Task T in project P, synced.
  WTTask* syncedTask() {
    auto* project = client.context->insertNewObject<WTProject>();
    project->setUuid("P@WTProject");
    project->setName("Site");
    auto* task = client.context->insertNewObject<WTTask>();
    task->setUuid("T@WTTask");
    task->setName("Design");
    task->setProject(project);
    synced();
    return task;
  }
  template <class T>
  T* make(const char* uuid) {
    T* object = client.context->insertNewObject<T>();
    object->setUuid(QString::fromLatin1(uuid));
    return object;
  }
  void expectRecords(const Records& records) {
    for (const auto& [uuid, values] : records)
      EXPECT_EQ(storedRecord(*client.context, uuid), values) << uuid.toStdString();
  }

  qint64 head = 1;
  qsizetype setUpRequests = 0;
  LoopbackHttpServer server;
  SyncClient client{server.address()};
};

}  // namespace

TEST(RZSyncManagerEndpoint, ServerAddressBecomesTheEndpoint) {
  const std::pair<const char*, const char*> cases[] = {
      {"sync.example.org", "https://sync.example.org/sync/tessal/sync.php"},
      {"  sync.example.org:8443 ", "https://sync.example.org:8443/sync/tessal/sync.php"},
      {"http://127.0.0.1:8080/", "http://127.0.0.1:8080/sync/tessal/sync.php"},
      {"https://example.org/tessal/", "https://example.org/tessal/sync/tessal/sync.php"},
      {"", ""},
      {"ftp://example.org", ""},
      {"https://", ""},
      {"https://example.org/?a=b", ""},
  };
  for (const auto& [server, endpoint] : cases)
    EXPECT_EQ(RZSyncManager::endpointURL(QString::fromLatin1(server)).toString(), endpoint) << server;
}

// Records arrive as sent, owners named only made empty; saved, not journaled, not undoable.
TEST_F(RZSyncManagerTest, HeadResultIsMergedByUuidWithRelationshipsDatesAndMoney) {
  const Records records = {
      {"C@WTClient", R"({"name":"Acme"})"},
      {"P@WTProject",
       R"({"client":"C@WTClient","name":"Site","rate":80.50,"tasks":["T2@WTTask","T1@WTTask"]})"},
      {"T1@WTTask", R"({"budget":1200.00,"name":"One","project":"P@WTProject"})"},
      {"T2@WTTask", R"({"name":"Two","project":"P@WTProject"})"},
      {"E@WTTime", R"({"endDate":1700003600,"startDate":1700000000,"task":"T1@WTTask"})"},
      {"X@WTExpense", R"({"expense":12.30,"startDate":1700000000,"task":"T1@WTTask"})"},
      {"N@WTNote",
       R"({"color":"#80ff0000","name":"Filed under a task not sent","startDate":1700000000,"task":"T3@WTTask"})"},
      {"T3@WTTask", "{}"},
  };
  QVariantMap updated;  // every record under both sections, as the server sends them
  for (const auto& [uuid, values] : records)
    if (uuid != "T3@WTTask")
      updated.insert(uuid, RZSyncJSON::parse(QByteArray::fromStdString(values)).value());
  QVariantMap inserted = updated, project = updated.value("P@WTProject").toMap();
  inserted["C@WTClient"] = QVariantMap{{"name", "Acme"}, {"uuid", "C@WTClient"}};
  project.remove("tasks");  // the order only among the updates, naming tasks of this same head
  inserted["P@WTProject"] = project;
  server.handler = [&](const HttpRequest&) { return headReply(9, changeSet(inserted, updated)); };
  ASSERT_TRUE(client.syncOnce());
  expectRecords(records);
  EXPECT_FALSE(client.context->hasChanges() || client.track().hasChanges() ||
               client.context->undoManager().canUndo() || !sent("save").isEmpty());
  EXPECT_EQ(client.track().iteration(), 9);
  client.reopen();
  EXPECT_EQ(client.track().iteration(), 9);
  expectRecords({records[1]});
}

// A server value (null clears) replaces a pending key, which is not sent; the server's deletion takes
// the record's items here too, and one filed under it here only goes out as a deletion; a deletion still
// waiting to be sent wins: the merge neither revives the record nor files under it.
struct MergeCase {
  const char* what;
  std::function<void(RZSyncManagerTest&, WTTask*)> local;  // on a synced T in P
  QVariantMap result;
  Records records;
  const char* sent;  // the save's data
  friend void PrintTo(const MergeCase& c, std::ostream* out) { *out << c.what; }
};
class RZSyncManagerMergeTest : public RZSyncManagerTest, public ::testing::WithParamInterface<MergeCase> {};

TEST_P(RZSyncManagerMergeTest, ServerAndPendingChanges) {
  const MergeCase& c = GetParam();
  c.local(*this, syncedTask());
  answer(headReply(5, c.result), saveReply(6));
  ASSERT_TRUE(client.syncOnce());
  expectRecords(c.records);
  ASSERT_EQ(sent("save").size(), 1);
  EXPECT_EQ(sent("save")[0].value("iteration").toLongLong(), 5);
  EXPECT_EQ(compact(sent("save")[0].value("data")), c.sent);
  EXPECT_FALSE(client.track().hasChanges());
  EXPECT_EQ(client.track().iteration(), 6);
}

INSTANTIATE_TEST_SUITE_P(
    Cases, RZSyncManagerMergeTest,
    ::testing::Values(
        MergeCase{
            "ServerValueWinsOverAPendingKey",
            [](RZSyncManagerTest& t, WTTask* task) {
              task->setBudget(dec("500.00"));
              task->setRate(dec("90.00"));
              t.synced();
              task->setName("Local name");
              task->setNotes("Local notes");  // not saved yet: the poll saves it first
            },
            changeSet({}, {{"T@WTTask", QVariantMap{{"name", "Server name"}, {"budget", {}}, {"rate", {}}}}}),
            {{"T@WTTask", R"({"name":"Server name","notes":"Local notes","project":"P@WTProject"})"}},
            R"({"i":{},"u":{"T@WTTask":{"notes":"Local notes"}},"x":[]})"},
        MergeCase{
            "ServerDeletionTakesOwnedRecordsHere",
            [](RZSyncManagerTest& t, WTTask* task) {
              task->setName("Renamed here");
              auto* note = t.make<WTNote>("N@WTNote");
              note->setTask(task);
              note->setStartDate(Date::fromSeconds(1700000000));
            },
            changeSet({}, {}, {"T@WTTask", "Gone@WTNote"}),
            {{"T@WTTask", "(none)"}, {"N@WTNote", "(none)"}},
            R"({"i":{"N@WTNote":{"archived":false,"startDate":1700000000,"task":"T@WTTask","uuid":"N@WTNote"}},)"
            R"("u":{},"x":["N@WTNote"]})"},
        MergeCase{
            "PendingDeletionWinsOverTheMerge",
            [](RZSyncManagerTest& t, WTTask* task) {
              auto* kept = t.make<WTTask>("K@WTTask");
              kept->setProject(task->project());
              auto* moved = t.make<WTNote>("M@WTNote");
              moved->setTask(kept);
              moved->setStartDate(Date::fromSeconds(1700000000));
              auto* acme = t.make<WTClient>("A@WTClient");
              t.synced();
              t.client.context->deleteObject(task);
              t.client.context->deleteObject(acme);
              t.client.save();
            },
            changeSet(
                {{"New@WTTime",
                  QVariantMap{{"task", "T@WTTask"}, {"startDate", 1700000000}, {"endDate", 1700000060}}},
                 {"Deeper@WTNote", QVariantMap{{"task", "NewTask@WTTask"}, {"startDate", 1700000000}}},
                 {"NewTask@WTTask", QVariantMap{{"project", "P@WTProject"}, {"name", "fine"}}},
                 {"P2@WTProject", QVariantMap{{"client", "A@WTClient"}, {"name", "Outlives its client"}}}},
                {{"T@WTTask", QVariantMap{{"name", "Renamed elsewhere"}}},
                 {"M@WTNote", QVariantMap{{"task", "T@WTTask"}}},
                 {"P@WTProject", QVariantMap{{"tasks", QStringList{"T@WTTask", "K@WTTask"}}}}}),
            {{"T@WTTask", "(none)"},
             {"A@WTClient", "(none)"},
             {"New@WTTime", R"({"endDate":1700000060,"startDate":1700000000})"},
             {"M@WTNote", R"({"startDate":1700000000,"task":"K@WTTask"})"},
             {"P@WTProject", R"({"name":"Site","tasks":["K@WTTask","NewTask@WTTask"]})"},
             {"NewTask@WTTask", R"({"name":"fine","project":"P@WTProject"})"},
             {"Deeper@WTNote", R"({"startDate":1700000000,"task":"NewTask@WTTask"})"},
             {"P2@WTProject", R"({"name":"Outlives its client"})"}},
            R"({"i":{},"u":{},"x":["A@WTClient","T@WTTask"]})"}),
    [](const auto& info) { return std::string(info.param.what); });

// The key is dropped only from the section the server sent it under.
TEST_F(RZSyncManagerTest, ServerValueDropsThePendingKeyOfItsOwnSectionOnly) {
  RZSyncTrack& track = client.track();
  track.insertValues({{"name", "mine"}, {"notes", "n"}}, "A@WTTask");
  track.updateValues({{"name", "mine"}}, "B@WTTask", Section::Updated);
  client.manager->mergeWithDictionary(changeSet(
      {{"A@WTTask", QVariantMap{{"name", "theirs"}}}},
      {{"A@WTTask", QVariantMap{{"notes", "theirs"}}}, {"B@WTTask", QVariantMap{{"name", "theirs"}}}}));
  EXPECT_EQ(compact(track.dictionary()), R"({"i":{"A@WTTask":{"notes":"n"}},"u":{},"x":[]})");
  EXPECT_EQ(client.find<WTTask>("A@WTTask")->notes(), "theirs");
}

// A merged head moves the journal's iteration even when the save after it is refused.
TEST_F(RZSyncManagerTest, IterationMovesToTheMergedHeadBeforeTheSave) {
  syncedTask()->setName("Pending");
  answer(headReply(9, changeSet({{"Other@WTTask", QVariantMap{{"name", "from elsewhere"}}}})),
         errorReply("Poll head first", 4, 0));
  ASSERT_TRUE(client.syncOnce());
  EXPECT_TRUE(client.track().hasChanges());
  EXPECT_EQ(RZSyncTrack(client.journalPath()).iteration(), 9);
  ASSERT_TRUE(client.syncOnce());
  ASSERT_EQ(sent("head").size(), 2);
  EXPECT_EQ(sent("head")[1].value("iteration").toLongLong(), 9);
}

// A save that gets no answer keeps the journal; edits made while one is on its way outlive its reply.
TEST_F(RZSyncManagerTest, SavesInFlightKeepTheJournal) {
  WTTask* task = syncedTask();
  task->setName("First");
  task->setNotes("Notes");
  answer(headReply(head), QByteArray());
  client.manager->sync();
  ASSERT_TRUE(waitUntil([&] { return server.dropHeld(), client.idle(); }));
  EXPECT_EQ(compact(client.track().dictionary()),
            R"({"i":{},"u":{"T@WTTask":{"name":"First","notes":"Notes"}},"x":[]})");
  EXPECT_EQ(client.presenter.networkErrors.size(), 1);

  client.manager->sync();
  ASSERT_TRUE(waitUntil([&] { return server.hasHeld(); }));
  task->setName("Second");
  auto* note = make<WTNote>("N@WTNote");
  note->setTask(task);
  note->setStartDate(Date::fromSeconds(1700000000));
  client.save();
  ASSERT_TRUE(server.answerHeld(saveReply(4)));
  ASSERT_TRUE(waitUntil([&] { return client.idle(); }));
  const RZSyncTrack journal(client.journalPath());
  EXPECT_EQ(journal.iteration(), 4);
  EXPECT_EQ(
      compact(journal.dictionary()),
      R"({"i":{"N@WTNote":{"archived":false,"startDate":1700000000,"task":"T@WTTask","uuid":"N@WTNote"}},"u":{"T@WTTask":{"name":"Second"}},"x":[]})");
}

// Stale head (code 4): with an iteration resend claiming it, without keep the journal; others stop syncing.
struct RefusalCase {
  const char* what;
  QByteArray answer;      // to the first request; later heads find nothing new and saves are confirmed
  qint64 resentClaiming;  // the iteration the resent journal claims; -1 when nothing is resent
  const char* shown;      // the sync error shown, if any
  const char* logged;     // a log line written, if any
  friend void PrintTo(const RefusalCase& c, std::ostream* out) { *out << c.what; }
};
class RZSyncManagerRefusalTest : public RZSyncManagerTest,
                                 public ::testing::WithParamInterface<RefusalCase> {};

TEST_P(RZSyncManagerRefusalTest, IsTakenByItsKind) {
  const RefusalCase& c = GetParam();
  syncedTask()->setName("Pending");
  client.save();
  const qint64 iteration = client.track().iteration();
  server.handler = [&](const HttpRequest& request) {
    if (server.requests.size() == setUpRequests + 1) return c.answer;
    return request.json().value("action") == "save" ? saveReply(13) : headReply(13);
  };
  QSignalSpy status(client.manager.get(), &RZSyncManager::syncStatusDidChange);
  LogCapture log(QStringLiteral("tessal.sync.debug=true"));
  client.manager->setIntervals({60000, 60000, 60000});
  client.manager->enableSync();
  ASSERT_TRUE(waitUntil([&] { return server.requests.size() > setUpRequests && client.idle(); }));
  EXPECT_TRUE(!c.logged || log.contains(QString::fromLatin1(c.logged)));
  const bool resent = c.resentClaiming >= 0;
  ASSERT_EQ(server.requests.size(), setUpRequests + (resent ? 2 : 1));
  if (resent) {
    EXPECT_EQ(sent("save")[0].value("iteration").toLongLong(), c.resentClaiming);
    EXPECT_TRUE(sent("save")[0].value("data").toMap().value("u").toMap().contains("T@WTTask"));
  }
  EXPECT_EQ(client.track().hasChanges(), !resent);
  EXPECT_EQ(client.track().iteration(), resent ? 13 : iteration);
  EXPECT_EQ(client.presenter.syncErrors, c.shown ? QStringList{c.shown} : QStringList{});
  EXPECT_EQ(client.manager->syncEnabled(), !c.shown);
  EXPECT_EQ(client.manager->scheduledInterval(), c.shown ? -1 : 60000);
  EXPECT_EQ(status.count(), c.shown ? 2 : 1);  // on, then off
}

INSTANTIATE_TEST_SUITE_P(
    Replies, RZSyncManagerRefusalTest,
    ::testing::Values(RefusalCase{"StaleHeadNamingAnIteration", errorReply("Try iteration 12", 4, 12), 12,
                                  nullptr, nullptr},
                      RefusalCase{"StaleHeadNamingNone", errorReply("Poll head first", 4, 0), -1, nullptr,
                                  "Head iteration problem"},
                      RefusalCase{"NoIteration", LoopbackHttpServer::json(QVariantMap{{"action", "save"}}),
                                  -1, nullptr, "Iteration not received"},
                      RefusalCase{"OtherCode", errorReply("Wrong e-mail address or password.", 2), -1,
                                  "Wrong e-mail address or password. - (Code: 2)", nullptr}),
    [](const auto& info) { return std::string(info.param.what); });

// The next wait: none while off (a save still journals then), the poll's, the retry's after a failure, the
// short one after a save; failures in a row are shown once and a good reply ends the run by itself.
TEST_F(RZSyncManagerTest, TheWaitBeforeTheNextPollFollowsWhatHappened) {
  RZSyncManager& manager = *client.manager;
  EXPECT_EQ(manager.scheduledInterval(), -1);  // off until enabled
  manager.setIntervals({60000, 70000, 80000});
  manager.enableSync();
  EXPECT_EQ(manager.scheduledInterval(), 60000);
  ASSERT_TRUE(waitUntil([&] { return client.idle(); }));
  server.handler = [](const HttpRequest&) { return LoopbackHttpServer::raw("not json"); };
  ASSERT_TRUE(client.syncOnce());
  EXPECT_EQ(manager.scheduledInterval(), 70000);
  auto* task = make<WTTask>("S@WTTask");
  client.save();
  EXPECT_EQ(manager.scheduledInterval(), 80000);
  manager.disableSync();
  task->setName("While off");
  client.save();
  EXPECT_EQ(manager.scheduledInterval(), -1);
  EXPECT_TRUE(RZSyncTrack(client.journalPath()).entries(Section::Inserted).contains("S@WTTask"));

  manager.setIntervals({40, 80, 40});
  bool failing = true;
  server.handler = [&](const HttpRequest&) {
    return failing ? LoopbackHttpServer::raw("oops", 500) : headReply(1);
  };
  manager.enableSync();
  ASSERT_TRUE(waitUntil([&] { return server.requests.size() >= 5; }));
  EXPECT_EQ(client.presenter.networkErrors.size(), 1);
  EXPECT_TRUE(manager.hasNetworkError());
  failing = false;
  const qsizetype before = server.requests.size();
  ASSERT_TRUE(waitUntil([&] { return server.requests.size() >= before + 4; }, 3000));
  EXPECT_FALSE(manager.hasNetworkError());
  failing = true;
  ASSERT_TRUE(waitUntil([&] { return client.presenter.networkErrors.size() == 2; }, 3000));
}

// Every request names the installation, which keeps its identity and its journal across launches; without
// a server address nothing is sent.
TEST_F(RZSyncManagerTest, DeviceAndJournalSurviveARestart) {
  WTTask* task = syncedTask();
  ASSERT_TRUE(client.syncOnce());
  const QString device = client.defaults->stringForKey("WTSyncDevice");
  EXPECT_FALSE(device.isEmpty());
  task->setName("Before quitting");
  client.save();
  client.reopen();
  EXPECT_EQ(client.track().entry(Section::Updated, "T@WTTask").value("name"), "Before quitting");
  ASSERT_TRUE(client.syncOnce());
  ASSERT_EQ(sent("save").size(), 1);
  EXPECT_EQ(compact(sent("save")[0].value("data")),
            R"({"i":{},"u":{"T@WTTask":{"name":"Before quitting"}},"x":[]})");
  ASSERT_GE(server.requests.size(), 4);
  for (const HttpRequest& request : server.requests) EXPECT_EQ(request.json().value("device"), device);
  EXPECT_NE(SyncClient(server.address()).network().device(), device);

  const qsizetype requests = server.requests.size();
  client.defaults->setValue("WTSyncServer", QVariant());
  client.manager->sync();
  QTest::qWait(100);
  EXPECT_EQ(server.requests.size(), requests);
  EXPECT_TRUE(client.idle());
}

// When saving local edits fails, the reply is not merged and the next poll asks from the same iteration.
TEST_F(RZSyncManagerTest, NoMergeWhenLocalEditsCannotBeSaved) {
  syncedTask()->setName("Unsaved");
  int saves = 0;
  client.manager->setSaveHandler([&]() -> Result<void> {
    return ++saves, Error{1, QStringLiteral("disk full")};
  });
  const qint64 iteration = client.track().iteration();
  answer(headReply(50, changeSet({{"New@WTTask", QVariantMap{{"name", "from elsewhere"}}}})), saveReply(51));
  ASSERT_TRUE(client.syncOnce());
  EXPECT_EQ(saves, 1);
  EXPECT_EQ(client.find<WTTask>("New@WTTask"), nullptr);
  EXPECT_EQ(client.track().iteration(), iteration);
  EXPECT_TRUE(sent("save").isEmpty());
  client.manager->setSaveHandler({});
  ASSERT_TRUE(client.syncOnce());
  EXPECT_NE(client.find<WTTask>("New@WTTask"), nullptr);
  EXPECT_EQ(sent("head").last().value("iteration").toLongLong(), iteration);
}

// A reply of the wrong shape fails (shown once per run of failures) and reaches neither journal nor store.
TEST_F(RZSyncManagerTest, RepliesOfTheWrongShapeFailAndLeaveTheJournalAlone) {
  WTTask* task = syncedTask();
  const qint64 before = client.track().iteration();
  const auto journalFile = [&] {
    QFile file(client.journalPath());
    return file.open(QIODevice::ReadOnly) ? file.readAll() : QByteArray();
  };
  const QByteArray journalBefore = journalFile();
  ASSERT_FALSE(journalBefore.isEmpty());
  std::istringstream bad(
      R"({"action":"head","iteration":-5,"result":{}} {"action":"head","iteration":"abc","result":{}})"
      R"( {"action":"head","iteration":true,"result":{}} {"action":"head","iteration":1e300,"result":{}})"
      R"( {"action":"head","iteration":7.5,"result":{}} {"action":"save","iteration":-1} {"action":"head","iteration":7})"
      R"( {"action":"head","iteration":7,"result":[]} {"action":"head","iteration":7,"result":{"i":[]}})"
      R"( {"action":"head","iteration":7,"result":{"u":{"A@WTTask":"name"}}})"
      R"( {"action":"head","iteration":7,"result":{"u":{"A@WTTask":{"name":{"text":"x"}}}}})"
      R"( {"action":"head","iteration":7,"result":{"u":{"A@WTProject":{"tasks":[["A@WTTask"]]}}}})"
      R"( {"action":"head","iteration":7,"result":{"i":{"A@WTTask":{"uuid":"B@WTTask"}}}})"
      R"( {"action":"head","iteration":7,"result":{"x":"A@WTTask"}} {"action":"head","iteration":7,"result":{"x":[5]}})"
      R"( {"action":"head","iteration":7,"result":{"q":{}}} {"action":"push","iteration":7})"
      R"( {"error":["not","text"],"code":1} {"error":"Busy","code":"4","iteration":7} [1,2,3])");
  for (std::string text; bad >> text;) {
    server.handler = [&](const HttpRequest&) {
      return LoopbackHttpServer::raw(QByteArray::fromStdString(text));
    };
    ASSERT_TRUE(client.syncOnce());
    EXPECT_TRUE(client.manager->hasNetworkError()) << text;
    EXPECT_EQ(client.track().iteration(), before) << text;
    EXPECT_EQ(task->name(), "Design") << text;
  }
  EXPECT_EQ(journalFile(), journalBefore);
  ASSERT_EQ(client.presenter.networkErrors.size(), 1);  // one run of failures, shown once
  EXPECT_TRUE(client.presenter.networkErrors[0].contains("not in the expected form"));
  EXPECT_TRUE(client.presenter.syncErrors.isEmpty());
  server.handler = [&](const HttpRequest&) { return headReply(before + 1); };
  ASSERT_TRUE(client.syncOnce());
  EXPECT_FALSE(client.manager->hasNetworkError());
  EXPECT_EQ(client.track().iteration(), before + 1);
}
