#include "ServerTestSupport.h"

#include "SqlDatabase.h"

#include <httplib.h>

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cstdlib>
#include <random>

namespace servertest {

std::string storageName(const testing::TestParamInfo<Storage>& info) {
  return info.param == Storage::SQLite ? "SQLite" : "PostgreSQL";
}

std::string postgresUri() {
  const char* uri = std::getenv("TESSAL_TEST_POSTGRES");
  return uri ? uri : "";
}

static void runOnPostgres(const std::string& sql) {
  std::string error;
  const auto database = tessal::server::SqlDatabase::open(postgresUri(), error);
  ASSERT_TRUE(database) << error;
  database->acquire()->executeScript(sql);
}

StorageLocation::StorageLocation(Storage storage) : location_((dir_.path() + "/sync.db").toStdString()) {
  if (storage == Storage::SQLite) return;
  std::random_device random;
  schema_ = "test_" + std::to_string(random()) + "_" + std::to_string(random());
  runOnPostgres("CREATE SCHEMA " + schema_);
  const std::string uri = postgresUri();
  location_ = uri + (uri.find('?') == std::string::npos ? "?" : "&") + "options=-csearch_path%3D" + schema_;
}

StorageLocation::~StorageLocation() {
  if (!schema_.empty()) runOnPostgres("DROP SCHEMA " + schema_ + " CASCADE");
}

int64_t Reply::integer(const char* name) const {
  const JsonValue* value = (*this)[name];
  return value && value->integerValue() ? *value->integerValue() : -1;
}

static Reply toReply(const httplib::Result& result) {
  if (!result) return {};
  return {result->status, result->body, JsonValue::parse(result->body),
          result->get_header_value("Retry-After")};
}

Reply post(int port, const std::string& path, const std::string& body, const std::string& contentType,
           const std::string& forwardedFor) {
  httplib::Client client("127.0.0.1", port);
  client.set_read_timeout(30, 0);
  httplib::Headers headers;
  if (!forwardedFor.empty()) headers.emplace("X-Forwarded-For", forwardedFor);
  return toReply(client.Post(path.c_str(), headers, body, contentType.c_str()));
}

Reply get(int port, const std::string& path) {
  return toReply(httplib::Client("127.0.0.1", port).Get(path.c_str()));
}

std::string requestBody(const std::string& user, const std::string& password, const std::string& action,
                        int64_t iteration, const std::string& device, const std::string& data) {
  std::string body = "{";
  const auto field = [&](const char* name, const std::string& text) {
    body += std::string(body.size() > 1 ? "," : "") + "\"" + name + "\":";
    tessal::server::appendJsonString(body, text);
  };
  field("user", user), field("password", password), field("action", action);
  body += ",\"iteration\":" + std::to_string(iteration);
  if (!device.empty()) field("device", device);
  return body + (data.empty() ? "" : ",\"data\":" + data) + "}";
}

RawConnection::RawConnection(int port, const std::string& from) : fd_(socket(AF_INET, SOCK_STREAM, 0)) {
  if (!from.empty()) {
    sockaddr_in local{};
    local.sin_family = AF_INET;
    inet_pton(AF_INET, from.c_str(), &local.sin_addr);
    if (bind(fd_, reinterpret_cast<sockaddr*>(&local), sizeof local) != 0) return;
  }
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_port = htons(static_cast<uint16_t>(port));
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  connected_ = connect(fd_, reinterpret_cast<sockaddr*>(&address), sizeof address) == 0;
  timeval timeout{5, 0};
  setsockopt(fd_, SOL_SOCKET, SO_RCVTIMEO, &timeout, sizeof timeout);
}
RawConnection::~RawConnection() {
  ::close(fd_);
}

bool RawConnection::send(const std::string& bytes) {
  return ::send(fd_, bytes.data(), bytes.size(), MSG_NOSIGNAL) == static_cast<ssize_t>(bytes.size());
}

std::string RawConnection::readAll() {
  std::string out;
  char buffer[4096];
  for (ssize_t got; (got = recv(fd_, buffer, sizeof buffer, 0)) > 0;) out.append(buffer, size_t(got));
  return out;
}

int RawConnection::status(const std::string& response) {
  return response.rfind("HTTP/1.1 ", 0) == 0 && response.size() >= 12 ? std::stoi(response.substr(9, 3)) : 0;
}

std::unique_ptr<SyncServer> startedServer(const std::string& location, const SyncServer::Options& options,
                                          const std::string& email, const std::string& password) {
  std::string error;
  std::unique_ptr<SyncServer> server = SyncServer::create(location, options, error);
  if (!server || !server->start(error)) {
    ADD_FAILURE() << "the server did not start: " << error;
    return nullptr;
  }
  EXPECT_TRUE(email.empty() || server->authenticator().createAccount(email, password) ==
                                   tessal::server::PasswordAuthenticator::SignUp::Created);
  return server;
}

void StorageTest::SetUp() {
  if (GetParam() == Storage::PostgreSQL && postgresUri().empty())
    GTEST_SKIP() << "TESSAL_TEST_POSTGRES is not set (scripts/pg-test-cluster.sh run ... sets it)";
  storage_ = std::make_unique<StorageLocation>(GetParam());
}

void ServerTest::SetUp() {
  StorageTest::SetUp();
  options.threads = 8;
  options.authentication.firstLock = std::chrono::milliseconds(300);
  options.authentication.longestLock = std::chrono::seconds(2);
}

void ServerTest::startServer() {
  server_ = startedServer(storage_->location(), options);
  ASSERT_TRUE(server_);
}

std::string ServerTest::newUser(const std::string& name) {
  const std::string email = name + "@example.com";
  EXPECT_EQ(server_->authenticator().createAccount(email, "password-of-" + email),
            tessal::server::PasswordAuthenticator::SignUp::Created);
  return email;
}

Reply ServerTest::sync(const std::string& email, const std::string& action, int64_t iteration,
                       const std::string& device, const std::string& data) {
  return post(port(), kSyncPath, requestBody(email, "password-of-" + email, action, iteration, device, data));
}

}  // namespace servertest
