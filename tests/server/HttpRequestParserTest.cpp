// Bytes in, a request or a refusal out, the same however the network splits the bytes.
#include "HttpRequestParser.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

using tessal::server::HttpRequestParser;
using Kind = HttpRequestParser::Outcome::Kind;

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

// Every outcome of one connection's bytes, delivered in pieces of `piece` bytes; small caps keep rows short.
std::string parse(const std::string& bytes, size_t piece) {
  HttpRequestParser parser(HttpRequestParser::Limits{16, 128, 40, 3});
  std::string seen;
  for (size_t at = 0; at < bytes.size(); at += piece) {
    HttpRequestParser::Outcome outcome = parser.feed(std::string_view(bytes).substr(at, piece));
    for (;; outcome = parser.feed({})) {
      if (outcome.continueFirst) seen += "continue | ";
      if (outcome.kind == Kind::NeedMore) break;
      seen += describe(outcome);
      if (outcome.kind == Kind::Refusal) {  // nothing after a refusal is read as a request
        EXPECT_EQ(parser.feed("GET / HTTP/1.1\r\n\r\n").status, outcome.status);
        return seen;
      }
      seen += " | ";
    }
  }
  return seen + "more";
}

TEST(HttpRequestParserTest, BytesGiveTheSameRequestOrRefusalHoweverTheyArrive) {
  const std::string post = "POST /s HTTP/1.1\r\n", chunked = post + "Transfer-Encoding: chunked\r\n\r\n";
  const std::string a37(37, 'a'), a38(38, 'a'), get = "GET / HTTP/1.1\r\n";
  const std::pair<std::string, std::string> rows[] = {
      {"GET /a?x=1 HTTP/1.1\r\n\r\n", "GET /a?x=1 [] keep | more"},
      {post + "X-A: 1 \r\nx-a:\t2\r\nContent-Length: 3\r\n\r\nabc",
       "POST /s [abc] keep {content-length=3;x-a=1, 2} | more"},
      {"GET / HTTP/1.0\r\n\r\n", "GET / [] close | more"},
      {"GET / HTTP/1.0\r\nConnection: Keep-Alive\r\n\r\n", "GET / [] keep {connection=Keep-Alive} | more"},
      {get + "Connection: close\r\n\r\n", "GET / [] close {connection=close} | more"},
      // Pipelined requests wait for their turn; an unfinished one waits for its bytes.
      {"GET /1 HTTP/1.1\r\n\r\nGET /2 HTTP/1.1\r\n\r\nGET /3", "GET /1 [] keep | GET /2 [] keep | more"},
      {post + "Content-Length: 4\r\n\r\nabc", "more"},
      {post + "Expect: 100-continue\r\nContent-Length: 1\r\n\r\nx",
       "continue | POST /s [x] keep {content-length=1;expect=100-continue} | more"},
      {post + "Content-Encoding: identity\r\n\r\n", "POST /s [] keep {content-encoding=identity} | more"},
      {chunked + "3;name=value\r\nabc\r\n2\r\nde\r\n0\r\nTrailer: x\r\n\r\n",
       "POST /s [abcde] keep {transfer-encoding=chunked} | more"},
      {get + "X: " + a37 + "\r\n\r\n",
       "GET / [] keep {x=" + a37 + "} | more"},  // CR right past the longest line
  };
  const std::pair<const char*, std::vector<std::string>> refusals[] = {
      {"400",
       {"GET /\r\n\r\n", "\r\n\r\n", " / HTTP/1.1\r\n\r\n", "GET  HTTP/1.1\r\n\r\n", "GET / HTTP/2\r\n\r\n",
        get + " X: 1\r\n\r\n", get + "NoColon\r\n\r\n", post + "Transfer-Encoding: gzip\r\n\r\n",
        post + "Transfer-Encoding: chunked\r\nContent-Length: 1\r\n\r\nx",
        post + "Content-Length: -1\r\n\r\n", post + "Content-Length: 1, 1\r\n\r\n",
        post + "Content-Length: 0000000000000000001\r\n\r\n", chunked + "g\r\n",
        chunked + "1;" + std::string(63, 'x') + "\r\n", chunked + "3\r\nabcXY"}},
      {"431",
       {get + "A: 1\r\nB: 2\r\nC: 3\r\nD: 4\r\n\r\n", get + "X: " + a38 + "\r\n\r\n",
        get + "A: " + a37.substr(1) + "\r\nB: " + a37.substr(1) + "\r\nC: " + a37.substr(1) + "\r\n\r\n",
        chunked + "0\r\nT: " + a38 + "\r\n"}},
      {"415", {post + "Content-Encoding: gzip\r\nContent-Length: 2\r\n\r\nxx"}},
      // Too large is known from the length, before any of the body is sent.
      {"413", {post + "Content-Length: 17\r\n\r\n", chunked + "10\r\n" + std::string(16, 'a') + "\r\n1\r\n"}},
  };
  std::vector<std::pair<std::string, std::string>> cases(std::begin(rows), std::end(rows));
  for (const auto& [status, inputs] : refusals)
    for (const std::string& bytes : inputs) cases.emplace_back(bytes, status);
  for (const auto& [bytes, expected] : cases) {
    EXPECT_EQ(parse(bytes, bytes.size()), expected) << bytes;
    EXPECT_EQ(parse(bytes, 1), expected) << "byte by byte: " << bytes;
  }
}

}  // namespace
