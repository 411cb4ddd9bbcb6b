// libFuzzer target over typed durations (see README.md): what the strict reading takes is written as the
// lists write it, and that text reads back, strictly and leniently, as the same number of minutes.
#include "DurationText.h"
#include "FuzzCheck.h"
#include "LocaleFuzzInput.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 1) return 0;
  UErrorCode status = U_ZERO_ERROR;
  icu::Locale::setDefault(localefuzz::locale(data[0]), status);
  const QString typed = localefuzz::text(data + 1, size - 1);
  DurationText::minutesFromString(typed);
  QString refusal;
  const std::optional<int> minutes = DurationText::minutesFromTypedText(typed, &refusal);
  check(minutes.has_value() == refusal.isEmpty());
  if (!minutes) return 0;
  check(*minutes >= 0);
  const QString shown = DurationText::stringWithMinutes(*minutes);
  check(DurationText::minutesFromTypedText(shown) == minutes);
  check(DurationText::minutesFromString(shown) == *minutes);
  return 0;
}
