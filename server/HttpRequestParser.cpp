#include "HttpRequestParser.h"

#include <algorithm>
#include <cctype>
#include <cstdint>
#include <utility>

namespace tessal::server {

namespace {

// Chunk size lines are a number and perhaps an extension; nothing honest needs more.
constexpr size_t kMaxChunkSizeLine = 64;
// A body's first allocation; it then doubles as its bytes arrive, never past what it may reach.
constexpr size_t kFirstBodyBlock = 16u << 10;
// Between requests the buffer keeps no more than this beyond the bytes it holds.
constexpr size_t kIdleBuffer = 4u << 10;

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

// Whether `c` may be part of a method (a token).
bool isTokenCharacter(char c) {
  return std::isalnum(static_cast<unsigned char>(c)) ||
         std::string_view("!#$%&'*+-.^_`|~").find(c) != std::string_view::npos;
}

}  // namespace

ByteBudget::Lease::Lease(Lease&& other) noexcept
    : budget_(other.budget_), bytes_(std::exchange(other.bytes_, 0)) {}

ByteBudget::Lease& ByteBudget::Lease::operator=(Lease&& other) noexcept {
  if (this != &other) {
    resize(0);
    budget_ = other.budget_;
    bytes_ = std::exchange(other.bytes_, 0);
  }
  return *this;
}

bool ByteBudget::Lease::resize(size_t bytes, bool evenAlone) {
  if (!budget_) {
    bytes_ = bytes;
    return true;
  }
  if (bytes <= bytes_) {
    budget_->used_ -= bytes_ - bytes;
    bytes_ = bytes;
    return true;
  }
  const size_t more = bytes - bytes_;
  size_t used = budget_->used_.load();
  do {
    const bool alone = used == bytes_;
    if (used + more > budget_->total_ && !(evenAlone && alone)) return false;
  } while (!budget_->used_.compare_exchange_weak(used, used + more));
  bytes_ = bytes;
  return true;
}

std::string HttpRequest::header(const std::string& lowerCaseName) const {
  auto found = headers.find(lowerCaseName);
  return found == headers.end() ? std::string() : found->second;
}

// Looks byte by byte, from where the last look stopped, for the CRLF that ends the line at
// lineStart_. A line is too long once its bytes, not counting a CR that may start its CRLF, pass the
// cap; the header block is too large once its bytes pass maxTotal. Checking at each byte, rather than
// once a line is complete, is what makes the outcome independent of how the bytes were delivered.
HttpRequestParser::Line HttpRequestParser::nextLine(size_t maxLength, size_t maxTotal, std::string& line) {
  for (; scanned_ < buffer_.size(); ++scanned_) {
    if (scanned_ + 1 > maxTotal) return Line::HeadersTooLarge;
    const char c = buffer_[scanned_];
    // A request begins with its method: a byte no method has (a TLS handshake sent to this plain HTTP
    // server) is refused as it arrives, not after a wait for a line end that never comes.
    if (inMethod_ && (c == ' ' || c == '\r' || c == '\n')) inMethod_ = false;
    if (inMethod_ && !isTokenCharacter(c)) return Line::NotAMethod;
    if (c == '\n' && scanned_ > lineStart_ && buffer_[scanned_ - 1] == '\r') {
      line.assign(buffer_, lineStart_, scanned_ - 1 - lineStart_);
      lineStart_ = ++scanned_;
      return Line::Complete;
    }
    if (scanned_ + 1 - lineStart_ - (c == '\r' ? 1 : 0) > maxLength) return Line::TooLong;
  }
  return Line::Partial;
}

void HttpRequestParser::consume(size_t bytes) {
  buffer_.erase(0, bytes);
  scanned_ = scanned_ > bytes ? scanned_ - bytes : 0;
  lineStart_ = lineStart_ > bytes ? lineStart_ - bytes : 0;
}

// Room in the body for `bytes` in all, drawn from the shared budget as the bytes arrive (not as a
// Content-Length claims them, which costs a client nothing): growing by doubling up to `limit`, and
// into a buffer of exactly that size, so that what the budget counts is what the body holds.
bool HttpRequestParser::makeRoomForBody(size_t bytes, size_t limit) {
  std::string& body = request_.body;
  if (bytes <= body.capacity() && bytes <= bodyLease_.bytes()) return true;
  size_t size = std::min(limit, std::max({bytes, 2 * bodyLease_.bytes(), kFirstBodyBlock}));
  if (!bodyLease_.resize(size)) {
    size = bytes;
    if (!bodyLease_.resize(size)) return false;
  }
  std::string grown;
  grown.reserve(size);
  grown.append(body);
  body.swap(grown);
  return true;
}

HttpRequestParser::Outcome&& HttpRequestParser::refuse(Outcome& outcome, int status, std::string why) {
  phase_ = Phase::Refused;
  refusedStatus_ = status;
  refusedWhy_ = std::move(why);
  std::string().swap(buffer_);
  std::string().swap(request_.body);
  bodyLease_.resize(0);
  outcome.kind = Outcome::Kind::Refusal;
  outcome.status = refusedStatus_;
  outcome.why = refusedWhy_;
  return std::move(outcome);
}

HttpRequestParser::Outcome&& HttpRequestParser::complete(Outcome& outcome) {
  outcome.kind = Outcome::Kind::Request;
  outcome.request = std::exchange(request_, HttpRequest{});
  outcome.body = std::exchange(bodyLease_, ByteBudget::Lease(limits_.bodies));
  outcome.keepAlive = keepAlive_;
  // A connection may stay open for hours between requests: it keeps only what it must.
  if (buffer_.capacity() > buffer_.size() + kIdleBuffer) buffer_.shrink_to_fit();
  phase_ = Phase::Headers;
  version_.clear();
  headerCount_ = 0;
  keepAlive_ = true;
  inMethod_ = true;
  contentLength_ = 0;
  chunkLeft_ = 0;
  return std::move(outcome);
}

// The request line or one header; false with the outcome refused when it is not acceptable.
bool HttpRequestParser::readHeaderLine(const std::string& line, Outcome& outcome) {
  if (version_.empty()) {
    const size_t space1 = line.find(' ');
    const size_t space2 = line.rfind(' ');
    // A method and a target, both not empty, and the version.
    if (space1 == std::string::npos || space1 == 0 || space2 <= space1 + 1) {
      refuse(outcome, 400, "Bad request line.");
      return false;
    }
    request_.method = line.substr(0, space1);
    const std::string target = line.substr(space1 + 1, space2 - space1 - 1);
    const std::string version = line.substr(space2 + 1);
    if (version != "HTTP/1.1" && version != "HTTP/1.0") {
      refuse(outcome, 400, "Bad HTTP version.");
      return false;
    }
    version_ = version;
    const size_t question = target.find('?');
    request_.path = target.substr(0, question);
    if (question != std::string::npos) request_.query = target.substr(question + 1);
    return true;
  }
  if (++headerCount_ > limits_.maxHeaderCount) {
    refuse(outcome, 431, "The request has too many headers.");
    return false;
  }
  const size_t colon = line.find(':');
  if (colon == std::string::npos || colon == 0 || line[0] == ' ' || line[0] == '\t') {
    refuse(outcome, 400, "Bad header line.");
    return false;
  }
  // Repeated headers are one list, as HTTP defines them.
  std::string& value = request_.headers[lowerCase(line.substr(0, colon))];
  const std::string more = trimmed(line.substr(colon + 1));
  value = value.empty() ? more : value + ", " + more;
  return true;
}

// The blank line after the headers: decides how the body is framed, or refuses the request.
bool HttpRequestParser::headersRead(Outcome& outcome) {
  consume(lineStart_);
  const std::string connection = lowerCase(request_.header("connection"));
  keepAlive_ = version_ == "HTTP/1.1" ? connection.find("close") == std::string::npos
                                      : connection.find("keep-alive") != std::string::npos;
  const std::string encoding = lowerCase(request_.header("content-encoding"));
  if (!encoding.empty() && encoding != "identity") {
    refuse(outcome, 415, "Compressed request bodies are not accepted.");
    return false;
  }
  const std::string transfer = lowerCase(request_.header("transfer-encoding"));
  const std::string length = request_.header("content-length");
  if (!transfer.empty()) {
    if (transfer != "chunked" || !length.empty()) {
      refuse(outcome, 400, "Unsupported transfer encoding.");
      return false;
    }
    phase_ = Phase::ChunkSize;
  } else {
    if (!length.empty()) {
      if (length.size() > 18 || length.find_first_not_of("0123456789") != std::string::npos) {
        refuse(outcome, 400, "Bad Content-Length.");
        return false;
      }
      contentLength_ = std::stoull(length);
      if (contentLength_ > limits_.maxBodyBytes) {
        refuse(outcome, 413, "The request is larger than this server accepts.");
        return false;
      }
    }
    phase_ = Phase::Body;
  }
  outcome.continueFirst = lowerCase(request_.header("expect")) == "100-continue";
  return true;
}

HttpRequestParser::Outcome HttpRequestParser::feed(std::string_view bytes) {
  Outcome outcome;
  if (phase_ == Phase::Refused) {
    outcome.kind = Outcome::Kind::Refusal;
    outcome.status = refusedStatus_;
    outcome.why = refusedWhy_;
    return outcome;
  }
  buffer_.append(bytes);
  std::string line;
  for (;;) {
    switch (phase_) {
      case Phase::Headers:
        switch (nextLine(limits_.maxHeaderLine, limits_.maxHeaderBytes, line)) {
          case Line::Partial:
            return outcome;
          case Line::NotAMethod:
            return refuse(outcome, 400, "Not an HTTP request: this server speaks plain HTTP.");
          case Line::TooLong:
            return refuse(outcome, 431, "A header line is too long.");
          case Line::HeadersTooLarge:
            return refuse(outcome, 431, "The request's headers are too large.");
          case Line::Complete:
            if (line.empty() && !version_.empty()) {
              if (!headersRead(outcome)) return outcome;
            } else if (!readHeaderLine(line, outcome)) {
              return outcome;
            }
            break;
        }
        break;
      case Phase::Body: {
        const size_t take = std::min(contentLength_ - request_.body.size(), buffer_.size());
        if (!makeRoomForBody(request_.body.size() + take, contentLength_)) return busy(outcome);
        request_.body.append(buffer_, 0, take);
        consume(take);
        if (request_.body.size() < contentLength_) return outcome;
        return complete(outcome);
      }
      case Phase::ChunkSize: {
        const Line found = nextLine(kMaxChunkSizeLine, SIZE_MAX, line);
        if (found == Line::Partial) return outcome;
        if (found != Line::Complete) return refuse(outcome, 400, "Bad chunk size.");
        consume(lineStart_);
        const std::string sizeText = line.substr(0, line.find_first_of(";\r"));
        if (sizeText.empty() || sizeText.size() > 15 ||
            sizeText.find_first_not_of("0123456789abcdefABCDEF") != std::string::npos)
          return refuse(outcome, 400, "Bad chunk size.");
        const size_t size = std::stoull(sizeText, nullptr, 16);
        if (size == 0) {
          phase_ = Phase::Trailers;
        } else if (request_.body.size() + size > limits_.maxBodyBytes) {
          return refuse(outcome, 413, "The request is larger than this server accepts.");
        } else {
          chunkLeft_ = size;
          phase_ = Phase::ChunkData;
        }
        break;
      }
      case Phase::ChunkData: {
        const size_t take = std::min(chunkLeft_, buffer_.size());
        if (!makeRoomForBody(request_.body.size() + take, limits_.maxBodyBytes)) return busy(outcome);
        request_.body.append(buffer_, 0, take);
        consume(take);
        chunkLeft_ -= take;
        if (chunkLeft_ > 0) return outcome;
        phase_ = Phase::ChunkEnd;
        break;
      }
      case Phase::ChunkEnd:
        if (buffer_.size() < 2) return outcome;
        if (buffer_.compare(0, 2, "\r\n") != 0) return refuse(outcome, 400, "Bad chunk.");
        consume(2);
        phase_ = Phase::ChunkSize;
        break;
      case Phase::Trailers: {
        const Line found = nextLine(limits_.maxHeaderLine, SIZE_MAX, line);
        if (found == Line::Partial) return outcome;
        if (found != Line::Complete) return refuse(outcome, 431, "A trailer is too long.");
        consume(lineStart_);
        if (line.empty()) return complete(outcome);  // the blank line after the trailers ends the request
        break;
      }
      case Phase::Refused:
        return outcome;
    }
  }
}

}  // namespace tessal::server
