// The tessal-sync-server executable itself: add-user with the password on standard input, serve, and
// a clean stop on SIGTERM.
#include "ServerTestSupport.h"

#include <QProcess>
#include <QRegularExpression>

#include <csignal>

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
