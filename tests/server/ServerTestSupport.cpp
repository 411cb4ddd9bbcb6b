#include "ServerTestSupport.h"

#include "SqlDatabase.h"

#include <httplib.h>

#include <cstdlib>
#include <random>

namespace servertest {

using tessal::server::appendJsonString;
using tessal::server::SqlDatabase;

std::string storageName(const testing::TestParamInfo<Storage>& info) {
  return info.param == Storage::SQLite ? "SQLite" : "PostgreSQL";
}

std::string postgresUri() {
  const char* uri = std::getenv("TESSAL_TEST_POSTGRES");
  return uri ? uri : "";
}

namespace {

void runOnPostgres(const std::string& sql) {
  std::string error;
  std::unique_ptr<SqlDatabase> database = SqlDatabase::open(postgresUri(), error);
  ASSERT_TRUE(database) << error;
  database->acquire()->executeScript(sql);
}

}  // namespace

StorageLocation::StorageLocation(Storage storage) : storage_(storage) {
  if (storage_ == Storage::SQLite) {
    location_ = (dir_.path() + "/sync.db").toStdString();
    return;
  }
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

namespace {

Reply toReply(const httplib::Result& result) {
  Reply reply;
  if (!result) return reply;
  reply.status = result->status;
  reply.body = result->body;
  reply.json = JsonValue::parse(reply.body);
  reply.retryAfter = result->get_header_value("Retry-After");
  return reply;
}

}  // namespace

Reply post(int port, const std::string& path, const std::string& body, const std::string& contentType) {
  httplib::Client client("127.0.0.1", port);
  client.set_read_timeout(30, 0);
  return toReply(client.Post(path.c_str(), body, contentType.c_str()));
}

Reply get(int port, const std::string& path) {
  httplib::Client client("127.0.0.1", port);
  return toReply(client.Get(path.c_str()));
}

std::string requestBody(const std::string& user, const std::string& password, const std::string& action,
                        int64_t iteration, const std::string& device, const std::string& data) {
  const auto field = [](const char* name, const std::string& text) {
    std::string out = std::string(",\"") + name + "\":";
    appendJsonString(out, text);
    return out;
  };
  std::string body = "{" + field("user", user).substr(1) + field("password", password) +
                     field("action", action) + ",\"iteration\":" + std::to_string(iteration);
  if (!device.empty()) body += field("device", device);
  if (!data.empty()) body += ",\"data\":" + data;
  return body + "}";
}

void ServerTest::SetUp() {
  if (GetParam() == Storage::PostgreSQL && postgresUri().empty()) {
    GTEST_SKIP() << "TESSAL_TEST_POSTGRES is not set (scripts/pg-test-cluster.sh run ... sets it)";
  }
  storage_ = std::make_unique<StorageLocation>(GetParam());
  options.threads = 8;
  options.authentication.firstLock = std::chrono::milliseconds(300);
  options.authentication.longestLock = std::chrono::seconds(2);
}

void ServerTest::TearDown() {
  stopServer();
  storage_.reset();
}

void ServerTest::startServer() {
  std::string error;
  server_ = SyncServer::create(storage_->location(), options, error);
  ASSERT_TRUE(server_) << error;
  ASSERT_TRUE(server_->start(error)) << error;
}

void ServerTest::stopServer() {
  if (server_) server_->stop();
  server_.reset();
}

void ServerTest::addAccount(const std::string& email, const std::string& password) {
  ASSERT_EQ(server_->authenticator().createAccount(email, password),
            tessal::server::PasswordAuthenticator::SignUp::Created);
}

std::string ServerTest::newUser(const std::string& name) {
  const std::string email = name + "@example.com";
  addAccount(email, "password-of-" + email);
  return email;
}

Reply ServerTest::sync(const std::string& email, const std::string& action, int64_t iteration,
                       const std::string& device, const std::string& data) {
  return post(port(), "/sync/tessal/sync.php",
              requestBody(email, "password-of-" + email, action, iteration, device, data));
}

}  // namespace servertest
