#include "RZSyncCommand.h"

#include "SyncTestSupport.h"
#include "WTTask.h"

#include <gtest/gtest.h>

using synctest::HttpRequest;
using synctest::LoopbackHttpServer;
using synctest::SyncClient;

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

// Polls until a head brings nothing and nothing waits to be sent: what is here goes up and what others
// did comes down, however many rounds that takes.
TEST(RZSyncCommand, RunsUntilInStep) {
  LoopbackHttpServer server;
  const QByteArray answers[] = {
      synctest::headReply(3, synctest::changeSet({{"One@WTTask", QVariantMap{{"name", "One"}}}})),
      synctest::saveReply(4),
      synctest::headReply(5, synctest::changeSet({{"Two@WTTask", QVariantMap{{"name", "Two"}}}})),
      synctest::headReply(5)};
  server.handler = [&](const HttpRequest&) {
    return answers[std::min<qsizetype>(server.requests.size(), 4) - 1];
  };
  SyncClient client(server.address());
  client.context->insertNewObject<WTTask>()->setName("Here");
  client.save();
  const CommandResult result = run(client, {"--timeout", "10"});
  EXPECT_EQ(result.code, 0) << result.err.toStdString();
  EXPECT_EQ(result.out, "In step with " + server.url().toString() + " at iteration 5.\n");
  EXPECT_EQ(server.requests.size(), 4);
  EXPECT_NE(client.find<WTTask>("Two@WTTask"), nullptr);
  EXPECT_FALSE(client.track().hasChanges());
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
       synctest::errorReply("Wrong e-mail address or password.", 2),
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
