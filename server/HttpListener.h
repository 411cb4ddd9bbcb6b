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

// The address a request comes from: the peer's, or, when the peer is a reverse proxy on loopback, the
// last one it names in X-Forwarded-For.
std::string clientAddress(const HttpRequest& request);
// What counts as one client when limiting by address: an IPv4 address, or an IPv6 address's /64 (the
// smallest network a provider hands a subscriber, who can use any address in it).
std::string addressGroup(const std::string& address);

// The HTTP/1.1 front of the server, written for a service that strangers can reach.
//
// One thread reads every connection without blocking, with a deadline for the whole request (not per
// byte, which one byte every few seconds would defeat), and feeds what arrives to the connection's
// HttpRequestParser, which applies the caps on header lines, header count, header size and body size.
// Only complete requests reach the workers, so slow or idle connections never hold one, and a flood of
// them costs memory bounded by the caps and the connection limit, not service. The listen backlog is
// the system's maximum.
//
// Memory is bounded in total, not only per request: the bodies of all requests being read or answered
// draw on one budget (past it a request is answered 503 with Retry-After), and so do the replies
// waiting for their readers. A connection's next request is not read before its reply has been taken
// in full, a reader that does not take it within writeTimeout is dropped, and one address may hold only
// so many connections, so that neither slow readers nor one busy address can crowd out the others.
//
// Threads: the reader thread alone accepts, reads, writes what a worker could not, parses, refuses and
// closes; it owns every connection between requests. A complete request goes to the job queue and its
// connection leaves the reader's epoll set; one of the workers answers it, writes what the socket takes
// at once (never waiting on a slow reader) and hands the connection back through `returned_`, with the
// rest of the reply, waking the reader. `mutex_` guards only the queue and `returned_`; the handler
// runs on the workers with no lock of the listener held. The budgets are atomic.
class HttpListener {
 public:
  struct Limits {
    HttpRequestParser::Limits request;                // the sizes a request may have
    std::chrono::milliseconds requestTimeout{10000};  // from the first byte to the end of the body
    std::chrono::milliseconds idleTimeout{5000};      // a kept-alive connection between requests
    // From the reply to the moment the client has taken all of it; a slower reader is dropped.
    std::chrono::milliseconds writeTimeout{10000};
    size_t maxConnections = 4096;           // lowered to what the process's descriptor limit allows
    size_t maxConnectionsPerAddress = 256;  // per addressGroup(); 0: no cap
    // The bodies of every request being read or answered. Answering one takes about as much again (its
    // JSON), so this with the workers' password checks keeps a flooded server within about 300 MB.
    size_t maxBodyMemory = 96u << 20;
    // Replies not yet taken by their readers. One reply alone may pass it, or a large account could
    // never be sent.
    size_t maxReplyMemory = 64u << 20;
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
    ByteBudget::Lease body;
    bool keepAlive;
  };
  // A connection a worker is done with, and what remains to be written of its reply.
  struct Returned {
    int fd;
    bool keepAlive;
    std::string output;
    size_t written = 0;
    ByteBudget::Lease lease;
  };

  void readLoop();
  void workLoop();
  void accept();
  void readFrom(int fd);
  void writeTo(int fd);
  void refuse(Connection& connection, int status, const std::string& why);
  void close(int fd);
  void dispatch(int fd, std::string_view bytes);
  void sweepDeadlines(std::chrono::steady_clock::time_point now);
  // The reader takes a connection back from a worker: to write the rest of its reply, to read its next
  // request, or to close it.
  void takeBack(Returned returned);
  // The connection is ready for its next request.
  void awaitRequest(Connection& connection);
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

  ByteBudget bodyMemory_;
  ByteBudget replyMemory_;

  // Read thread only.
  std::map<int, std::unique_ptr<Connection>> connections_;
  std::map<std::string, size_t> connectionsPerAddress_;
  std::optional<std::chrono::steady_clock::time_point> acceptPausedUntil_;

  std::mutex mutex_;
  std::condition_variable work_;
  std::deque<Job> jobs_;
  std::vector<Returned> returned_;  // connections back from workers
};

}  // namespace tessal::server
