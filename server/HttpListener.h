#pragma once

#include "HttpRequestParser.h"
#include "SyncService.h"

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

namespace tessal::server {

// A plain-text answer: `text` and a line break.
HttpReply textReply(int status, const std::string& text);

// The HTTP/1.1 front of the server, written for a service that strangers can reach.
//
// One thread reads every connection without blocking, with a deadline for the whole request (not per
// byte, which one byte every few seconds would defeat), and feeds what arrives to the connection's
// HttpRequestParser, which applies the caps on header lines, header count, header size and body size.
// Only complete requests reach the workers, so slow or idle connections never hold one, and a flood of
// them costs memory bounded by the caps and the connection limit, not service. The listen backlog is
// the system's maximum.
//
// Threads: the reader thread alone accepts, reads, parses, refuses and closes; it owns every
// connection between requests. A complete request goes to the job queue and its connection leaves the
// reader's epoll set; one of the workers answers it, writes the reply (blocking, with writeTimeout) and
// hands the connection back through `returned_`, waking the reader. `mutex_` guards only the queue and
// `returned_`; the handler runs on the workers with no lock of the listener held.
class HttpListener {
 public:
  struct Limits {
    HttpRequestParser::Limits request;  // the sizes a request may have
    std::chrono::milliseconds requestTimeout{10000};  // from the first byte to the end of the body
    std::chrono::milliseconds idleTimeout{5000};      // a kept-alive connection between requests
    std::chrono::milliseconds writeTimeout{10000};
    size_t maxConnections = 4096;  // lowered to what the process's descriptor limit allows
  };
  using Handler = std::function<HttpReply(const HttpRequest&)>;
  // What to answer a request refused before it was complete (status 400, 408, 413, 415, 431); `partial`
  // holds what was read of its request line and headers, and no body.
  using Refusal = std::function<HttpReply(const HttpRequest& partial, int status, const std::string& why)>;

  HttpListener(Limits limits, int workers, Handler handler, Refusal refusal);
  ~HttpListener();
  HttpListener(const HttpListener&) = delete;
  HttpListener& operator=(const HttpListener&) = delete;

  // Binds HOST:PORT (port 0: any free one) and starts serving. False with `error` set when it cannot.
  bool start(const std::string& host, int port, std::string& error);
  // Stops accepting, lets the workers finish what they hold and closes every connection. Idempotent.
  void stop();
  int port() const { return port_; }

 private:
  struct Connection;
  struct Job {
    int fd;
    HttpRequest request;
    bool keepAlive;
  };

  void readLoop();
  void workLoop();
  void accept();
  void readFrom(int fd);
  void refuse(Connection& connection, int status, const std::string& why);
  void close(int fd);
  void dispatch(int fd, std::string_view bytes);
  void sweepDeadlines(std::chrono::steady_clock::time_point now);
  bool writeAll(int fd, const std::string& bytes);
  // A worker is done with a connection: the reader keeps it for the next request or closes it.
  void handBack(int fd, bool keepAlive);
  void wake();

  Limits limits_;
  int workerCount_;
  Handler handler_;
  Refusal refusal_;
  int listenFd_ = -1;
  int epollFd_ = -1;
  int wakeFd_ = -1;
  int port_ = -1;
  std::atomic<bool> stopping_{false};
  std::thread reader_;
  std::vector<std::thread> workers_;

  // Read thread only.
  std::map<int, std::unique_ptr<Connection>> connections_;
  std::optional<std::chrono::steady_clock::time_point> acceptPausedUntil_;

  std::mutex mutex_;
  std::condition_variable work_;
  std::deque<Job> jobs_;
  std::vector<std::pair<int, bool>> returned_;  // connections back from workers, and whether to keep them
};

}  // namespace tessal::server
