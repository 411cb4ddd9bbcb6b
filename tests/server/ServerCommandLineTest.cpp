// The tessal-sync-server executable itself: add-user with the password on standard input, serve, and
// a clean stop on SIGTERM.
#include "ServerTestSupport.h"

#include <QProcess>
#include <QRegularExpression>

#include <poll.h>
#include <sys/resource.h>
#include <sys/socket.h>

#include <chrono>
#include <csignal>
#include <thread>
#include <vector>

namespace servertest {
namespace {

struct Outcome {
  int exitCode = -1;
  std::string out, err;
};

Outcome run(const QStringList& arguments, const QByteArray& input = {}) {
  QProcess process;
  process.start(QStringLiteral(TESSAL_SYNC_SERVER_EXE), arguments);
  EXPECT_TRUE(process.waitForStarted(10000));
  process.write(input);
  process.closeWriteChannel();
  EXPECT_TRUE(process.waitForFinished(30000));
  return {process.exitStatus() == QProcess::NormalExit ? process.exitCode() : -1,
          process.readAllStandardOutput().toStdString(), process.readAllStandardError().toStdString()};
}

class ServerCommandLineTest : public testing::TestWithParam<Storage> {
 protected:
  void SetUp() override {
    if (GetParam() == Storage::PostgreSQL && postgresUri().empty())
      GTEST_SKIP() << "TESSAL_TEST_POSTGRES is not set";
    storage_ = std::make_unique<StorageLocation>(GetParam());
    db_ = QString::fromStdString(storage_->location());
  }
  // Starts `serve` on a free port and gives the port it reports; 0 when it does not say.
  int serve(QProcess& server, const QStringList& more = {}) {
    server.start(QStringLiteral(TESSAL_SYNC_SERVER_EXE),
                 QStringList{"serve", "--listen", "127.0.0.1:0", "--db", db_} + more);
    EXPECT_TRUE(server.waitForStarted(10000) && server.waitForReadyRead(10000))
        << server.readAllStandardError().toStdString();
    const QString line = QString::fromUtf8(server.readLine());
    const QRegularExpressionMatch match =
        QRegularExpression("listening on http://127\\.0\\.0\\.1:(\\d+)").match(line);
    EXPECT_TRUE(match.hasMatch()) << line.toStdString();
    return match.captured(1).toInt();
  }
  // A clean stop on SIGTERM.
  static void expectStopsOnTerm(QProcess& server) {
    ::kill(static_cast<pid_t>(server.processId()), SIGTERM);
    ASSERT_TRUE(server.waitForFinished(10000));
    EXPECT_EQ(server.exitStatus(), QProcess::NormalExit);
    EXPECT_EQ(server.exitCode(), 0);
  }
  std::unique_ptr<StorageLocation> storage_;
  QString db_;
};

TEST_P(ServerCommandLineTest, AddUserThenServe) {
  const Outcome added = run({"add-user", "Cli@Example.com", "--db", db_}, "a password on stdin\n");
  EXPECT_EQ(added.exitCode, 0) << added.err;
  EXPECT_NE(added.out.find("cli@example.com"), std::string::npos) << added.out;
  EXPECT_EQ(run({"add-user", "cli@example.com", "--db", db_}, "another password\n").exitCode, 1);
  EXPECT_EQ(run({"add-user", "short@example.com", "--db", db_}, "short\n").exitCode, 1);

  QProcess server;
  const int port = serve(server);
  ASSERT_GT(port, 0);
  const Reply reply = post(port, "/sync/tessal/sync.php",
                           requestBody("cli@example.com", "a password on stdin", "head", 0, "cli-device"));
  EXPECT_EQ(reply.body, R"({"action":"head","iteration":0,"result":{"i":{},"u":{},"x":[]}})");
  EXPECT_EQ(get(port, "/sync/tessal/signup.php").status, 200);
  expectStopsOnTerm(server);
}

// Under a low descriptor limit the server holds only the connections it has descriptors for and closes
// the rest at once, instead of leaving them unanswered in the backlog while it fails to accept them.
TEST_P(ServerCommandLineTest, ConnectionsBeyondTheDescriptorLimitAreClosedAtOnce) {
  ASSERT_EQ(run({"add-user", "fd@example.com", "--db", db_}, "a password on stdin\n").exitCode, 0);
  QProcess server;
  server.setChildProcessModifier([] {
    const rlimit files{160, 160};  // soft and hard: the server cannot raise it
    setrlimit(RLIMIT_NOFILE, &files);
  });
  const int port = serve(server, {"--threads", "4"});
  ASSERT_GT(port, 0);
  std::vector<std::unique_ptr<RawConnection>> clients;
  for (int i = 0; i < 300; ++i) {
    clients.push_back(std::make_unique<RawConnection>(port));
    ASSERT_TRUE(clients.back()->connected());
  }
  std::this_thread::sleep_for(std::chrono::milliseconds(500));
  int closedAtOnce = 0;
  for (const auto& client : clients) {
    pollfd readable{client->fd(), POLLIN, 0};
    char byte;
    if (poll(&readable, 1, 0) == 1 && recv(client->fd(), &byte, 1, MSG_DONTWAIT) == 0) ++closedAtOnce;
  }
  clients.clear();
  EXPECT_GE(closedAtOnce, 150) << "of 300, with descriptors for fewer than 160";

  const Reply reply = post(port, "/sync/tessal/sync.php",
                           requestBody("fd@example.com", "a password on stdin", "head", 0, "cli-device"));
  EXPECT_EQ(reply.status, 200) << reply.body;
  expectStopsOnTerm(server);
}

TEST_P(ServerCommandLineTest, WrongUsageExitsWith2) {
  const QStringList cases[] = {
      {},
      {"start"},
      {"serve", "--db", db_},
      {"serve", "--listen", "127.0.0.1:0"},
      {"serve", "--listen", "localhost", "--db", db_},
      {"serve", "--listen", "127.0.0.1:70000", "--db", db_},
      {"serve", "--listen", "127.0.0.1:0", "--db", db_, "--threads", "many"},
      {"add-user", "--db", db_},
  };
  for (const QStringList& arguments : cases) {
    const Outcome result = run(arguments);
    EXPECT_EQ(result.exitCode, 2) << arguments.join(' ').toStdString();
    EXPECT_NE(result.err.find("usage"), std::string::npos);
  }
}

INSTANTIATE_TEST_SUITE_P(Storage, ServerCommandLineTest,
                         testing::Values(Storage::SQLite, Storage::PostgreSQL), storageName);

}  // namespace
}  // namespace servertest
