// libFuzzer target: feeds arbitrary bytes to the sync client's reply parsing, the way a server's answer
// reaches it: JSON into values, values into a protocol reply. Checks that nothing crashes, hangs or trips
// a sanitizer, and that whatever parses writes back to text that parses to the same value.
//
// Build and run from /work/main (clang 14 from Debian; the tests are left out of this configuration):
//   cmake -S . -B build-sync-fuzz -G Ninja -DCMAKE_BUILD_TYPE=Debug -DCMAKE_CXX_COMPILER=clang++-14 \
//         -DTESSAL_BUILD_FUZZERS=ON -DTESSAL_BUILD_TESTS=OFF
//   ninja -C build-sync-fuzz sync_reply_fuzzer
//   mkdir -p /tmp/sync-corpus
//   build-sync-fuzz/Sources/sync/sync_reply_fuzzer -max_total_time=600 -timeout=10 -rss_limit_mb=2048 \
//     -dict=tests/fuzz/sync.dict /tmp/sync-corpus tests/fuzz/sync-corpus
#include "RZSyncJSON.h"
#include "RZSyncReply.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const QByteArrayView text(reinterpret_cast<const char*>(data), qsizetype(size));
  const std::optional<QVariant> value = RZSyncJSON::parse(text);
  if (!value) return 0;
  const Result<RZSyncReply> reply = RZSyncReply::fromJSON(*value);
  if (reply) {
    // A reply that was taken holds what the manager relies on.
    const RZSyncReply& taken = reply.value();
    if (!taken.error && (!taken.iteration || *taken.iteration < 0)) std::abort();
  }
  const QByteArray written = RZSyncJSON::write(*value, RZSyncJSON::Style::Compact);
  const std::optional<QVariant> again = RZSyncJSON::parse(written);
  if (!again || !RZSyncJSON::sameValue(*value, *again)) std::abort();
  return 0;
}
