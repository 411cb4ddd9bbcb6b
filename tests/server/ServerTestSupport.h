#pragma once

// A real sync server on 127.0.0.1 for every test, over either storage, and a plain HTTP client.
#include "JsonValue.h"
#include "SyncServer.h"

#include <gtest/gtest.h>

#include <QTemporaryDir>

#include <memory>
#include <optional>
#include <string>

namespace servertest {

using tessal::server::JsonValue;
using tessal::server::SyncServer;
inline constexpr const char* kSyncPath = "/sync/tessal/sync.php";

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
  QTemporaryDir dir_;
  std::string schema_, location_;
};

struct Reply {
  int status = 0;  // 0 when the connection failed
  std::string body;
  std::optional<JsonValue> json;  // the body parsed, when it is JSON
  std::string retryAfter;

  const JsonValue* operator[](const char* name) const { return json ? json->find(name) : nullptr; }
  int64_t integer(const char* name) const;                                 // -1 when absent
  int64_t code() const { return (*this)["error"] ? integer("code") : 0; }  // 0 when no error
};

// `forwardedFor` names the client the way a reverse proxy on loopback would (X-Forwarded-For).
Reply post(int port, const std::string& path, const std::string& body,
           const std::string& contentType = "application/json", const std::string& forwardedFor = {});
Reply get(int port, const std::string& path);

// A sync request body. `data` is JSON text or empty (no "data"); `device` empty leaves "device" out.
std::string requestBody(const std::string& user, const std::string& password, const std::string& action,
                        int64_t iteration, const std::string& device = {}, const std::string& data = {});

// One TCP connection driven byte by byte, the way a hostile client would.
class RawConnection {
 public:
  // From `from`, a loopback address other than 127.0.0.1 when the test needs a second client address.
  explicit RawConnection(int port, const std::string& from = {});
  ~RawConnection();
  bool connected() const { return connected_; }
  int fd() const { return fd_; }
  bool send(const std::string& bytes);
  std::string readAll();  // everything until the server closes (or 5 s pass)
  static int status(const std::string& response);

 private:
  int fd_ = -1;
  bool connected_ = false;
};

// A sync server in this process over `location`, started (it stops as it goes); null, with the failure
// recorded, when it did not start. With an `email`, the storage gets that account.
std::unique_ptr<SyncServer> startedServer(const std::string& location, const SyncServer::Options& options,
                                          const std::string& email = {}, const std::string& password = {});
inline QString address(const SyncServer& server) {
  return QStringLiteral("http://127.0.0.1:%1").arg(server.port());
}

// Each test on each storage (PostgreSQL when TESSAL_TEST_POSTGRES names a cluster).
class StorageTest : public testing::TestWithParam<Storage> {
 protected:
  void SetUp() override;
  std::unique_ptr<StorageLocation> storage_;
};

// One in-process server per test; short locks keep the tests quick.
class ServerTest : public StorageTest {
 protected:
  void SetUp() override;
  void TearDown() override { stopServer(); }

  SyncServer::Options options;  // for the next startServer()
  void startServer();
  void stopServer() { server_.reset(); }
  int port() const { return server_->port(); }

  // A user with an account whose password is "password-of-" + email, and its sync requests.
  std::string newUser(const std::string& name);
  Reply sync(const std::string& email, const std::string& action, int64_t iteration,
             const std::string& device = {}, const std::string& data = {});

  std::unique_ptr<SyncServer> server_;
};

}  // namespace servertest
