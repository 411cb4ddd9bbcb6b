#include "RZSyncNetwork.h"

#include "SyncTestSupport.h"

using namespace synctest;

namespace {

// Records the outcomes; optionally sends the next request from inside the callback. Answers credentials.
class RecordingDelegate final : public RZSyncNetworkDelegate, public RZSyncNetworkCredentialDelegate {
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
  QString syncNetworkRequestsUser(RZSyncNetwork*) override { return user; }
  QString syncNetworkRequestsPassword(RZSyncNetwork*) override { return password; }
  int calls() const { return int(objects.size() + errors.size()); }

  QVariantList objects;
  QStringList errors;
  int actionWhenCalled = -1;
  std::function<void(RZSyncNetwork*)> then;
  QString user, password;
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
    EXPECT_EQ(delegate.actionWhenCalled, RZSyncNetwork::Idle);
  }

  LoopbackHttpServer server;
  RecordingDelegate delegate;
  RZSyncNetwork network{server.url(), &delegate};
};

}  // namespace

// Credentials come trimmed from the delegate unless set, blank ones send nothing; a head carries neither
// data nor an unset device; a save carries its data, money as written.
TEST_F(RZSyncNetworkTest, RequestCarriesCredentialsBodyAndHeaders) {
  network.setCredentialDelegate(&delegate);
  for (const auto& [user, password] :
       {std::pair<QString, QString>{"   ", "pw"}, {"ann", "\n\t"}, {"", "pw"}, {"ann", ""}}) {
    network.setUser({}), network.setPassword({});
    delegate.user = user, delegate.password = password;
    EXPECT_FALSE(network.hasCredentials());
    network.postJSONObject({}, QStringLiteral("head"), 1);
    EXPECT_EQ(network.networkAction(), RZSyncNetwork::Idle);
  }
  QTest::qWait(100);
  EXPECT_TRUE(server.requests.isEmpty() && delegate.calls() == 0);
  delegate.user = QStringLiteral("  bob@example.org\n"), delegate.password = QStringLiteral("\tsecret ");
  // The client is idle again before its delegate hears, so the delegate may send the next request.
  delegate.then = [](RZSyncNetwork* n) {
    n->setUser(QStringLiteral("carl@example.org"));
    n->setDevice(QStringLiteral("device-1"));
    n->postJSONObject(changeSet({{"A@WTExpense", QVariantMap{{"expense", money("12.30")}}}}), "save", 9);
  };
  exchange();
  ASSERT_TRUE(waitUntil([&] { return delegate.objects.size() == 2; }));
  EXPECT_EQ(compact(server.requests.value(0).json()),
            R"({"action":"head","iteration":7,"password":"secret","user":"bob@example.org"})");
  ASSERT_EQ(server.requests.size(), 2);
  const HttpRequest& request = server.requests[1];
  EXPECT_EQ(request.method + ' ' + request.path + ' ' + request.headers.value("accept") + ' ' +
                request.headers.value("content-type") + ' ' + request.headers.value("content-length"),
            "POST /sync/tessal/sync.php application/json application/json " +
                QByteArray::number(request.body.size()));
  EXPECT_EQ(compact(request.json()),
            R"({"action":"save","data":{"i":{"A@WTExpense":{"expense":12.30}},"u":{},"x":[]},)"
            R"("device":"device-1","iteration":9,"password":"secret","user":"carl@example.org"})");
}

// Only an object or array is delivered; a redirect (the request carries the password) fails; so does a
// reply past the bound of bytes or of values.
TEST_F(RZSyncNetworkTest, OnlyObjectsAndArraysAreDelivered) {
  LoopbackHttpServer elsewhere;
  network.setMaxReplyBytes(1024);
  network.setMaxReplyValues(64);
  // An array of `values` values, all but the array itself empty arrays.
  auto arrays = [](int values) {
    return LoopbackHttpServer::raw("[" + QByteArray("[],").repeated(values - 2) + "[]]");
  };
  network.setTimeoutMilliseconds(300);
  const struct {
    QByteArray answer;  // empty: never answers; "closed": nobody listens
    const char* error;  // what the failure says; null when the reply is delivered
  } rows[] = {
      // clang-format off
      {LoopbackHttpServer::json(QVariantMap{{"iteration", 3}}), nullptr},
      {LoopbackHttpServer::raw("[1, 2]"), nullptr},
      {LoopbackHttpServer::raw("{\"error\": \"x\", \"code\": 9}", 500), nullptr},
      {LoopbackHttpServer::raw("\"just text\""), ""}, {LoopbackHttpServer::raw("42"), ""},
      {LoopbackHttpServer::raw(""), ""},
      {LoopbackHttpServer::raw("<html>Bad gateway</html>", 502, "text/html"), "502"},
      {LoopbackHttpServer::raw("The sync service cannot reach its storage; try again later.\n", 503, "text/plain"),
       "try again later"},
      {LoopbackHttpServer::raw("{\"iteration\": 6}", 307, "application/json",
                               "Location: " + elsewhere.url().toEncoded() + "\r\n"), "307"},
      {LoopbackHttpServer::raw("{\"pad\": \"" + QByteArray(4096, 'x') + "\"}"), "larger than 1024 bytes"},
      {arrays(64), nullptr},
      {arrays(65), "more than 64 values"},
      {LoopbackHttpServer::raw(R"({"result": {"i": {"a": {"b": [)" + QByteArray("1,").repeated(59) + "1]}}}}"),
       "more than 64 values"},
      {LoopbackHttpServer::raw("404", 404, "text/plain"), "HTTP 404: there is no sync service at this address"},
      {QByteArray(), ""}, {"closed", ""}, {"tls", "plain HTTP, its address starts with \u201Chttp://\u201D"},
      // clang-format on
  };
  QTcpServer closed;
  ASSERT_TRUE(closed.listen(QHostAddress::LocalHost, 0));
  closed.close();
  QTcpServer plain;  // answers a TLS handshake as a plain HTTP server does
  ASSERT_TRUE(plain.listen(QHostAddress::LocalHost, 0));
  QObject::connect(&plain, &QTcpServer::newConnection, [&] {
    QTcpSocket* connection = plain.nextPendingConnection();
    QObject::connect(connection, &QTcpSocket::readyRead, connection, [connection] {
      connection->readAll();
      connection->write("HTTP/1.1 400 Bad Request\r\nContent-Length: 0\r\nConnection: close\r\n\r\n");
      connection->disconnectFromHost();
    });
  });
  for (const auto& row : rows) {
    SCOPED_TRACE(row.answer.left(120).toStdString());
    server.handler = [&](const HttpRequest&) { return row.answer; };
    if (row.answer == "closed")
      network.setUrl(QUrl(QStringLiteral("http://127.0.0.1:%1/s").arg(closed.serverPort())));
    if (row.answer == "tls")
      network.setUrl(QUrl(QStringLiteral("https://127.0.0.1:%1/s").arg(plain.serverPort())));
    const qsizetype objects = delegate.objects.size(), errors = delegate.errors.size();
    exchange();
    EXPECT_EQ(delegate.objects.size(), objects + (row.error ? 0 : 1));
    ASSERT_EQ(delegate.errors.size(), errors + (row.error ? 1 : 0));
    EXPECT_TRUE(!row.error ||
                (!delegate.errors.last().isEmpty() && delegate.errors.last().contains(row.error)))
        << delegate.errors.last().toStdString();
  }
  QTest::qWait(50);
  EXPECT_TRUE(elsewhere.requests.isEmpty());
}

// A reply without a length, or without end, fails as soon as it is past the limit, and the client hangs up.
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
  EXPECT_EQ(delegate.errors, QStringList{"The server's reply is larger than 1024 bytes."});
  EXPECT_TRUE(
      waitUntil([&] { return !connection || connection->state() != QAbstractSocket::ConnectedState; }));
}
