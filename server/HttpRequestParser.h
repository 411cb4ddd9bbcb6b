#pragma once

#include <cstddef>
#include <map>
#include <string>
#include <string_view>

namespace tessal::server {

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
// the answer. Compressed bodies are refused: they could unpack to anything.
class HttpRequestParser {
 public:
  struct Limits {
    size_t maxBodyBytes = 32u << 20;
    size_t maxHeaderBytes = 64u << 10;  // request line and headers together
    size_t maxHeaderLine = 8u << 10;
    size_t maxHeaderCount = 100;
  };

  struct Outcome {
    enum class Kind { NeedMore, Request, Refusal };
    Kind kind = Kind::NeedMore;
    HttpRequest request;     // Request: the whole request (its peer left empty)
    bool keepAlive = false;  // Request: whether the connection may carry another one
    int status = 0;          // Refusal: 400, 413, 415 or 431
    std::string why;         // Refusal: one sentence for the client
    // The headers just read ask for "100 Continue" before the client sends the body.
    bool continueFirst = false;
  };

  explicit HttpRequestParser(Limits limits) : limits_(limits) {}

  // Takes the next bytes and reads as far as they go. After a request, the bytes that follow it are
  // kept for the next one (feed nothing to read them). After a refusal the connection's bytes cannot
  // be trusted to frame anything: every later call answers the same refusal.
  Outcome feed(std::string_view bytes);

  // What has been read of the present request, for answering a refusal or a timeout.
  const HttpRequest& partial() const { return request_; }
  // Bytes of a request not yet answered are waiting.
  bool hasBufferedBytes() const { return !buffer_.empty(); }

 private:
  enum class Phase { Headers, Body, ChunkSize, ChunkData, ChunkEnd, Trailers, Refused };
  enum class Line { Complete, Partial, TooLong, HeadersTooLarge };

  Line nextLine(size_t maxLength, size_t maxTotal, std::string& line);
  bool readHeaderLine(const std::string& line, Outcome& outcome);
  bool headersRead(Outcome& outcome);
  Outcome& refuse(Outcome& outcome, int status, std::string why);
  Outcome& complete(Outcome& outcome);
  void consume(size_t bytes);

  Limits limits_;
  std::string buffer_;  // from the start of the present line (headers: of the request) on
  size_t scanned_ = 0;  // bytes of the buffer already looked at for a line end
  size_t lineStart_ = 0;
  Phase phase_ = Phase::Headers;
  HttpRequest request_;
  std::string version_;
  size_t headerCount_ = 0;
  bool keepAlive_ = true;
  size_t contentLength_ = 0;
  size_t chunkLeft_ = 0;
  int refusedStatus_ = 0;
  std::string refusedWhy_;
};

}  // namespace tessal::server
