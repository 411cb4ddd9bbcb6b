#include "RZSyncCommand.h"

#include "SyncTestSupport.h"
#include "WTProject.h"
#include "WTTask.h"

#include <gtest/gtest.h>

using synctest::HttpRequest;
using synctest::LoopbackHttpServer;
using synctest::snapshot;
using synctest::snapshotDifference;
using synctest::SyncClient;
using synctest::SyncServerProcess;

namespace {

struct CommandResult {
  int code;
  QString out;
  QString err;
};

CommandResult run(SyncClient& client, const QStringList& arguments = {}) {
  QString out, err;
  QTextStream outStream(&out), errStream(&err);
  const int code = runSyncCommand(*client.manager, arguments, outStream, errStream);
  return {code, out, err};
}

}  // namespace

// Runs until both sides are in step: what one installation has goes up, what the other has comes down.
TEST(RZSyncCommand, BringsTwoInstallationsInStepWithTheRealServer) {
  if (!SyncServerProcess::available()) GTEST_SKIP() << "tessal-sync-server is not built";
  SyncServerProcess server;
  ASSERT_TRUE(server.addUser("cli@example.org", "command line password"));
  ASSERT_TRUE(server.start());
  SyncClient a(server.address(), "cli@example.org", "command line password");
  SyncClient b(server.address(), "cli@example.org", "command line password");
  auto* project = a.context->insertNewObject<WTProject>();
  for (int i = 0; i < 3; ++i) a.context->insertNewObject<WTTask>()->setProject(project);
  a.save();
  b.context->insertNewObject<WTTask>()->setName("From B");
  b.save();

  const CommandResult first = run(a);
  EXPECT_EQ(first.code, 0) << first.err.toStdString();
  EXPECT_TRUE(
      first.out.startsWith("In step with " + server.address() + "/sync/tessal/sync.php at iteration "))
      << first.out.toStdString();
  EXPECT_FALSE(a.track().hasChanges());
  const CommandResult second = run(b);
  EXPECT_EQ(second.code, 0) << second.err.toStdString();
  EXPECT_EQ(run(a).code, 0);
  EXPECT_EQ(b.find<WTProject>(project->uuid())->tasks().size(), 3);
  const auto left = snapshot(*a.context), right = snapshot(*b.context);
  EXPECT_TRUE(left == right) << snapshotDifference(left, right);
  EXPECT_EQ(a.context->count(), 5);
}

TEST(RZSyncCommand, FailsWithAMessage) {
  LoopbackHttpServer server;
  struct Case {
    const char* what;
    QByteArray answer;  // empty: never answers
    QStringList arguments;
    const char* message;
  };
  const Case cases[] = {
      {"refused",
       LoopbackHttpServer::json(QVariantMap{{"error", "Wrong e-mail address or password."}, {"code", 2}}),
       {},
       "The server refused: Wrong e-mail address or password. - (Code: 2)"},
      {"no usable answer", LoopbackHttpServer::raw("Bad gateway", 502, "text/plain"), {}, "Sync failed: "},
      {"no answer in time", QByteArray(), {"--timeout", "1"}, "Not in step with the server after 1 seconds."},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    server.handler = [&](const HttpRequest&) { return c.answer; };
    SyncClient client(server.address());
    const CommandResult result = run(client, c.arguments);
    EXPECT_EQ(result.code, 1);
    EXPECT_TRUE(result.err.contains(QString::fromLatin1(c.message))) << result.err.toStdString();
    EXPECT_TRUE(result.out.isEmpty());
  }
}

TEST(RZSyncCommand, NeedsAServerAndAnAccount) {
  LoopbackHttpServer server;
  SyncClient noServer(QString{});
  EXPECT_TRUE(run(noServer).err.contains("\"WTSyncServer\""));
  SyncClient noAccount(server.address(), QStringLiteral("  "));
  const CommandResult result = run(noAccount);
  EXPECT_EQ(result.code, 1);
  EXPECT_TRUE(result.err.contains("\"WTSyncUser\""));
  EXPECT_TRUE(server.requests.isEmpty());
  SyncClient client(server.address());
  for (const QStringList& arguments :
       {QStringList{"--timeout"}, QStringList{"--timeout", "0"}, QStringList{"now"}}) {
    EXPECT_EQ(run(client, arguments).code, 2);
  }
}

// What a hostile or broken server answers ends the command with a failure instead of a crash or a
// journal the real server refuses from then on.
TEST(RZSyncCommand, FailsOnAReplyNotOfTheProtocolsShape) {
  LoopbackHttpServer server;
  const int depth = 200000;
  const QByteArray deep =
      "{\"action\": \"head\", \"iteration\": 3, \"result\": {\"x\": " + QByteArray(depth, '[') +
      QByteArray(depth, ']') + "}}";
  const QByteArray negative = R"({"action": "head", "iteration": -5, "result": {}})";
  for (const QByteArray& body : {deep, negative}) {
    SCOPED_TRACE(body.left(60).toStdString());
    server.handler = [&](const HttpRequest&) { return LoopbackHttpServer::raw(body); };
    SyncClient client(server.address());
    const qint64 before = client.track().iteration();
    const CommandResult result = run(client, {"--timeout", "5"});
    EXPECT_EQ(result.code, 1);
    EXPECT_TRUE(result.err.startsWith("Sync failed: ")) << result.err.toStdString();
    EXPECT_EQ(client.track().iteration(), before);
  }
}
