#include "DurationText.h"

#include "UserLocale.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <string>

namespace {

TEST(DurationText, MinutesAsHoursAndMinutes) {
  constexpr std::int32_t max = std::numeric_limits<std::int32_t>::max(), min = -max - 1;
  // Hours never roll into days; negative values keep their historical look: a "0" before each signed part.
  // clang-format off
  const std::pair<std::int32_t, const char*> cases[] = {
      {0, "00:00"}, {5, "00:05"}, {59, "00:59"}, {60, "01:00"}, {61, "01:01"}, {549, "09:09"}, {610, "10:10"},
      {6000, "100:00"}, {-5, "00:0-5"}, {-60, "0-1:00"}, {-90, "0-1:0-30"}, {-600, "0-10:00"},
      {max, "35791394:07"}, {min, "0-35791394:0-8"}};
  // clang-format on
  for (const auto& [minutes, text] : cases)
    EXPECT_EQ(DurationText::stringWithMinutes(minutes), text) << minutes;
}

// Scripts read leniently; typed text is whole numbers in the user's locale or refused (-1), never cut.
TEST(DurationText, DurationsAreReadLenientlyOrStrictlyInTheUsersLocale) {
  // "1:00:00" is days, hours, minutes; of more pieces the leftmost is ignored.
  // clang-format off
  const std::tuple<const char*, int, int, int> cases[] = {  // text, lenient, typed in English, in German
      {"45", 45, 45, 45}, {"1:30", 90, 90, 90}, {"2:0", 120, 120, 120}, {"0:90", 90, 90, 90},
      {"1:00:00", 1440, 1440, 1440}, {":15", 15, 15, 15}, {"1:", 60, 60, 60}, {" 1 : 30 ", 90, 90, 90},
      {"", 0, 0, 0}, {"1:2:3:4", 3064, -1, -1}, {"0:0:0:0:0:7", 7, -1, -1}, {"abc", 0, -1, -1},
      {"::", 0, 0, 0}, {"1:abc", 60, -1, -1}, {"5m", 0, -1, -1}, {"2.5", 2, -1, -1}, {"2,5", 0, -1, -1},
      {"1:2.5", 62, -1, -1}, {"-5", -5, -1, -1}, {"1:-30", 30, -1, -1}, {"+7", 7, -1, -1},
      {"1,000", 1000, 1000, -1}, {"1.000", 1, -1, 1000}, {"99999999999", 2147483647, -1, -1},
      // Hours or money meant, never minutes: no decimal sign, even before a nought fraction.
      {"2.00", 2, -1, -1}, {"2,00", 0, -1, -1}, {"1.250,00", 0, -1, -1}};
  // clang-format on
  for (const auto& [text, lenient, english, german] : cases) {
    QString refusals[2] = {"stale", "stale"};
    const UserLocale inEnglish("en_US");
    const int readLeniently = DurationText::minutesFromString(QString::fromUtf8(text));
    const int typedInEnglish = DurationText::minutesFromTypedText(text, &refusals[0]).value_or(-1);
    const UserLocale inGerman("de_DE");
    const int typedInGerman = DurationText::minutesFromTypedText(text, &refusals[1]).value_or(-1);
    EXPECT_EQ(std::tuple(readLeniently, typedInEnglish, typedInGerman, refusals[0].isEmpty(),
                         refusals[1].isEmpty()),
              std::tuple(lenient, english, german, english >= 0, german >= 0))
        << '"' << text << '"';
  }
  // The lenient reading takes the pieces in the user's locale too.
  const UserLocale german("de_DE");
  for (const auto& [text, minutes] :
       {std::pair{"2,5", 2}, {"1.000", 1000}, {"1:2,9", 62}, {"1.440:0", 1440 * 60}})
    EXPECT_EQ(DurationText::minutesFromString(QString::fromUtf8(text)), minutes) << text;
}

}  // namespace
