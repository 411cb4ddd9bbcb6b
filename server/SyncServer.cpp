#include "SyncServer.h"

#include <httplib.h>

#include <chrono>
#include <iostream>

namespace tessal::server {

namespace {

constexpr const char* kSyncPath = "/sync/tessal/sync.php";
constexpr const char* kSignUpPath = "/sync/tessal/signup.php";

void send(const HttpReply& reply, httplib::Response& res) {
  res.status = reply.status;
  for (const auto& [name, value] : reply.headers) res.set_header(name, value);
  res.set_content(reply.body, reply.contentType);
}

}  // namespace

SyncServer::SyncServer(std::unique_ptr<SyncStore> store, Options options)
    : options_(std::move(options)), store_(std::move(store)) {
  authenticator_ = std::make_unique<PasswordAuthenticator>(*store_, options_.authentication);
  service_ = std::make_unique<SyncService>(*store_, *authenticator_);
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

void SyncServer::installRoutes() {
  httplib::Server& http = *http_;
  http.Post(kSyncPath, [this](const httplib::Request& req, httplib::Response& res) {
    send(service_->handle(req.body), res);
  });
  if (options_.signUp) {
    http.Get(kSignUpPath,
             [this](const httplib::Request&, httplib::Response& res) { send(signUpPage_->form(), res); });
    http.Post(kSignUpPath, [this](const httplib::Request& req, httplib::Response& res) {
      send(signUpPage_->submit(req.get_param_value("email"), req.get_param_value("password"),
                               req.get_param_value("password2")),
           res);
    });
  }
  // Runs for every answer of status 400 or more, also for those a route wrote itself: leave those be.
  http.set_error_handler(
      httplib::Server::HandlerWithResponse([](const httplib::Request& req, httplib::Response& res) {
        if (!res.body.empty()) return httplib::Server::HandlerResponse::Unhandled;
        if (res.status == 413 && req.path == kSyncPath) {
          send(SyncService::errorReply(SyncService::kRequestTooLarge,
                                       "The request is larger than this server accepts.", 413),
               res);
        } else {
          res.set_content(std::to_string(res.status) + "\n", "text/plain; charset=utf-8");
        }
        return httplib::Server::HandlerResponse::Handled;
      }));
  http.set_exception_handler([](const httplib::Request&, httplib::Response& res, std::exception_ptr error) {
    try {
      if (error) std::rethrow_exception(error);
    } catch (const std::exception& e) {
      std::cerr << "tessal-sync-server: request failed: " << e.what() << std::endl;
    } catch (...) {
    }
    res.status = 500;
    res.set_content("Internal error; try again later.\n", "text/plain; charset=utf-8");
  });
}

bool SyncServer::start(std::string& error) {
  if (http_) {
    error = "already started";
    return false;
  }
  http_ = std::make_unique<httplib::Server>();
  const int threads = std::max(options_.threads, 2);
  http_->new_task_queue = [threads] { return new httplib::ThreadPool(static_cast<size_t>(threads)); };
  // Without it a second request on a kept-alive connection waits for the delayed ACK (~40 ms).
  http_->set_tcp_nodelay(true);
  http_->set_keep_alive_max_count(10000);
  // Devices poll every 5 s; a shorter keep-alive frees the worker between polls.
  http_->set_keep_alive_timeout(2);
  http_->set_payload_max_length(options_.maxBodyBytes);
  installRoutes();
  if (options_.port == 0) {
    port_ = http_->bind_to_any_port(options_.host);
  } else {
    port_ = http_->bind_to_port(options_.host, options_.port) ? options_.port : -1;
  }
  if (port_ < 0) {
    error = "cannot listen on " + options_.host + ":" + std::to_string(options_.port);
    http_.reset();
    return false;
  }
  thread_ = std::thread([this] { http_->listen_after_bind(); });
  // stop() is a no-op until the loop runs; wait for it so a quick stop cannot be lost.
  while (!http_->is_running()) std::this_thread::sleep_for(std::chrono::milliseconds(1));
  return true;
}

void SyncServer::stop() {
  if (!http_) return;
  http_->stop();
  if (thread_.joinable()) thread_.join();
  http_.reset();
  port_ = -1;
}

}  // namespace tessal::server
