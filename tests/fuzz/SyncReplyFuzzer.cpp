// libFuzzer target over the sync client's reply parsing, checking a round trip (see README.md).
#include "FuzzCheck.h"
#include "RZSyncJSON.h"
#include "RZSyncReply.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const QByteArrayView text(reinterpret_cast<const char*>(data), qsizetype(size));
  const std::optional<QVariant> value = RZSyncJSON::parse(text);
  if (!value) return 0;
  // A reply that was taken holds what the manager relies on.
  if (const Result<RZSyncReply> reply = RZSyncReply::fromJSON(*value))
    check(reply.value().error || (reply.value().iteration && *reply.value().iteration >= 0));
  const std::optional<QVariant> again =
      RZSyncJSON::parse(RZSyncJSON::write(*value, RZSyncJSON::Style::Compact));
  check(again && RZSyncJSON::sameValue(*value, *again));
  return 0;
}
