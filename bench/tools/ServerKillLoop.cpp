// Kills sync servers with -9 at random moments while several devices save, and checks after every
// restart that each acknowledged save is stored and that the account's iterations have no gap and no
// iteration twice. Every save inserts one new record, so each iteration up to the head belongs to
// exactly one record.
//
//   tessal_server_kill_loop LOCATION [KILLS [DEVICES [REPLICAS]]]
//
// LOCATION is a fresh SQLite file or a postgresql:// URI of an empty database (bench/server-kill-loop.sh
// runs both). With several replicas, one of them is killed at a time while the others keep answering.
// Prints the figures; exits 1 when anything acknowledged was lost or the iterations are not gap-free.
#include "JsonValue.h"
#include "PasswordAuthenticator.h"
#include "ServerProcess.h"
#include "SqlDatabase.h"
#include "SyncStore.h"

#include <httplib.h>

#include <atomic>
#include <chrono>
#include <iostream>
#include <map>
#include <mutex>
#include <random>
#include <thread>
#include <vector>

using namespace tessal::server;

namespace {

const std::string kUser = "kill-loop@example.com";
const std::string kPassword = "kill loop password";

struct Shared {
  std::vector<std::atomic<int>> ports;  // 0 while that replica is down
  std::atomic<bool> stop{false};
  std::mutex mutex;
  std::map<std::string, std::string> acknowledged;  // identity -> name it was saved with
  std::atomic<long> sent{0}, failed{0}, refused{0};
  explicit Shared(size_t replicas) : ports(replicas) {}
};

std::string body(const std::string& action, int64_t base, const std::string& device,
                 const std::string& data) {
  std::string out = "{\"user\":";
  appendJsonString(out, kUser);
  out += ",\"password\":";
  appendJsonString(out, kPassword);
  out += ",\"action\":\"" + action + "\",\"iteration\":" + std::to_string(base) + ",\"device\":";
  appendJsonString(out, device);
  return out + (data.empty() ? "" : ",\"data\":" + data) + "}";
}

// The reply's JSON, or none when no reply came (the server was killed, or is down).
std::optional<JsonValue> ask(int port, const std::string& request) {
  httplib::Client client("127.0.0.1", port);
  client.set_connection_timeout(1, 0);
  client.set_read_timeout(20, 0);
  const httplib::Result result = client.Post("/sync/tessal/sync.php", request, "application/json");
  if (!result || result->status != 200) return std::nullopt;
  return JsonValue::parse(result->body);
}

void device(Shared& shared, int number) {
  const std::string name = "device-" + std::to_string(number);
  std::mt19937 random(static_cast<unsigned>(number) * 7919u + 1u);
  int64_t base = 0;
  bool poll = false;
  for (int n = 0; !shared.stop; ++n) {
    const int port = shared.ports[std::uniform_int_distribution<size_t>(0, shared.ports.size() - 1)(random)];
    if (port == 0) {
      std::this_thread::sleep_for(std::chrono::milliseconds(1));
      continue;
    }
    // A poll now and then keeps the base near the head, as a real device's does; after a refusal first.
    if (poll || n % 5 == 4) {
      if (const auto reply = ask(port, body("head", base, name, {})); reply && reply->find("iteration")) {
        base = reply->find("iteration")->integerValue().value_or(base);
        poll = false;
      }
      continue;
    }
    const std::string uuid = name + "-" + std::to_string(n) + "@WTNote";
    const std::string value = "\"saved " + std::to_string(n) + "\"";
    ++shared.sent;
    const auto reply =
        ask(port, body("save", base, name, "{\"i\":{\"" + uuid + "\":{\"name\":" + value + "}}}"));
    if (!reply) {
      ++shared.failed;
    } else if (reply->find("error")) {
      ++shared.refused;  // code 4: poll first
      poll = true;
    } else if (const JsonValue* iteration = reply->find("iteration")) {
      base = iteration->integerValue().value_or(base);
      std::lock_guard lock(shared.mutex);
      shared.acknowledged.emplace(uuid, value);
    }
  }
}

size_t acknowledgedCount(Shared& shared) {
  std::lock_guard lock(shared.mutex);
  return shared.acknowledged.size();
}

struct Check {
  size_t lost = 0, wrong = 0, gaps = 0, twice = 0, records = 0;
  int64_t head = 0;
};

// What was acknowledged before the snapshot must be in it; the iterations must be 1..head, once each.
Check check(SqlDatabase& database, Shared& shared) {
  std::map<std::string, std::string> acknowledged;
  {
    std::lock_guard lock(shared.mutex);
    acknowledged = shared.acknowledged;
  }
  Check result;
  SqlDatabase::Lease c = database.acquire();
  c->beginRead();
  result.head = c->query("SELECT head FROM accounts").at(0).integer(0);
  std::map<std::string, std::string> stored;
  std::vector<int> seen(static_cast<size_t>(result.head) + 1, 0);
  for (const SqlRow& row :
       c->query("SELECT r.uuid, r.created_iter, f.value FROM records r LEFT JOIN fields f "
                "ON f.account_id = r.account_id AND f.uuid = r.uuid AND f.name = 'name'")) {
    stored.emplace(row.text(0), row.text(2));
    const int64_t iteration = row.integer(1);
    if (iteration < 1 || iteration > result.head) {
      ++result.twice;  // beyond the head: counted with the doubles
    } else if (++seen[static_cast<size_t>(iteration)] == 2) {
      ++result.twice;
    }
  }
  c->commit();
  result.records = stored.size();
  for (int64_t i = 1; i <= result.head; ++i) result.gaps += seen[static_cast<size_t>(i)] == 0;
  for (const auto& [uuid, value] : acknowledged) {
    const auto found = stored.find(uuid);
    if (found == stored.end()) {
      ++result.lost;
    } else if (found->second != value) {
      ++result.wrong;
    }
  }
  return result;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 2) {
    std::cerr << "usage: tessal_server_kill_loop LOCATION [KILLS [DEVICES [REPLICAS]]]\n";
    return 2;
  }
  const std::string location = argv[1];
  const int kills = argc > 2 ? std::atoi(argv[2]) : 200;
  const int devices = argc > 3 ? std::atoi(argv[3]) : 4;
  const size_t replicas = argc > 4 ? static_cast<size_t>(std::atoi(argv[4])) : 1;
  std::string error;
  {
    std::unique_ptr<SyncStore> store = SyncStore::open(location, error);
    if (!store || PasswordAuthenticator(*store).createAccount(kUser, kPassword) !=
                      PasswordAuthenticator::SignUp::Created) {
      std::cerr << "cannot create the account in " << location << ": " << error << "\n";
      return 1;
    }
  }
  std::unique_ptr<SqlDatabase> database = SqlDatabase::open(location, error);
  if (!database) {
    std::cerr << error << "\n";
    return 1;
  }

  Shared shared(replicas);
  std::vector<std::unique_ptr<servertest::ServerProcess>> servers;
  for (size_t i = 0; i < replicas; ++i) {
    servers.push_back(std::make_unique<servertest::ServerProcess>(TESSAL_SYNC_SERVER_EXE, location));
    if (!servers[i]->start()) {
      std::cerr << "the server did not start\n";
      return 1;
    }
    shared.ports[i] = servers[i]->port();
  }
  std::vector<std::thread> threads;
  for (int d = 0; d < devices; ++d) threads.emplace_back(device, std::ref(shared), d);

  std::mt19937 random(20261126u);
  const auto started = std::chrono::steady_clock::now();
  Check last;
  size_t failedChecks = 0;
  for (int k = 1; k <= kills; ++k) {
    // A random moment while the devices save: after a restart they first wait for the password check,
    // so the moment is counted from the first save acknowledged since.
    const size_t before = acknowledgedCount(shared);
    for (int waited = 0; acknowledgedCount(shared) == before && waited < 10000; ++waited)
      std::this_thread::sleep_for(std::chrono::milliseconds(1));
    std::this_thread::sleep_for(
        std::chrono::microseconds(std::uniform_int_distribution<int>(0, 100000)(random)));
    const size_t victim = std::uniform_int_distribution<size_t>(0, replicas - 1)(random);
    // Requests already on their way meet the kill; new ones wait for the restart.
    shared.ports[victim] = 0;
    servers[victim]->kill();
    last = check(*database, shared);
    if (last.lost || last.wrong || last.gaps || last.twice) {
      ++failedChecks;
      std::cerr << "after kill " << k << ": " << last.lost << " lost, " << last.wrong
                << " with another value, " << last.gaps << " iterations missing, " << last.twice
                << " iterations twice\n";
    }
    if (!servers[victim]->start()) {
      std::cerr << "the server did not start again after kill " << k << "\n";
      return 1;
    }
    shared.ports[victim] = servers[victim]->port();
  }
  shared.stop = true;
  for (std::thread& thread : threads) thread.join();
  servers.clear();
  last = check(*database, shared);
  const double seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - started).count();
  std::cout << (database->kind() == SqlDatabase::Kind::SQLite ? "SQLite" : "PostgreSQL") << ", " << replicas
            << " replica(s), " << devices << " devices: " << kills << " kills in " << seconds << " s; "
            << shared.sent << " saves sent, " << shared.acknowledged.size() << " acknowledged, "
            << shared.failed << " without reply, " << shared.refused << " refused; " << last.records
            << " records, head " << last.head << "; lost " << last.lost << ", other value " << last.wrong
            << ", iterations missing " << last.gaps << ", twice " << last.twice << "; checks failed "
            << failedChecks << "\n";
  return failedChecks || last.lost || last.wrong || last.gaps || last.twice ? 1 : 0;
}
