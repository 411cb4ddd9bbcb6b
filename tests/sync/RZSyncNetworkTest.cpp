#include "RZSyncNetwork.h"

#include "Decimal.h"
#include "RZSyncJSON.h"
#include "SyncTestSupport.h"

#include <gtest/gtest.h>

#include <QPointer>
#include <QTcpServer>
#include <QTcpSocket>

using synctest::HttpRequest;
using synctest::LogCapture;
using synctest::LoopbackHttpServer;
using synctest::waitUntil;

namespace {

// Records the outcomes; optionally sends the next request from inside the callback.
class RecordingDelegate final : public RZSyncNetworkDelegate {
 public:
  void syncNetworkReceivedJSONObject(RZSyncNetwork* network, const QVariant& object) override {
    actionWhenCalled = network->networkAction();
    objects.append(object);
    if (then) std::exchange(then, {})(network);
  }
  void syncNetworkDidFailWithError(RZSyncNetwork* network, const QString& error) override {
    actionWhenCalled = network->networkAction();
    errors.append(error);
  }
  int calls() const { return int(objects.size() + errors.size()); }

  QVariantList objects;
  QStringList errors;
  int actionWhenCalled = -1;
  std::function<void(RZSyncNetwork*)> then;
};

class FixedCredentials final : public RZSyncNetworkCredentialDelegate {
 public:
  QString syncNetworkRequestsUser(RZSyncNetwork*) override { return user; }
  QString syncNetworkRequestsPassword(RZSyncNetwork*) override { return password; }
  QString user;
  QString password;
};

class RZSyncNetworkTest : public ::testing::Test {
 protected:
  void SetUp() override {
    network.setUser(QStringLiteral("ann@example.org"));
    network.setPassword(QStringLiteral("pw"));
  }
  // Posts and waits for the delegate to hear of it.
  void exchange(const QVariant& data = {}, const QString& action = QStringLiteral("head"),
                qint64 iteration = 7) {
    const int before = delegate.calls();
    network.postJSONObject(data, action, iteration);
    ASSERT_EQ(network.networkAction(), RZSyncNetwork::Busy);
    ASSERT_TRUE(waitUntil([&] { return delegate.calls() > before; }));
  }

  LoopbackHttpServer server;
  RecordingDelegate delegate;
  RZSyncNetwork network{server.url(), &delegate};
};

}  // namespace

// A head carries neither data nor a device unless one is set; a save carries its data pretty-printed,
// money as written.
TEST_F(RZSyncNetworkTest, RequestCarriesBodyAndHeaders) {
  exchange();
  EXPECT_EQ(server.requests.value(0).json().keys(), (QStringList{"action", "iteration", "password", "user"}));
  network.setDevice(QStringLiteral("device-1"));
  const QVariantMap data{
      {"i", QVariantMap{{"A@WTExpense", QVariantMap{{"expense", synctest::money("12.30")}}}}},
      {"u", QVariantMap{}},
      {"x", QVariantList{}}};
  exchange(data, QStringLiteral("save"), 9);
  ASSERT_EQ(server.requests.size(), 2);
  const HttpRequest& request = server.requests[1];
  EXPECT_EQ(request.method, "POST");
  EXPECT_EQ(request.path, "/sync/tessal/sync.php");
  EXPECT_EQ(request.headers.value("accept"), "application/json");
  EXPECT_EQ(request.headers.value("content-type"), "application/json");
  EXPECT_EQ(request.headers.value("content-length").toLongLong(), request.body.size());
  EXPECT_TRUE(request.body.contains("\n  \"action\": \"save\"")) << request.body.toStdString();
  EXPECT_TRUE(request.body.contains("\"expense\": 12.30")) << request.body.toStdString();
  const QVariantMap body = request.json();
  EXPECT_EQ(body.value("user"), "ann@example.org");
  EXPECT_EQ(body.value("password"), "pw");
  EXPECT_EQ(body.value("iteration").toLongLong(), 9);
  EXPECT_EQ(body.value("device"), "device-1");
  EXPECT_EQ(body.value("data").toMap().keys(), (QStringList{"i", "u", "x"}));
}

// Credentials come trimmed from the delegate when unset, an explicit field wins, and blank ones send
// nothing at all: no request and no callback.
TEST_F(RZSyncNetworkTest, CredentialsAreTrimmedAndBlankOnesSendNothing) {
  FixedCredentials credentials;
  network.setCredentialDelegate(&credentials);
  const std::pair<QString, QString> blanks[] = {{"   ", "pw"}, {"ann", "\n\t"}, {"", "pw"}, {"ann", ""}};
  for (const auto& [user, password] : blanks) {
    network.setUser({});
    network.setPassword({});
    credentials.user = user;
    credentials.password = password;
    EXPECT_FALSE(network.hasCredentials());
    network.postJSONObject({}, QStringLiteral("head"), 1);
    EXPECT_EQ(network.networkAction(), RZSyncNetwork::Idle);
  }
  QTest::qWait(100);
  EXPECT_TRUE(server.requests.isEmpty());
  EXPECT_EQ(delegate.calls(), 0);

  credentials.user = QStringLiteral("  bob@example.org\n");
  credentials.password = QStringLiteral("\tsecret ");
  EXPECT_TRUE(network.hasCredentials());
  exchange();
  EXPECT_EQ(server.requests.value(0).json().value("user"), "bob@example.org");
  EXPECT_EQ(server.requests.value(0).json().value("password"), "secret");
  network.setUser(QStringLiteral("carl@example.org"));
  exchange();
  EXPECT_EQ(server.requests.value(1).json().value("user"), "carl@example.org");
}

// Only a JSON object or array is delivered (the status is not examined). Everything else fails, and the
// failure says what the server answered. A redirect is a failure too: the request carries the password,
// so nothing is sent where it points. A reply is counted as its bytes arrive: a declared length over the
// limit fails at once, and so does a chunked body that declares none.
TEST_F(RZSyncNetworkTest, OnlyObjectsAndArraysAreDelivered) {
  LoopbackHttpServer elsewhere;
  network.setMaxReplyBytes(1024);
  network.setTimeoutMilliseconds(300);
  QByteArray chunked =
      "HTTP/1.1 200 OK\r\nContent-Type: application/json\r\nTransfer-Encoding: chunked\r\nConnection: "
      "close\r\n\r\n";
  for (int i = 0; i < 4; ++i) chunked += "400\r\n" + QByteArray(1024, ' ') + "\r\n";
  const struct {
    QByteArray answer;  // empty: never answers
    const char* error;  // what the failure says; null when the reply is delivered
  } rows[] = {
      {LoopbackHttpServer::json(QVariantMap{{"iteration", 3}}), nullptr},
      {LoopbackHttpServer::raw("[1, 2]"), nullptr},
      {LoopbackHttpServer::raw("{\"error\": \"x\", \"code\": 9}", 500), nullptr},
      {LoopbackHttpServer::raw("\"just text\""), ""},
      {LoopbackHttpServer::raw("42"), ""},
      {LoopbackHttpServer::raw(""), ""},
      {LoopbackHttpServer::raw("<html>Bad gateway</html>", 502, "text/html"), "502"},
      {LoopbackHttpServer::raw("The sync service cannot reach its storage; try again later.\n", 503,
                               "text/plain"),
       "try again later"},
      {LoopbackHttpServer::raw("{\"iteration\": 6}", 307, "application/json",
                               "Location: " + elsewhere.url().toEncoded() + "\r\n"),
       "307"},
      {LoopbackHttpServer::raw("{\"pad\": \"" + QByteArray(4096, 'x') + "\"}"), "larger than 1024 bytes"},
      {chunked + "2\r\n{}\r\n0\r\n\r\n", "larger than 1024 bytes"},
      {QByteArray(), ""},
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.answer.left(120).toStdString());
    server.handler = [&](const HttpRequest&) { return row.answer; };
    const qsizetype objects = delegate.objects.size(), errors = delegate.errors.size();
    exchange();
    EXPECT_EQ(delegate.objects.size(), objects + (row.error ? 0 : 1));
    ASSERT_EQ(delegate.errors.size(), errors + (row.error ? 1 : 0));
    if (row.error) {
      EXPECT_FALSE(delegate.errors.last().isEmpty());
      EXPECT_TRUE(delegate.errors.last().contains(row.error)) << delegate.errors.last().toStdString();
    }
    EXPECT_EQ(delegate.actionWhenCalled, RZSyncNetwork::Idle);
  }
  QTest::qWait(50);
  EXPECT_TRUE(elsewhere.requests.isEmpty());
}

TEST_F(RZSyncNetworkTest, ConnectionFailureIsReportedAndLogged) {
  QTcpServer closed;
  ASSERT_TRUE(closed.listen(QHostAddress::LocalHost, 0));
  const quint16 port = closed.serverPort();
  closed.close();
  network.setUrl(QUrl(QStringLiteral("http://127.0.0.1:%1/sync/tessal/sync.php").arg(port)));
  LogCapture log;
  exchange();
  ASSERT_EQ(delegate.errors.size(), 1);
  EXPECT_EQ(delegate.actionWhenCalled, RZSyncNetwork::Idle);
  EXPECT_TRUE(log.contains(QStringLiteral("Connection failed: ")));
}

// A server that streams a reply without end: the exchange fails as soon as the limit is passed, and the
// client hangs up instead of waiting for the rest.
TEST_F(RZSyncNetworkTest, AnEndlessReplyIsCutOffAtTheLimit) {
  QTcpServer endless;
  ASSERT_TRUE(endless.listen(QHostAddress::LocalHost, 0));
  QPointer<QTcpSocket> connection;
  QObject::connect(&endless, &QTcpServer::newConnection, [&] {
    connection = endless.nextPendingConnection();
    QObject::connect(connection, &QTcpSocket::readyRead, connection, [&] {
      connection->readAll();
      connection->write(
          "HTTP/1.1 200 OK\r\nContent-Type: application/json\r\nTransfer-Encoding: chunked\r\n\r\n1000\r\n" +
          QByteArray(4096, ' ') + "\r\n");
    });
  });
  network.setUrl(QUrl(QStringLiteral("http://127.0.0.1:%1/sync").arg(endless.serverPort())));
  network.setMaxReplyBytes(1024);
  exchange();
  ASSERT_EQ(delegate.errors.size(), 1);
  EXPECT_TRUE(delegate.errors[0].contains("larger than 1024 bytes")) << delegate.errors[0].toStdString();
  EXPECT_TRUE(
      waitUntil([&] { return !connection || connection->state() != QAbstractSocket::ConnectedState; }));
}

// The client is idle again before its delegate hears, so the delegate may send the next request.
TEST_F(RZSyncNetworkTest, DelegateMaySendTheNextRequestFromItsCallback) {
  delegate.then = [](RZSyncNetwork* n) { n->postJSONObject(QVariantMap{}, QStringLiteral("save"), 8); };
  exchange();
  ASSERT_TRUE(waitUntil([&] { return delegate.objects.size() == 2; }));
  ASSERT_EQ(server.requests.size(), 2);
  EXPECT_EQ(server.requests[1].json().value("action"), "save");
}

#ifndef QT_NO_DEBUG
TEST_F(RZSyncNetworkTest, SecondRequestInFlightIsAProgrammingError) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  server.handler = [](const HttpRequest&) { return QByteArray(); };
  EXPECT_DEATH(
      {
        network.postJSONObject({}, QStringLiteral("head"), 1);
        network.postJSONObject({}, QStringLiteral("head"), 1);
      },
      "RZSyncNetwork");
}
#endif
