#include "HttpListener.h"

#include <arpa/inet.h>
#include <dirent.h>
#include <fcntl.h>
#include <netdb.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <poll.h>
#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <unistd.h>

#ifdef __GLIBC__
#include <malloc.h>
#endif

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <fstream>
#include <iostream>

namespace tessal::server {

namespace {

using Clock = std::chrono::steady_clock;

// A request or reply this large leaves many pages behind in the allocator when it is gone.
constexpr size_t kLargeExchange = 1u << 20;

const char* reason(int status) {
  switch (status) {
    case 100:
      return "Continue";
    case 200:
      return "OK";
    case 201:
      return "Created";
    case 400:
      return "Bad Request";
    case 403:
      return "Forbidden";
    case 404:
      return "Not Found";
    case 405:
      return "Method Not Allowed";
    case 408:
      return "Request Timeout";
    case 409:
      return "Conflict";
    case 411:
      return "Length Required";
    case 413:
      return "Content Too Large";
    case 415:
      return "Unsupported Media Type";
    case 429:
      return "Too Many Requests";
    case 431:
      return "Request Header Fields Too Large";
    case 500:
      return "Internal Server Error";
    case 501:
      return "Not Implemented";
    case 503:
      return "Service Unavailable";
    default:
      return "Status";
  }
}

std::string serialise(const HttpReply& reply, bool keepAlive) {
  std::string out = "HTTP/1.1 " + std::to_string(reply.status) + " " + reason(reply.status) + "\r\n";
  out += "Content-Type: " + reply.contentType + "\r\n";
  for (const auto& [name, value] : reply.headers) out += name + ": " + value + "\r\n";
  out += "Content-Length: " + std::to_string(reply.body.size()) + "\r\n";
  out += keepAlive ? "Connection: keep-alive\r\n\r\n" : "Connection: close\r\n\r\n";
  out += reply.body;
  return out;
}

// The largest backlog the system allows: devices reconnect for many of their polls.
int listenBacklog() {
  std::ifstream file("/proc/sys/net/core/somaxconn");
  int value = 0;
  if (file >> value && value > 0) return value;
  return SOMAXCONN;
}

// How many more connections the process can hold open, leaving room for storage connections, files
// and the workers. Accepting past the descriptor limit fails, leaving the listening socket readable
// (the reader would spin) and the connection waiting in the backlog with nobody to answer it.
size_t connectionsTheFileLimitAllows(int workers) {
  rlimit files{};
  if (getrlimit(RLIMIT_NOFILE, &files) != 0 || files.rlim_cur == RLIM_INFINITY) return SIZE_MAX;
  size_t open = 0;
  if (DIR* folder = opendir("/proc/self/fd")) {
    while (readdir(folder)) ++open;
    closedir(folder);
  }
  const size_t reserve = open + 64 + 2 * static_cast<size_t>(workers);
  return files.rlim_cur > reserve ? files.rlim_cur - reserve : 1;
}

void setNonBlocking(int fd) {
  fcntl(fd, F_SETFL, fcntl(fd, F_GETFL, 0) | O_NONBLOCK);
}

bool isLoopback(const std::string& address) {
  return address.rfind("127.", 0) == 0 || address == "::1" || address.rfind("::ffff:127.", 0) == 0;
}

HttpReply withRetryAfter(HttpReply reply) {
  const bool has = std::any_of(reply.headers.begin(), reply.headers.end(),
                               [](const auto& header) { return header.first == "Retry-After"; });
  if (!has) reply.headers.emplace_back("Retry-After", "1");
  return reply;
}

// Writes what the socket takes now; false when the connection is broken.
bool sendSome(int fd, const std::string& bytes, size_t& written) {
  while (written < bytes.size()) {
    const ssize_t sent =
        send(fd, bytes.data() + written, bytes.size() - written, MSG_NOSIGNAL | MSG_DONTWAIT);
    if (sent > 0) {
      written += static_cast<size_t>(sent);
    } else if (sent < 0 && errno == EINTR) {
      continue;
    } else {
      return sent < 0 && (errno == EAGAIN || errno == EWOULDBLOCK);
    }
  }
  return true;
}

// Gives the pages of large freed buffers back to the system: the allocator would keep them for the
// next large request, and a burst would leave the process at its peak for good.
void releaseFreedMemory() {
#ifdef __GLIBC__
  malloc_trim(0);
#endif
}

}  // namespace

std::string clientAddress(const HttpRequest& request) {
  if (!isLoopback(request.peer)) return request.peer;
  const std::string forwarded = request.header("x-forwarded-for");
  const size_t comma = forwarded.rfind(',');
  const std::string last = forwarded.substr(comma == std::string::npos ? 0 : comma + 1);
  const size_t begin = last.find_first_not_of(' ');
  if (begin == std::string::npos) return request.peer;
  return last.substr(begin, last.find_last_not_of(' ') + 1 - begin);
}

std::string addressGroup(const std::string& address) {
  in6_addr v6{};
  if (address.find(':') == std::string::npos || inet_pton(AF_INET6, address.c_str(), &v6) != 1)
    return address;
  if (IN6_IS_ADDR_V4MAPPED(&v6)) return address.substr(address.rfind(':') + 1);
  std::fill(v6.s6_addr + 8, v6.s6_addr + 16, 0);
  char text[INET6_ADDRSTRLEN] = {};
  inet_ntop(AF_INET6, &v6, text, sizeof text);
  return std::string(text) + "/64";
}

HttpReply textReply(int status, const std::string& text) {
  HttpReply reply;
  reply.status = status;
  reply.contentType = "text/plain; charset=utf-8";
  reply.body = text + "\n";
  return reply;
}

struct HttpListener::Connection {
  // Idle: between requests, under the idle deadline. Reading: under the request's deadline. Busy: a
  // worker holds the connection, and no deadline runs. Writing: the rest of a reply waits for the
  // client to take it, under the write deadline; nothing is read meanwhile.
  enum class Phase { Idle, Reading, Busy, Writing };
  Connection(int fd, std::string peer, std::string group, HttpRequestParser::Limits limits)
      : fd(fd), peer(std::move(peer)), group(std::move(group)), parser(limits) {}
  int fd;
  std::string peer;
  std::string group;  // addressGroup(peer)
  HttpRequestParser parser;
  Phase phase = Phase::Idle;
  Clock::time_point deadline;
  // Writing: the reply, how much of it is written, what it holds of the budget, and what comes after.
  std::string output;
  size_t written = 0;
  ByteBudget::Lease outputLease;
  bool keepAlive = false;
};

HttpListener::HttpListener(Limits limits, int workers, Handler handler, Refusal refusal)
    : limits_(limits),
      workerCount_(std::max(workers, 1)),
      handler_(std::move(handler)),
      refusal_(std::move(refusal)),
      bodyMemory_(limits.maxBodyMemory),
      replyMemory_(limits.maxReplyMemory) {
  limits_.request.bodies = &bodyMemory_;
}

HttpListener::~HttpListener() {
  stop();
}

bool HttpListener::start(const std::string& host, int port, std::string& error) {
  addrinfo hints{};
  hints.ai_family = AF_UNSPEC;
  hints.ai_socktype = SOCK_STREAM;
  hints.ai_flags = AI_PASSIVE | AI_NUMERICSERV;
  addrinfo* found = nullptr;
  const std::string service = std::to_string(port);
  if (getaddrinfo(host.c_str(), service.c_str(), &hints, &found) != 0 || !found) {
    error = "cannot resolve " + host;
    return false;
  }
  int failure = 0;
  for (addrinfo* address = found; address && listenFd_ < 0; address = address->ai_next) {
    const int fd = socket(address->ai_family, address->ai_socktype | SOCK_CLOEXEC, address->ai_protocol);
    if (fd < 0) continue;
    const int yes = 1;
    setsockopt(fd, SOL_SOCKET, SO_REUSEADDR, &yes, sizeof yes);
    if (bind(fd, address->ai_addr, address->ai_addrlen) == 0 && listen(fd, listenBacklog()) == 0) {
      listenFd_ = fd;
    } else {
      failure = errno;
      ::close(fd);
    }
  }
  freeaddrinfo(found);
  if (listenFd_ < 0) {
    error = "cannot listen on " + host + ":" + std::to_string(port) +
            (failure ? ": " + std::string(std::strerror(failure)) : "");
    return false;
  }
  sockaddr_storage bound{};
  socklen_t length = sizeof bound;
  getsockname(listenFd_, reinterpret_cast<sockaddr*>(&bound), &length);
  port_ = ntohs(bound.ss_family == AF_INET6 ? reinterpret_cast<sockaddr_in6*>(&bound)->sin6_port
                                            : reinterpret_cast<sockaddr_in*>(&bound)->sin_port);
  setNonBlocking(listenFd_);
  epollFd_ = epoll_create1(EPOLL_CLOEXEC);
  wakeFd_ = eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC);
  for (int fd : {listenFd_, wakeFd_}) {
    epoll_event event{};
    event.events = EPOLLIN;
    event.data.fd = fd;
    epoll_ctl(epollFd_, EPOLL_CTL_ADD, fd, &event);
  }
  limits_.maxConnections = std::min(limits_.maxConnections, connectionsTheFileLimitAllows(workerCount_));
  stopping_ = false;
  for (int i = 0; i < workerCount_; ++i) workers_.emplace_back([this] { workLoop(); });
  reader_ = std::thread([this] { readLoop(); });
  return true;
}

void HttpListener::stop() {
  if (listenFd_ < 0) return;
  stopping_ = true;
  wake();
  if (reader_.joinable()) reader_.join();
  work_.notify_all();
  for (std::thread& worker : workers_) worker.join();
  workers_.clear();
  for (const auto& entry : connections_) ::close(entry.first);
  connections_.clear();
  connectionsPerAddress_.clear();
  ::close(listenFd_);
  ::close(epollFd_);
  ::close(wakeFd_);
  listenFd_ = epollFd_ = wakeFd_ = -1;
  port_ = -1;
}

void HttpListener::wake() {
  const uint64_t one = 1;
  [[maybe_unused]] const ssize_t written = write(wakeFd_, &one, sizeof one);
}

void HttpListener::readLoop() {
  epoll_event events[64];
  while (!stopping_) {
    const int ready = epoll_wait(epollFd_, events, 64, 250);
    for (int i = 0; i < ready; ++i) {
      const int fd = events[i].data.fd;
      if (fd == listenFd_) {
        accept();
      } else if (fd == wakeFd_) {
        uint64_t count = 0;
        [[maybe_unused]] const ssize_t read = ::read(wakeFd_, &count, sizeof count);
      } else if (auto found = connections_.find(fd); found != connections_.end()) {
        if (found->second->phase == Connection::Phase::Writing) {
          writeTo(fd);
        } else {
          readFrom(fd);
        }
      }
    }
    std::vector<Returned> returned;
    {
      std::lock_guard lock(mutex_);
      returned.swap(returned_);
    }
    for (Returned& back : returned) takeBack(std::move(back));
    sweepDeadlines(Clock::now());
    if (acceptPausedUntil_ && Clock::now() >= *acceptPausedUntil_) {
      acceptPausedUntil_.reset();
      epoll_event event{};
      event.events = EPOLLIN;
      event.data.fd = listenFd_;
      epoll_ctl(epollFd_, EPOLL_CTL_ADD, listenFd_, &event);
    }
  }
}

void HttpListener::accept() {
  for (;;) {
    sockaddr_storage address{};
    socklen_t length = sizeof address;
    const int fd =
        accept4(listenFd_, reinterpret_cast<sockaddr*>(&address), &length, SOCK_NONBLOCK | SOCK_CLOEXEC);
    if (fd < 0) {
      // Out of descriptors after all (something else holds them): stop listening for a moment rather
      // than being woken for the same connection again and again.
      if (errno == EMFILE || errno == ENFILE || errno == ENOBUFS || errno == ENOMEM) {
        epoll_ctl(epollFd_, EPOLL_CTL_DEL, listenFd_, nullptr);
        acceptPausedUntil_ = Clock::now() + std::chrono::milliseconds(100);
      }
      return;
    }
    if (connections_.size() >= limits_.maxConnections) {
      ::close(fd);
      continue;
    }
    char text[INET6_ADDRSTRLEN] = {};
    if (address.ss_family == AF_INET6) {
      inet_ntop(AF_INET6, &reinterpret_cast<sockaddr_in6*>(&address)->sin6_addr, text, sizeof text);
    } else {
      inet_ntop(AF_INET, &reinterpret_cast<sockaddr_in*>(&address)->sin_addr, text, sizeof text);
    }
    std::string group = addressGroup(text);
    size_t& fromThere = connectionsPerAddress_[group];
    if (limits_.maxConnectionsPerAddress > 0 && fromThere >= limits_.maxConnectionsPerAddress) {
      // Told at once rather than left waiting: it is the address, not the server, that is at its limit.
      HttpRequest nothing;
      nothing.peer = text;
      const std::string bytes =
          serialise(withRetryAfter(
                        refusal_(nothing, 503, "Too many connections from your address; try again shortly.")),
                    false);
      [[maybe_unused]] const ssize_t sent = send(fd, bytes.data(), bytes.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
      ::close(fd);
      continue;
    }
    ++fromThere;
    const int yes = 1;
    setsockopt(fd, IPPROTO_TCP, TCP_NODELAY, &yes, sizeof yes);
    auto connection = std::make_unique<Connection>(fd, text, std::move(group), limits_.request);
    connection->deadline = Clock::now() + limits_.idleTimeout;
    connections_[fd] = std::move(connection);
    epoll_event event{};
    event.events = EPOLLIN | EPOLLRDHUP;
    event.data.fd = fd;
    epoll_ctl(epollFd_, EPOLL_CTL_ADD, fd, &event);
  }
}

void HttpListener::close(int fd) {
  auto found = connections_.find(fd);
  if (found == connections_.end()) return;
  epoll_ctl(epollFd_, EPOLL_CTL_DEL, fd, nullptr);
  ::close(fd);
  auto fromThere = connectionsPerAddress_.find(found->second->group);
  if (fromThere != connectionsPerAddress_.end() && --fromThere->second == 0)
    connectionsPerAddress_.erase(fromThere);
  const bool large = found->second->output.size() >= kLargeExchange;
  connections_.erase(found);
  if (large) releaseFreedMemory();
}

void HttpListener::readFrom(int fd) {
  if (!connections_.count(fd)) return;
  char chunk[16384];
  const ssize_t got = ::read(fd, chunk, sizeof chunk);
  if (got == 0 || (got < 0 && errno != EAGAIN && errno != EWOULDBLOCK && errno != EINTR)) {
    close(fd);
    return;
  }
  if (got < 0) return;
  dispatch(fd, std::string_view(chunk, static_cast<size_t>(got)));
}

void HttpListener::refuse(Connection& connection, int status, const std::string& why) {
  // The head is all a refusal needs; a partial body could be megabytes to copy.
  const HttpRequest& read = connection.parser.partial();
  const HttpRequest partial{read.method, read.path, read.query, read.headers, {}, connection.peer};
  HttpReply reply = refusal_(partial, status, why);
  if (status == 503) reply = withRetryAfter(std::move(reply));
  const std::string bytes = serialise(reply, false);
  // Best effort and never blocking: the reader must not wait on a client that does not read.
  [[maybe_unused]] const ssize_t sent =
      send(connection.fd, bytes.data(), bytes.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
  close(connection.fd);
}

// Parses what has arrived; hands a complete request to the workers or refuses a bad one.
void HttpListener::dispatch(int fd, std::string_view bytes) {
  Connection& connection = *connections_.at(fd);
  // The request's deadline runs from its first byte.
  if (connection.phase == Connection::Phase::Idle) {
    connection.phase = Connection::Phase::Reading;
    connection.deadline = Clock::now() + limits_.requestTimeout;
  }
  HttpRequestParser::Outcome outcome = connection.parser.feed(bytes);
  if (outcome.continueFirst) {
    static const char kContinue[] = "HTTP/1.1 100 Continue\r\n\r\n";
    [[maybe_unused]] const ssize_t sent =
        send(fd, kContinue, sizeof kContinue - 1, MSG_NOSIGNAL | MSG_DONTWAIT);
  }
  if (outcome.kind == HttpRequestParser::Outcome::Kind::Refusal)
    return refuse(connection, outcome.status, outcome.why);
  if (outcome.kind == HttpRequestParser::Outcome::Kind::NeedMore) return;
  // Complete: the connection leaves the reader until a worker has answered.
  epoll_ctl(epollFd_, EPOLL_CTL_DEL, fd, nullptr);
  connection.phase = Connection::Phase::Busy;
  outcome.request.peer = connection.peer;
  {
    std::lock_guard lock(mutex_);
    jobs_.push_back(Job{fd, std::move(outcome.request), std::move(outcome.body), outcome.keepAlive});
  }
  work_.notify_one();
}

void HttpListener::sweepDeadlines(Clock::time_point now) {
  std::vector<int> expired;
  for (const auto& [fd, connection] : connections_) {
    if (connection->phase != Connection::Phase::Busy && connection->deadline <= now) expired.push_back(fd);
  }
  for (int fd : expired) {
    Connection& connection = *connections_.at(fd);
    if (connection.phase == Connection::Phase::Idle || connection.phase == Connection::Phase::Writing) {
      close(fd);
    } else {
      refuse(connection, 408, "The request took too long to arrive.");
    }
  }
}

void HttpListener::takeBack(Returned returned) {
  auto found = connections_.find(returned.fd);
  if (found == connections_.end()) return;
  Connection& connection = *found->second;
  const bool written = returned.written == returned.output.size();
  if (stopping_ || (written && !returned.keepAlive)) return close(returned.fd);
  if (written) return awaitRequest(connection);
  connection.phase = Connection::Phase::Writing;
  connection.deadline = Clock::now() + limits_.writeTimeout;
  connection.output = std::move(returned.output);
  connection.written = returned.written;
  connection.outputLease = std::move(returned.lease);
  connection.keepAlive = returned.keepAlive;
  epoll_event event{};
  event.events = EPOLLOUT;
  event.data.fd = returned.fd;
  epoll_ctl(epollFd_, EPOLL_CTL_ADD, returned.fd, &event);
}

void HttpListener::awaitRequest(Connection& connection) {
  const bool wasWriting = connection.phase == Connection::Phase::Writing;
  connection.phase = Connection::Phase::Idle;
  connection.deadline = Clock::now() + limits_.idleTimeout;
  epoll_event event{};
  event.events = EPOLLIN | EPOLLRDHUP;
  event.data.fd = connection.fd;
  epoll_ctl(epollFd_, wasWriting ? EPOLL_CTL_MOD : EPOLL_CTL_ADD, connection.fd, &event);
  // A pipelined request may already be waiting in the buffer.
  if (connection.parser.hasBufferedBytes()) dispatch(connection.fd, {});
}

void HttpListener::writeTo(int fd) {
  Connection& connection = *connections_.at(fd);
  if (!sendSome(fd, connection.output, connection.written)) return close(fd);
  if (connection.written < connection.output.size()) return;
  if (!connection.keepAlive) return close(fd);
  const bool large = connection.output.size() >= kLargeExchange;
  std::string().swap(connection.output);
  connection.outputLease.resize(0);
  if (large) releaseFreedMemory();
  awaitRequest(connection);
}

void HttpListener::workLoop() {
  for (;;) {
    Job job;
    {
      std::unique_lock lock(mutex_);
      work_.wait(lock, [this] { return stopping_ || !jobs_.empty(); });
      if (jobs_.empty()) return;  // stopping, and nothing left to answer
      job = std::move(jobs_.front());
      jobs_.pop_front();
    }
    HttpReply reply;
    try {
      reply = handler_(job.request);
    } catch (const std::exception& e) {
      std::cerr << "tessal-sync-server: request failed: " << e.what() << std::endl;
      reply = HttpReply{500, "Internal error; try again later.\n", "text/plain; charset=utf-8", {}};
    }
    Returned returned{job.fd, job.keepAlive && !stopping_, {}, 0, ByteBudget::Lease(&replyMemory_)};
    const bool large = job.request.body.size() >= kLargeExchange || reply.body.size() >= kLargeExchange;
    job = Job{};  // answered: the body's memory goes back before the reply takes more
    returned.output = serialise(reply, returned.keepAlive);
    reply = HttpReply{};
    // The reply waits in memory until its reader has taken it; past the budget it gives way to a short
    // answer, and its client asks again shortly.
    if (!returned.lease.resize(returned.output.size(), true)) {
      returned.output = serialise(
          withRetryAfter(textReply(503, "The server has too many replies waiting; try again shortly.")),
          returned.keepAlive);
    }
    if (large) releaseFreedMemory();
    const bool broken = !sendSome(returned.fd, returned.output, returned.written);
    if (broken || returned.written == returned.output.size()) {
      // Nothing is left to hold.
      returned.keepAlive = returned.keepAlive && !broken;
      std::string().swap(returned.output);
      returned.written = 0;
      returned.lease.resize(0);
    }
    {
      std::lock_guard lock(mutex_);
      returned_.push_back(std::move(returned));
    }
    wake();
  }
}

}  // namespace tessal::server
