// libFuzzer target over the sync client's reply parsing, checking a round trip (see README.md).
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
