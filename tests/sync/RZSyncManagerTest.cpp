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

using synctest::changeSet;
using synctest::compact;
using synctest::dec;
using synctest::errorReply;
using synctest::headReply;
using synctest::HttpRequest;
using synctest::LogCapture;
using synctest::LoopbackHttpServer;
using synctest::money;
using synctest::saveReply;
using synctest::SyncClient;
using synctest::waitUntil;
using Section = RZSyncTrack::Section;

namespace {

class RZSyncManagerTest : public ::testing::Test {
 protected:
  // Answers heads with nothing new at `head` and saves with `head` + 1 unless a test says otherwise.
  void SetUp() override {
    server.handler = [this](const HttpRequest& request) {
      return request.json().value("action") == "save" ? saveReply(++head) : headReply(head);
    };
  }
  // From now on heads get `head` and saves get `save`.
  void answer(const QByteArray& head, const QByteArray& save) {
    server.handler = [=](const HttpRequest& r) { return r.json().value("action") == "save" ? save : head; };
  }

  // The bodies of the requests with this action since the fixture's set-up was done.
  QList<QVariantMap> sent(const QString& action) const {
    QList<QVariantMap> bodies;
    for (qsizetype i = setUpRequests; i < server.requests.size(); ++i) {
      if (server.requests[i].json().value("action") == action) bodies.append(server.requests[i].json());
    }
    return bodies;
  }

  // A task in a project, saved and confirmed, so the journal starts empty.
  WTTask* syncedTask() {
    auto* project = client.context->insertNewObject<WTProject>();
    project->setName("Site");
    auto* task = client.context->insertNewObject<WTTask>();
    task->setName("Design");
    task->setProject(project);
    client.save();
    EXPECT_TRUE(client.syncOnce());
    EXPECT_FALSE(client.track().hasChanges());
    setUpRequests = server.requests.size();
    return task;
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
  for (const auto& [server, endpoint] : cases) {
    SCOPED_TRACE(server);
    EXPECT_EQ(RZSyncManager::endpointURL(QString::fromLatin1(server)).toString(),
              QString::fromLatin1(endpoint));
  }
}

// Records arrive as sent, owners named only made empty; saved, not journaled, not undoable.
TEST_F(RZSyncManagerTest, HeadResultIsMergedByUuidWithRelationshipsDatesAndMoney) {
  const std::pair<QString, QString> records[] = {
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
  for (const auto& [uuid, values] : records) {
    if (uuid != "T3@WTTask") updated.insert(uuid, RZSyncJSON::parse(values.toUtf8()).value_or(QVariant()));
  }
  QVariantMap inserted = updated;
  inserted["C@WTClient"] = QVariantMap{{"name", "Acme"}, {"uuid", "C@WTClient"}};
  QVariantMap project = inserted.value("P@WTProject").toMap();
  project.remove("tasks");  // the order only among the updates, naming tasks of this same head
  inserted["P@WTProject"] = project;
  server.handler = [&](const HttpRequest&) { return headReply(9, changeSet(inserted, updated)); };
  ASSERT_TRUE(client.syncOnce());
  for (const auto& [uuid, values] : records)
    EXPECT_EQ(synctest::storedRecord(*client.context, uuid), values.toStdString());

  EXPECT_FALSE(client.context->hasChanges());
  EXPECT_FALSE(client.track().hasChanges());
  EXPECT_FALSE(client.context->undoManager().canUndo());
  EXPECT_EQ(client.track().iteration(), 9);
  EXPECT_TRUE(sent("save").isEmpty());
  client.reopen();
  EXPECT_EQ(client.track().iteration(), 9);
  EXPECT_EQ(synctest::storedRecord(*client.context, "P@WTProject"), records[1].second.toStdString());
}

// Local edits are saved first; the server's value (null clears) replaces a pending one, which is not sent.
TEST_F(RZSyncManagerTest, ServerValueWinsOverAPendingLocalKey) {
  WTTask* task = syncedTask();
  const QString id = task->uuid();
  task->setBudget(dec("500.00"));
  task->setRate(dec("90.00"));
  client.save();
  ASSERT_TRUE(client.syncOnce());
  setUpRequests = server.requests.size();
  task->setName("Local name");
  task->setNotes("Local notes");  // not saved yet: the poll saves it first
  answer(
      headReply(5, changeSet({}, {{id, QVariantMap{{"name", "Server name"}, {"budget", {}}, {"rate", {}}}}})),
      saveReply(6));
  ASSERT_TRUE(client.syncOnce());
  EXPECT_EQ(synctest::storedRecord(*client.context, id),
            QString(R"({"name":"Server name","notes":"Local notes","project":"%1"})")
                .arg(task->project()->uuid())
                .toStdString());
  ASSERT_EQ(sent("save").size(), 1);
  const QVariantMap save = sent("save")[0];
  EXPECT_EQ(save.value("iteration").toLongLong(), 5);
  EXPECT_EQ(compact(save.value("data")),
            QString(R"({"i":{},"u":{"%1":{"notes":"Local notes"}},"x":[]})").arg(id));
  EXPECT_FALSE(client.track().hasChanges());
  EXPECT_EQ(client.track().iteration(), 6);
}

// The key is dropped only from the section the server sent it under.
TEST_F(RZSyncManagerTest, ServerValueDropsThePendingKeyOfItsOwnSectionOnly) {
  RZSyncManager& manager = *client.manager;
  RZSyncTrack& track = client.track();
  track.insertValues({{"name", "mine"}, {"notes", "n"}}, "A@WTTask");
  track.updateValues({{"name", "mine"}}, "B@WTTask", Section::Updated);
  manager.mergeWithDictionary(changeSet(
      {{"A@WTTask", QVariantMap{{"name", "theirs"}}}},
      {{"A@WTTask", QVariantMap{{"notes", "theirs"}}}, {"B@WTTask", QVariantMap{{"name", "theirs"}}}}));
  EXPECT_EQ(compact(track.entry(Section::Inserted, "A@WTTask")), R"({"notes":"n"})");
  EXPECT_FALSE(track.entries(Section::Updated).contains("B@WTTask"));
  EXPECT_EQ(client.find<WTTask>("A@WTTask")->notes(), "theirs");
}

// The server's deletion takes the record's items here too; an item filed under it here only goes to the
// server as a deletion (the server may still have it elsewhere).
TEST_F(RZSyncManagerTest, ServerDeletionTakesOwnedRecordsHere) {
  WTTask* task = syncedTask();
  const QString taskId = task->uuid();
  task->setName("Renamed here");
  auto* note = client.context->insertNewObject<WTNote>();
  note->setTask(task);
  const QString noteId = note->uuid();
  client.save();
  answer(headReply(10, changeSet({}, {}, {taskId, "Gone@WTNote"})), saveReply(20));
  ASSERT_TRUE(client.syncOnce());
  EXPECT_EQ(client.find<WTTask>(taskId), nullptr);
  EXPECT_EQ(client.find<WTNote>(noteId), nullptr);
  ASSERT_EQ(sent("save").size(), 1);
  const QVariantMap data = sent("save")[0].value("data").toMap();
  EXPECT_FALSE(data.value("u").toMap().contains(taskId));
  EXPECT_EQ(data.value("x").toStringList(), QStringList{noteId});
  EXPECT_FALSE(client.track().hasChanges());
  EXPECT_EQ(client.track().iteration(), 20);
}

// A deletion still waiting to be sent wins: the merge neither revives the record nor files under it.
TEST_F(RZSyncManagerTest, PendingDeletionWinsOverTheMerge) {
  WTTask* task = syncedTask();
  WTProject* project = task->project();
  const QString taskId = task->uuid(), projectId = project->uuid();
  auto* kept = client.context->insertNewObject<WTTask>();
  kept->setProject(project);
  auto* movedItem = client.context->insertNewObject<WTNote>();
  movedItem->setTask(kept);
  movedItem->setStartDate(Date::fromSeconds(1700000000));
  auto* acme = client.context->insertNewObject<WTClient>();
  client.save();
  ASSERT_TRUE(client.syncOnce());
  setUpRequests = server.requests.size();
  const QString keptId = kept->uuid(), movedId = movedItem->uuid(), acmeId = acme->uuid();
  client.context->deleteObject(task);
  client.context->deleteObject(acme);
  client.save();

  const QVariantMap result = changeSet(
      {{"New@WTTime", QVariantMap{{"task", taskId}, {"startDate", 1700000000}, {"endDate", 1700000060}}},
       {"Deeper@WTNote", QVariantMap{{"task", "NewTask@WTTask"}, {"startDate", 1700000000}}},
       {"NewTask@WTTask", QVariantMap{{"project", projectId}, {"name", "fine"}}},
       {"P2@WTProject", QVariantMap{{"client", acmeId}, {"name", "Outlives its client"}}}},
      {{taskId, QVariantMap{{"name", "Renamed elsewhere"}}},
       {movedId, QVariantMap{{"task", taskId}}},
       {projectId, QVariantMap{{"tasks", QStringList{taskId, keptId}}}}});
  answer(headReply(30, result), saveReply(31));
  ASSERT_TRUE(client.syncOnce());

  const std::pair<QString, QString> records[] = {
      {taskId, "(none)"},
      {acmeId, "(none)"},
      {"New@WTTime", R"({"endDate":1700000060,"startDate":1700000000})"},
      {movedId, QString(R"({"startDate":1700000000,"task":"%1"})").arg(keptId)},
      {projectId, QString(R"({"name":"Site","tasks":["%1","NewTask@WTTask"]})").arg(keptId)},
      {"NewTask@WTTask", QString(R"({"name":"fine","project":"%1"})").arg(projectId)},
      {"Deeper@WTNote", R"({"startDate":1700000000,"task":"NewTask@WTTask"})"},
      {"P2@WTProject", R"({"name":"Outlives its client"})"},
  };
  for (const auto& [uuid, values] : records)
    EXPECT_EQ(synctest::storedRecord(*client.context, uuid), values.toStdString());
  ASSERT_EQ(sent("save").size(), 1);
  const QStringList deleted = sent("save")[0].value("data").toMap().value("x").toStringList();
  EXPECT_TRUE(deleted.contains(taskId) && deleted.contains(acmeId)) << deleted.join(' ').toStdString();
  EXPECT_FALSE(client.track().hasChanges());
}

// A merged head moves the journal's iteration even when the save after it is refused.
TEST_F(RZSyncManagerTest, IterationMovesToTheMergedHeadBeforeTheSave) {
  WTTask* task = syncedTask();
  task->setName("Pending");
  answer(headReply(9, changeSet({{"Other@WTTask", QVariantMap{{"name", "from elsewhere"}}}})),
         errorReply("Poll head first", 4, 0));
  ASSERT_TRUE(client.syncOnce());
  EXPECT_EQ(client.track().iteration(), 9);
  EXPECT_TRUE(client.track().hasChanges());
  EXPECT_EQ(RZSyncTrack(client.journalPath()).iteration(), 9);
  ASSERT_TRUE(client.syncOnce());
  const QList<QVariantMap> heads = sent("head");
  ASSERT_EQ(heads.size(), 2);
  EXPECT_EQ(heads[1].value("iteration").toLongLong(), 9);
}

// A save that gets no answer keeps the journal; edits made while one is on its way outlive its reply.
TEST_F(RZSyncManagerTest, SavesInFlightKeepTheJournal) {
  WTTask* task = syncedTask();
  task->setName("First");
  task->setNotes("Notes");
  answer(headReply(head), QByteArray());
  client.manager->sync();
  ASSERT_TRUE(waitUntil([&] {
    server.dropHeld();
    return client.idle();
  }));
  EXPECT_EQ(compact(client.track().entry(Section::Updated, task->uuid())),
            R"({"name":"First","notes":"Notes"})");
  EXPECT_EQ(client.presenter.networkErrors.size(), 1);

  client.manager->sync();
  ASSERT_TRUE(waitUntil([&] { return server.hasHeld(); }));
  task->setName("Second");
  auto* note = client.context->insertNewObject<WTNote>();
  note->setTask(task);
  client.save();
  ASSERT_TRUE(server.answerHeld(saveReply(4)));
  ASSERT_TRUE(waitUntil([&] { return client.idle(); }));
  const RZSyncTrack& track = client.track();
  EXPECT_EQ(track.iteration(), 4);
  EXPECT_EQ(compact(track.entry(Section::Updated, task->uuid())), R"({"name":"Second"})");
  EXPECT_TRUE(track.entries(Section::Inserted).contains(note->uuid()));
  EXPECT_EQ(RZSyncTrack(client.journalPath()).iteration(), 4);
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
  WTTask* task = syncedTask();
  task->setName("Pending");
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
  if (c.resentClaiming >= 0) {
    ASSERT_EQ(sent("save").size(), 1);
    EXPECT_EQ(sent("save")[0].value("iteration").toLongLong(), c.resentClaiming);
    EXPECT_TRUE(sent("save")[0].value("data").toMap().value("u").toMap().contains(task->uuid()));
    EXPECT_FALSE(client.track().hasChanges());
    EXPECT_EQ(client.track().iteration(), 13);
  } else {
    EXPECT_EQ(server.requests.size(), setUpRequests + 1);  // the poll itself; nothing is resent
    EXPECT_TRUE(client.track().hasChanges());
    EXPECT_EQ(client.track().iteration(), iteration);
  }
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

// The next wait: none while off, the poll's, the retry's after a failure, the short one after a save.
TEST_F(RZSyncManagerTest, TheWaitBeforeTheNextPollFollowsWhatHappened) {
  RZSyncManager& manager = *client.manager;
  EXPECT_EQ(manager.scheduledInterval(), -1);  // off until enabled
  manager.setIntervals({60000, 70000, 80000});
  manager.enableSync();
  EXPECT_EQ(manager.scheduledInterval(), 60000);
  ASSERT_TRUE(waitUntil([&] { return client.idle(); }));
  server.handler = [](const HttpRequest&) { return LoopbackHttpServer::raw("not json"); };
  manager.sync();
  ASSERT_TRUE(waitUntil([&] { return client.idle(); }));
  EXPECT_EQ(manager.scheduledInterval(), 70000);
  auto* task = client.context->insertNewObject<WTTask>();
  task->setName("Saved");
  client.save();
  EXPECT_EQ(manager.scheduledInterval(), 80000);
  manager.disableSync();
  EXPECT_EQ(manager.scheduledInterval(), -1);
  // Disabled, a save still writes the journal, so the change goes out once syncing is on again.
  task->setName("While off");
  client.save();
  EXPECT_EQ(manager.scheduledInterval(), -1);
  EXPECT_TRUE(RZSyncTrack(client.journalPath()).entries(Section::Inserted).contains(task->uuid()));
}

// Failures in a row are shown once; a good reply ends the run and polling goes on by itself.
TEST_F(RZSyncManagerTest, PollingResumesAfterAGoodReplyFollowingFailures) {
  RZSyncManager& manager = *client.manager;
  manager.setIntervals({40, 80, 40});
  bool failing = true;
  server.handler = [&](const HttpRequest&) {
    return failing ? LoopbackHttpServer::raw("oops", 500) : headReply(1);
  };
  manager.enableSync();
  ASSERT_TRUE(waitUntil([&] { return server.requests.size() >= 3; }));
  EXPECT_EQ(client.presenter.networkErrors.size(), 1);
  EXPECT_TRUE(manager.hasNetworkError());
  failing = false;
  const qsizetype before = server.requests.size();
  ASSERT_TRUE(waitUntil([&] { return server.requests.size() >= before + 4; }, 3000));
  EXPECT_FALSE(manager.hasNetworkError());
  failing = true;
  ASSERT_TRUE(waitUntil([&] { return client.presenter.networkErrors.size() == 2; }, 3000));
}

// Every request names the installation, which keeps its identity and its journal across launches.
TEST_F(RZSyncManagerTest, DeviceAndJournalSurviveARestart) {
  WTTask* task = syncedTask();
  ASSERT_TRUE(client.syncOnce());
  const QString device = client.defaults->stringForKey("WTSyncDevice");
  EXPECT_FALSE(device.isEmpty());
  task->setName("Before quitting");
  client.save();
  const QString id = task->uuid();
  client.reopen();
  EXPECT_EQ(client.track().entry(Section::Updated, id).value("name"), "Before quitting");
  ASSERT_TRUE(client.syncOnce());
  ASSERT_EQ(sent("save").size(), 1);
  EXPECT_EQ(compact(sent("save")[0].value("data")),
            QString(R"({"i":{},"u":{"%1":{"name":"Before quitting"}},"x":[]})").arg(id));
  ASSERT_GE(server.requests.size(), 4);
  for (const HttpRequest& request : server.requests) EXPECT_EQ(request.json().value("device"), device);
  SyncClient other(server.address());
  EXPECT_NE(other.network().device(), device);
}

TEST_F(RZSyncManagerTest, NothingIsSentWithoutAServerAddress) {
  client.defaults->setValue("WTSyncServer", QVariant());
  client.manager->sync();
  QTest::qWait(100);
  EXPECT_TRUE(server.requests.isEmpty());
  EXPECT_TRUE(client.idle());
}

// When saving local edits fails, the reply is not merged and the next poll asks from the same iteration.
TEST_F(RZSyncManagerTest, NoMergeWhenLocalEditsCannotBeSaved) {
  WTTask* task = syncedTask();
  task->setName("Unsaved");
  int saves = 0;
  client.manager->setSaveHandler([&]() -> Result<void> {
    ++saves;
    return Error{1, QStringLiteral("disk full")};
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
    const QByteArray body = QByteArray::fromStdString(text);
    SCOPED_TRACE(body.toStdString());
    server.handler = [&](const HttpRequest&) { return LoopbackHttpServer::raw(body); };
    ASSERT_TRUE(client.syncOnce());
    EXPECT_TRUE(client.manager->hasNetworkError());
    EXPECT_EQ(client.track().iteration(), before);
    EXPECT_EQ(task->name(), "Design");
  }
  EXPECT_EQ(journalFile(), journalBefore);
  ASSERT_EQ(client.presenter.networkErrors.size(), 1);  // one run of failures, shown once
  EXPECT_TRUE(client.presenter.networkErrors[0].contains("not in the expected form"))
      << client.presenter.networkErrors[0].toStdString();
  EXPECT_TRUE(client.presenter.syncErrors.isEmpty());

  server.handler = [&](const HttpRequest&) { return headReply(before + 1); };
  ASSERT_TRUE(client.syncOnce());
  EXPECT_FALSE(client.manager->hasNetworkError());
  EXPECT_EQ(client.track().iteration(), before + 1);
}
