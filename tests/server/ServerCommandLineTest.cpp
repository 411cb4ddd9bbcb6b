// The tessal-sync-server executable: add-user (password on stdin), serve, a clean stop on SIGTERM.
#include "ServerTestSupport.h"

#include <QProcess>
#include <QRegularExpression>

#include <poll.h>
#include <sys/resource.h>
#include <sys/socket.h>

#include <chrono>
#include <csignal>
#include <thread>
#include <tuple>
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

class ServerCommandLineTest : public StorageTest {};

// Out of descriptors, the server closes further connections at once instead of leaving them unanswered.
TEST_P(ServerCommandLineTest, AddUserServeWithFewDescriptorsStopAndRefusals) {
  const QString db = QString::fromStdString(storage_->location());
  const Outcome added = run({"add-user", "Cli@Example.com", "--db", db}, "a password on stdin\n");
  EXPECT_EQ(added.exitCode, 0) << added.err;
  EXPECT_NE(added.out.find("cli@example.com"), std::string::npos) << added.out;
  QProcess server;
  server.setChildProcessModifier([] {
    const rlimit files{160, 160};  // soft and hard: the server cannot raise it
    setrlimit(RLIMIT_NOFILE, &files);
  });
  server.start(TESSAL_SYNC_SERVER_EXE, {"serve", "--listen", "127.0.0.1:0", "--db", db, "--threads", "4"});
  ASSERT_TRUE(server.waitForStarted(10000) && server.waitForReadyRead(10000));
  const QString line = QString::fromUtf8(server.readLine());
  const int port =
      QRegularExpression("listening on http://127\\.0\\.0\\.1:(\\d+)").match(line).captured(1).toInt();
  ASSERT_GT(port, 0) << line.toStdString();
  EXPECT_EQ(get(port, "/sync/tessal/signup.php").status, 200);
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
    closedAtOnce += poll(&readable, 1, 0) == 1 && recv(client->fd(), &byte, 1, MSG_DONTWAIT) == 0;
  }
  clients.clear();
  EXPECT_GE(closedAtOnce, 150) << "of 300, with descriptors for fewer than 160";
  const Reply reply =
      post(port, kSyncPath, requestBody("cli@example.com", "a password on stdin", "head", 0, "cli"));
  EXPECT_EQ(reply.body, R"({"action":"head","iteration":0,"result":{"i":{},"u":{},"x":[]}})");
  ::kill(static_cast<pid_t>(server.processId()), SIGTERM);
  EXPECT_TRUE(server.waitForFinished(10000) && server.exitStatus() == QProcess::NormalExit &&
              server.exitCode() == 0);
  // clang-format off
  const std::tuple<QStringList, int, const char*> rows[] = {  // arguments, exit code, standard input
      {{"add-user", "cli@example.com", "--db", db}, 1, "another password\n"},  // taken
      {{"add-user", "short@example.com", "--db", db}, 1, "short\n"}, {{}, 2, ""}, {{"start"}, 2, ""},
      {{"serve", "--db", db}, 2, ""}, {{"serve", "--listen", "127.0.0.1:0"}, 2, ""},
      {{"serve", "--listen", "localhost", "--db", db}, 2, ""},
      {{"serve", "--listen", "127.0.0.1:70000", "--db", db}, 2, ""},
      {{"serve", "--listen", "127.0.0.1:0", "--db", db, "--threads", "many"}, 2, ""},
      {{"add-user", "--db", db}, 2, ""}};
  // clang-format on
  for (const auto& [arguments, exitCode, input] : rows) {
    const Outcome result = run(arguments, input);
    EXPECT_EQ(result.exitCode, exitCode) << arguments.join(' ').toStdString();
    EXPECT_TRUE(exitCode != 2 || (result.err.starts_with("tessal-sync-server: ") &&  // the reason first
                                  result.err.find("usage") != std::string::npos))
        << result.err;
  }
  const Outcome help = run({"--help"});
  EXPECT_EQ(help.exitCode, 0);
  EXPECT_NE(help.out.find("--connections-per-address N"), std::string::npos) << help.out;
}

INSTANTIATE_TEST_SUITE_P(Storage, ServerCommandLineTest,
                         testing::Values(Storage::SQLite, Storage::PostgreSQL), storageName);

}  // namespace
}  // namespace servertest
