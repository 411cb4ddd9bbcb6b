#include "SyncServer.h"

#include <algorithm>

namespace tessal::server {

namespace {

constexpr const char* kSyncPath = "/sync/tessal/sync.php";
constexpr const char* kSignUpPath = "/sync/tessal/signup.php";

}  // namespace

SyncServer::SyncServer(std::unique_ptr<SyncStore> store, Options options)
    : options_(std::move(options)), store_(std::move(store)) {
  authenticator_ = std::make_unique<PasswordAuthenticator>(*store_, options_.authentication);
  service_ = std::make_unique<SyncService>(*store_, *authenticator_, options_.concurrentHeads);
  signUpPage_ = std::make_unique<SignUpPage>(*authenticator_);
}

std::unique_ptr<SyncServer> SyncServer::create(const std::string& location, Options options,
                                               std::string& error) {
  std::unique_ptr<SyncStore> store = SyncStore::open(location, error);
  if (!store) return nullptr;
  return std::unique_ptr<SyncServer>(new SyncServer(std::move(store), std::move(options)));
}

SyncServer::~SyncServer() {
  stop();
}

HttpReply SyncServer::route(const HttpRequest& request) {
  if (request.path == kSyncPath) {
    if (request.method != "POST") return textReply(405, "POST a sync request here.");
    return service_->handle(request.body, addressGroup(clientAddress(request)));
  }
  if (request.path == kSignUpPath && options_.signUp) {
    if (request.method == "GET") return signUpPage_->form();
    if (request.method == "POST") return signUpPage_->submit(request);
    return textReply(405, "GET the form or POST it.");
  }
  return textReply(404, "404");
}

HttpReply SyncServer::refusal(const HttpRequest& request, int status, const std::string& why) {
  // A sync client reads JSON: an oversized request is the protocol's code 6.
  if (status == 413 && request.path == kSyncPath)
    return SyncService::errorReply(SyncService::kRequestTooLarge, why, 413);
  return textReply(status, why);
}

bool SyncServer::start(std::string& error) {
  if (http_) {
    error = "already started";
    return false;
  }
  HttpListener::Limits limits = options_.limits;
  limits.request.maxBodyBytes = options_.maxBodyBytes;
  auto http = std::make_unique<HttpListener>(
      limits, std::max(options_.threads, 2), [this](const HttpRequest& request) { return route(request); },
      &SyncServer::refusal);
  if (!http->start(options_.host, options_.port, error)) return false;
  http_ = std::move(http);
  return true;
}

void SyncServer::stop() {
  if (!http_) return;
  http_->stop();
  http_.reset();
}

}  // namespace tessal::server
