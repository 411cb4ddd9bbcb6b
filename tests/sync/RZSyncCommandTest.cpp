#include "RZSyncCommand.h"

#include "SyncTestSupport.h"
#include "WTTask.h"

using namespace synctest;

namespace {

// The exit code, standard output and standard error, as one line each.
std::string run(SyncClient& client, const QStringList& arguments = {}) {
  QString out, err;
  QTextStream outStream(&out), errStream(&err);
  const int code = runSyncCommand(*client.manager, arguments, outStream, errStream);
  outStream.flush(), errStream.flush();
  return (QString::number(code) + " | " + out.trimmed() + " | " + err.trimmed()).toStdString();
}

}  // namespace

// Polls, however many rounds it takes, until a head brings nothing and nothing waits to be sent.
TEST(RZSyncCommand, RunsUntilInStep) {
  LoopbackHttpServer server;
  const QByteArray answers[] = {
      headReply(3, changeSet({{"One@WTTask", QVariantMap{{"name", "One"}}}})), saveReply(4),
      headReply(5, changeSet({{"Two@WTTask", QVariantMap{{"name", "Two"}}}})), headReply(5)};
  server.handler = [&](const HttpRequest&) {
    return answers[std::min<qsizetype>(server.requests.size(), 4) - 1];
  };
  SyncClient client(server.address());
  client.context->insertNewObject<WTTask>()->setName("Here");
  client.save();
  EXPECT_EQ(run(client, {"--timeout", "10"}),
            "0 | In step with " + server.url().toString().toStdString() + " at iteration 5. | ");
  EXPECT_EQ(server.requests.size(), 4);
  EXPECT_NE(client.find<WTTask>("Two@WTTask"), nullptr);
  EXPECT_FALSE(client.track().hasChanges());
}

// Refusals, failures and a missing server, account or argument end with a message and send nothing more.
TEST(RZSyncCommand, FailsWithAMessage) {
  LoopbackHttpServer server;
  const struct {
    QByteArray answer;  // empty: never answers
    QStringList arguments;
    QString server, user;
    std::string result;  // the start of what run() gives
  } rows[] = {
      // clang-format off
      {errorReply("Wrong e-mail address or password.", 2), {}, server.address(), "ann",
       "1 |  | The server refused: Wrong e-mail address or password. - (Code: 2)"},
      {LoopbackHttpServer::raw("Bad gateway", 502, "text/plain"), {}, server.address(), "ann",
       "1 |  | Sync with " + server.url().toString().toStdString() + " failed: "},
      {QByteArray(), {"--timeout", "1"}, server.address(), "ann",
       "1 |  | Not in step with the server after 1 seconds."},
      {QByteArray(), {}, "", "ann", "1 |  | "},  // the message names the missing setting
      {QByteArray(), {}, server.address(), "  ", "1 |  | "},
      {QByteArray(), {"--timeout"}, server.address(), "ann", "2 |  | tessal: --timeout takes a whole number"},
      {QByteArray(), {"--timeout", "0"}, server.address(), "ann", "2 |  | tessal: --timeout takes a whole number"},
      {QByteArray(), {"now"}, server.address(), "ann", "2 |  | tessal: unexpected “now”\nusage: "},
      // clang-format on
  };
  for (const auto& row : rows) {
    server.handler = [&](const HttpRequest&) { return row.answer; };
    SyncClient client(row.server, row.user);
    const qsizetype before = server.requests.size();
    const std::string result = run(client, row.arguments);
    EXPECT_EQ(result.substr(0, row.result.size()), row.result) << result;
    EXPECT_TRUE(row.server.isEmpty() == (result.find("\"WTSyncServer\"") != std::string::npos)) << result;
    EXPECT_TRUE((row.user == "  ") == (result.find("\"WTSyncUser\"") != std::string::npos)) << result;
    EXPECT_EQ(server.requests.size() > before, &row < rows + 3) << result;  // only the first rows get as far
  }
}
