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

TEST_F(RZSyncNetworkTest, RequestCarriesBodyAndHeaders) {
  network.setDevice(QStringLiteral("device-1"));
  const QVariantMap data{
      {"i", QVariantMap{{"A@WTExpense",
                         QVariantMap{{"expense", QVariant::fromValue(*Decimal::fromString(u"12.30"))}}}}},
      {"u", QVariantMap{}},
      {"x", QVariantList{}}};
  exchange(data, QStringLiteral("save"), 9);
  ASSERT_EQ(server.requests.size(), 1);
  const HttpRequest& request = server.requests[0];
  EXPECT_EQ(request.method, "POST");
  EXPECT_EQ(request.path, "/sync/tessal/sync.php");
  EXPECT_EQ(request.headers.value("accept"), "application/json");
  EXPECT_EQ(request.headers.value("content-type"), "application/json");
  EXPECT_EQ(request.headers.value("content-length").toLongLong(), request.body.size());
  EXPECT_TRUE(request.body.contains("\n  \"action\": \"save\""))
      << request.body.toStdString();                                                       // pretty-printed
  EXPECT_TRUE(request.body.contains("\"expense\": 12.30")) << request.body.toStdString();  // money as written
  const QVariantMap body = request.json();
  EXPECT_EQ(body.value("user"), "ann@example.org");
  EXPECT_EQ(body.value("password"), "pw");
  EXPECT_EQ(body.value("iteration").toLongLong(), 9);
  EXPECT_EQ(body.value("device"), "device-1");
  EXPECT_EQ(body.value("data").toMap().keys(), (QStringList{"i", "u", "x"}));
}

TEST_F(RZSyncNetworkTest, HeadHasNoDataAndNoDeviceWhenNoneIsSet) {
  exchange();
  const QVariantMap body = server.requests.value(0).json();
  EXPECT_EQ(body.keys(), (QStringList{"action", "iteration", "password", "user"}));
  EXPECT_EQ(body.value("action"), "head");
}

TEST_F(RZSyncNetworkTest, CredentialsAreTrimmedAndComeFromTheDelegateWhenUnset) {
  FixedCredentials credentials;
  credentials.user = QStringLiteral("  bob@example.org\n");
  credentials.password = QStringLiteral("\tsecret ");
  network.setUser({});
  network.setPassword({});
  network.setCredentialDelegate(&credentials);
  EXPECT_TRUE(network.hasCredentials());
  exchange();
  EXPECT_EQ(server.requests.value(0).json().value("user"), "bob@example.org");
  EXPECT_EQ(server.requests.value(0).json().value("password"), "secret");
  // The explicit field wins over the delegate.
  network.setUser(QStringLiteral("carl@example.org"));
  exchange();
  EXPECT_EQ(server.requests.value(1).json().value("user"), "carl@example.org");
}

// Missing credentials are silent: no request and no callback.
TEST_F(RZSyncNetworkTest, BlankCredentialsSendNothing) {
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
  QTest::qWait(200);
  EXPECT_TRUE(server.requests.isEmpty());
  EXPECT_EQ(delegate.calls(), 0);
}

TEST_F(RZSyncNetworkTest, RepliesThatAreNotObjectsOrArraysFail) {
  struct Case {
    QByteArray answer;
    bool delivered;
  };
  const Case cases[] = {
      {LoopbackHttpServer::json(QVariantMap{{"iteration", 3}}), true},
      {LoopbackHttpServer::raw("[1, 2]"), true},
      {LoopbackHttpServer::raw("{\"error\": \"x\", \"code\": 9}", 500), true},  // the status is not examined
      {LoopbackHttpServer::raw("\"just text\""), false},
      {LoopbackHttpServer::raw("42"), false},
      {LoopbackHttpServer::raw("<html>Bad gateway</html>", 502, "text/html"), false},
      {LoopbackHttpServer::raw(""), false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.answer.toStdString());
    server.handler = [&](const HttpRequest&) { return c.answer; };
    const int objects = int(delegate.objects.size());
    const int errors = int(delegate.errors.size());
    exchange();
    EXPECT_EQ(delegate.objects.size(), objects + (c.delivered ? 1 : 0));
    EXPECT_EQ(delegate.errors.size(), errors + (c.delivered ? 0 : 1));
    EXPECT_EQ(delegate.actionWhenCalled, RZSyncNetwork::Idle);
  }
  EXPECT_TRUE(delegate.errors.last().isEmpty() == false);
}

TEST_F(RZSyncNetworkTest, AnErrorPageSaysWhatTheServerAnswered) {
  server.handler = [](const HttpRequest&) {
    return LoopbackHttpServer::raw("The sync service cannot reach its storage; try again later.\n", 503,
                                   "text/plain");
  };
  exchange();
  ASSERT_EQ(delegate.errors.size(), 1);
  EXPECT_TRUE(delegate.errors[0].contains("503")) << delegate.errors[0].toStdString();
  EXPECT_TRUE(delegate.errors[0].contains("try again later"));
}

// A second response in one exchange (here after a redirect) starts the body over.
// The request carries the password: a redirect, even with a JSON body, is a failure that names it, and
// nothing is sent where it points (here another port on the same host).
TEST_F(RZSyncNetworkTest, ARedirectIsAFailureAndTheCredentialsStayHome) {
  LoopbackHttpServer elsewhere;
  elsewhere.handler = [](const HttpRequest&) {
    return LoopbackHttpServer::json(QVariantMap{{"iteration", 5}});
  };
  server.handler = [&](const HttpRequest&) -> QByteArray {
    return LoopbackHttpServer::raw("{\"iteration\": 6}", 307, "application/json",
                                   "Location: " + elsewhere.url().toEncoded() + "\r\n");
  };
  exchange();
  EXPECT_TRUE(delegate.objects.isEmpty());
  ASSERT_EQ(delegate.errors.size(), 1);
  EXPECT_TRUE(delegate.errors[0].contains("307")) << delegate.errors[0].toStdString();
  EXPECT_EQ(server.requests.size(), 1);
  QTest::qWait(50);
  EXPECT_TRUE(elsewhere.requests.isEmpty());
}

// Counted as the bytes arrive: a declared length over the limit fails at once, and so does a chunked
// body that declares none; the rest is not read.
TEST_F(RZSyncNetworkTest, AReplyOverTheSizeLimitFails) {
  EXPECT_EQ(network.maxReplyBytes(), 64 << 20);
  network.setMaxReplyBytes(1024);
  const QByteArray big = "{\"pad\": \"" + QByteArray(4096, 'x') + "\"}";
  server.handler = [&](const HttpRequest&) { return LoopbackHttpServer::raw(big); };
  exchange();
  EXPECT_TRUE(delegate.objects.isEmpty());
  ASSERT_EQ(delegate.errors.size(), 1);
  EXPECT_TRUE(delegate.errors[0].contains("larger than 1024 bytes")) << delegate.errors[0].toStdString();
  EXPECT_EQ(network.networkAction(), RZSyncNetwork::Idle);

  delegate.errors.clear();
  server.handler = [&](const HttpRequest&) {
    QByteArray chunked =
        "HTTP/1.1 200 OK\r\nContent-Type: application/json\r\nTransfer-Encoding: chunked\r\n"
        "Connection: close\r\n\r\n";
    for (int i = 0; i < 4; ++i) chunked += "400\r\n" + QByteArray(1024, ' ') + "\r\n";
    return chunked + "2\r\n{}\r\n0\r\n\r\n";
  };
  exchange();
  EXPECT_TRUE(delegate.objects.isEmpty());
  ASSERT_EQ(delegate.errors.size(), 1);
  EXPECT_TRUE(delegate.errors[0].contains("larger than")) << delegate.errors[0].toStdString();
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
TEST(RZSyncNetworkSizeLimit, AnEndlessReplyIsCutOffAtTheLimit) {
  QTcpServer endless;
  ASSERT_TRUE(endless.listen(QHostAddress::LocalHost, 0));
  QPointer<QTcpSocket> connection;
  QObject::connect(&endless, &QTcpServer::newConnection, [&] {
    connection = endless.nextPendingConnection();
    QObject::connect(connection, &QTcpSocket::readyRead, connection, [&] {
      connection->readAll();
      // Headers and a first chunk of 4 KiB of white space; the rest never comes.
      connection->write(
          "HTTP/1.1 200 OK\r\nContent-Type: application/json\r\nTransfer-Encoding: chunked\r\n\r\n"
          "1000\r\n" +
          QByteArray(4096, ' ') + "\r\n");
    });
  });
  RecordingDelegate delegate;
  RZSyncNetwork network(QUrl(QStringLiteral("http://127.0.0.1:%1/sync").arg(endless.serverPort())),
                        &delegate);
  network.setUser(QStringLiteral("ann@example.org"));
  network.setPassword(QStringLiteral("pw"));
  network.setMaxReplyBytes(1024);
  network.postJSONObject({}, QStringLiteral("head"), 7);
  ASSERT_TRUE(waitUntil([&] { return delegate.calls() > 0; }, 3000));
  ASSERT_EQ(delegate.errors.size(), 1);
  EXPECT_TRUE(delegate.errors[0].contains("larger than 1024 bytes")) << delegate.errors[0].toStdString();
  EXPECT_EQ(network.networkAction(), RZSyncNetwork::Idle);
  EXPECT_TRUE(
      waitUntil([&] { return !connection || connection->state() != QAbstractSocket::ConnectedState; }));
}

TEST_F(RZSyncNetworkTest, SilentServerTimesOut) {
  EXPECT_EQ(network.timeoutMilliseconds(), 60000);
  network.setTimeoutMilliseconds(300);
  server.handler = [](const HttpRequest&) { return QByteArray(); };  // never answers
  QElapsedTimer clock;
  clock.start();
  exchange();
  EXPECT_EQ(delegate.errors.size(), 1);
  EXPECT_GE(clock.elapsed(), 250);
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
