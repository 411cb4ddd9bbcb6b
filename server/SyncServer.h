#pragma once

#include "HttpListener.h"
#include "PasswordAuthenticator.h"
#include "SignUpPage.h"
#include "SyncService.h"
#include "SyncStore.h"

#include <cstddef>
#include <memory>
#include <string>

namespace tessal::server {

// The HTTP side of the sync service: POST "/sync/tessal/sync.php" and the sign-up page
// "/sync/tessal/signup.php" (GET shows the form, POST creates the account). Plain HTTP; TLS belongs to
// a reverse proxy in front (server/README.md has an example).
class SyncServer {
 public:
  struct Options {
    std::string host = "127.0.0.1";
    int port = 0;  // 0: any free port (see port())
    size_t maxBodyBytes = 32u << 20;
    // Workers answer complete requests only; connections that are slow, idle or kept alive hold none.
    int threads = 64;
    // Header caps and read deadlines of every connection (its maxBodyBytes is the one above).
    HttpListener::Limits limits;
    bool signUp = true;       // false: the sign-up page answers 404
    int concurrentHeads = 4;  // heads that bring changes, built at once (SyncService)
    PasswordAuthenticator::Options authentication;
  };

  // Opens the storage at `location` (a SQLite path or a postgresql:// URI). None with `error` set when
  // that fails.
  static std::unique_ptr<SyncServer> create(const std::string& location, Options options, std::string& error);
  ~SyncServer();
  SyncServer(const SyncServer&) = delete;
  SyncServer& operator=(const SyncServer&) = delete;

  // Binds the address and serves on a background thread. False with `error` set when it cannot bind.
  bool start(std::string& error);
  // Stops accepting, finishes the requests in progress and joins the workers. Idempotent.
  void stop();
  // The bound port once started.
  int port() const { return http_ ? http_->port() : -1; }

  SyncStore& store() { return *store_; }
  PasswordAuthenticator& authenticator() { return *authenticator_; }

 private:
  SyncServer(std::unique_ptr<SyncStore> store, Options options);
  HttpReply route(const HttpRequest& request);
  static HttpReply refusal(const HttpRequest& request, int status, const std::string& why);

  Options options_;
  std::unique_ptr<SyncStore> store_;
  std::unique_ptr<PasswordAuthenticator> authenticator_;
  std::unique_ptr<SyncService> service_;
  std::unique_ptr<SignUpPage> signUpPage_;
  std::unique_ptr<HttpListener> http_;
};

}  // namespace tessal::server
