#pragma once

#include <atomic>
#include <cstddef>
#include <map>
#include <string>
#include <string_view>

namespace tessal::server {

// Bytes that many holders draw on together (the bodies of every request being read, the replies of
// every connection being written), so that many connections each within their own cap cannot add up
// to more memory than the server has. Any thread may take and give.
class ByteBudget {
 public:
  explicit ByteBudget(size_t total) : total_(total) {}
  ByteBudget(const ByteBudget&) = delete;
  ByteBudget& operator=(const ByteBudget&) = delete;

  // What one holder has drawn; given back when it is resized to 0 or destroyed. An empty lease (no
  // budget) grants everything.
  class Lease {
   public:
    Lease() = default;
    explicit Lease(ByteBudget* budget) : budget_(budget) {}
    Lease(Lease&& other) noexcept;
    Lease& operator=(Lease&& other) noexcept;
    ~Lease() { resize(0); }
    // Takes or gives back the difference. False, holding what it held, when the budget lacks it; with
    // `evenAlone`, a holder that would be the budget's only one gets it anyway.
    bool resize(size_t bytes, bool evenAlone = false);
    size_t bytes() const { return bytes_; }

   private:
    ByteBudget* budget_ = nullptr;
    size_t bytes_ = 0;
  };

  size_t total() const { return total_; }
  size_t used() const { return used_.load(); }

 private:
  const size_t total_;
  std::atomic<size_t> used_{0};
};

// One request, read completely before any worker sees it.
struct HttpRequest {
  std::string method;
  std::string path;                            // without the query
  std::string query;                           // after "?", undecoded
  std::map<std::string, std::string> headers;  // names in lower case
  std::string body;
  std::string peer;  // the client's address

  // A header's value, or empty.
  std::string header(const std::string& lowerCaseName) const;
};

// Reads HTTP/1.1 requests from the bytes of one connection, as they arrive, without a socket.
//
// The caps are counted on the bytes as they arrive whatever the framing (Content-Length or chunked,
// whose decoded size is what counts), so a client never makes the server hold more than the caps allow.
// Every check is made at the byte that breaks it, so how the network splits a request never changes
// the answer (only the shared budget for bodies depends on what other connections hold). Compressed
// bodies are refused: they could unpack to anything.
class HttpRequestParser {
 public:
  struct Limits {
    size_t maxBodyBytes = 32u << 20;
    size_t maxHeaderBytes = 64u << 10;  // request line and headers together
    size_t maxHeaderLine = 8u << 10;
    size_t maxHeaderCount = 100;
    // Shared with every other connection's parser; none: only maxBodyBytes bounds a body.
    ByteBudget* bodies = nullptr;
  };

  struct Outcome {
    enum class Kind { NeedMore, Request, Refusal };
    Kind kind = Kind::NeedMore;
    HttpRequest request;     // Request: the whole request (its peer left empty)
    bool keepAlive = false;  // Request: whether the connection may carry another one
    // Request: what its body holds of the budget, to be given back once the request is answered.
    ByteBudget::Lease body;
    int status = 0;   // Refusal: 400, 413, 415, 431, or 503 when the budget is spent
    std::string why;  // Refusal: one sentence for the client
    // The headers just read ask for "100 Continue" before the client sends the body.
    bool continueFirst = false;
  };

  explicit HttpRequestParser(Limits limits) : limits_(limits), bodyLease_(limits.bodies) {}

  // Takes the next bytes and reads as far as they go. After a request, the bytes that follow it are
  // kept for the next one (feed nothing to read them). After a refusal the connection's bytes cannot
  // be trusted to frame anything: every later call answers the same refusal.
  Outcome feed(std::string_view bytes);

  // What has been read of the present request, for answering a refusal or a timeout.
  const HttpRequest& partial() const { return request_; }
  // Bytes of a request not yet answered are waiting.
  bool hasBufferedBytes() const { return !buffer_.empty(); }
  // The memory its buffers hold now: between requests only what the next request already sent.
  size_t heldBytes() const { return buffer_.capacity() + request_.body.capacity(); }

 private:
  enum class Phase { Headers, Body, ChunkSize, ChunkData, ChunkEnd, Trailers, Refused };
  // NotAMethod: the request line began with a byte no method has (as a TLS handshake does).
  enum class Line { Complete, Partial, TooLong, HeadersTooLarge, NotAMethod };

  Line nextLine(size_t maxLength, size_t maxTotal, std::string& line);
  bool readHeaderLine(const std::string& line, Outcome& outcome);
  bool headersRead(Outcome& outcome);
  Outcome&& refuse(Outcome& outcome, int status, std::string why);
  Outcome&& busy(Outcome& outcome) {
    return refuse(outcome, 503, "The server is receiving too much at once; try again shortly.");
  }
  Outcome&& complete(Outcome& outcome);
  void consume(size_t bytes);
  bool makeRoomForBody(size_t bytes, size_t limit);

  Limits limits_;
  std::string buffer_;  // from the start of the present line (headers: of the request) on
  size_t scanned_ = 0;  // bytes of the buffer already looked at for a line end
  size_t lineStart_ = 0;
  Phase phase_ = Phase::Headers;
  HttpRequest request_;
  ByteBudget::Lease bodyLease_;  // what request_.body's capacity holds of the shared budget
  std::string version_;
  size_t headerCount_ = 0;
  bool keepAlive_ = true;
  bool inMethod_ = true;  // the bytes scanned are those of a request's method so far
  size_t contentLength_ = 0;
  size_t chunkLeft_ = 0;
  int refusedStatus_ = 0;
  std::string refusedWhy_;
};

}  // namespace tessal::server
