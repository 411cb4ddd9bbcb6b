// The server as strangers meet it over real sockets: floods, slow requests, guessing, foreign sign-ups.
#include "ServerTestSupport.h"

#include <atomic>
#include <chrono>
#include <thread>
#include <vector>

namespace servertest {
namespace {

using namespace std::chrono_literals;

std::string requestHead(const std::string& extraHeaders) {
  return "POST /sync/tessal/sync.php HTTP/1.1\r\nHost: 127.0.0.1\r\nContent-Type: application/json\r\n" +
         extraHeaders + "\r\n";
}

class ServerHardeningTest : public ServerTest {};

// A body of no announced length is cut off while it arrives, once past the limit, with code 6.
TEST_P(ServerHardeningTest, AChunkedFloodIsCutOffWhileItArrives) {
  options.maxBodyBytes = 64 * 1024;
  startServer();
  RawConnection chunked(port());
  ASSERT_TRUE(chunked.send(requestHead("Transfer-Encoding: chunked\r\n")));
  const std::string chunk = "4000\r\n" + std::string(0x4000, ' ') + "\r\n";
  int sent = 0;
  while (sent < 64 && chunked.send(chunk)) ++sent;  // up to 1 MiB; the server stops reading long before
  const std::string refused = chunked.readAll();
  EXPECT_EQ(RawConnection::status(refused), 413) << refused.substr(0, 200);
  EXPECT_NE(refused.find("\"code\":6"), std::string::npos) << refused.substr(0, 400);
}

// Connections sending a byte now and then hold no worker, end at the deadline, never starve a device.
TEST_P(ServerHardeningTest, SlowConnectionsDoNotStarveADevicesPolls) {
  options.threads = 4;
  options.limits.requestTimeout = 1500ms;
  startServer();
  const std::string user = newUser("owner");
  ASSERT_EQ(head(user, 0, "laptop").status, 200);

  std::atomic<bool> done{false};
  std::atomic<int> cutOff{0};
  std::vector<std::thread> slow;
  for (int i = 0; i < 70; ++i) {
    slow.emplace_back([&, port = port()] {
      RawConnection connection(port);
      const std::string request = requestHead("Content-Length: 2\r\n") + "{}";
      for (size_t at = 0; at < request.size() && !done; ++at) {
        if (!connection.send(request.substr(at, 1))) break;
        std::this_thread::sleep_for(200ms);
      }
      if (RawConnection::status(connection.readAll()) == 408) ++cutOff;
    });
  }
  std::this_thread::sleep_for(300ms);  // every slow connection is open and talking
  int answered = 0;
  const auto until = std::chrono::steady_clock::now() + 2s;
  while (std::chrono::steady_clock::now() < until) {
    const Reply reply = head(user, 0, "laptop");
    EXPECT_EQ(reply.status, 200) << reply.body;
    if (reply.status == 200) ++answered;
    std::this_thread::sleep_for(100ms);
  }
  done = true;
  for (std::thread& thread : slow) thread.join();
  EXPECT_GE(answered, 10);
  EXPECT_EQ(cutOff, 70) << "every slow request ends at the deadline with 408";
}

// Guesses finding every verification slot taken are told to come back at once instead of holding a worker.
TEST_P(ServerHardeningTest, AFloodOfGuessesWaitsForNoVerificationSlot) {
  options.threads = 4;
  options.authentication.concurrentVerifications = 1;
  startServer();
  const std::string user = newUser("owner");
  ASSERT_EQ(head(user, 0, "laptop").status, 200);

  std::atomic<bool> done{false};
  std::atomic<int> busy{0}, unanswered{0};
  std::vector<std::thread> strangers;
  for (int t = 0; t < 12; ++t) {
    strangers.emplace_back([&, t, port = port()] {
      for (int n = 0; !done; ++n) {
        // A new address each time, so no lock spares the server a verification.
        const std::string address =
            "stranger-" + std::to_string(t) + "-" + std::to_string(n) + "@example.com";
        const Reply reply = post(port, "/sync/tessal/sync.php", requestBody(address, "guess", "head", 0));
        if (reply.status == 503 && reply.retryAfter == "1") ++busy;
        if (reply.status == 0) ++unanswered;
      }
    });
  }
  for (int poll = 0; poll < 20; ++poll) {
    const Reply reply = head(user, 0, "laptop");
    EXPECT_EQ(reply.status, 200) << reply.body;
    std::this_thread::sleep_for(50ms);
  }
  done = true;
  for (std::thread& thread : strangers) thread.join();
  EXPECT_GT(busy, 0) << "guesses beyond the free slot are answered 503 at once";
  EXPECT_EQ(unanswered, 0);
}

// A stranger cannot lock out the owner's devices, even after their remembered success expired.
TEST_P(ServerHardeningTest, FailedGuessesNeverLockOutDevicesThatProvedThePassword) {
  std::atomic<int64_t> offset{0};
  options.authentication.now = [&] {
    return std::chrono::steady_clock::now() + std::chrono::seconds(offset.load());
  };
  options.authentication.successLifetime = 10min;
  options.authentication.firstLock = 60s;
  options.authentication.longestLock = 10min;
  startServer();
  const std::string user = newUser("owner");
  const std::string password = "password-of-" + user;
  auto attempt = [&](const std::string& secret) {
    return post(port(), "/sync/tessal/sync.php", requestBody(user, secret, "head", 0, "laptop"));
  };
  ASSERT_EQ(attempt(password).status, 200);
  for (int minute = 0; minute < 30; ++minute) {
    offset += 70;  // past the remembered success after ten minutes
    const Reply guess = attempt("guess-" + std::to_string(minute));
    EXPECT_TRUE(guess.status == 429 || guess.code() == 2) << guess.body;
    const Reply owner = attempt(password);
    EXPECT_EQ(owner.status, 200) << "minute " << minute << ": " << owner.body;
  }
  EXPECT_EQ(attempt("one-more-guess").status, 429);
}

TEST_P(ServerHardeningTest, SignUpRefusesOtherSitesQueriesFloodsAndSaysWhatIsWrong) {
  startServer();
  auto signUp = [&](const std::string& email, const std::string& password, const std::string& headers,
                    const std::string& query = {}) {
    RawConnection connection(port());
    const std::string body = "email=" + email + "&password=" + password + "&password2=" + password;
    connection.send("POST /sync/tessal/signup.php" + query +
                    " HTTP/1.1\r\nHost: 127.0.0.1:" + std::to_string(port()) +
                    "\r\nContent-Type: application/x-www-form-urlencoded\r\nConnection: close\r\n" + headers +
                    "Content-Length: " + std::to_string(body.size()) + "\r\n\r\n" + body);
    return connection.readAll();
  };
  auto exists = [&](const std::string& email) {
    // The account exists when the password gets past the credentials check.
    const Reply reply =
        post(port(), "/sync/tessal/sync.php", requestBody(email, "long enough password", "head", 0));
    return reply.status == 200 && reply.code() == 0;
  };
  const std::string password = "long+enough+password";

  const std::pair<const char*, int> strangers[] = {{"Origin: https://evil.example\r\n", 403},
                                                   {"Origin: null\r\n", 403},
                                                   {"Referer: https://evil.example/form.html\r\n", 403},
                                                   {"", 415}};  // the fields in the query instead
  for (const auto& [headers, status] : strangers) {
    const std::string query = *headers ? "" : "?email=a%40example.com";
    EXPECT_EQ(RawConnection::status(signUp("a%40example.com", password, headers, query)), status) << headers;
  }
  EXPECT_FALSE(exists("a@example.com"));

  const std::string sameSite = "Origin: http://127.0.0.1:" + std::to_string(port()) + "\r\n";
  const std::string tooLong = signUp("b%40example.com", std::string(1025, 'p'), sameSite);
  EXPECT_EQ(RawConnection::status(tooLong), 400);
  EXPECT_NE(tooLong.find("The password is too long"), std::string::npos);
  EXPECT_EQ(tooLong.find("needs at least 8"), std::string::npos);

  // That was the first of five attempts this address may make in the window.
  for (int i = 0; i < 4; ++i) {
    const std::string email = "c" + std::to_string(i) + "%40example.com";
    EXPECT_EQ(RawConnection::status(signUp(email, password, sameSite)), 201) << i;
  }
  EXPECT_TRUE(exists("c0@example.com"));
  const std::string flooded = signUp("d%40example.com", password, sameSite);
  EXPECT_EQ(RawConnection::status(flooded), 429);
  EXPECT_NE(flooded.find("Retry-After:"), std::string::npos);
  EXPECT_FALSE(exists("d@example.com"));
}

INSTANTIATE_TEST_SUITE_P(Storage, ServerHardeningTest, testing::Values(Storage::SQLite, Storage::PostgreSQL),
                         storageName);

}  // namespace
}  // namespace servertest
