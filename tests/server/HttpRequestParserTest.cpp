// Bytes in, a request or a refusal out, the same however the network splits the bytes.
#include "HttpRequestParser.h"

#include <gtest/gtest.h>

#include <fstream>
#include <string>

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

// Each line of tests/data/http-requests.txt: the bytes, escaped, then the outcomes.
TEST(HttpRequestParserTest, BytesGiveTheSameRequestOrRefusalHoweverTheyArrive) {
  std::ifstream file(TESSAL_TEST_DATA_DIR "/http-requests.txt");
  int rows = 0;
  for (std::string line; std::getline(file, line);) {
    if (line.empty() || line[0] == '#') continue;
    std::string bytes;
    const size_t tab = line.find('\t');
    for (size_t at = 0; at < tab; ++at) {
      const char c = line[at] == '\\' ? line[++at] : '\0';
      bytes += c == 'r' ? '\r' : c == 'n' ? '\n' : c == 't' ? '\t' : c ? c : line[at];
    }
    EXPECT_EQ(parse(bytes, bytes.size()), line.substr(tab + 1)) << line;
    EXPECT_EQ(parse(bytes, 1), line.substr(tab + 1)) << "byte by byte: " << line;
    ++rows;
  }
  EXPECT_EQ(rows, 35);
}

// Bodies draw on a budget shared by every connection as their bytes arrive (a claimed length costs
// nothing), past it a request is refused 503, and an answered request leaves no buffer behind.
TEST(HttpRequestParserTest, BodiesDrawOnOneBudgetAndKeepNothingAfterwards) {
  tessal::server::ByteBudget budget(1 << 20);
  HttpRequestParser::Limits limits;
  limits.bodies = &budget;
  HttpRequestParser first(limits), second(limits);
  const std::string head = "POST /s HTTP/1.1\r\nContent-Length: 700000\r\n\r\n";
  // Body bytes in pieces as a socket gives them, then `after`; the last outcome.
  auto feed = [](HttpRequestParser& parser, size_t bytes, const std::string& after = {}) {
    HttpRequestParser::Outcome outcome;
    for (size_t at = 0; at < bytes && outcome.kind == Kind::NeedMore; at += 16384)
      outcome = parser.feed(std::string(std::min<size_t>(16384, bytes - at), 'x'));
    return outcome.kind == Kind::NeedMore && !after.empty() ? parser.feed(after) : std::move(outcome);
  };
  EXPECT_EQ(first.feed(head).kind, Kind::NeedMore);
  EXPECT_EQ(second.feed(head).kind, Kind::NeedMore);
  EXPECT_EQ(budget.used(), 0u);
  EXPECT_EQ(feed(first, 600000).kind, Kind::NeedMore);
  EXPECT_EQ(describe(feed(second, 600000)), "503");
  HttpRequestParser::Outcome done = feed(first, 100000, "GET /next HTTP/1.1\r\n");
  ASSERT_EQ(done.kind, Kind::Request);
  EXPECT_EQ(done.request.body.size(), 700000u);
  EXPECT_EQ(budget.used(), done.body.bytes());
  EXPECT_LT(first.heldBytes(), 8192u) << "only the next request's first bytes are kept";
  done = {};
  EXPECT_EQ(budget.used(), 0u);
}

}  // namespace
