#include "RZSyncManager.h"

#include "SyncTestSupport.h"
#include "WTClient.h"
#include "WTNote.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTTime.h"

#include <QSignalSpy>
#include <QUuid>

#include <fstream>

using namespace synctest;
using Section = RZSyncTrack::Section;

namespace {

QVariantMap json(const char* text) {
  return RZSyncJSON::parse(text).value_or(QVariant()).toMap();
}

// A scripted server and one installation on it.
struct Bench {
  // Answers heads with nothing new at `head` and saves with `head` + 1 unless a test says otherwise.
  Bench() {
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
  template <class T>
  T* make(const char* uuid, const char* name = nullptr) {
    T* object = client.context->insertNewObject<T>();
    object->setUuid(QString::fromLatin1(uuid));
    if (name) object->setName(name);
    return object;
  }
  // Task T "Design" in project P "Site", synced.
  WTTask* syncedTask() {
    auto* task = make<WTTask>("T@WTTask", "Design");
    task->setProject(make<WTProject>("P@WTProject", "Site"));
    synced();
    return task;
  }
  // `expected` holds a line "uuid set-values" (or "uuid (none)") for each record to compare.
  void expectRecords(const std::string& expected) {
    std::string actual;
    for (const QString& line : QString::fromStdString(expected).split('\n', Qt::SkipEmptyParts))
      actual += line.section(' ', 0, 0).toStdString() + " " +
                storedRecord(*client.context, line.section(' ', 0, 0)) + "\n";
    EXPECT_EQ(actual, expected);
  }

  qint64 head = 1;
  qsizetype setUpRequests = 0;
  LoopbackHttpServer server;
  SyncClient client{server.address()};
};

class RZSyncManagerTest : public ::testing::Test, public Bench {};

}  // namespace

TEST(RZSyncManagerEndpoint, ServerAddressBecomesTheEndpoint) {
  const std::pair<const char*, const char*> cases[] = {
      {"sync.example.org", "https://sync.example.org/sync/tessal/sync.php"},
      {"  sync.example.org:8443 ", "https://sync.example.org:8443/sync/tessal/sync.php"},
      {"http://127.0.0.1:8080/", "http://127.0.0.1:8080/sync/tessal/sync.php"},
      {"https://example.org/tessal/", "https://example.org/tessal/sync/tessal/sync.php"},
      // clang-format off
      {"", ""}, {"ftp://example.org", ""}, {"https://", ""}, {"https://example.org/?a=b", ""}};
  // clang-format on
  for (const auto& [server, endpoint] : cases)
    EXPECT_EQ(RZSyncManager::endpointURL(QString::fromLatin1(server)).toString(), endpoint) << server;
}

// Records arrive as sent, owners named only made empty; saved, not journaled, not undoable.
TEST_F(RZSyncManagerTest, HeadResultIsMergedByUuidWithRelationshipsDatesAndMoney) {
  const std::string records = R"(C@WTClient {"name":"Acme"}
P@WTProject {"client":"C@WTClient","name":"Site","rate":80.50,"tasks":["T2@WTTask","T1@WTTask"]}
T1@WTTask {"budget":1200.00,"name":"One","project":"P@WTProject"}
T2@WTTask {"name":"Two","project":"P@WTProject"}
E@WTTime {"endDate":1700003600,"startDate":1700000000,"task":"T1@WTTask"}
X@WTExpense {"expense":12.30,"startDate":1700000000,"task":"T1@WTTask"}
N@WTNote {"color":"#80ff0000","name":"Filed under a task not sent","startDate":1700000000,"task":"T3@WTTask"}
T3@WTTask {}
)";
  QVariantMap updated;  // every record under both sections, as the server sends them
  for (const QString& line : QString::fromStdString(records).split('\n', Qt::SkipEmptyParts))
    if (!line.startsWith("T3@")) updated.insert(line.section(' ', 0, 0), json(line.section(' ', 1).toUtf8()));
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
  expectRecords(records);
}

// A server value or deletion beats a pending change here; a pending deletion beats the merge.
TEST(RZSyncManagerMerge, ServerAndPendingChanges) {
  const struct {
    const char* what;
    std::function<void(Bench&, WTTask*)> local;  // on a synced T in P
    const char *result, *records, *sent;         // the head's change set, records afterwards, the save's data
    const char* told = "";                       // what the user is told
  } rows[] = {
      {"ServerValueWinsOverAPendingKey",
       [](Bench& t, WTTask* task) {
         task->setBudget(dec("500.00"));
         task->setRate(dec("90.00"));
         auto* note = t.make<WTNote>("N@WTNote");
         note->setTask(task);
         note->setStartDate(Date::fromSeconds(1700000000));
         t.synced();
         task->setName("Local name");
         task->setNotes("Local notes");  // not saved yet: the poll saves it first
         note->setName("PO 4711");
       },
       R"({"u":{"T@WTTask":{"name":"Server name","budget":null,"rate":null},"N@WTNote":{"name":"PO 4712"}}})",
       R"(T@WTTask {"name":"Server name","notes":"Local notes","project":"P@WTProject"}
N@WTNote {"name":"PO 4712","startDate":1700000000,"task":"T@WTTask"}
)",
       R"({"i":{},"u":{"T@WTTask":{"notes":"Local notes"}},"x":[]})",
       "Changes made here to “Local name” (now “Server name”), “PO 4711” (now “PO 4712”) were replaced by "
       "ones made on another device."},
      {"ServerDeletionTakesOwnedRecordsHere",
       [](Bench& t, WTTask* task) {
         auto* note = t.make<WTNote>("N@WTNote");
         note->setTask(t.make<WTTask>("K@WTTask"));
         t.synced();
         task->setName("Renamed here");
         note->setTask(task);  // moved here only: the server deletes it elsewhere
       },
       R"({"x":["T@WTTask","Gone@WTNote"]})", "T@WTTask (none)\nN@WTNote (none)\n",
       R"({"u":{"K@WTTask":{},"N@WTNote":{"task":"T@WTTask"}},"x":["N@WTNote"]})",
       "Changes made here to an item of “Renamed here”, “Renamed here” went with records deleted on another "
       "device."},
      {"PendingDeletionWinsOverTheMerge",
       [](Bench& t, WTTask* task) {
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
       R"({"i":{"New@WTTime":{"task":"T@WTTask","startDate":1700000000,"endDate":1700000060},)"
       R"("Deeper@WTNote":{"task":"NewTask@WTTask","startDate":1700000000},)"
       R"("NewTask@WTTask":{"project":"P@WTProject","name":"fine"},"P2@WTProject":{"client":"A@WTClient",)"
       R"("name":"Outlives its client"}},"u":{"T@WTTask":{"name":"Renamed elsewhere"},"M@WTNote":{"task":"T@WTTask"},)"
       R"("P@WTProject":{"tasks":["T@WTTask","K@WTTask"]}}})",
       R"(T@WTTask (none)
A@WTClient (none)
New@WTTime {"endDate":1700000060,"startDate":1700000000}
M@WTNote {"startDate":1700000000,"task":"K@WTTask"}
P@WTProject {"name":"Site","tasks":["K@WTTask","NewTask@WTTask"]}
NewTask@WTTask {"name":"fine","project":"P@WTProject"}
Deeper@WTNote {"startDate":1700000000,"task":"NewTask@WTTask"}
P2@WTProject {"name":"Outlives its client"}
)",
       R"({"i":{},"u":{},"x":["A@WTClient","T@WTTask"]})"},
      {"TheServerKeepsWorkTheDeletingDeviceNeverSaw",
       [](Bench& t, WTTask* task) {
         auto* note = t.make<WTNote>("N@WTNote");
         note->setTask(task);
         note->setStartDate(Date::fromSeconds(1700000000));
         t.synced();
         t.make<WTClient>("K@WTClient");
       },
       R"({"i":{"P~7@WTProject":{"name":"Site","tasks":["T~7@WTTask"]},"T~7@WTTask":{"name":"Design",)"
       R"("project":"P~7@WTProject"}},"u":{"N@WTNote":{"task":"T~7@WTTask"}},"x":["T@WTTask","P@WTProject"]})",
       R"(T@WTTask (none)
P@WTProject (none)
N@WTNote {"startDate":1700000000,"task":"T~7@WTTask"}
P~7@WTProject {"name":"Site","tasks":["T~7@WTTask"]}
T~7@WTTask {"name":"Design","project":"P~7@WTProject"}
)",
       R"({"i":{"K@WTClient":{"archived":false,"uuid":"K@WTClient"}},"u":{},"x":[]})",
       "“Site” was deleted on one device while another added work to it; the work is kept, in a new “Site”."},
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.what);
    Bench t;
    row.local(t, t.syncedTask());
    const QVariantMap result = json(row.result);
    t.answer(headReply(5, changeSet(result["i"].toMap(), result["u"].toMap(), result["x"].toStringList())),
             saveReply(6));
    ASSERT_TRUE(t.client.syncOnce());
    t.expectRecords(row.records);
    ASSERT_EQ(t.sent("save").size(), 1);
    const QVariantMap data = t.sent("save")[0].value("data").toMap();
    EXPECT_EQ(compact(row.sent[2] == 'u' ? QVariantMap{{"u", data["u"]}, {"x", data["x"]}} : data), row.sent);
    EXPECT_EQ(t.sent("save")[0].value("iteration").toLongLong(), 5);
    EXPECT_FALSE(t.client.track().hasChanges());
    EXPECT_EQ(t.client.track().iteration(), 6);
    EXPECT_EQ(t.client.presenter.mergeNotices.join('\n').toStdString(), row.told);
  }
}

// Work added here that the deleting device never saw outlives the deletion elsewhere: under copies of its
// owners, or under what the other device made again by the same name, unless the two bill differently.
TEST(RZSyncKeptWork, WorkAddedHereOutlivesItsOwnersDeletionElsewhere) {
  for (const char* rate : {"", "null", "99.00"}) {  // "": nothing made again
    SCOPED_TRACE(rate);
    Bench t;
    WTTask* task = t.syncedTask();
    task->project()->setRate(dec("80.00"));
    t.synced();
    t.make<WTNote>("E@WTNote")->setTask(task);
    auto* added = t.make<WTTask>("K@WTTask", "Added");
    added->setProject(task->project());
    t.make<WTNote>("N@WTNote")->setTask(added);
    const QString again = QStringLiteral(R"({"P2@WTProject":{"name":"site","rate":%1,"tasks":["T2@WTTask"]},)"
                                         R"("T2@WTTask":{"name":"Design","project":"P2@WTProject"}})")
                              .arg(rate);
    // The deletions as the server orders them.
    t.answer(headReply(
                 5, changeSet(*rate ? json(again.toUtf8()) : QVariantMap(), {}, {"T@WTTask", "P@WTProject"})),
             saveReply(6));
    ASSERT_TRUE(t.client.syncOnce());
    WTTask* into = t.client.find<WTNote>("E@WTNote")->task();
    ASSERT_TRUE(into && into->project() && into->project() == added->project());
    EXPECT_EQ(t.client.find<WTNote>("N@WTNote")->task(), added);
    EXPECT_FALSE(t.client.find<WTTask>("T@WTTask") || t.client.find<WTProject>("P@WTProject"));
    ASSERT_EQ(t.sent("save").size(), 1);
    const QVariantMap data = t.sent("save")[0].value("data").toMap(), inserted = data["i"].toMap();
    EXPECT_TRUE(data["x"].toList().isEmpty());
    const std::string told = t.client.presenter.mergeNotices.join('\n').toStdString();
    if (QByteArray(rate) == "null") {  // the project made again takes the task added here into its order
      EXPECT_EQ(into->uuid(), "T2@WTTask");
      EXPECT_EQ(t.client.context->fetch<WTProject>().size(), 1);
      EXPECT_EQ(compact(data["u"].toMap()["P2@WTProject"]), R"({"tasks":["T2@WTTask","K@WTTask"]})");
      EXPECT_EQ(
          told,
          "3 records added here to “site” after it was deleted on another device, and made again there, "
          "are kept in the new “site”.");
      continue;
    }
    EXPECT_EQ(t.client.context->fetch<WTProject>().size(), *rate ? 2 : 1);
    EXPECT_EQ(into->name(), "Design");
    EXPECT_EQ(into->project()->name(), "Site");
    EXPECT_EQ(into->project()->storedRate(), dec("80.00"));
    EXPECT_EQ(QSet<QString>(inserted.keyBegin(), inserted.keyEnd()),
              QSet<QString>({"E@WTNote", "K@WTTask", "N@WTNote", into->uuid(), into->project()->uuid()}));
    EXPECT_EQ(inserted[into->project()->uuid()].toMap()["tasks"], QVariantList({into->uuid(), "K@WTTask"}));
    EXPECT_EQ(
        told,
        "3 records added here to “Site” after it was deleted on another device are kept, in a new “Site”.");
  }
}

// The same file imported, or the same names made, on two devices before either synced meet as one.
TEST_F(RZSyncManagerTest, RecordsMadeOnTwoDevicesBeforeEitherSyncedMeetAsOne) {
  auto* task = make<WTTask>("T2@WTTask", "Design");
  task->setProject(make<WTProject>("P2@WTProject", "Dune"));
  task->project()->setClient(make<WTClient>("C2@WTClient", "Delta"));
  make<WTProject>("Solo@WTProject", "Solo")->setClient(task->project()->client());
  task->project()->setRate(dec("95.00"));  // typed here before the sync: it carries over
  for (const char* uuid : {"E1@WTTime", "E2@WTTime", "E3@WTTime"}) {
    auto* entry = make<WTTime>(uuid);
    entry->setTask(task);
    if (uuid[1] == '3') continue;
    entry->setImportId(QStringLiteral("csv:%1").arg(uuid[1]));
    entry->setStartDate(Date::fromSeconds(1700000000));
    entry->setEndDate(Date::fromSeconds(1700003600));
  }
  client.find<WTTime>("E2@WTTime")->setName("PO 4711");
  make<WTClient>("Apart@WTClient", "Tyrell")->setRate(dec("150.00"));  // billing otherwise: kept apart
  answer(
      headReply(
          5, changeSet(json(R"({"C1@WTClient":{"name":"delta"},"T9@WTClient":{"name":"Tyrell","rate":80.00},
    "P1@WTProject":{"name":"Dune","client":"C1@WTClient"},"T1@WTTask":{"name":"Design","project":"P1@WTProject"},
    "R1@WTTime":{"task":"T1@WTTask","importId":"csv:1","startDate":1700000000,"endDate":1700003600},
    "R2@WTTime":{"task":"T1@WTTask","importId":"csv:2","startDate":1700000000,"endDate":1700003600}})"))),
      saveReply(6));
  ASSERT_TRUE(client.syncOnce());
  expectRecords(R"(C1@WTClient {"name":"delta"}
Solo@WTProject {"client":"C1@WTClient","name":"Solo"}
P1@WTProject {"client":"C1@WTClient","name":"Dune","rate":95.00,"tasks":["T1@WTTask"]}
R2@WTTime {"endDate":1700003600,"importId":"csv:2","name":"PO 4711","startDate":1700000000,"task":"T1@WTTask"}
Apart@WTClient {"name":"Tyrell","rate":150.00}
C2@WTClient (none)
P2@WTProject (none)
T2@WTTask (none)
E1@WTTime (none)
)");
  EXPECT_TRUE(client.find<WTTime>("E3@WTTime") &&
              client.find<WTTime>("E3@WTTime")->task()->uuid() == "T1@WTTask");
  ASSERT_EQ(sent("save").size(), 1);
  const QVariantMap data = sent("save")[0].value("data").toMap();
  const QVariantMap inserted = data["i"].toMap();
  EXPECT_EQ(
      compact(QVariantList{inserted.keys(), data["x"], inserted["E3@WTTime"].toMap()["task"],
                           inserted["Solo@WTProject"].toMap()["client"]}),
      R"([["Apart@WTClient","E3@WTTime","Solo@WTProject"],["C2@WTClient","P2@WTProject","T2@WTTask","E1@WTTime","E2@WTTime"],)"
      R"("T1@WTTask","C1@WTClient"])");
  EXPECT_EQ(compact(QVariantList{data["u"].toMap()["R2@WTTime"],
                                 data["u"].toMap()["P1@WTProject"].toMap()["rate"]}),
            R"([{"name":"PO 4711"},95.00])");
  EXPECT_EQ(client.presenter.mergeNotices.join('\n').toStdString(),
            "“Tyrell”: made on this device and on another before they synced, billing differently; both are "
            "kept.\nan item of “Design”, “Dune”: made on this device and on another before they synced, each "
            "is one "
            "record now, with the values set here.");
}

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

// A save without answer keeps the journal; edits made while one is on its way outlive its reply, a relaunch.
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
  const std::string pending =
      R"({"i":{"N@WTNote":{"archived":false,"startDate":1700000000,"task":"T@WTTask","uuid":"N@WTNote"}},"u":{"T@WTTask":{"name":"Second"}},"x":[]})";
  EXPECT_EQ(storedJournal(client.storePath()), "4 " + pending);

  const QString device = client.defaults->stringForKey("WTSyncDevice");
  client.reopen();
  setUpRequests = server.requests.size();
  answer(headReply(4), saveReply(5));
  ASSERT_TRUE(client.syncOnce());
  ASSERT_EQ(sent("save").size(), 1);
  EXPECT_EQ(compact(sent("save")[0].value("data")), pending);
  for (const HttpRequest& request : server.requests) EXPECT_EQ(request.json().value("device"), device);
  EXPECT_FALSE(device.isEmpty());
  EXPECT_NE(SyncClient(server.address()).network().device(), device);
  // Without settings to keep them in, a manager makes a device of its own anyway and has no server.
  WTObjectContext bare;
  const RZSyncManager alone(&bare);
  EXPECT_FALSE(QUuid(alone.syncNetwork()->device()).isNull());
  EXPECT_NE(alone.syncNetwork()->device(), device);
  EXPECT_TRUE(alone.configuredEndpoint().isEmpty() && alone.syncNetwork()->url().isEmpty());
  const qsizetype requests = server.requests.size();
  client.defaults->setValue("WTSyncServer", QVariant());
  client.manager->sync();
  QTest::qWait(100);
  EXPECT_EQ(server.requests.size(), requests);
  EXPECT_TRUE(client.idle());
}

// Stale head (code 4): with an iteration resend claiming it, without keep the journal; others stop syncing.
TEST(RZSyncManagerRefusal, IsTakenByItsKind) {
  const struct {
    QByteArray answer;      // to the first request; later heads find nothing new and saves are confirmed
    qint64 resentClaiming;  // the iteration the resent journal claims; -1 when nothing is resent
    const char* shown;      // the sync error shown, if any
  } rows[] = {
      {errorReply("Try iteration 12", 4, 12), 12, nullptr},
      {errorReply("Poll head first", 4, 0), -1, nullptr},
      {LoopbackHttpServer::json(QVariantMap{{"action", "save"}}), -1, nullptr},
      {errorReply("Wrong e-mail address or password.", 2), -1,
       "Wrong e-mail address or password. - (Code: 2)"},
  };
  for (const auto& c : rows) {
    SCOPED_TRACE(c.answer.toStdString());
    Bench t;
    t.syncedTask()->setName("Pending");
    t.client.save();
    const qint64 iteration = t.client.track().iteration();
    t.server.handler = [&](const HttpRequest& request) {
      if (t.server.requests.size() == t.setUpRequests + 1) return c.answer;
      return request.json().value("action") == "save" ? saveReply(13) : headReply(13);
    };
    QSignalSpy status(t.client.manager.get(), &RZSyncManager::syncStatusDidChange);
    t.client.manager->setIntervals({60000, 60000, 60000});
    t.client.manager->enableSync();
    ASSERT_TRUE(waitUntil([&] { return t.server.requests.size() > t.setUpRequests && t.client.idle(); }));
    const bool resent = c.resentClaiming >= 0;
    ASSERT_EQ(t.server.requests.size(), t.setUpRequests + (resent ? 2 : 1));
    EXPECT_TRUE(!resent || (t.sent("save")[0].value("iteration").toLongLong() == c.resentClaiming &&
                            t.sent("save")[0].value("data").toMap().value("u").toMap().contains("T@WTTask")));
    EXPECT_EQ(t.client.track().hasChanges(), !resent);
    EXPECT_EQ(t.client.track().iteration(), resent ? 13 : iteration);
    EXPECT_EQ(t.client.presenter.syncErrors, c.shown ? QStringList{c.shown} : QStringList{});
    EXPECT_EQ(t.client.manager->syncEnabled(), !c.shown);
    EXPECT_EQ(t.client.manager->scheduledInterval(), c.shown ? -1 : 60000);
    EXPECT_EQ(status.count(), c.shown ? 2 : 1);  // on, then off
  }
}

// The next wait follows what happened; failures in a row are shown once, a good reply ends the run.
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
  EXPECT_NE(storedJournal(client.storePath()).find("S@WTTask"), std::string::npos);

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
  EXPECT_EQ(client.presenter.recoveries, 1);
  // A new run of failures is shown once, though polls go on failing while its box is on screen.
  client.presenter.answersAfterMs = 300;
  failing = true;
  const qsizetype shown = server.requests.size();
  ASSERT_TRUE(waitUntil([&] { return server.requests.size() >= shown + 4; }, 3000));
  EXPECT_EQ(client.presenter.networkErrors.size(), 2);
}

// The iteration moves with a merged head only: not when local edits cannot be saved first (nothing is
// merged then), and still when the save after the merge is refused.
TEST_F(RZSyncManagerTest, IterationMovesWithAMergedHeadOnly) {
  syncedTask()->setName("Unsaved");
  int saves = 0;
  client.manager->setSaveHandler([&]() -> Result<void> { return ++saves, Error{1, "disk full"}; });
  const qint64 iteration = client.track().iteration();
  answer(headReply(50, changeSet({{"New@WTTask", QVariantMap{{"name", "from elsewhere"}}}})),
         errorReply("Poll head first", 4, 0));
  ASSERT_TRUE(client.syncOnce());
  EXPECT_EQ(saves, 1);
  EXPECT_EQ(client.find<WTTask>("New@WTTask"), nullptr);
  EXPECT_EQ(synctest::StoredJournal(client.storePath()).track.iteration(), iteration);
  client.manager->setSaveHandler({});
  ASSERT_TRUE(client.syncOnce());
  EXPECT_NE(client.find<WTTask>("New@WTTask"), nullptr);
  EXPECT_TRUE(client.track().hasChanges());
  EXPECT_EQ(synctest::StoredJournal(client.storePath()).track.iteration(), 50);
  ASSERT_TRUE(client.syncOnce());
  const QList<QVariantMap> heads = sent("head");
  ASSERT_EQ(heads.size(), 3);
  EXPECT_EQ(heads[1].value("iteration").toLongLong(), iteration);
  EXPECT_EQ(heads[2].value("iteration").toLongLong(), 50);
  EXPECT_EQ(sent("save").size(), 2);  // refused both times
}

// A reply of the wrong shape fails (shown once per run of failures) and reaches neither journal nor store.
TEST_F(RZSyncManagerTest, RepliesOfTheWrongShapeFailAndLeaveTheJournalAlone) {
  WTTask* task = syncedTask();
  const qint64 before = client.track().iteration();
  const std::string journalBefore = storedJournal(client.storePath());
  ASSERT_NE(journalBefore, "0 " + compact(changeSet()));
  std::ifstream bad(TESSAL_TEST_DATA_DIR "/sync-bad-replies.txt");
  int replies = 0;
  for (std::string text; std::getline(bad, text);) {
    if (text.empty() || text[0] == '#') continue;
    ++replies;
    server.handler = [&](const HttpRequest&) {
      return LoopbackHttpServer::raw(QByteArray::fromStdString(text));
    };
    ASSERT_TRUE(client.syncOnce());
    EXPECT_TRUE(client.manager->hasNetworkError()) << text;
    EXPECT_EQ(client.track().iteration(), before) << text;
    EXPECT_EQ(task->name(), "Design") << text;
  }
  EXPECT_EQ(replies, 20);
  EXPECT_EQ(storedJournal(client.storePath()), journalBefore);
  ASSERT_EQ(client.presenter.networkErrors.size(), 1);  // one run of failures, shown once
  EXPECT_TRUE(client.presenter.networkErrors[0].contains("not in the expected form"));
  EXPECT_TRUE(client.presenter.syncErrors.isEmpty());
  server.handler = [&](const HttpRequest&) { return headReply(before + 1); };
  ASSERT_TRUE(client.syncOnce());
  EXPECT_FALSE(client.manager->hasNetworkError());
  EXPECT_EQ(client.track().iteration(), before + 1);
}
