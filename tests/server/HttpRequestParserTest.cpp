// Bytes in, a request or a refusal out, the same however the network splits the bytes.
#include "HttpRequestParser.h"

#include <gtest/gtest.h>

#include <string>

namespace {

using tessal::server::HttpRequestParser;
using Kind = HttpRequestParser::Outcome::Kind;

// Small caps keep the rows short.
constexpr HttpRequestParser::Limits kLimits{16, 128, 40, 3};

std::string describe(const HttpRequestParser::Outcome& outcome) {
  if (outcome.kind == Kind::Refusal) return std::to_string(outcome.status);
  const auto& request = outcome.request;
  std::string text = request.method + " " + request.path +
                     (request.query.empty() ? "" : "?" + request.query) + " [" + request.body + "] " +
                     (outcome.keepAlive ? "keep" : "close");
  std::string headers;
  for (const auto& [name, value] : request.headers)
    headers += (headers.empty() ? "" : ";") + name + "=" + value;
  return headers.empty() ? text : text + " {" + headers + "}";
}

// Every outcome of one connection's bytes, delivered in pieces of `piece` bytes (0: all at once).
std::string parse(const std::string& bytes, size_t piece) {
  HttpRequestParser parser(kLimits);
  std::string seen;
  auto note = [&](const std::string& what) { seen += (seen.empty() ? "" : " | ") + what; };
  for (size_t at = 0; at < bytes.size();) {
    const size_t size = piece == 0 ? bytes.size() : std::min(piece, bytes.size() - at);
    HttpRequestParser::Outcome outcome = parser.feed(std::string_view(bytes).substr(at, size));
    at += size;
    for (;;) {
      if (outcome.continueFirst) note("continue");
      if (outcome.kind == Kind::NeedMore) break;
      note(describe(outcome));
      if (outcome.kind == Kind::Refusal) {
        // Nothing after a refusal is read as a request.
        EXPECT_EQ(parser.feed("GET / HTTP/1.1\r\n\r\n").status, outcome.status);
        return seen;
      }
      outcome = parser.feed({});
    }
  }
  note("more");
  return seen;
}

TEST(HttpRequestParserTest, BytesGiveTheSameRequestOrRefusalHoweverTheyArrive) {
  const std::string post = "POST /s HTTP/1.1\r\n";
  const std::string chunked = post + "Transfer-Encoding: chunked\r\n\r\n";
  const struct {
    std::string bytes;
    std::string expected;
  } rows[] = {
      {"GET /a?x=1 HTTP/1.1\r\n\r\n", "GET /a?x=1 [] keep | more"},
      {post + "X-A: 1 \r\nx-a:\t2\r\nContent-Length: 3\r\n\r\nabc",
       "POST /s [abc] keep {content-length=3;x-a=1, 2} | more"},
      {"GET / HTTP/1.0\r\n\r\n", "GET / [] close | more"},
      {"GET / HTTP/1.0\r\nConnection: Keep-Alive\r\n\r\n", "GET / [] keep {connection=Keep-Alive} | more"},
      {"GET / HTTP/1.1\r\nConnection: close\r\n\r\n", "GET / [] close {connection=close} | more"},
      // Pipelined requests wait for their turn; an unfinished one waits for its bytes.
      {"GET /1 HTTP/1.1\r\n\r\nGET /2 HTTP/1.1\r\n\r\nGET /3", "GET /1 [] keep | GET /2 [] keep | more"},
      {post + "Content-Length: 4\r\n\r\nabc", "more"},
      {post + "Expect: 100-continue\r\nContent-Length: 1\r\n\r\nx",
       "continue | POST /s [x] keep {content-length=1;expect=100-continue} | more"},
      {post + "Content-Encoding: identity\r\n\r\n", "POST /s [] keep {content-encoding=identity} | more"},
      {chunked + "3;name=value\r\nabc\r\n2\r\nde\r\n0\r\nTrailer: x\r\n\r\n",
       "POST /s [abcde] keep {transfer-encoding=chunked} | more"},
      // A line of exactly the longest length, whose CR falls right past it.
      {"GET / HTTP/1.1\r\nX: " + std::string(37, 'a') + "\r\n\r\n",
       "GET / [] keep {x=" + std::string(37, 'a') + "} | more"},

      {"GET /\r\n\r\n", "400"},
      {"\r\n\r\n", "400"},
      {" / HTTP/1.1\r\n\r\n", "400"},
      {"GET  HTTP/1.1\r\n\r\n", "400"},
      {"GET / HTTP/2\r\n\r\n", "400"},
      {"GET / HTTP/1.1\r\n X: 1\r\n\r\n", "400"},
      {"GET / HTTP/1.1\r\nNoColon\r\n\r\n", "400"},
      {"GET / HTTP/1.1\r\nA: 1\r\nB: 2\r\nC: 3\r\nD: 4\r\n\r\n", "431"},
      {"GET / HTTP/1.1\r\nX: " + std::string(38, 'a') + "\r\n\r\n", "431"},
      {"GET / HTTP/1.1\r\nA: " + std::string(36, 'a') + "\r\nB: " + std::string(36, 'b') +
           "\r\nC: " + std::string(36, 'c') + "\r\n\r\n",
       "431"},
      {post + "Content-Encoding: gzip\r\nContent-Length: 2\r\n\r\nxx", "415"},
      {post + "Transfer-Encoding: gzip\r\n\r\n", "400"},
      {post + "Transfer-Encoding: chunked\r\nContent-Length: 1\r\n\r\nx", "400"},
      {post + "Content-Length: -1\r\n\r\n", "400"},
      {post + "Content-Length: 1, 1\r\n\r\n", "400"},
      {post + "Content-Length: 0000000000000000001\r\n\r\n", "400"},
      // Too large is known from the length, before any of the body is sent.
      {post + "Content-Length: 17\r\n\r\n", "413"},
      {chunked + "10\r\n" + std::string(16, 'a') + "\r\n1\r\n", "413"},
      {chunked + "g\r\n", "400"},
      {chunked + "1;" + std::string(63, 'x') + "\r\n", "400"},
      {chunked + "3\r\nabcXY", "400"},
      {chunked + "0\r\nT: " + std::string(38, 't') + "\r\n", "431"},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(parse(row.bytes, 0), row.expected) << row.bytes;
    EXPECT_EQ(parse(row.bytes, 1), row.expected) << "byte by byte: " << row.bytes;
  }
}

}  // namespace
