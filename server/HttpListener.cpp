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

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <fstream>
#include <iostream>

namespace tessal::server {

namespace {

using Clock = std::chrono::steady_clock;

std::string lowerCase(std::string text) {
  for (char& c : text) {
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  }
  return text;
}

std::string trimmed(const std::string& text) {
  size_t begin = 0, end = text.size();
  while (begin < end && (text[begin] == ' ' || text[begin] == '\t')) ++begin;
  while (end > begin && (text[end - 1] == ' ' || text[end - 1] == '\t')) --end;
  return text.substr(begin, end - begin);
}

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

}  // namespace

HttpReply textReply(int status, const std::string& text) {
  HttpReply reply;
  reply.status = status;
  reply.contentType = "text/plain; charset=utf-8";
  reply.body = text + "\n";
  return reply;
}

std::string HttpRequest::header(const std::string& lowerCaseName) const {
  auto found = headers.find(lowerCaseName);
  return found == headers.end() ? std::string() : found->second;
}

struct HttpListener::Connection {
  enum class Phase { Idle, Headers, Body, Busy };
  int fd = -1;
  std::string peer;
  std::string buffer;
  Phase phase = Phase::Idle;
  Clock::time_point deadline;
  HttpRequest request;
  bool keepAlive = true;
  bool chunked = false;
  size_t contentLength = 0;
  // Chunked bodies: the bytes left of the present chunk, or none while a size line is awaited.
  std::optional<size_t> chunkLeft;
  bool trailers = false;

  void reset(Clock::time_point idleDeadline) {
    phase = Phase::Idle;
    deadline = idleDeadline;
    request = HttpRequest{};
    request.peer = peer;
    keepAlive = true;
    chunked = false;
    contentLength = 0;
    chunkLeft.reset();
    trailers = false;
  }
};

HttpListener::HttpListener(Limits limits, int workers, Handler handler, Refusal refusal)
    : limits_(limits),
      workerCount_(std::max(workers, 1)),
      handler_(std::move(handler)),
      refusal_(std::move(refusal)) {}

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
  for (addrinfo* address = found; address && listenFd_ < 0; address = address->ai_next) {
    const int fd = socket(address->ai_family, address->ai_socktype | SOCK_CLOEXEC, address->ai_protocol);
    if (fd < 0) continue;
    const int yes = 1;
    setsockopt(fd, SOL_SOCKET, SO_REUSEADDR, &yes, sizeof yes);
    if (bind(fd, address->ai_addr, address->ai_addrlen) == 0 && listen(fd, listenBacklog()) == 0) {
      listenFd_ = fd;
    } else {
      ::close(fd);
    }
  }
  freeaddrinfo(found);
  if (listenFd_ < 0) {
    error = "cannot listen on " + host + ":" + std::to_string(port);
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
      } else {
        readFrom(fd);
      }
    }
    std::vector<std::pair<int, bool>> returned;
    {
      std::lock_guard lock(mutex_);
      returned.swap(returned_);
    }
    for (auto& [fd, keep] : returned) {
      auto found = connections_.find(fd);
      if (found == connections_.end()) continue;
      if (!keep || stopping_) {
        close(fd);
        continue;
      }
      Connection& connection = *found->second;
      connection.reset(Clock::now() + limits_.idleTimeout);
      epoll_event event{};
      event.events = EPOLLIN | EPOLLRDHUP;
      event.data.fd = fd;
      epoll_ctl(epollFd_, EPOLL_CTL_ADD, fd, &event);
      // A pipelined request may already be waiting in the buffer.
      if (!connection.buffer.empty()) dispatch(fd);
    }
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
    const int yes = 1;
    setsockopt(fd, IPPROTO_TCP, TCP_NODELAY, &yes, sizeof yes);
    char text[INET6_ADDRSTRLEN] = {};
    if (address.ss_family == AF_INET6) {
      inet_ntop(AF_INET6, &reinterpret_cast<sockaddr_in6*>(&address)->sin6_addr, text, sizeof text);
    } else {
      inet_ntop(AF_INET, &reinterpret_cast<sockaddr_in*>(&address)->sin_addr, text, sizeof text);
    }
    auto connection = std::make_unique<Connection>();
    connection->fd = fd;
    connection->peer = text;
    connection->reset(Clock::now() + limits_.idleTimeout);
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
  connections_.erase(found);
}

void HttpListener::readFrom(int fd) {
  auto found = connections_.find(fd);
  if (found == connections_.end()) return;
  Connection& connection = *found->second;
  char chunk[16384];
  const ssize_t got = ::read(fd, chunk, sizeof chunk);
  if (got == 0 || (got < 0 && errno != EAGAIN && errno != EWOULDBLOCK && errno != EINTR)) {
    close(fd);
    return;
  }
  if (got < 0) return;
  if (connection.phase == Connection::Phase::Idle) {
    connection.phase = Connection::Phase::Headers;
    connection.deadline = Clock::now() + limits_.requestTimeout;
  }
  connection.buffer.append(chunk, static_cast<size_t>(got));
  dispatch(fd);
}

void HttpListener::refuse(Connection& connection, int status, const std::string& why) {
  connection.request.peer = connection.peer;
  const std::string bytes = serialise(refusal_(connection.request, status, why), false);
  // Best effort and never blocking: the reader must not wait on a client that does not read.
  [[maybe_unused]] const ssize_t sent =
      send(connection.fd, bytes.data(), bytes.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
  close(connection.fd);
}

// Parses what the buffer holds; hands a complete request to the workers or refuses a bad one.
void HttpListener::dispatch(int fd) {
  Connection& connection = *connections_.at(fd);
  if (connection.phase == Connection::Phase::Idle && !connection.buffer.empty()) {
    connection.phase = Connection::Phase::Headers;
    connection.deadline = Clock::now() + limits_.requestTimeout;
  }
  if (connection.phase == Connection::Phase::Headers) {
    const size_t end = connection.buffer.find("\r\n\r\n");
    const size_t headerBytes = end == std::string::npos ? connection.buffer.size() : end + 4;
    if (headerBytes > limits_.maxHeaderBytes)
      return refuse(connection, 431, "The request's headers are too large.");
    if (end == std::string::npos) {
      const size_t lineStart = connection.buffer.rfind('\n');
      const size_t open = connection.buffer.size() - (lineStart == std::string::npos ? 0 : lineStart + 1);
      if (open > limits_.maxHeaderLine) return refuse(connection, 431, "A header line is too long.");
      return;
    }
    HttpRequest& request = connection.request;
    size_t position = 0, count = 0;
    bool first = true;
    std::string version;
    while (position < end) {
      size_t lineEnd = connection.buffer.find("\r\n", position);
      if (lineEnd == std::string::npos || lineEnd > end) lineEnd = end;
      const std::string line = connection.buffer.substr(position, lineEnd - position);
      position = lineEnd + 2;
      if (line.size() > limits_.maxHeaderLine) return refuse(connection, 431, "A header line is too long.");
      if (first) {
        first = false;
        const size_t space1 = line.find(' ');
        const size_t space2 = line.rfind(' ');
        if (space1 == std::string::npos || space2 == space1)
          return refuse(connection, 400, "Bad request line.");
        request.method = line.substr(0, space1);
        const std::string target = line.substr(space1 + 1, space2 - space1 - 1);
        version = line.substr(space2 + 1);
        if (version != "HTTP/1.1" && version != "HTTP/1.0")
          return refuse(connection, 400, "Bad HTTP version.");
        const size_t question = target.find('?');
        request.path = target.substr(0, question);
        if (question != std::string::npos) request.query = target.substr(question + 1);
        continue;
      }
      if (++count > limits_.maxHeaderCount)
        return refuse(connection, 431, "The request has too many headers.");
      const size_t colon = line.find(':');
      if (colon == std::string::npos || colon == 0 || line[0] == ' ' || line[0] == '\t')
        return refuse(connection, 400, "Bad header line.");
      std::string& value = request.headers[lowerCase(line.substr(0, colon))];
      value =
          value.empty() ? trimmed(line.substr(colon + 1)) : value + ", " + trimmed(line.substr(colon + 1));
    }
    connection.buffer.erase(0, end + 4);
    const std::string connectionHeader = lowerCase(request.header("connection"));
    connection.keepAlive = version == "HTTP/1.1" ? connectionHeader.find("close") == std::string::npos
                                                 : connectionHeader.find("keep-alive") != std::string::npos;
    const std::string encoding = lowerCase(request.header("content-encoding"));
    if (!encoding.empty() && encoding != "identity")
      return refuse(connection, 415, "Compressed request bodies are not accepted.");
    const std::string transfer = lowerCase(request.header("transfer-encoding"));
    const std::string length = request.header("content-length");
    if (!transfer.empty()) {
      if (transfer != "chunked" || !length.empty())
        return refuse(connection, 400, "Unsupported transfer encoding.");
      connection.chunked = true;
    } else if (!length.empty()) {
      if (length.size() > 18 || length.find_first_not_of("0123456789") != std::string::npos)
        return refuse(connection, 400, "Bad Content-Length.");
      connection.contentLength = std::stoull(length);
      if (connection.contentLength > limits_.maxBodyBytes)
        return refuse(connection, 413, "The request is larger than this server accepts.");
    }
    if (lowerCase(request.header("expect")) == "100-continue") {
      static const char kContinue[] = "HTTP/1.1 100 Continue\r\n\r\n";
      [[maybe_unused]] const ssize_t sent =
          send(fd, kContinue, sizeof kContinue - 1, MSG_NOSIGNAL | MSG_DONTWAIT);
    }
    connection.phase = Connection::Phase::Body;
  }
  if (connection.phase != Connection::Phase::Body) return;

  HttpRequest& request = connection.request;
  if (!connection.chunked) {
    if (connection.buffer.size() < connection.contentLength) {
      return;
    }
    request.body = connection.buffer.substr(0, connection.contentLength);
    connection.buffer.erase(0, connection.contentLength);
  } else {
    // Decoded as it arrives; the decoded size is what counts against the limit.
    for (;;) {
      if (connection.trailers) {
        const size_t lineEnd = connection.buffer.find("\r\n");
        if (lineEnd == std::string::npos) {
          if (connection.buffer.size() > limits_.maxHeaderLine)
            return refuse(connection, 431, "A trailer is too long.");
          return;
        }
        connection.buffer.erase(0, lineEnd + 2);
        if (lineEnd == 0) break;  // the blank line after the trailers ends the request
        continue;
      }
      if (!connection.chunkLeft) {
        const size_t lineEnd = connection.buffer.find("\r\n");
        if (lineEnd == std::string::npos) {
          if (connection.buffer.size() > 64) return refuse(connection, 400, "Bad chunk size.");
          return;
        }
        const std::string sizeText = connection.buffer.substr(0, connection.buffer.find_first_of(";\r"));
        if (sizeText.empty() || sizeText.size() > 15 ||
            sizeText.find_first_not_of("0123456789abcdefABCDEF") != std::string::npos)
          return refuse(connection, 400, "Bad chunk size.");
        const size_t size = std::stoull(sizeText, nullptr, 16);
        connection.buffer.erase(0, lineEnd + 2);
        if (size == 0) {
          connection.trailers = true;
          continue;
        }
        if (request.body.size() + size > limits_.maxBodyBytes)
          return refuse(connection, 413, "The request is larger than this server accepts.");
        connection.chunkLeft = size;
      }
      const size_t take = std::min(*connection.chunkLeft, connection.buffer.size());
      request.body.append(connection.buffer, 0, take);
      connection.buffer.erase(0, take);
      *connection.chunkLeft -= take;
      if (*connection.chunkLeft > 0) return;
      if (connection.buffer.size() < 2) return;
      if (connection.buffer.compare(0, 2, "\r\n") != 0) return refuse(connection, 400, "Bad chunk.");
      connection.buffer.erase(0, 2);
      connection.chunkLeft.reset();
    }
  }
  // Complete: the connection leaves the reader until a worker has answered.
  epoll_ctl(epollFd_, EPOLL_CTL_DEL, fd, nullptr);
  connection.phase = Connection::Phase::Busy;
  request.peer = connection.peer;
  {
    std::lock_guard lock(mutex_);
    jobs_.push_back(Job{fd, std::move(request), connection.keepAlive});
  }
  connection.request = HttpRequest{};
  work_.notify_one();
}

void HttpListener::sweepDeadlines(Clock::time_point now) {
  std::vector<int> expired;
  for (const auto& [fd, connection] : connections_) {
    if (connection->phase != Connection::Phase::Busy && connection->deadline <= now) expired.push_back(fd);
  }
  for (int fd : expired) {
    Connection& connection = *connections_.at(fd);
    if (connection.phase == Connection::Phase::Idle) {
      close(fd);
    } else {
      refuse(connection, 408, "The request took too long to arrive.");
    }
  }
}

bool HttpListener::writeAll(int fd, const std::string& bytes) {
  size_t done = 0;
  const auto deadline = Clock::now() + limits_.writeTimeout;
  while (done < bytes.size()) {
    const ssize_t sent = send(fd, bytes.data() + done, bytes.size() - done, MSG_NOSIGNAL | MSG_DONTWAIT);
    if (sent > 0) {
      done += static_cast<size_t>(sent);
      continue;
    }
    if (sent < 0 && errno != EAGAIN && errno != EWOULDBLOCK && errno != EINTR) return false;
    const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now()).count();
    if (left <= 0) return false;
    pollfd writable{fd, POLLOUT, 0};
    poll(&writable, 1, static_cast<int>(std::min<long long>(left, 1000)));
  }
  return true;
}

void HttpListener::handBack(int fd, bool keepAlive) {
  {
    std::lock_guard lock(mutex_);
    returned_.emplace_back(fd, keepAlive);
  }
  wake();
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
    const bool keep = job.keepAlive && !stopping_;
    const bool written = writeAll(job.fd, serialise(reply, keep));
    handBack(job.fd, written && keep);
  }
}

}  // namespace tessal::server
