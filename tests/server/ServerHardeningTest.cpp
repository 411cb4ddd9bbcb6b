// The server as strangers meet it over real sockets: floods, slow requests, guessing, foreign sign-ups.
#include "ServerTestSupport.h"

#include <poll.h>
#include <sys/socket.h>

#include <atomic>
#include <chrono>
#include <functional>
#include <map>
#include <sstream>
#include <thread>
#include <vector>

namespace servertest {
namespace {

using namespace std::chrono_literals;

std::string requestHead(const std::string& extraHeaders) {
  return "POST /sync/tessal/sync.php HTTP/1.1\r\nHost: 127.0.0.1\r\nContent-Type: application/json\r\n" +
         extraHeaders + "\r\n";
}
// The whole request for `body`, after which the server closes the connection.
std::string closingRequest(const std::string& body) {
  return requestHead("Connection: close\r\nContent-Length: " + std::to_string(body.size()) + "\r\n") + body;
}

class ServerHardeningTest : public ServerTest {
 protected:
  // Starts the server; while `attackers` threads attack, every one of the owner's `polls` is answered.
  void ownerPollsThrough(int attackers, const std::function<void(int, const std::atomic<bool>&)>& attack,
                         int polls, std::chrono::milliseconds pause) {
    if (!server_) startServer();
    const std::string user = newUser("owner");
    ASSERT_EQ(sync(user, "head", 0, "laptop").status, 200);
    std::atomic<bool> done{false};
    std::vector<std::thread> threads;
    for (int t = 0; t < attackers; ++t) threads.emplace_back([&, t] { attack(t, done); });
    std::this_thread::sleep_for(300ms);  // every attacker is at it
    for (int poll = 0; poll < polls; ++poll, std::this_thread::sleep_for(pause)) {
      const Reply reply = sync(user, "head", 0, "laptop");
      EXPECT_EQ(reply.status, 200) << reply.body;
    }
    done = true;
    for (std::thread& thread : threads) thread.join();
  }
};

TEST_P(ServerHardeningTest, FloodsSlowConnectionsAndGuessesDoNotStarveADevicesPolls) {
  options.maxBodyBytes = 64 * 1024;
  options.threads = 4;
  options.limits.requestTimeout = 1500ms;
  options.authentication.concurrentVerifications = 1;
  startServer();
  RawConnection chunked(port());
  ASSERT_TRUE(chunked.send(requestHead("Transfer-Encoding: chunked\r\n")));
  const std::string chunk = "4000\r\n" + std::string(0x4000, ' ') + "\r\n";
  for (int sent = 0; sent < 64 && chunked.send(chunk);) ++sent;  // up to 1 MiB; the server stops long before
  const std::string refused = chunked.readAll();
  EXPECT_EQ(RawConnection::status(refused), 413) << refused.substr(0, 200);
  EXPECT_NE(refused.find("\"code\":6"), std::string::npos) << refused.substr(0, 400);
  std::atomic<int> cutOff{0}, busy{0}, unanswered{0};
  ownerPollsThrough(
      82,
      [&](int t, const std::atomic<bool>& done) {
        // From a new address each time, so no lock spares a verification.
        for (int n = 0; t >= 70 && !done; ++n) {
          const std::string stranger =
              "stranger-" + std::to_string(t) + "-" + std::to_string(n) + "@example.com";
          const Reply reply =
              post(port(), kSyncPath, requestBody(stranger, "guess", "head", 0), "application/json",
                   "10." + std::to_string(t) + "." + std::to_string(n % 250) + ".1");
          busy += reply.status == 503 && reply.retryAfter == "1";
          unanswered += reply.status == 0;
        }
        if (t >= 70) return;
        RawConnection connection(port());
        const std::string request = requestHead("Content-Length: 2\r\n") + "{}";
        for (size_t at = 0; at < request.size() && !done && connection.send(request.substr(at, 1)); ++at)
          std::this_thread::sleep_for(200ms);
        cutOff += RawConnection::status(connection.readAll()) == 408;
      },
      20, 100ms);
  EXPECT_EQ(cutOff, 70) << "every slow request ends at the deadline with 408";
  EXPECT_GT(busy, 0) << "guesses beyond the free slot are answered 503 at once";
  EXPECT_EQ(unanswered, 0);
}

// Past the bodies' budget a request is answered 503 at once; a closed connection gives back what it held.
TEST_P(ServerHardeningTest, BodiesInFlightShareOneBudget) {
  options.maxBodyBytes = 96 << 10;
  options.limits.maxBodyMemory = 128 << 10;
  startServer();
  const std::string user = newUser("owner");
  const std::string padding(80 << 10, ' '),
      body = requestBody(user, "password-of-" + user, "head", 0, "laptop");
  const std::string whole = closingRequest(padding + body);
  auto chunk = [](const std::string& bytes) {
    return (std::stringstream() << std::hex << bytes.size()).str() + "\r\n" + bytes + "\r\n";
  };
  auto holder = std::make_unique<RawConnection>(port());
  ASSERT_TRUE(holder->send(whole.substr(0, whole.size() - body.size())));  // and never the rest
  std::this_thread::sleep_for(300ms);                                      // read by the server
  const std::pair<std::string, int> rows[] = {
      {whole, 503},
      {requestHead("Connection: close\r\nTransfer-Encoding: chunked\r\n") + chunk(padding) + chunk(body) +
           "0\r\n\r\n",
       503},
      {whole, 200}};  // once the holder is gone
  for (const auto& row : rows) {
    if (row.second == 200) holder.reset(), std::this_thread::sleep_for(200ms);  // the server saw it close
    RawConnection connection(port());
    connection.send(row.first);
    const std::string reply = connection.readAll();
    EXPECT_EQ(RawConnection::status(reply), row.second) << reply.substr(0, 300);
    EXPECT_EQ(row.second == 503, reply.find("Retry-After: ") != std::string::npos) << reply.substr(0, 300);
  }
}

// A reply waits for its reader without holding a worker, within one budget for every waiting reply;
// a reader that does not take its reply in time is dropped, and the budget comes back.
TEST_P(ServerHardeningTest, RepliesWaitingForTheirReadersShareOneBudget) {
  options.threads = 2;
  options.limits.maxReplyMemory = 24 << 20;
  options.limits.writeTimeout = 1500ms;
  startServer();
  const std::string user = newUser("owner");
  const std::string note = R"({"i":{"big@WTNote":{"text":")" + std::string(8 << 20, 'n') + R"("}}})";
  ASSERT_EQ(sync(user, "save", 0, "laptop", note).integer("iteration"), 1);
  const std::string ask = closingRequest(requestBody(user, "password-of-" + user, "head", 0, "reader"));
  // Two readers that do not read: the first reply (about 16 MiB) waits, the second does not fit.
  RawConnection first(port()), second(port());
  ASSERT_TRUE(first.send(ask) && second.send(ask));
  std::map<int, RawConnection*> byStatus;
  for (RawConnection* reader : {&first, &second}) {
    pollfd readable{reader->fd(), POLLIN, 0};
    ASSERT_EQ(poll(&readable, 1, 20000), 1);
    char start[13] = {};
    ASSERT_EQ(recv(reader->fd(), start, 12, MSG_PEEK | MSG_WAITALL), 12);
    byStatus[RawConnection::status(start)] = reader;
  }
  ASSERT_EQ(byStatus.size(), 2u);
  ASSERT_TRUE(byStatus.count(200) && byStatus.count(503));
  EXPECT_NE(byStatus[503]->readAll().find("Retry-After: 1"), std::string::npos);
  EXPECT_EQ(sync(user, "head", 1, "laptop").status, 200) << "a poll is answered meanwhile";
  std::this_thread::sleep_for(2500ms);  // past the write deadline
  const size_t dropped = byStatus[200]->readAll().size();
  RawConnection reading(port());
  ASSERT_TRUE(reading.send(ask));
  const std::string whole = reading.readAll();
  EXPECT_EQ(RawConnection::status(whole), 200);
  EXPECT_GT(whole.size(), 16u << 20);
  EXPECT_LT(dropped, whole.size()) << "the reader that did not read was dropped";
}

// An address past its connections is answered 503 at once, and every other address is served.
TEST_P(ServerHardeningTest, ConnectionsAreCappedPerAddress) {
  options.limits.maxConnectionsPerAddress = 3;
  startServer();
  const std::string user = newUser("owner");
  const std::string ask = closingRequest(requestBody(user, "password-of-" + user, "head", 0, "laptop"));
  std::vector<std::unique_ptr<RawConnection>> held;
  for (int i = 0; i < 3; ++i) held.push_back(std::make_unique<RawConnection>(port()));
  std::this_thread::sleep_for(200ms);  // accepted
  // From where, with how many still held: the status.
  for (const auto& [from, stillHeld, status] :
       {std::tuple{"127.0.0.1", 3, 503}, {"127.0.0.2", 3, 200}, {"127.0.0.1", 2, 200}}) {
    held.resize(size_t(stillHeld));
    std::this_thread::sleep_for(200ms);  // the closed one is gone
    RawConnection connection(port(), from);
    ASSERT_TRUE(connection.connected());
    connection.send(ask);
    const std::string reply = connection.readAll();
    EXPECT_EQ(RawConnection::status(reply), status) << from << ": " << reply.substr(0, 300);
  }
}

// Guesses slow down the address they come from, never the owner's devices: those that proved the
// password pass, also on another server over the same storage; sign-ups from strangers are refused.
TEST_P(ServerHardeningTest, GuessesLockOutNoDeviceAndStrangersCannotSignUp) {
  std::atomic<int64_t> offset{0};
  options.authentication.now = [&] {
    return std::chrono::steady_clock::now() + std::chrono::seconds(offset.load());
  };
  options.authentication.successLifetime = 10min;
  options.authentication.firstLock = 60s;
  options.authentication.longestLock = 10min;
  startServer();
  const std::string user = newUser("owner");
  // The owner's laptop, or a stranger's guesses (no device) from the same address.
  auto attempt = [&](const std::string& secret) {
    const bool owner = secret == "password-of-" + user;
    return post(port(), kSyncPath, requestBody(user, secret, "head", 0, owner ? "laptop" : ""));
  };
  ASSERT_EQ(attempt("password-of-" + user).status, 200);
  // A wrong password is code 2; while locked a guess is not even tried (429, to retry); the lock doubles.
  for (const auto& [seconds, outcome] : {std::pair{0, 2}, {0, 429}, {61, 2}, {61, 429}, {61, 2}}) {
    offset += seconds;
    const Reply guess = attempt("guess");
    EXPECT_EQ(outcome == 2 ? guess.code() : guess.status, outcome) << offset << " s: " << guess.body;
    EXPECT_TRUE(outcome == 2 || (!guess.json && !guess.retryAfter.empty())) << guess.body;
    EXPECT_EQ(attempt("password-of-" + user).status, 200) << "remembered credentials pass during a lock";
  }
  for (int minute = 0; minute < 30; ++minute) {
    offset += 70;  // past the remembered success after ten minutes
    const Reply guess = attempt("guess-" + std::to_string(minute));
    EXPECT_TRUE(guess.status == 429 || guess.code() == 2) << guess.body;
    EXPECT_EQ(attempt("password-of-" + user).status, 200) << "minute " << minute;
  }
  EXPECT_EQ(attempt("one-more-guess").status, 429);

  // Another server over the same storage (a replica, or this one restarted) knows nothing of the
  // above but the laptop's proof; it remembers no success, so every row is verified.
  SyncServer::Options fresh = options;
  fresh.authentication.successLifetime = 0ms;
  const std::unique_ptr<SyncServer> replica = startedServer(storage_->location(), fresh);
  ASSERT_TRUE(replica);
  // Secret, device, X-Forwarded-For (as a proxy on loopback names a client): a status, or 2 for the error
  // code. The laptop is proven: past the lock on its address; the phone is new, at the guesser's address.
  // clang-format off
  for (const auto& [secret, device, from, outcome] :
       {std::tuple{"guess", "", "", 2}, {"guess", "", "", 429}, {"password-of-", "laptop", "", 200},
        {"password-of-", "phone", "", 429}, {"password-of-", "phone", "198.51.100.7", 200},
        {"password-of-", "phone", "", 200}}) {
    // clang-format on
    const Reply reply = post(replica->port(), kSyncPath,
                             requestBody(user, *secret == 'p' ? secret + user : secret, "head", 0, device),
                             "application/json", from);
    EXPECT_EQ(outcome == 2 ? reply.code() : reply.status, outcome)
        << secret << " " << device << " " << from << ": " << reply.body;
  }

  // Sign-ups from other sites, with the fields in the query or too often are refused, saying what is wrong.
  const std::string sameSite = "Origin: http://127.0.0.1:" + std::to_string(port()) + "\r\n";
  int checks = 0;
  // The reply to a sign-up, and whether the account exists afterwards.
  auto signUp = [&](const std::string& name, const std::string& password, const std::string& headers,
                    const std::string& query = {}) {
    RawConnection connection(port());
    const std::string body =
        "email=" + name + "%40example.com&password=" + password + "&password2=" + password;
    connection.send("POST /sync/tessal/signup.php" + query +
                    " HTTP/1.1\r\nHost: 127.0.0.1:" + std::to_string(port()) +
                    "\r\nContent-Type: application/x-www-form-urlencoded\r\nConnection: close\r\n" + headers +
                    "Content-Length: " + std::to_string(body.size()) + "\r\n\r\n" + body);
    const std::string reply = connection.readAll();
    // From an address of its own: the guesses above slowed down this one.
    const Reply head =
        post(port(), kSyncPath, requestBody(name + "@example.com", "long enough password", "head", 0),
             "application/json", "192.0.2." + std::to_string(++checks));
    return std::pair(reply, head.status == 200 && head.code() == 0);
  };
  const std::string password = "long+enough+password", tooLong(1025, 'p');
  const struct {
    const char *name, *headers, *query;
    int status;
    const char* says;  // a fragment of the reply
  } rows[] = {
      // clang-format off
      {"a", "Origin: https://evil.example\r\n", "", 403, ""}, {"a", "Origin: null\r\n", "", 403, ""},
      {"a", "Referer: https://evil.example/form.html\r\n", "", 403, ""},
      {"a", "", "?email=a%40example.com", 415, ""},  // the fields in the query instead
      // From the server's own page (no headers given): the first of five attempts in the window.
      {"b", nullptr, "", 400, "The password is too long"}, {"c0", nullptr, "", 201, ""},
      {"c1", nullptr, "", 201, ""}, {"c2", nullptr, "", 201, ""}, {"c3", nullptr, "", 201, ""},
      {"d", nullptr, "", 429, "Retry-After:"},
      // clang-format on
  };
  for (const auto& row : rows) {
    const auto [reply, exists] = signUp(row.name, *row.name == 'b' ? tooLong : password,
                                        row.headers ? row.headers : sameSite, row.query);
    EXPECT_EQ(RawConnection::status(reply), row.status)
        << row.name << " " << (row.headers ? row.headers : "");
    EXPECT_NE(reply.find(row.says), std::string::npos) << reply;
    EXPECT_EQ(reply.find("needs at least 8"), std::string::npos);
    EXPECT_EQ(exists, row.status == 201) << row.name;
  }
}

INSTANTIATE_TEST_SUITE_P(Storage, ServerHardeningTest, testing::Values(Storage::SQLite, Storage::PostgreSQL),
                         storageName);

}  // namespace
}  // namespace servertest
