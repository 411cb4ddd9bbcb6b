// libFuzzer target over the sync server's request parsing, delivered in pieces (see README.md).
#include "FuzzCheck.h"
#include "HttpRequestParser.h"

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace {

using tessal::server::HttpRequestParser;
using Kind = HttpRequestParser::Outcome::Kind;

// Small caps, so that short inputs reach every one of them; the line cap comes from the input, so the
// fuzzer can move it onto a line's end.
HttpRequestParser::Limits kLimits{64, 256, 48, 6};

void note(std::string& seen, const HttpRequestParser::Outcome& outcome) {
  if (outcome.continueFirst) seen += "continue\n";
  if (outcome.kind == Kind::Refusal) {
    const int status = outcome.status;
    check(status == 400 || status == 413 || status == 415 || status == 431);
    check(!outcome.why.empty());
    seen += std::to_string(status) + " " + outcome.why + "\n";
    return;
  }
  if (outcome.kind != Kind::Request) return;
  const auto& request = outcome.request;
  check(request.body.size() <= kLimits.maxBodyBytes);
  check(request.headers.size() <= kLimits.maxHeaderCount);
  check(!request.method.empty());
  seen +=
      request.method + " " + request.path + "?" + request.query + (outcome.keepAlive ? " keep" : " close");
  for (const auto& [name, value] : request.headers) seen += "\n" + name + ": " + value;
  seen += "\n" + std::to_string(request.body.size()) + ":" + request.body + "\n";
}

// Every outcome of the bytes delivered in pieces of `piece` bytes.
std::string parse(std::string_view bytes, size_t piece) {
  HttpRequestParser parser(kLimits);
  std::string seen;
  for (size_t at = 0; at < bytes.size(); at += piece) {
    HttpRequestParser::Outcome outcome = parser.feed(bytes.substr(at, piece));
    for (;;) {
      note(seen, outcome);
      if (outcome.kind == Kind::Refusal) return seen;
      if (outcome.kind == Kind::NeedMore) break;
      outcome = parser.feed({});
    }
  }
  return seen + "more\n";
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 2) return 0;
  kLimits.maxHeaderLine = 8 + data[1] % 64;
  const std::string_view bytes(reinterpret_cast<const char*>(data) + 2, size - 2);
  const std::string whole = parse(bytes, bytes.size() + 1);
  // Byte by byte meets every boundary a check could wrongly see; larger pieces, the reads in between.
  check(parse(bytes, 1) == whole);
  if (data[0] > 1) check(parse(bytes, data[0]) == whole);
  return 0;
}
