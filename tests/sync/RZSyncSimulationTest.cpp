// Random edits synced through a lossy proxy and a server restart converge on every accepted change, also
// over three server processes on one database that are killed while they answer.
// Seeded: TESSAL_SYNC_SEED=<n> replays one run; TESSAL_SYNC_RUNS=<n> runs that many seeds.
#include "RZSyncCommand.h"
#include "RZSyncReplacedStore.h"
#include "ServerProcess.h"
#include "ServerTestSupport.h"
#include "SqlDatabase.h"
#include "SyncTestSupport.h"
#include "WTClient.h"
#include "WTExpense.h"
#include "WTFlat.h"
#include "WTNote.h"
#include "WTProject.h"
#include "WTStoreBackup.h"
#include "WTTask.h"
#include "WTTime.h"
#include "WTToDo.h"

#include <future>
#include <iostream>
#include <map>
#include <random>

using namespace synctest;

namespace {

// The account every device syncs.
const QString kUser = QStringLiteral("sim@example.org"), kPassword = QStringLiteral("simulation password");

// A save the server applied: the request's "data", base and device, and the iteration its changes got.
struct AppliedSave {
  QVariantMap data;
  qint64 base = 0;
  QString device;
  qint64 iteration = 0;
};

// What the accepted saves add up to, deletions taking what is filed under them (a project its client), but
// for what another device filed there since the deleting device's base: that goes to copies of the owners
// deleted, made with the values they had, under the identity "original~iteration@Entity".
struct Expected {
  QSet<QString> deleted;
  QMap<QString, QVariantMap> values;
  struct Filing {
    qint64 iteration = 0;
    QString device;
  };
  QHash<QString, Filing> filed;  // when and by which device each record was last filed under its owner
  int keptFromDeletions = 0;

  static QString ownerKey(const QString& uuid) {
    static const QHash<QString, QString> kOwners{
        {"WTTask", "project"}, {"WTProject", "client"}, {"WTClient", ""}};
    return kOwners.value(uuid.section(u'@', -1), "task");
  }

  void apply(const AppliedSave& save) {
    for (const char* section : {"i", "u"}) {
      const QVariantMap entries = save.data.value(section).toMap();
      for (auto it = entries.begin(); it != entries.end(); ++it) {
        if (deleted.contains(it.key())) continue;  // deleted stays so
        const QVariantMap fields = it.value().toMap();
        const QString key = ownerKey(it.key());
        QVariantMap& record = values[it.key()];
        if (fields.contains(key) && (!record.contains(key) || compact(record[key]) != compact(fields[key])))
          filed[it.key()] = {save.iteration, save.device};
        record.insert(fields);
      }
    }
    QMap<QString, QVariantMap> gone;  // what this save deletes, with its values
    for (const QVariant& uuid : save.data.value("x").toList()) {
      if (!deleted.contains(uuid.toString())) gone.insert(uuid.toString(), values.value(uuid.toString()));
      deleted.insert(uuid.toString()), values.remove(uuid.toString());
    }
    const qint64 serverIteration = save.iteration + 1;
    QHash<QString, QString> copies;
    // None when the original's values are gone (it was deleted by an earlier save), or its owner's.
    std::function<QString(const QString&)> copyOf = [&](const QString& original) {
      if (copies.contains(original) || !gone.contains(original)) return copies.value(original);
      QVariantMap copied = gone.value(original);
      copied.remove("tasks"), copied.remove("uuid");
      const QString key = ownerKey(original);
      if (const QVariant owner = copied.value(key);
          owner.typeId() == QMetaType::QString && deleted.contains(owner.toString())) {
        copied[key] = key == "client" ? QVariant() : QVariant(copyOf(owner.toString()));
        if (key != "client" && copied[key].toString().isEmpty()) return QString();
      }
      const QString copy = QStringLiteral("%1~%2@%3")
                               .arg(original.section(u'@', 0, -2).left(120))
                               .arg(serverIteration)
                               .arg(original.section(u'@', -1));
      copies[original] = copy;
      values[copy] = copied;
      filed[copy] = {serverIteration, QString()};
      return copy;
    };
    for (bool changed = true; changed;) {
      changed = false;
      QStringList kept;
      for (auto it = values.begin(); it != values.end();) {
        const QString key = ownerKey(it.key());
        const QVariant owner = key.isEmpty() ? QVariant() : it.value().value(key);
        const Filing filing = filed.value(it.key());
        if (owner.typeId() != QMetaType::QString || !deleted.contains(owner.toString())) {
          ++it;
        } else if (key == "client") {
          it++.value().insert(key, QVariant());
        } else if (filing.iteration > save.base && filing.iteration < save.iteration &&
                   filing.device != save.device && gone.contains(owner.toString())) {
          kept << it++.key();  // filed there by another device since the deleting device's base
        } else {
          gone.insert(it.key(), it.value()), deleted.insert(it.key());
          it = values.erase(it), changed = true;
        }
      }
      for (const QString& uuid : kept) {
        if (const QString copy = copyOf(values[uuid][ownerKey(uuid)].toString()); !copy.isEmpty()) {
          values[uuid][ownerKey(uuid)] = copy, filed[uuid] = {serverIteration, QString()};
          ++keptFromDeletions;
        } else {
          gone.insert(uuid, values.take(uuid)), deleted.insert(uuid);
        }
        changed = true;
      }
    }
  }
};

// Where the released requests go.
class Servers {
 public:
  virtual ~Servers() = default;
  // The server's reply (status 0 when none came); `appliedUnanswered` when a save without a reply was
  // applied all the same.
  virtual servertest::Reply deliver(const std::string& path, const std::string& body,
                                    bool& appliedUnanswered) = 0;
  virtual void stop() = 0;
  virtual bool start() = 0;
  // The account's head, read from the storage.
  int64_t head() {
    return database_ ? database_->acquire()->query("SELECT head FROM accounts").at(0).integer(0) : -1;
  }

 protected:
  explicit Servers(const std::string& location) {
    std::string error;
    database_ = tessal::server::SqlDatabase::open(location, error);
    EXPECT_TRUE(database_) << error;
  }

 private:
  std::unique_ptr<tessal::server::SqlDatabase> database_;
};

class OneServer final : public Servers {
 public:
  OneServer(const std::string& location, std::unique_ptr<servertest::SyncServer> server)
      : Servers(location), location_(location), server_(std::move(server)) {}
  servertest::Reply deliver(const std::string& path, const std::string& body, bool&) override {
    return server_ ? servertest::post(server_->port(), path, body) : servertest::Reply{};  // none while down
  }
  void stop() override { server_.reset(); }
  bool start() override { return (server_ = servertest::startedServer(location_, {})) != nullptr; }

 private:
  std::string location_;
  std::unique_ptr<servertest::SyncServer> server_;
};

// Three server processes over one database. Each request goes to any of them; now and then the one
// answering is killed (-9) at a random moment while the request is on its way, and started again.
class Replicas final : public Servers {
 public:
  Replicas(const std::string& location, const std::string& user, const std::string& password, unsigned seed)
      : Servers(location), poll_(servertest::requestBody(user, password, "head", 0)), random_(seed) {
    for (int i = 0; i < 3; ++i)
      replicas_.push_back(std::make_unique<servertest::ServerProcess>(kExe, location));
    EXPECT_TRUE(Replicas::start());
  }
  static inline const std::string kExe = TESSAL_SYNC_SERVER_EXE;
  int killPercent = 15;
  int kills = 0, killedAnswering = 0, appliedUnansweredSaves = 0;

  servertest::Reply deliver(const std::string& path, const std::string& body,
                            bool& appliedUnanswered) override {
    servertest::ServerProcess& replica = *replicas_[std::uniform_int_distribution<size_t>(0, 2)(random_)];
    if (!replica.running()) return {};
    if (std::uniform_int_distribution<int>(0, 99)(random_) >= killPercent)
      return servertest::post(replica.port(), path, body);
    const int64_t before = head();
    auto reply = std::async(std::launch::async,
                            [&, port = replica.port()] { return servertest::post(port, path, body); });
    const auto moment = std::chrono::microseconds(std::uniform_int_distribution<int>(0, 3000)(random_));
    killedAnswering += reply.wait_for(moment) == std::future_status::timeout;
    replica.kill();
    ++kills;
    const servertest::Reply answer = reply.get();
    EXPECT_TRUE(start(replica));
    // Nothing else runs meanwhile, so a moved head is this save, committed before its reply was sent.
    appliedUnanswered = answer.status == 0 && head() != before;
    appliedUnansweredSaves += appliedUnanswered;
    return answer;
  }
  void stop() override {
    for (auto& replica : replicas_) replica->kill();
  }
  bool start() override {
    bool started = true;
    for (auto& replica : replicas_) started &= start(*replica);
    return started;
  }

 private:
  // A replica's first request checks the password, which takes longer than a save: done here, so that
  // the random moment of a kill falls into the request, not into the check.
  bool start(servertest::ServerProcess& replica) {
    return replica.start() && servertest::post(replica.port(), servertest::kSyncPath, poll_).status == 200;
  }

  std::string poll_;  // a head without a device, which changes nothing
  std::mt19937 random_;
  std::vector<std::unique_ptr<servertest::ServerProcess>> replicas_;
};

// The proxy holds every request until released, so a run depends on its seed, not on the machine.
class Simulation {
 public:
  Simulation(unsigned seed, Servers& server) : seed_(seed), random_(seed), server_(server) {
    proxy_.handler = [](const HttpRequest&) { return QByteArray(); };  // hold
    // Syncing stays "off": no timer polls on its own, every exchange is one the run starts.
    for (int i = std::uniform_int_distribution<int>(3, 5)(random_); i > 0; --i)
      clients_.push_back(std::make_unique<SyncClient>(proxy_.address(), kUser, kPassword));
  }

  void run(int steps) {
    for (int step = 0; step < steps; ++step) {
      if (step == steps / 2) restartServer();
      const int action = roll(100);
      if (action < 50) {
        edit(pick());
      } else if (action < 62) {
        pick().save();
      } else if (action < 80) {
        startSync(pick());
      } else if (held() > 0) {  // what the clients do next happens while other requests are on their way
        const int fate = roll(100);
        release(fate < 12 ? Fate::LoseRequest : fate < 24 ? Fate::LoseReply : Fate::Deliver);
      }
    }
  }

  // No more losses; everybody syncs until nobody has anything to send or to receive.
  bool settle() {
    drain();
    for (int round = 0; round < 40; ++round) {
      bool quiet = true;
      for (auto& client : clients_) {
        bool received = false;
        auto connection = QObject::connect(
            client->manager.get(), &RZSyncManager::exchangeDidFinish, [&](const RZSyncExchange& e) {
              received |= e.receivedChanges || e.outcome != RZSyncExchange::Outcome::Answered;
            });
        startSync(*client);
        drain();
        QObject::disconnect(connection);
        quiet &= !received && !client->track().hasChanges() && !client->context->hasChanges();
      }
      if (quiet) return true;
    }
    return false;
  }

  void check() {
    for (auto& client : clients_) EXPECT_EQ(client->presenter.syncErrors.join('\n').toStdString(), "");
    const std::string first = snapshot(*clients_[0]->context);
    for (size_t i = 1; i < clients_.size(); ++i)
      EXPECT_EQ(snapshot(*clients_[i]->context), first) << "client " << i;
    // Every accepted change is there, unless replaced by a later one or taken by a deletion.
    Expected expected;
    for (const AppliedSave& save : appliedSaves_) expected.apply(save);
    WTObjectContext& context = *clients_[0]->context;
    for (WTObject* object : context.fetchObjectsForEntityName("WTObject").value_or(QList<WTObject*>()))
      EXPECT_TRUE(expected.values.contains(object->uuid()))
          << object->uuid().toStdString() << " was deleted or never sent";
    for (auto [uuid, values] : expected.values.asKeyValueRange()) {
      WTObject* object = context.objectWithUUID(uuid, false);
      EXPECT_TRUE(object) << uuid.toStdString() << " is missing";
      for (auto value = values.begin(); object && value != values.end(); ++value) {
        if (value.key() == "tasks" || value.key() == "uuid") continue;  // the server keeps the task order
        const QVariant actual = storedValue(object, value.key());
        EXPECT_TRUE(RZSyncJSON::sameValue(actual, value.value()))
            << uuid.toStdString() << " " << value.key().toStdString() << ": " << compact(actual)
            << " instead of " << compact(value.value());
      }
    }
    for (WTProject* project : context.fetch<WTProject>())  // a project lists exactly the tasks under it
      for (WTTask* task : project->tasks()) EXPECT_EQ(task->project(), project);
    std::cout << "seed " << seed_ << ": " << clients_.size() << " clients, " << appliedSaves_.size()
              << " saves applied, " << lost_ << " requests or replies lost, " << expected.keptFromDeletions
              << " records kept from deletions, " << context.count() << " records in every store\n";
  }

 private:
  enum class Fate { Deliver, LoseRequest, LoseReply };
  int roll(int n) { return std::uniform_int_distribution<int>(0, n - 1)(random_); }
  SyncClient& pick() { return *clients_[size_t(roll(int(clients_.size())))]; }
  qsizetype held() const { return proxy_.requests.size() - released_; }

  // A new record under an identity that depends on the seed only, so a run replays exactly.
  template <class T>
  T* insert(SyncClient& client) {
    T* object = client.context->insertNewObject<T>();
    object->setUuid(
        QStringLiteral("%1-%2@%3").arg(seed_).arg(++inserted_, 6, 10, QChar('0')).arg(object->entityName()));
    return object;
  }
  // A random record of a kind, chosen in identity order.
  template <class T = WTObject>
  T* any(SyncClient& client, const QString& kind = WTEntities::name(T::kEntity)) {
    QList<WTObject*> all = client.context->fetchObjectsForEntityName(kind).value_or(QList<WTObject*>());
    std::sort(all.begin(), all.end(), [](WTObject* a, WTObject* b) { return a->uuid() < b->uuid(); });
    return all.isEmpty() ? nullptr : static_cast<T*>(all[roll(int(all.size()))]);
  }
  WTItem* anyItem(SyncClient& client) { return any<WTItem>(client, QStringLiteral("WTItem")); }
  Decimal money() {
    return *Decimal::fromString(QStringLiteral("%1.%2").arg(roll(500)).arg(roll(100), 2, 10, QChar('0')));
  }
  Date day() { return Date::fromSeconds(1700000000.0 + 60.0 * roll(60 * 24 * 30)); }
  QString text() { return QStringLiteral("t%1").arg(roll(1000)); }

  // One random change; some clear a value.
  void edit(SyncClient& client) {
    WTObjectContext& context = *client.context;
    const int kind = roll(12);
    if (kind == 0) {
      insert<WTClient>(client)->setName(text());
    } else if (kind == 1) {
      auto* project = insert<WTProject>(client);
      project->setName(text());
      if (WTClient* owner = any<WTClient>(client)) project->setClient(owner);
    } else if (WTProject* project = kind == 2 ? any<WTProject>(client) : nullptr) {
      auto* task = insert<WTTask>(client);
      task->setName(text());
      task->setProject(project, roll(int(project->tasks().size()) + 1));
    } else if (WTTask* task =
                   kind == 3 || kind == 4 ? any<WTTask>(client) : nullptr) {  // a new item of any kind
      const int type = roll(5);
      WTItem* item = type == 0   ? insert<WTTime>(client)
                     : type == 1 ? insert<WTFlat>(client)
                     : type == 2 ? insert<WTExpense>(client)
                     : type == 3 ? static_cast<WTItem*>(insert<WTNote>(client))
                                 : insert<WTToDo>(client);
      if (auto* time = dynamic_cast<WTTime*>(item)) time->setStartDate(day());
      if (auto* time = dynamic_cast<WTTime*>(item))
        time->setEndDate(time->startDate()->addingSeconds(60.0 * roll(300)));
      if (auto* flat = dynamic_cast<WTFlat*>(item)) flat->setMinutes(roll(600));
      if (auto* expense = dynamic_cast<WTExpense*>(item)) expense->setExpense(money());
      item->setStartDate(day());
      item->setName(text());
      item->setTask(task);
    } else if (WTObject* object = kind == 5 ? any(client, QStringLiteral("WTObject")) : nullptr) {
      const int change = roll(6);  // rename, re-rate or clear anything
      if (change == 0) object->setName(text());
      if (change == 1) object->setNotes(text());
      if (change == 2) object->setRate(money());
      if (change == 3) roll(2) ? object->setRate(std::nullopt) : object->setNotes(QString());
      if (change == 4) {
        if (auto* task = dynamic_cast<WTTask*>(object))
          task->setBudget(roll(2) ? std::optional(money()) : std::nullopt);
        if (auto* expense = dynamic_cast<WTExpense*>(object)) expense->setExpense(std::nullopt);
        if (auto* flat = dynamic_cast<WTFlat*>(object)) flat->setMinutes(std::nullopt);
        if (auto* time = dynamic_cast<WTTime*>(object)) time->setEndDate(std::nullopt);
        if (auto* owner = dynamic_cast<WTClient*>(object)) owner->setCurrency(roll(2) ? "JPY" : QString());
        if (auto* project = dynamic_cast<WTProject*>(object))
          project->setBudget(roll(2) ? std::optional(money()) : std::nullopt);
        if (!WTEntities::isItem(object->entity()))  // a rule, or none
          object->setValue("roundingMinutes", roll(2) ? QVariant(roll(30)) : QVariant());
      }
      if (change == 5) object->setArchived(roll(2) == 1);
    } else if (WTItem* item = kind == 6 ? anyItem(client) : nullptr) {  // item values
      if (auto* time = dynamic_cast<WTTime*>(item))
        time->setEndDate(time->startDate().value_or(day()).addingSeconds(60.0 * roll(300)));
      if (auto* expense = dynamic_cast<WTExpense*>(item)) expense->setExpense(money());
      if (auto* flat = dynamic_cast<WTFlat*>(item)) flat->setMinutes(roll(600));
      if (auto* todo = dynamic_cast<WTToDo*>(item)) todo->setCompleted(!todo->completed());
      if (dynamic_cast<WTNote*>(item)) item->setStartDate(day());
    } else if (kind == 7) {  // reorder or move a task
      WTTask* task = any<WTTask>(client);
      WTProject* project = any<WTProject>(client);
      if (!task || !project) return;
      const int tasks = int(project->tasks().size());
      if (task->project() == project) project->moveTask(task, roll(tasks));
      if (task->project() != project) task->setProject(project, roll(tasks + 1));
      if (roll(2)) task->setBudget(money());
    } else if (kind == 8 && roll(2)) {  // move an item
      WTItem* item = anyItem(client);
      WTTask* task = any<WTTask>(client);
      if (item && task) item->setTask(task);
    } else if (kind == 8) {  // file a project under another client, sometimes none
      WTProject* project = any<WTProject>(client);
      WTClient* owner = roll(4) ? any<WTClient>(client) : nullptr;
      if (project) project->setClient(owner);
    } else if (kind == 9 || kind == 10) {  // delete an item
      if (WTItem* item = anyItem(client)) context.deleteObject(item);
    } else if (kind == 11) {  // delete an owner; projects seldom
      const int owner = roll(3);
      WTObject* doomed = owner == 0                   ? any<WTTask>(client)
                         : owner == 1 && roll(3) == 0 ? static_cast<WTObject*>(any<WTProject>(client))
                         : owner == 2                 ? any<WTClient>(client)
                                                      : nullptr;
      if (doomed) context.deleteObject(doomed);
    }
  }

  // Saves and polls, when the client has nothing on its way; waits until the request is held.
  void startSync(SyncClient& client) {
    client.save();
    if (!client.idle()) return;
    client.manager->sync();
    settleArrivals();
  }

  // Answers the oldest held request and waits until its client dealt with the answer.
  void release(Fate fate) {
    static const QByteArray kGatewayError = LoopbackHttpServer::raw("Bad gateway", 502, "text/plain");
    const HttpRequest request = proxy_.requests.value(released_++);
    if (fate == Fate::LoseRequest) {
      proxy_.answerHeld(kGatewayError), ++lost_;
    } else {
      bool appliedUnanswered = false;
      const qint64 head = server_.head();
      const servertest::Reply reply =
          server_.deliver(request.path.toStdString(), request.body.toStdString(), appliedUnanswered);
      const QByteArray body = QByteArray::fromStdString(reply.body);
      const QVariantMap answer = RZSyncJSON::parse(body).value_or(QVariant()).toMap();
      if ((answer.value("action") == "save" && !answer.contains("error")) || appliedUnanswered)
        appliedSaves_.append({request.json().value("data").toMap(),
                              request.json().value("iteration").toLongLong(),
                              request.json().value("device").toString(), head + 1});
      lost_ += fate == Fate::LoseReply;
      // A lost reply, or the server is down.
      proxy_.answerHeld(reply.status == 0 || fate == Fate::LoseReply
                            ? kGatewayError
                            : LoopbackHttpServer::raw(body, reply.status));
    }
    settleArrivals();
  }

  void settleArrivals() {
    const auto busy = [this] {
      return std::count_if(clients_.begin(), clients_.end(), [](auto& c) { return !c->idle(); });
    };
    ASSERT_TRUE(waitUntil([&] { return busy() == held(); }, 20000))
        << "a request or its reply went unhandled";
  }
  void drain() {
    while (held() > 0) release(Fate::Deliver);
  }

  void restartServer() {
    server_.stop();
    for (int i = 0; i < 10; ++i) {  // requests fail while it is down
      edit(pick());
      startSync(pick());
      if (held() > 0) release(Fate::Deliver);
    }
    ASSERT_TRUE(server_.start());
  }

  unsigned seed_;
  int inserted_ = 0, lost_ = 0;
  std::mt19937 random_;
  LoopbackHttpServer proxy_;
  qsizetype released_ = 0;
  QList<AppliedSave> appliedSaves_;  // each save the server applied, in order
  Servers& server_;
  std::vector<std::unique_ptr<SyncClient>> clients_;
};

}  // namespace

// Over both storages of the server: PostgreSQL when a throw-away cluster is given (TESSAL_TEST_POSTGRES).
class RZSyncSimulation : public servertest::StorageTest {};

std::vector<unsigned> seeds(int runs) {
  std::vector<unsigned> seeds;
  if (qEnvironmentVariableIsSet("TESSAL_SYNC_RUNS")) runs = qEnvironmentVariableIntValue("TESSAL_SYNC_RUNS");
  for (int i = 0; i < runs; ++i) seeds.push_back(20240601u + unsigned(i) * 7919u);
  if (const QByteArray seed = qgetenv("TESSAL_SYNC_SEED"); !seed.isEmpty()) seeds = {seed.toUInt()};
  return seeds;
}

TEST_P(RZSyncSimulation, RandomEditsLossesAndARestartConverge) {
  for (const unsigned seed : seeds(2)) {
    SCOPED_TRACE(testing::Message() << "TESSAL_SYNC_SEED=" << seed);
    const servertest::StorageLocation storage(GetParam());
    OneServer one(storage.location(), servertest::startedServer(storage.location(), {}, kUser.toStdString(),
                                                                kPassword.toStdString()));
    Simulation simulation(seed, one);
    simulation.run(600);
    ASSERT_TRUE(simulation.settle()) << "no quiescence";
    simulation.check();
    if (HasFailure()) break;
  }
}

// The long run (ctest -L long) sets TESSAL_SYNC_RUNS=20.
TEST(RZSyncReplicaSimulation, RandomEditsOnThreeReplicasKilledWhileTheyAnswerConverge) {
  if (servertest::postgresUri().empty()) GTEST_SKIP() << "TESSAL_TEST_POSTGRES is not set";
  for (const unsigned seed : seeds(1)) {
    SCOPED_TRACE(testing::Message() << "TESSAL_SYNC_SEED=" << seed);
    const servertest::StorageLocation storage(servertest::Storage::PostgreSQL);
    // The account is made by a server that goes at once.
    servertest::startedServer(storage.location(), {}, kUser.toStdString(), kPassword.toStdString());
    Replicas replicas(storage.location(), kUser.toStdString(), kPassword.toStdString(), seed);
    Simulation simulation(seed, replicas);
    simulation.run(600);
    replicas.killPercent = 0;
    ASSERT_TRUE(simulation.settle()) << "no quiescence";
    simulation.check();
    std::cout << "seed " << seed << ": " << replicas.kills << " replicas killed, " << replicas.killedAnswering
              << " while answering, " << replicas.appliedUnansweredSaves << " after committing a save\n";
    if (HasFailure()) break;
  }
}

// One account on a real server over the storage under test, used from two devices.
class RZSyncTwoDevices : public servertest::StorageTest {
 protected:
  void SetUp() override {
    StorageTest::SetUp();
    if (IsSkipped()) return;
    server =
        servertest::startedServer(storage_->location(), {}, kUser.toStdString(), kPassword.toStdString());
    here = std::make_unique<SyncClient>(servertest::address(*server), kUser, kPassword);
    there = std::make_unique<SyncClient>(servertest::address(*server), kUser, kPassword);
  }
  std::unique_ptr<servertest::SyncServer> server;
  std::unique_ptr<SyncClient> here, there;
};

// A device puts back a copy of its store from before its own and another device's saves: the journal
// started again, it gets back what was saved since, and the server neither brings back what was deleted
// since nor loses what the copy lacks.
TEST_P(RZSyncTwoDevices, ARestoredCopyNeitherResurrectsNorDrops) {
  SyncClient &here = *this->here, &there = *this->there;
  auto task = [](SyncClient& client, const QString& name, WTProject* project) {
    auto* task = client.context->insertNewObject<WTTask>();
    task->setName(name);
    task->setProject(project);
    return task;
  };
  auto* project = here.context->insertNewObject<WTProject>();
  project->setName("Project");
  WTTask* gone = task(here, "Deleted here", project);
  WTTask* renamed = task(here, "Renamed", project);
  task(here, "Deleted there", project);
  here.save();
  ASSERT_TRUE(here.syncOnce() && here.syncOnce() && there.syncOnce());
  const QString copy = here.dir.filePath("copy.sqlite");
  ASSERT_TRUE(WTStoreBackup::copy(here.dir.filePath("Tessal.sqlite"), copy).ok());

  task(here, "Added here", project);
  here.context->deleteObject(gone);
  renamed->setName("Renamed since");
  here.save();
  ASSERT_TRUE(here.syncOnce());
  for (WTTask* other : there.context->fetch<WTTask>())
    if (other->name() == "Deleted there") there.context->deleteObject(other);
  task(there, "Added there", there.find<WTProject>(project->uuid()));
  there.save();
  ASSERT_TRUE(there.syncOnce());

  here.close();
  ASSERT_TRUE(WTStoreBackup::restore(copy, here.dir.filePath("Tessal.sqlite")));
  {
    WTObjectContext restored(here.defaults.get());
    auto store = WTStore::open(here.dir.filePath("Tessal.sqlite"));
    ASSERT_TRUE(store && restored.attachStore(std::move(store.value())));
    ASSERT_TRUE(journalReplacedStore(restored));
  }
  here.open();
  for (int round = 0; round < 3; ++round) ASSERT_TRUE(here.syncOnce() && there.syncOnce());
  EXPECT_FALSE(here.track().hasChanges() || there.track().hasChanges());
  QStringList names;
  for (WTTask* each : here.context->fetch<WTTask>()) names << each->name();
  names.sort();
  EXPECT_EQ(names, QStringList({"Added here", "Added there", "Renamed since"}));
  EXPECT_EQ(snapshot(*here.context), snapshot(*there.context));
  // A device set up afresh gets the same from the server, also with settings copied from another device.
  SyncClient fresh(servertest::address(*server), kUser, kPassword);
  fresh.defaults->setValue("WTSyncDevice", there.defaults->stringForKey("WTSyncDevice"));
  fresh.defaults->setValue("WTSyncDeviceMachine", "another machine");
  fresh.reopen();
  const QString own = fresh.defaults->stringForKey("WTSyncDevice");
  fresh.reopen();  // and keeps it at the next start, synced or not
  EXPECT_EQ(fresh.defaults->stringForKey("WTSyncDevice"), own);
  ASSERT_TRUE(fresh.syncOnce());
  EXPECT_EQ(snapshot(*fresh.context), snapshot(*here.context));
}

// A journal larger than one save may carry (an import's) goes out in pieces, one after another within
// the same poll, and reaches the other devices whole.
TEST_P(RZSyncTwoDevices, ALargeJournalIsSentInPieces) {
  SyncClient &here = *this->here, &there = *this->there;
  RZSyncManager::Intervals intervals = here.manager->intervals();
  intervals.recordsPerSave = 3;
  here.manager->setIntervals(intervals);
  for (int i = 0; i < 9; ++i) here.context->insertNewObject<WTClient>()->setName(QString::number(i));
  // A project's task order goes in one piece with its tasks, or the server would lose it.
  auto* project = here.context->insertNewObject<WTProject>();
  project->setName("Imported");
  for (int i = 0; i < 5; ++i) {
    auto* task = here.context->insertNewObject<WTTask>();
    task->setName(QString::number(i));
    task->setProject(project);
  }
  here.save();
  int saves = 0;
  QObject::connect(here.manager.get(), &RZSyncManager::exchangeDidFinish,
                   [&](const RZSyncExchange& exchange) { saves += exchange.action == "save"; });
  ASSERT_TRUE(here.syncOnce());
  EXPECT_FALSE(here.track().hasChanges());
  EXPECT_GE(saves, 4);  // fifteen records, three a save but for the project's six
  ASSERT_TRUE(there.syncOnce());
  EXPECT_EQ(snapshot(*there.context), snapshot(*here.context));
}

// Undo, redo, and undoing a deletion the server kept for good, all after the autosave, reach the file and
// the other device, each record with every key it has.
TEST_P(RZSyncTwoDevices, AnotherDeviceFollowsUndoAfterTheSave) {
  SyncClient &a = *here, &b = *there;
  // Ends A's turn, undoes (or redoes) `steps` steps each in its own turn and saves; then A, and B, run the
  // sync command until in step.
  const auto undoThenSync = [&](qsizetype steps, bool undo = true, bool sync = true) {
    a.context->processPendingChanges();
    for (qsizetype i = 0; i < steps; ++i) {
      undo ? a.context->undoManager().undo() : a.context->undoManager().redo();
      a.context->processPendingChanges();
    }
    a.save();
    for (SyncClient* client : {&a, &b}) {
      QString out, err;
      QTextStream outStream(&out), errStream(&err);
      ASSERT_TRUE(!sync || runSyncCommand(*client->manager, {"--timeout", "30"}, outStream, errStream) == 0)
          << err.toStdString();
    }
  };
  auto* task = a.context->insertNewObject<WTTask>();
  task->setName("Design");
  task->setProject(a.context->insertNewObject<WTProject>());
  task->project()->setName("Atlas");
  a.context->processPendingChanges();
  // clang-format off
  const std::map<WTEntity, QVariantMap> billing = {
      {WTEntity::Client, {{"currency", "JPY"}, {"address", "1 Main St"}, {"roundingMinutes", 15}, {"roundingMode", "up"}}},
      {WTEntity::Project, {{"budget", "2500.50"}, {"roundingMode", "down"}}},
      {WTEntity::Task, {{"roundingMinutes", 6}}}};
  // clang-format on
  for (WTEntity entity : WTEntities::kAll) {  // each its own undo step
    WTObject* record = a.context->insertNewObject(entity);
    record->setName(QStringLiteral("one ") + WTEntities::name(entity));
    const QVariantMap values = billing.count(entity) ? billing.at(entity) : QVariantMap();
    for (const auto& [key, value] : values.asKeyValueRange())
      EXPECT_TRUE(record->setValue(key, value)) << key.toStdString();
    if (entity == WTEntity::Client) task->project()->setClient(static_cast<WTClient*>(record));
    if (entity == WTEntity::Task) static_cast<WTTask*>(record)->setProject(task->project());
    if (WTEntities::isItem(entity)) static_cast<WTItem*>(record)->setTask(task);
    a.context->processPendingChanges();
  }
  const qsizetype count = std::size(WTEntities::kAll);
  undoThenSync(0);
  ASSERT_EQ(b.context->count(), 2 + count);
  EXPECT_EQ(snapshot(*a.context), snapshot(*b.context));
  for (const char* value : {R"("address":"1 Main St")", R"("currency":"JPY")"})
    EXPECT_NE(snapshot(*b.context).find(value), std::string::npos) << value;
  undoThenSync(count);
  ASSERT_EQ(b.context->count(), 2);  // only the project and task the records are filed under
  undoThenSync(count, false);
  ASSERT_EQ(b.context->count(), 2 + count);
  EXPECT_EQ(snapshot(*a.context), snapshot(*b.context));
  // A rename, a client deleted from under its project, a project deleted with its tasks and items: each
  // undone after its save (before a sync) puts back the rows that were in the file, and the other device
  // follows. Rows and the project's client in the file after each change, and after its undo:
  const auto rows = [&] {
    QMap<QString, WTStoreRecord> rows;
    auto store = WTStore::open(a.storePath());
    EXPECT_TRUE(store.ok() &&
                store.value()->loadAll([&](WTStoreRecord&& row) { rows.insert(row.uuid, row); }));
    return rows;
  };
  const QMap<QString, WTStoreRecord> before = rows();
  WTProject* atlas = task->project();
  const QString atlasUuid = atlas->uuid(), clientUuid = atlas->client()->uuid();
  const std::function<void()> changes[] = {[&] { task->setName("Renamed"); },
                                           [&] { a.context->deleteObject(atlas->client()); },
                                           [&] { a.context->deleteObject(atlas); }};
  const std::pair<qsizetype, QString> afterChange[] = {{2 + count, clientUuid}, {1 + count, ""}, {2, ""}};
  for (int i = 0; i < 3; ++i) {
    changes[i]();
    undoThenSync(0, true, false);
    const QMap<QString, WTStoreRecord> changed = rows();
    EXPECT_EQ(std::pair(changed.size(), changed.value(atlasUuid).clientUuid), afterChange[i]) << i;
    undoThenSync(1);
    EXPECT_EQ(rows(), before) << i;
    EXPECT_EQ(snapshot(*a.context), snapshot(*b.context)) << i;
  }
  undoThenSync(count);
  a.reopen(), b.reopen();
  EXPECT_EQ(snapshot(*a.context), snapshot(*b.context));
  ASSERT_EQ(b.context->count(), 2);

  task = a.context->fetch<WTTask>().value(0);
  const auto entry = [&](const char* name) {
    auto* time = a.context->insertNewObject<WTTime>();
    time->setName(name);
    time->setTask(task);
    undoThenSync(0);
  };
  entry("before");
  a.context->deleteObject(task);
  undoThenSync(0);
  ASSERT_EQ(b.context->count(), 1) << "the deletion reached the other device";
  a.context->undoManager().undo();
  entry("after");
  a.reopen(), b.reopen();
  EXPECT_EQ(snapshot(*a.context), snapshot(*b.context));
  const QList<WTTask*> tasks = b.context->fetch<WTTask>();
  ASSERT_TRUE(tasks.size() == 1 && tasks[0]->project());
  QStringList entries{tasks[0]->name(), tasks[0]->project()->name()};
  for (const WTItem* item : tasks[0]->items()) entries.append(item->name());
  std::sort(entries.begin() + 2, entries.end());
  EXPECT_EQ(entries, QStringList({"Design", "Atlas", "after", "before"}));
}

INSTANTIATE_TEST_SUITE_P(Storage, RZSyncSimulation,
                         testing::Values(servertest::Storage::SQLite, servertest::Storage::PostgreSQL),
                         servertest::storageName);
INSTANTIATE_TEST_SUITE_P(Storage, RZSyncTwoDevices,
                         testing::Values(servertest::Storage::SQLite, servertest::Storage::PostgreSQL),
                         servertest::storageName);
