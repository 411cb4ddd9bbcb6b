// Clients that behave like the application's sync manager, against the real server: scripted exchanges
// and a seeded random simulation that must end with every store equal to the server's state.
#include "ServerTestSupport.h"
#include "SimClient.h"

#include <cstdlib>
#include <random>

namespace servertest {
namespace {

class SyncSimulationTest : public ServerTest {
 protected:
  void SetUp() override {
    ServerTest::SetUp();
    if (IsSkipped()) return;
    startServer();
  }

  std::unique_ptr<SimClient> client(const std::string& name, const std::string& user,
                                    bool withDevice = true) {
    return std::make_unique<SimClient>(name, withDevice ? "device-" + name : "", user, "password-of-" + user,
                                       [this] { return port(); });
  }

  // Syncs every client until a whole round brings nothing new to anyone.
  void syncUntilQuiet(const std::vector<SimClient*>& clients) {
    for (int round = 0; round < 40; ++round) {
      bool quiet = true;
      for (SimClient* c : clients) quiet = c->syncOnce() && quiet;
      if (quiet) return;
    }
    FAIL() << "the clients did not settle";
  }

  void expectInStep(const std::vector<SimClient*>& clients, const std::string& user) {
    const ServerState state = fetchServerState(port(), user, "password-of-" + user);
    for (SimClient* c : clients) {
      EXPECT_TRUE(c->errors().empty()) << c->errors().front();
      const std::vector<std::string> lines = differences(*c, state);
      std::string shown;
      for (size_t i = 0; i < lines.size() && i < 15; ++i) shown += lines[i] + "\n";
      EXPECT_TRUE(lines.empty()) << lines.size() << " differences:\n" << shown;
    }
  }
};

TEST_P(SyncSimulationTest, TwoClientsExchangeInsertsUpdatesOrderedMovesAndDeletes) {
  const std::string user = newUser("pair");
  auto a = client("a", user);
  auto b = client("b", user);
  const std::string c = a->insert("WTClient", "");
  a->setValue(c, "name", "\"Acme\"");
  const std::string p = a->insert("WTProject", c);
  a->setValue(p, "notes", "\"first notes\"");
  const std::string t1 = a->insert("WTTask", p), t2 = a->insert("WTTask", p), t3 = a->insert("WTTask", p);
  const std::string e1 = a->insert("WTTime", t1);
  a->setValue(e1, "startDate", "1700000000");
  const std::string n1 = a->insert("WTNote", t2);
  a->setValue(n1, "name", "\"a note\"");
  const std::string x1 = a->insert("WTExpense", t3);
  a->setValue(x1, "expense", "12.30");
  syncUntilQuiet({a.get(), b.get()});
  ASSERT_EQ(b->records().size(), 8u);
  EXPECT_EQ(b->records().at(x1).attrs.at("expense"), "12.30");
  EXPECT_EQ(b->records().at(p).tasks, (std::vector<std::string>{t1, t2, t3}));

  // B reorders and renames while A deletes, moves and clears.
  b->setOwner(t3, p, 0);
  b->setValue(t1, "name", "\"renamed by b\"");
  a->remove(n1);
  a->setOwner(e1, t2);
  a->setValue(p, "notes", std::nullopt);
  syncUntilQuiet({a.get(), b.get()});
  expectInStep({a.get(), b.get()}, user);
  EXPECT_EQ(a->records().at(p).tasks, (std::vector<std::string>{t3, t1, t2}));
  EXPECT_EQ(a->records().at(t1).attrs.at("name"), "\"renamed by b\"");
  EXPECT_EQ(b->records().at(e1).owner, t2);
  EXPECT_FALSE(b->records().count(n1));
  EXPECT_FALSE(b->records().at(p).attrs.count("notes"));

  // Deleting the project takes its tasks and items everywhere; the client stays.
  b->remove(p);
  syncUntilQuiet({a.get(), b.get()});
  expectInStep({a.get(), b.get()}, user);
  EXPECT_EQ(a->records().size(), 1u);
  EXPECT_TRUE(a->records().count(c));
}

TEST_P(SyncSimulationTest, ALostSaveReplyIsNotEchoedOverANewerEdit) {
  const std::string user = newUser("echo");
  auto a = client("a", user);
  auto b = client("b", user);
  const std::string c = a->insert("WTClient", "");
  a->setValue(c, "name", "\"v1\"");
  a->save();
  a->poll();
  a->deliver(SimClient::Delivery::Normal);
  a->handleIncoming();  // the head; the save is built
  ASSERT_TRUE(a->hasOutgoing());
  a->deliver(SimClient::Delivery::LoseReply);  // stored, but A never hears of it
  a->handleIncoming();
  a->setValue(c, "name", "\"v2\"");
  syncUntilQuiet({a.get(), b.get()});
  expectInStep({a.get(), b.get()}, user);
  EXPECT_EQ(a->records().at(c).attrs.at("name"), "\"v2\"");
  EXPECT_EQ(b->records().at(c).attrs.at("name"), "\"v2\"");
}

TEST_P(SyncSimulationTest, EditsDuringAnInFlightSaveAreSentAfterIt) {
  const std::string user = newUser("inflight");
  auto a = client("a", user);
  auto b = client("b", user);
  const std::string t = a->insert("WTTask", "");
  a->setValue(t, "name", "\"before\"");
  a->save();
  a->poll();
  a->deliver(SimClient::Delivery::Normal);
  a->handleIncoming();
  ASSERT_TRUE(a->hasOutgoing());
  a->setValue(t, "name", "\"during\"");
  a->setValue(t, "notes", "\"also during\"");
  a->save();
  a->deliver(SimClient::Delivery::Normal);
  a->handleIncoming();
  EXPECT_EQ(a->journal().i.at(t).at("name"), "\"during\"") << "the edit made in flight is still to be sent";
  syncUntilQuiet({a.get(), b.get()});
  expectInStep({a.get(), b.get()}, user);
  EXPECT_EQ(b->records().at(t).attrs.at("name"), "\"during\"");
}

// Seeds: TESSAL_SIM_SEED=n replays one.
std::vector<uint32_t> simulationSeeds() {
  if (const char* seed = std::getenv("TESSAL_SIM_SEED"))
    return {static_cast<uint32_t>(std::strtoul(seed, nullptr, 10))};
  return {1, 2, 3, 4};
}

TEST_P(SyncSimulationTest, RandomClientsConvergeToTheServersState) {
  for (const uint32_t seed : simulationSeeds()) {
    SCOPED_TRACE("seed " + std::to_string(seed) + " (TESSAL_SIM_SEED=" + std::to_string(seed) +
                 " replays it)");
    std::mt19937 rng(seed);
    auto chance = [&](int percent) { return static_cast<int>(rng() % 100) < percent; };
    auto pick = [&](const std::vector<std::string>& from) {
      return from.empty() ? std::string() : from[rng() % from.size()];
    };
    const std::string user = newUser("sim" + std::to_string(seed));
    const int count = 3 + static_cast<int>(rng() % 3);
    std::vector<std::unique_ptr<SimClient>> owned;
    std::vector<SimClient*> clients;
    for (int k = 0; k < count; ++k) {
      // Every other seed one client sends no device, as older clients do.
      owned.push_back(client("c" + std::to_string(k), user, !(seed % 2 == 0 && k == 0)));
      clients.push_back(owned.back().get());
    }
    const int steps = 700;
    const int restartAt = steps / 3 + static_cast<int>(rng() % (steps / 3));

    auto isItem = [](const std::string& e) {
      return e == "WTTime" || e == "WTFlat" || e == "WTExpense" || e == "WTNote" || e == "WTToDo";
    };
    auto is = [](const char* entity) { return [entity](const std::string& e) { return e == entity; }; };
    auto text = [&] { return "\"t" + std::to_string(rng() % 1000) + "\""; };
    auto money = [&] { return std::to_string(rng() % 500) + "." + std::to_string(10 + rng() % 90); };

    auto edit = [&](SimClient& c) {
      const int roll = static_cast<int>(rng() % 100);
      if (roll < 4) {
        c.setValue(c.insert("WTClient", ""), "name", text());
      } else if (roll < 10) {
        const std::string p = c.insert("WTProject", chance(70) ? pick(c.recordsOf(is("WTClient"))) : "");
        c.setValue(p, "name", text());
      } else if (roll < 20) {
        const std::string project = pick(c.recordsOf(is("WTProject")));
        if (project.empty()) return;
        const int size = static_cast<int>(c.records().at(project).tasks.size());
        c.setValue(c.insert("WTTask", project, static_cast<int>(rng() % (size + 1))), "name", text());
      } else if (roll < 40) {
        const std::string task = pick(c.recordsOf(is("WTTask")));
        if (task.empty()) return;
        static const char* kinds[] = {"WTTime", "WTFlat", "WTExpense", "WTNote", "WTToDo"};
        const std::string kind = kinds[rng() % 5];
        const std::string item = c.insert(kind, task);
        c.setValue(item, "startDate", std::to_string(1700000000 + rng() % 100000));
        if (kind == "WTExpense") c.setValue(item, "expense", money());
        if (kind == "WTFlat") c.setValue(item, "minutes", std::to_string(rng() % 600));
        if (kind == "WTToDo") c.setValue(item, "completed", chance(50) ? "true" : "false");
      } else if (roll < 62) {
        const std::string uuid = pick(c.recordsOf([](const std::string&) { return true; }));
        if (uuid.empty()) return;
        static const char* keys[] = {"name", "notes", "rate"};
        const std::string key = keys[rng() % 3];
        c.setValue(uuid, key, key == "rate" ? money() : text());
      } else if (roll < 67) {
        const std::string uuid = pick(c.recordsOf([](const std::string&) { return true; }));
        if (!uuid.empty()) c.setValue(uuid, chance(50) ? "notes" : "rate", std::nullopt);
      } else if (roll < 75) {
        const std::string task = pick(c.recordsOf(is("WTTask")));
        const std::string project = pick(c.recordsOf(is("WTProject")));
        if (task.empty() || project.empty()) return;
        const int size = static_cast<int>(c.records().at(project).tasks.size());
        c.setOwner(task, project, static_cast<int>(rng() % (size + 1)));
      } else if (roll < 80) {
        const std::string item = pick(c.recordsOf(isItem));
        const std::string task = pick(c.recordsOf(is("WTTask")));
        if (!item.empty() && !task.empty()) c.setOwner(item, task);
      } else if (roll < 83) {
        const std::string project = pick(c.recordsOf(is("WTProject")));
        if (!project.empty()) c.setOwner(project, chance(70) ? pick(c.recordsOf(is("WTClient"))) : "");
      } else if (roll < 91) {
        c.remove(pick(c.recordsOf(isItem)));
      } else if (roll < 96) {
        c.remove(pick(c.recordsOf(is("WTTask"))));
      } else if (roll < 99) {
        c.remove(pick(c.recordsOf(is("WTProject"))));
      } else {
        c.remove(pick(c.recordsOf(is("WTClient"))));
      }
    };

    for (int step = 0; step < steps; ++step) {
      if (step == restartAt) {
        stopServer();
        startServer();
      }
      SimClient& c = *clients[rng() % clients.size()];
      const int roll = static_cast<int>(rng() % 100);
      if (roll < 40) {
        if (c.idle()) {
          c.poll();
        } else if (c.hasOutgoing()) {
          const int loss = static_cast<int>(rng() % 100);
          c.deliver(loss < 7    ? SimClient::Delivery::LoseRequest
                    : loss < 14 ? SimClient::Delivery::LoseReply
                                : SimClient::Delivery::Normal);
        } else {
          c.handleIncoming();
        }
      } else if (roll < 50) {
        c.save();
      } else {
        edit(c);
      }
    }
    syncUntilQuiet(clients);
    expectInStep(clients, user);

    const ServerState state = fetchServerState(port(), user, "password-of-" + user);
    for (const auto& [uuid, fields] : state.records) {
      // Nothing live is filed under a record that is gone.
      for (const char* key : {"client", "project", "task"}) {
        auto owner = fields.find(key);
        if (owner == fields.end()) continue;
        const std::string target = JsonValue::parse(owner->second)->text();
        EXPECT_TRUE(state.records.count(target)) << uuid << "." << key << " names " << target;
      }
    }
    for (SimClient* c : clients) {
      for (const std::string& uuid : c->acknowledgedDeletes()) {
        EXPECT_FALSE(state.records.count(uuid)) << "acknowledged delete of " << uuid << " undone";
      }
      for (const std::string& uuid : c->acknowledgedInserts()) {
        EXPECT_TRUE(state.records.count(uuid) || state.deleted.count(uuid))
            << "acknowledged " << uuid << " lost";
      }
    }
    // The run must have exercised something: records survive and deletes happened.
    EXPECT_GT(state.records.size(), 5u);
    EXPECT_GT(state.deleted.size(), 5u);
    EXPECT_GT(state.records.size() + state.deleted.size(), 60u);
  }
}

INSTANTIATE_TEST_SUITE_P(Storage, SyncSimulationTest, testing::Values(Storage::SQLite, Storage::PostgreSQL),
                         storageName);

}  // namespace
}  // namespace servertest
