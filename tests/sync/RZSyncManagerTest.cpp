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

// Records, their owners, dates and money arrive as sent; a record named only as an owner is made, empty,
// under its identity. What came from the server is saved but not journaled, and the user cannot undo it.
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

// Local edits are saved (and journaled) before the server's changes arrive; the server's value of a key
// replaces a pending local one, which then is not sent; the rest is sent with the head's iteration.
// A cleared value arrives as null and clears it here.
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
  server.handler = [&](const HttpRequest& request) {
    if (request.json().value("action") == "save") return saveReply(6);
    return headReply(
        5, changeSet({}, {{id, QVariantMap{{"name", "Server name"}, {"budget", {}}, {"rate", {}}}}}));
  };
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

// The server's deletion takes the record's items here too. What was pending for the record itself is
// dropped; an item filed under it here only is deleted on the server with the next save (it may have
// been moved there only here, and then the server still has it elsewhere).
TEST_F(RZSyncManagerTest, ServerDeletionTakesOwnedRecordsHere) {
  WTTask* task = syncedTask();
  const QString taskId = task->uuid();
  task->setName("Renamed here");
  auto* note = client.context->insertNewObject<WTNote>();
  note->setTask(task);
  const QString noteId = note->uuid();
  client.save();
  server.handler = [&](const HttpRequest& request) {
    if (request.json().value("action") == "save") return saveReply(20);
    return headReply(10, changeSet({}, {}, {taskId, "Gone@WTNote"}));
  };
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

// A deletion still waiting to be sent wins: the merge neither brings the record back nor files
// anything under it, and the deletion goes out with the next save.
TEST_F(RZSyncManagerTest, PendingDeletionWinsOverTheMerge) {
  WTTask* task = syncedTask();
  WTProject* project = task->project();
  const QString taskId = task->uuid();
  const QString projectId = project->uuid();
  auto* kept = client.context->insertNewObject<WTTask>();
  kept->setProject(project);
  auto* movedItem = client.context->insertNewObject<WTNote>();
  movedItem->setTask(kept);
  movedItem->setStartDate(Date::fromSeconds(1700000000));
  auto* acme = client.context->insertNewObject<WTClient>();
  client.save();
  ASSERT_TRUE(client.syncOnce());
  setUpRequests = server.requests.size();
  const QString keptId = kept->uuid();
  const QString movedId = movedItem->uuid();
  const QString acmeId = acme->uuid();
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
  server.handler = [&](const HttpRequest& request) {
    if (request.json().value("action") == "save") return saveReply(31);
    return headReply(30, result);
  };
  ASSERT_TRUE(client.syncOnce());

  // Nothing is filed under the deleted task or client; the server takes care of what it has there once
  // the deletions arrive (it deletes or clears them and tells every device).
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
  EXPECT_TRUE(deleted.contains(taskId));
  EXPECT_TRUE(deleted.contains(acmeId));
  EXPECT_FALSE(client.track().hasChanges());
}

// Once a head is merged and saved the journal is at that head, even when the save that follows is
// refused: the next poll must not bring the same changes again.
TEST_F(RZSyncManagerTest, IterationMovesToTheMergedHeadBeforeTheSave) {
  WTTask* task = syncedTask();
  task->setName("Pending");
  server.handler = [&](const HttpRequest& request) {
    if (request.json().value("action") == "save") return errorReply("Poll head first", 4, 0);
    return headReply(9, changeSet({{"Other@WTTask", QVariantMap{{"name", "from elsewhere"}}}}));
  };
  ASSERT_TRUE(client.syncOnce());
  EXPECT_EQ(client.track().iteration(), 9);
  EXPECT_TRUE(client.track().hasChanges());
  EXPECT_EQ(RZSyncTrack(client.journalPath()).iteration(), 9);
  ASSERT_TRUE(client.syncOnce());
  const QList<QVariantMap> heads = sent("head");
  ASSERT_EQ(heads.size(), 2);
  EXPECT_EQ(heads[1].value("iteration").toLongLong(), 9);
}

// A save whose connection closes before any answer, however often it is tried, keeps the whole journal;
// what the user does while a save is on its way stays in the journal after the server confirms it.
TEST_F(RZSyncManagerTest, SavesInFlightKeepTheJournal) {
  WTTask* task = syncedTask();
  task->setName("First");
  task->setNotes("Notes");
  server.handler = [&](const HttpRequest& request) {
    return request.json().value("action") == "save" ? QByteArray() : headReply(head);
  };
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

// How a refusal is taken: a stale head (code 4) naming an iteration resends the journal claiming it, one
// naming none keeps the journal for the next poll, a reply without an iteration changes nothing, and any
// other code is shown once and switches syncing off.
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

// Which wait comes next: none while off, the poll's while all goes well, the retry's after a failure,
// the short one after a save.
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

// The merge waits until local edits are saved (and so journaled): when that save fails, the reply is
// left alone and the next poll asks again from the same iteration.
TEST_F(RZSyncManagerTest, NoMergeWhenLocalEditsCannotBeSaved) {
  WTTask* task = syncedTask();
  task->setName("Unsaved");
  int saves = 0;
  client.manager->setSaveHandler([&]() -> Result<void> {
    ++saves;
    return Error{1, QStringLiteral("disk full")};
  });
  const qint64 iteration = client.track().iteration();
  server.handler = [&](const HttpRequest& request) {
    if (request.json().value("action") == "save") return saveReply(51);
    return headReply(50, changeSet({{"New@WTTask", QVariantMap{{"name", "from elsewhere"}}}}));
  };
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

// A reply not of the protocol's exact shape is a failed exchange: shown once for the run of failures,
// retried, and nothing of it reaches the journal, its file or the store.
TEST_F(RZSyncManagerTest, RepliesOfTheWrongShapeFailAndLeaveTheJournalAlone) {
  WTTask* task = syncedTask();
  const qint64 before = client.track().iteration();
  QFile file(client.journalPath());
  ASSERT_TRUE(file.open(QIODevice::ReadOnly));
  const QByteArray journalFile = file.readAll();
  file.close();
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
  ASSERT_TRUE(file.open(QIODevice::ReadOnly));
  EXPECT_EQ(file.readAll(), journalFile);
  ASSERT_EQ(client.presenter.networkErrors.size(), 1);  // one run of failures, shown once
  EXPECT_TRUE(client.presenter.networkErrors[0].contains("not in the expected form"))
      << client.presenter.networkErrors[0].toStdString();
  EXPECT_TRUE(client.presenter.syncErrors.isEmpty());

  // The next good reply ends the run and is taken.
  server.handler = [&](const HttpRequest&) { return headReply(before + 1); };
  ASSERT_TRUE(client.syncOnce());
  EXPECT_FALSE(client.manager->hasNetworkError());
  EXPECT_EQ(client.track().iteration(), before + 1);
}
