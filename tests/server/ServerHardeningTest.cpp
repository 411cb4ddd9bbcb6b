// The server as strangers meet it over real sockets: floods, slow requests, guessing, foreign sign-ups.
#include "ServerTestSupport.h"

#include <atomic>
#include <chrono>
#include <functional>
#include <thread>
#include <vector>

namespace servertest {
namespace {

using namespace std::chrono_literals;

std::string requestHead(const std::string& extraHeaders) {
  return "POST /sync/tessal/sync.php HTTP/1.1\r\nHost: 127.0.0.1\r\nContent-Type: application/json\r\n" +
         extraHeaders + "\r\n";
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

// Chunked floods are cut off as they arrive; slow connections and guesses never starve the owner's polls.
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
        for (int n = 0; t >= 70 && !done; ++n) {  // a new address each time, so no lock spares a verification
          const std::string stranger =
              "stranger-" + std::to_string(t) + "-" + std::to_string(n) + "@example.com";
          const Reply reply = post(port(), kSyncPath, requestBody(stranger, "guess", "head", 0));
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

// Guesses are slowed down, never locking out the owner's devices; sign-ups from strangers are refused.
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
  auto attempt = [&](const std::string& secret) {
    return post(port(), kSyncPath, requestBody(user, secret, "head", 0, "laptop"));
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

  // Sign-ups from other sites, with the fields in the query or too often are refused, saying what is wrong.
  const std::string sameSite = "Origin: http://127.0.0.1:" + std::to_string(port()) + "\r\n";
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
    const Reply head =
        post(port(), kSyncPath, requestBody(name + "@example.com", "long enough password", "head", 0));
    return std::pair(reply, head.status == 200 && head.code() == 0);
  };
  const std::string password = "long+enough+password", tooLong(1025, 'p');
  const struct {
    const char *name, *headers, *query;
    int status;
    const char* says;  // a fragment of the reply
  } rows[] = {
      {"a", "Origin: https://evil.example\r\n", "", 403, ""},
      {"a", "Origin: null\r\n", "", 403, ""},
      {"a", "Referer: https://evil.example/form.html\r\n", "", 403, ""},
      {"a", "", "?email=a%40example.com", 415, ""},  // the fields in the query instead
      // From the server's own page (no headers given): the first of five attempts in the window.
      {"b", nullptr, "", 400, "The password is too long"},
      {"c0", nullptr, "", 201, ""},
      {"c1", nullptr, "", 201, ""},
      {"c2", nullptr, "", 201, ""},
      {"c3", nullptr, "", 201, ""},
      {"d", nullptr, "", 429, "Retry-After:"},
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
