// The tessal-sync-server executable itself: add-user with the password on standard input, serve, and
// a clean stop on SIGTERM.
#include "ServerTestSupport.h"

#include <QProcess>
#include <QRegularExpression>

#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <unistd.h>

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
  server.start(QStringLiteral(TESSAL_SYNC_SERVER_EXE), {"serve", "--listen", "127.0.0.1:0", "--db", db_});
  ASSERT_TRUE(server.waitForStarted(10000));
  ASSERT_TRUE(server.waitForReadyRead(10000)) << server.readAllStandardError().toStdString();
  const QString line = QString::fromUtf8(server.readLine());
  const QRegularExpressionMatch match =
      QRegularExpression("listening on http://127\\.0\\.0\\.1:(\\d+)").match(line);
  ASSERT_TRUE(match.hasMatch()) << line.toStdString();
  const int port = match.captured(1).toInt();

  const Reply reply = post(port, "/sync/tessal/sync.php",
                           requestBody("cli@example.com", "a password on stdin", "head", 0, "cli-device"));
  EXPECT_EQ(reply.body, R"({"action":"head","iteration":0,"result":{"i":{},"u":{},"x":[]}})");
  EXPECT_EQ(get(port, "/sync/tessal/signup.php").status, 200);

  ::kill(static_cast<pid_t>(server.processId()), SIGTERM);
  ASSERT_TRUE(server.waitForFinished(10000));
  EXPECT_EQ(server.exitStatus(), QProcess::NormalExit);
  EXPECT_EQ(server.exitCode(), 0);
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
  server.start(QStringLiteral(TESSAL_SYNC_SERVER_EXE),
               {"serve", "--listen", "127.0.0.1:0", "--db", db_, "--threads", "4"});
  ASSERT_TRUE(server.waitForStarted(10000));
  ASSERT_TRUE(server.waitForReadyRead(10000)) << server.readAllStandardError().toStdString();
  const QRegularExpressionMatch match = QRegularExpression("listening on http://127\\.0\\.0\\.1:(\\d+)")
                                            .match(QString::fromUtf8(server.readLine()));
  ASSERT_TRUE(match.hasMatch());
  const int port = match.captured(1).toInt();

  std::vector<int> clients;
  for (int i = 0; i < 300; ++i) {
    const int fd = socket(AF_INET, SOCK_STREAM, 0);
    ASSERT_GE(fd, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<uint16_t>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    ASSERT_EQ(connect(fd, reinterpret_cast<sockaddr*>(&address), sizeof address), 0);
    clients.push_back(fd);
  }
  std::this_thread::sleep_for(std::chrono::milliseconds(500));
  int closedAtOnce = 0;
  for (int fd : clients) {
    pollfd readable{fd, POLLIN, 0};
    char byte;
    if (poll(&readable, 1, 0) == 1 && recv(fd, &byte, 1, MSG_DONTWAIT) == 0) ++closedAtOnce;
  }
  for (int fd : clients) ::close(fd);
  EXPECT_GE(closedAtOnce, 150) << "of 300, with descriptors for fewer than 160";

  const Reply reply = post(port, "/sync/tessal/sync.php",
                           requestBody("fd@example.com", "a password on stdin", "head", 0, "cli-device"));
  EXPECT_EQ(reply.status, 200) << reply.body;
  ::kill(static_cast<pid_t>(server.processId()), SIGTERM);
  ASSERT_TRUE(server.waitForFinished(10000));
  EXPECT_EQ(server.exitCode(), 0);
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
