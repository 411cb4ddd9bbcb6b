// How iterations, devices and deletes make concurrent clients of one account converge: each known
// hazard, reproduced with the requests such a client sends.
#include "ServerTestSupport.h"

#include <algorithm>
#include <thread>

namespace servertest {
namespace {

// The JSON text of one field of a record in a reply's section; "absent" when it is not there.
std::string field(const Reply& reply, const char* section, const std::string& uuid, const char* name) {
  const JsonValue* result = reply["result"];
  const JsonValue* records = result ? result->find(section) : nullptr;
  const JsonValue* record = records ? records->find(uuid) : nullptr;
  if (!record) return "absent";
  const JsonValue* value = record->find(name);
  return value ? value->dump() : "absent";
}

bool hasRecord(const Reply& reply, const char* section, const std::string& uuid) {
  const JsonValue* result = reply["result"];
  const JsonValue* records = result ? result->find(section) : nullptr;
  return records && records->find(uuid);
}

std::vector<std::string> deleted(const Reply& reply) {
  std::vector<std::string> uuids;
  const JsonValue* result = reply["result"];
  if (const JsonValue* x = result ? result->find("x") : nullptr) {
    for (const JsonValue& uuid : x->elements()) uuids.push_back(uuid.text());
  }
  std::sort(uuids.begin(), uuids.end());
  return uuids;
}

using Uuids = std::vector<std::string>;

class SyncIterationTest : public ServerTest {
 protected:
  void SetUp() override {
    ServerTest::SetUp();
    if (IsSkipped()) return;
    startServer();
    user = newUser("iterations");
  }

  int64_t saveOk(int64_t base, const std::string& device, const std::string& data) {
    const Reply reply = save(user, base, device, data);
    EXPECT_EQ(reply.code(), 0) << reply.body;
    EXPECT_EQ(reply["action"] ? reply["action"]->text() : "", "save") << reply.body;
    return reply.integer("iteration");
  }
  // Everything the account holds, as a device that has never synced sees it.
  Reply everything() { return head(user, 0, "observer"); }

  std::string user;
};

TEST_P(SyncIterationTest, AStaleSaveIsKeptAndItsSenderStillGetsWhatOthersDid) {
  ASSERT_EQ(saveOk(0, "A", R"({"i":{"c@WTClient":{"name":"first"}}})"), 1);
  ASSERT_EQ(head(user, 0, "B").integer("iteration"), 1);
  ASSERT_EQ(saveOk(1, "B", R"({"u":{"c@WTClient":{"name":"by B"}}})"), 2);

  // A saves on top of iteration 1 without knowing B's change: it is kept, and A's base stays at 1.
  EXPECT_EQ(saveOk(1, "A", R"({"u":{"c@WTClient":{"notes":"by A"}}})"), 1);
  const Reply forA = head(user, 1, "A");
  EXPECT_EQ(forA.integer("iteration"), 3);
  EXPECT_EQ(field(forA, "u", "c@WTClient", "name"), "\"by B\"");
  EXPECT_EQ(field(forA, "u", "c@WTClient", "notes"), "absent") << "A's own change is not sent back";

  const Reply forB = head(user, 2, "B");
  EXPECT_EQ(forB.integer("iteration"), 3);
  EXPECT_EQ(field(forB, "u", "c@WTClient", "notes"), "\"by A\"");
  EXPECT_EQ(field(forB, "u", "c@WTClient", "name"), "absent");

  // A save on top of the head moves the sender to its own new iteration.
  EXPECT_EQ(saveOk(3, "A", R"({"u":{"c@WTClient":{"notes":"again"}}})"), 4);
}

TEST_P(SyncIterationTest, ADeviceNeverGetsItsOwnChangesBack) {
  ASSERT_EQ(saveOk(0, "A", R"({"i":{"c@WTClient":{"name":"mine","notes":"mine too"}}})"), 1);
  // The reply was lost: A polls from its old base and must not get its (possibly edited since) values.
  const Reply lost = head(user, 0, "A");
  EXPECT_EQ(lost.integer("iteration"), 1);
  EXPECT_EQ(lost["result"]->dump(), R"({"i":{},"u":{},"x":[]})");

  ASSERT_EQ(saveOk(1, "B", R"({"u":{"c@WTClient":{"notes":"B's"}}})"), 2);
  const Reply later = head(user, 0, "A");
  EXPECT_EQ(field(later, "u", "c@WTClient", "notes"), "\"B's\"");
  EXPECT_EQ(field(later, "u", "c@WTClient", "name"), "absent");
  // Another device gets both.
  EXPECT_EQ(field(head(user, 0, "C"), "i", "c@WTClient", "name"), "\"mine\"");
}

TEST_P(SyncIterationTest, AClientWithoutDeviceMustCatchUpBeforeItSaves) {
  ASSERT_EQ(saveOk(0, "", R"({"i":{"c@WTClient":{"name":"old"}}})"), 1);
  ASSERT_EQ(saveOk(1, "B", R"({"u":{"c@WTClient":{"name":"B's"}}})"), 2);

  // Its reply could not leave out its own changes, so a stale save is refused: code 4 with iteration 0
  // (the client logs, keeps its journal and polls "head").
  const Reply refused = save(user, 1, "", R"({"u":{"c@WTClient":{"notes":"lost?"}}})");
  EXPECT_EQ(refused.code(), 4);
  EXPECT_EQ(refused.integer("iteration"), 0);
  EXPECT_FALSE(refused["action"]);
  EXPECT_EQ(everything().integer("iteration"), 2);
  EXPECT_EQ(field(everything(), "i", "c@WTClient", "notes"), "absent");

  const Reply caughtUp = head(user, 1, "");
  EXPECT_EQ(caughtUp.integer("iteration"), 2);
  EXPECT_EQ(field(caughtUp, "u", "c@WTClient", "name"), "\"B's\"");
  EXPECT_EQ(saveOk(2, "", R"({"u":{"c@WTClient":{"notes":"kept"}}})"), 3);
  // Without a device everything newer than the base comes, its own changes included.
  EXPECT_EQ(field(head(user, 2, ""), "u", "c@WTClient", "notes"), "\"kept\"");
}

TEST_P(SyncIterationTest, EveryRecordComesUnderBothSections) {
  ASSERT_EQ(saveOk(0, "A", R"({"i":{"c@WTClient":{"name":"new"}},"u":{"p@WTProject":{"name":"changed"}}})"),
            1);
  const Reply reply = head(user, 0, "B");
  ASSERT_TRUE(reply["result"]);
  EXPECT_EQ(reply["result"]->find("i")->dump(), reply["result"]->find("u")->dump());
  EXPECT_EQ(field(reply, "u", "c@WTClient", "name"), "\"new\"");
  EXPECT_EQ(field(reply, "i", "p@WTProject", "name"), "\"changed\"");
}

TEST_P(SyncIterationTest, NothingWrittenToADeletedRecordComesBack) {
  ASSERT_EQ(saveOk(0, "A", R"({"i":{"t@WTTask":{"name":"doomed"}}})"), 1);
  ASSERT_EQ(saveOk(1, "B", R"({"x":["t@WTTask"]})"), 2);
  // A, unaware, edits and even re-inserts it; B deletes a record nobody ever sent.
  saveOk(1, "A", R"({"i":{"t@WTTask":{"name":"revived","notes":"fragment"}},"u":{"t@WTTask":{"budget":5}}})");
  saveOk(2, "B", R"({"x":["never-seen@WTNote"]})");
  saveOk(1, "A", R"({"i":{"never-seen@WTNote":{"name":"late insert"}}})");

  const Reply all = everything();
  EXPECT_FALSE(hasRecord(all, "i", "t@WTTask")) << all.body;
  EXPECT_FALSE(hasRecord(all, "i", "never-seen@WTNote")) << all.body;
  EXPECT_EQ(deleted(all), (Uuids{"never-seen@WTNote", "t@WTTask"}));
  const Reply forA = head(user, 1, "A");
  EXPECT_FALSE(hasRecord(forA, "u", "t@WTTask"));
  EXPECT_EQ(deleted(forA), (Uuids{"never-seen@WTNote", "t@WTTask"}));
}

TEST_P(SyncIterationTest, AnItemFiledUnderADeletedTaskIsDeletedForEveryone) {
  ASSERT_EQ(
      saveOk(0, "A", R"({"i":{"p@WTProject":{"tasks":["t@WTTask"]},"t@WTTask":{"project":"p@WTProject"}}})"),
      1);
  ASSERT_EQ(saveOk(1, "B", R"({"x":["t@WTTask"],"u":{"p@WTProject":{"tasks":[]}}})"), 2);
  // A files an entry under the task B deleted meanwhile.
  const int64_t base = saveOk(1, "A", R"({"i":{"e@WTTime":{"task":"t@WTTask","startDate":1700000000}}})");
  EXPECT_EQ(base, 1);

  const Reply forA = head(user, base, "A");
  EXPECT_EQ(deleted(forA), (Uuids{"e@WTTime", "t@WTTask"})) << "the sender learns its entry is gone";
  EXPECT_FALSE(hasRecord(forA, "i", "e@WTTime"));
  const Reply forB = head(user, 2, "B");
  EXPECT_EQ(deleted(forB), (Uuids{"e@WTTime"}));
  EXPECT_FALSE(hasRecord(forB, "i", "e@WTTime")) << forB.body;
  EXPECT_EQ(deleted(everything()), (Uuids{"e@WTTime", "t@WTTask"}));
}

TEST_P(SyncIterationTest, DeletingAProjectReachesEverythingFiledUnderIt) {
  ASSERT_EQ(saveOk(0, "A",
                   R"({"i":{"p@WTProject":{"tasks":["t1@WTTask","t2@WTTask"]},)"
                   R"("t1@WTTask":{"project":"p@WTProject"},"t2@WTTask":{"project":"p@WTProject"},)"
                   R"("e@WTTime":{"task":"t1@WTTask"},"n@WTNote":{"task":"t2@WTTask"},)"
                   R"("other@WTTask":{"name":"elsewhere"}}})"),
            1);
  // B had not seen the tasks and items yet; its delete names the project only.
  const int64_t base = saveOk(0, "B", R"({"x":["p@WTProject"]})");
  EXPECT_EQ(base, 0);

  const Uuids filedUnder{"e@WTTime", "n@WTNote", "t1@WTTask", "t2@WTTask"};
  const Reply forB = head(user, base, "B");
  EXPECT_EQ(deleted(forB), filedUnder) << "the deleter gets what the server deleted on its behalf";
  EXPECT_TRUE(hasRecord(forB, "i", "other@WTTask"));
  EXPECT_FALSE(hasRecord(forB, "i", "t1@WTTask"));
  const Reply forA = head(user, 1, "A");
  Uuids all = filedUnder;
  all.insert(all.begin() + 2, "p@WTProject");
  EXPECT_EQ(deleted(forA), all);
  EXPECT_EQ(forA["result"]->find("i")->dump(), "{}");
}

TEST_P(SyncIterationTest, ProjectsOutliveTheirClientWithTheOwnerCleared) {
  ASSERT_EQ(saveOk(0, "A", R"({"i":{"c@WTClient":{"name":"C"},"p@WTProject":{"client":"c@WTClient"}}})"), 1);
  ASSERT_EQ(saveOk(1, "B", R"({"x":["c@WTClient"]})"), 2);
  EXPECT_EQ(everything().integer("iteration"), 3) << "the cleared owner is the server's change, after B's";
  for (const auto& [device, base] : {std::pair<const char*, int64_t>{"A", 1}, {"B", 2}}) {
    const Reply reply = head(user, base, device);
    EXPECT_EQ(field(reply, "u", "p@WTProject", "client"), "null") << device;
  }
  // Filing a project under the deleted client afterwards clears it the same way.
  ASSERT_EQ(saveOk(1, "C", R"({"i":{"q@WTProject":{"client":"c@WTClient","name":"Q"}}})"), 1);
  const Reply forC = head(user, 1, "C");
  EXPECT_EQ(field(forC, "u", "q@WTProject", "client"), "null");
  EXPECT_EQ(field(forC, "u", "q@WTProject", "name"), "absent");
  EXPECT_EQ(field(everything(), "i", "q@WTProject", "name"), "\"Q\"");
}

TEST_P(SyncIterationTest, TheTaskOrderListsExactlyTheTasksFiledUnderTheProject) {
  ASSERT_EQ(saveOk(0, "A",
                   R"({"i":{"p@WTProject":{"tasks":["t1@WTTask","t2@WTTask"]},"q@WTProject":{},)"
                   R"("t1@WTTask":{"project":"p@WTProject"},"t2@WTTask":{"project":"p@WTProject"}}})"),
            1);
  // B adds a task without sending the project's order: it is appended, and B hears of it as well.
  const int64_t b = saveOk(1, "B", R"({"i":{"t3@WTTask":{"project":"p@WTProject"}}})");
  EXPECT_EQ(field(head(user, b, "B"), "u", "p@WTProject", "tasks"),
            R"(["t1@WTTask","t2@WTTask","t3@WTTask"])");
  // C moves t1 to the other project, naming neither order.
  saveOk(0, "C", R"({"u":{"t1@WTTask":{"project":"q@WTProject"}}})");
  // A stale reorder that still lists the moved task: that entry drops out.
  saveOk(1, "A", R"({"u":{"p@WTProject":{"tasks":["t3@WTTask","t1@WTTask","t2@WTTask"]}}})");
  // A delete takes the task out of the order too.
  saveOk(0, "D", R"({"i":{"t4@WTTask":{"project":"p@WTProject"}},"x":["t2@WTTask"]})");

  const Reply all = everything();
  EXPECT_EQ(field(all, "i", "p@WTProject", "tasks"), R"(["t3@WTTask","t4@WTTask"])");
  EXPECT_EQ(field(all, "i", "q@WTProject", "tasks"), R"(["t1@WTTask"])");
  EXPECT_EQ(field(all, "i", "t1@WTTask", "project"), R"("q@WTProject")");
  EXPECT_EQ(deleted(all), (Uuids{"t2@WTTask"}));
}

TEST_P(SyncIterationTest, AClearedValueTravelsAsNull) {
  ASSERT_EQ(saveOk(0, "A", R"({"i":{"c@WTClient":{"name":"named","notes":"some notes","rate":90.00}}})"), 1);
  ASSERT_EQ(saveOk(1, "A", R"({"u":{"c@WTClient":{"notes":null,"rate":null}}})"), 2);
  const Reply forB = head(user, 1, "B");
  EXPECT_EQ(field(forB, "u", "c@WTClient", "notes"), "null");
  EXPECT_EQ(field(forB, "u", "c@WTClient", "rate"), "null");
  EXPECT_EQ(field(forB, "u", "c@WTClient", "name"), "absent");
  EXPECT_EQ(field(everything(), "i", "c@WTClient", "notes"), "null");
}

TEST_P(SyncIterationTest, AClientAheadOfTheServerStartsOver) {
  ASSERT_EQ(saveOk(0, "A", R"({"i":{"c@WTClient":{"name":"kept"}}})"), 1);
  const Reply refused = save(user, 99, "B", R"({"i":{"d@WTClient":{"name":"from another history"}}})");
  EXPECT_EQ(refused.code(), 4);
  EXPECT_EQ(refused.integer("iteration"), 0);
  EXPECT_EQ(everything().integer("iteration"), 1);

  const Reply reply = head(user, 99, "B");
  EXPECT_EQ(reply.integer("iteration"), 1);
  EXPECT_EQ(field(reply, "i", "c@WTClient", "name"), "\"kept\"");
}

TEST_P(SyncIterationTest, ASaveOvertakenByALaterPollOfTheSameDeviceIsRefused) {
  ASSERT_EQ(saveOk(0, "B", R"({"i":{"c@WTClient":{"name":"B's"}}})"), 1);
  ASSERT_EQ(head(user, 0, "A").integer("iteration"), 1);
  // A save A built on iteration 0 arrives only now, after A was already given iteration 1.
  const Reply late = save(user, 0, "A", R"({"u":{"c@WTClient":{"name":"stale"}}})");
  EXPECT_EQ(late.code(), 4);
  EXPECT_EQ(late.integer("iteration"), 0);
  EXPECT_EQ(field(everything(), "i", "c@WTClient", "name"), "\"B's\"");
  EXPECT_EQ(saveOk(1, "A", R"({"u":{"c@WTClient":{"name":"current"}}})"), 2);
}

TEST_P(SyncIterationTest, ResendingEqualValuesSpendsNoIteration) {
  const std::string data = R"({"i":{"c@WTClient":{"name":"same","rate":12.30}},"x":["n@WTNote"]})";
  ASSERT_EQ(saveOk(0, "A", data), 1);
  EXPECT_EQ(saveOk(1, "A", data), 1);
  EXPECT_EQ(saveOk(1, "B", R"({"u":{"c@WTClient":{"name":"same"}}})"), 1);
  EXPECT_EQ(everything().integer("iteration"), 1);
  // 12.3 is another text than 12.30: it is a change.
  EXPECT_EQ(saveOk(1, "B", R"({"u":{"c@WTClient":{"rate":12.3}}})"), 2);
}

TEST_P(SyncIterationTest, ConcurrentSavesGetOneIterationEach) {
  constexpr int kDevices = 6, kSaves = 8;
  std::vector<std::thread> threads;
  std::vector<std::vector<int64_t>> replies(kDevices);
  for (int d = 0; d < kDevices; ++d) {
    threads.emplace_back([&, d] {
      for (int s = 0; s < kSaves; ++s) {
        const std::string uuid = "d" + std::to_string(d) + "s" + std::to_string(s) + "@WTNote";
        replies[d].push_back(
            save(user, 0, "device" + std::to_string(d), R"({"i":{")" + uuid + R"(":{"name":"x"}}})")
                .integer("iteration"));
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  const Reply all = everything();
  EXPECT_EQ(all.integer("iteration"), kDevices * kSaves);
  EXPECT_EQ(all["result"]->find("i")->members().size(), static_cast<size_t>(kDevices * kSaves));
  for (const auto& device : replies) {
    // All were based on 0: each reply is 0 once others had saved, or the save's own iteration.
    for (const int64_t iteration : device) EXPECT_GE(iteration, 0);
  }
}

INSTANTIATE_TEST_SUITE_P(Storage, SyncIterationTest, testing::Values(Storage::SQLite, Storage::PostgreSQL),
                         storageName);

}  // namespace
}  // namespace servertest
