#pragma once

// A real sync server on 127.0.0.1 for every test, over either storage, and a plain HTTP client.
#include "JsonValue.h"
#include "SyncServer.h"

#include <gtest/gtest.h>

#include <QTemporaryDir>

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <memory>
#include <optional>
#include <string>

namespace servertest {

using tessal::server::JsonValue;
using tessal::server::SyncServer;

enum class Storage { SQLite, PostgreSQL };
std::string storageName(const testing::TestParamInfo<Storage>& info);

// The PostgreSQL connection URI of the throw-away cluster (scripts/pg-test-cluster.sh), or empty.
std::string postgresUri();

// A SQLite file in a temp folder, or a fresh PostgreSQL schema dropped afterwards.
class StorageLocation {
 public:
  explicit StorageLocation(Storage storage);
  ~StorageLocation();
  const std::string& location() const { return location_; }

 private:
  Storage storage_;
  QTemporaryDir dir_;
  std::string schema_;
  std::string location_;
};

// A reply as the client sees it.
struct Reply {
  int status = 0;  // 0 when the connection failed
  std::string body;
  std::optional<JsonValue> json;  // the body parsed, when it is JSON
  std::string retryAfter;

  // A member of the JSON object, or none.
  const JsonValue* operator[](const char* name) const { return json ? json->find(name) : nullptr; }
  // The integer member, or -1 when absent.
  int64_t integer(const char* name) const;
  // The error code, or 0 when the reply is no error.
  int64_t code() const { return (*this)["error"] ? integer("code") : 0; }
};

// POSTs `body` to `path` on 127.0.0.1:`port`.
Reply post(int port, const std::string& path, const std::string& body,
           const std::string& contentType = "application/json");
Reply get(int port, const std::string& path);

// A sync request body. `data` is JSON text or empty (no "data"); `device` empty leaves "device" out.
std::string requestBody(const std::string& user, const std::string& password, const std::string& action,
                        int64_t iteration, const std::string& device = {}, const std::string& data = {});

// One TCP connection driven byte by byte, the way a hostile client would.
class RawConnection {
 public:
  explicit RawConnection(int port) {
    fd_ = socket(AF_INET, SOCK_STREAM, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<uint16_t>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    connected_ = connect(fd_, reinterpret_cast<sockaddr*>(&address), sizeof address) == 0;
    timeval timeout{5, 0};
    setsockopt(fd_, SOL_SOCKET, SO_RCVTIMEO, &timeout, sizeof timeout);
  }
  ~RawConnection() { ::close(fd_); }
  bool connected() const { return connected_; }
  int fd() const { return fd_; }
  bool send(const std::string& bytes) {
    return ::send(fd_, bytes.data(), bytes.size(), MSG_NOSIGNAL) == static_cast<ssize_t>(bytes.size());
  }
  // Everything until the server closes (or 5 s pass).
  std::string readAll() {
    std::string out;
    char buffer[4096];
    for (ssize_t got; (got = recv(fd_, buffer, sizeof buffer, 0)) > 0;) out.append(buffer, size_t(got));
    return out;
  }
  static int status(const std::string& response) {
    if (response.rfind("HTTP/1.1 ", 0) != 0 || response.size() < 12) return 0;
    return std::stoi(response.substr(9, 3));
  }

 private:
  int fd_ = -1;
  bool connected_ = false;
};

// One server per test, on each storage (PostgreSQL when TESSAL_TEST_POSTGRES names a cluster).
class ServerTest : public testing::TestWithParam<Storage> {
 protected:
  void SetUp() override;
  void TearDown() override;

  // Options for the next startServer(); short locks keep the tests quick.
  SyncServer::Options options;
  void startServer();
  void stopServer();
  int port() const { return server_->port(); }
  SyncServer& server() { return *server_; }

  // Creates an account straight in the storage.
  void addAccount(const std::string& email, const std::string& password);

  // One sync request of `email` (password "password-of-" + email).
  Reply sync(const std::string& email, const std::string& action, int64_t iteration,
             const std::string& device = {}, const std::string& data = {});
  Reply head(const std::string& email, int64_t iteration, const std::string& device = {}) {
    return sync(email, "head", iteration, device);
  }
  Reply save(const std::string& email, int64_t iteration, const std::string& device,
             const std::string& data) {
    return sync(email, "save", iteration, device, data);
  }
  // A user with an account whose password follows the rule above.
  std::string newUser(const std::string& name);

  std::unique_ptr<StorageLocation> storage_;
  std::unique_ptr<SyncServer> server_;
};

}  // namespace servertest
