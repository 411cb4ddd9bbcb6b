#include "DurationText.h"

#include "UserLocale.h"

#include <gtest/gtest.h>

#include <QLocale>

#include <cstdint>
#include <limits>
#include <string>

namespace {

struct Formatted {
  std::int32_t value;
  const char* text;
};

TEST(DurationText, MinutesAsHoursAndMinutes) {
  const Formatted cases[] = {
      {0, "00:00"},
      {5, "00:05"},
      {9, "00:09"},
      {10, "00:10"},
      {59, "00:59"},
      {60, "01:00"},
      {61, "01:01"},
      {90, "01:30"},
      {549, "09:09"},
      {600, "10:00"},
      {610, "10:10"},
      {6000, "100:00"},  // hours never roll into days
      // Negative values keep their historical look: a "0" in front of each signed part.
      {-5, "00:0-5"},
      {-60, "0-1:00"},
      {-90, "0-1:0-30"},
      {-600, "0-10:00"},
      {std::numeric_limits<std::int32_t>::max(), "35791394:07"},
      {std::numeric_limits<std::int32_t>::min(), "0-35791394:0-8"},
  };
  for (const Formatted& c : cases) EXPECT_EQ(DurationText::stringWithMinutes(c.value), c.text) << c.value;
}

struct Parsed {
  const char* text;
  int minutes;
};

TEST(DurationText, ParsesTypedDurationsLeniently) {
  const Parsed cases[] = {
      {"45", 45},
      {"1:30", 90},
      {"2:0", 120},
      {"0:90", 90},
      {"1:00:00", 1440},  // days, hours, minutes
      {":15", 15},
      {"1:2:3:4", 3064},  // the leftmost piece is ignored
      {"0:0:0:0:0:7", 7},
      {"abc", 0},
      {"", 0},
      {"::", 0},
      {"1:abc", 60},
      {"5m", 0},
      {" 1 : 30 ", 90},
      {"2.5", 2},
      {"1:2.5", 62},
      {"-5", -5},
      {"1:-30", 30},
      {"+7", 7},
      {"99999999999", std::numeric_limits<int>::max()},
  };
  for (const Parsed& c : cases)
    EXPECT_EQ(DurationText::minutesFromString(QString::fromUtf8(c.text)), c.minutes) << c.text;
  EXPECT_EQ(DurationText::stringWithMinutes(DurationText::minutesFromString("0:90")), "01:30");
}

TEST(DurationText, PiecesAreReadInTheUsersLocale) {
  const QLocale previous;
  QLocale::setDefault(QLocale(QLocale::German, QLocale::Germany));
  const Parsed cases[] = {{"2,5", 2}, {"1.000", 1000}, {"2.5", 2}, {"1:2,9", 62}, {"1.440:0", 1440 * 60}};
  for (const Parsed& c : cases)
    EXPECT_EQ(DurationText::minutesFromString(QString::fromUtf8(c.text)), c.minutes) << c.text;
  QLocale::setDefault(previous);
}

// What a person types is never read as another length: anything but whole numbers in the user's locale
// is refused (-1 here) rather than cut, dropped or read in another locale.
TEST(DurationText, TypedDurationsAreReadStrictlyInTheUsersLocale) {
  const struct {
    const char* text;
    int inEnglish;
    int inGerman;
  } cases[] = {
      {"45", 45, 45},     {"1:30", 90, 90},    {" 1 : 30 ", 90, 90},    {":15", 15, 15},
      {"1:", 60, 60},     {"0:90", 90, 90},    {"1:00:00", 1440, 1440}, {"", 0, 0},
      {"1,000", 1000, 1}, {"1.000", 1, 1000},  {"2.5", -1, -1},         {"2,5", -1, -1},
      {"1:2.5", -1, -1},  {"1:2:3:4", -1, -1}, {"abc", -1, -1},         {"1:abc", -1, -1},
      {"5m", -1, -1},     {"-5", -1, -1},      {"1:-30", -1, -1},       {"99999999999", -1, -1},
  };
  for (const char* name : {"en_US", "de_DE"}) {
    const UserLocale user(name);
    const bool german = name == std::string("de_DE");
    for (const auto& c : cases) {
      QString refusal = QStringLiteral("stale");
      const std::optional<int> minutes =
          DurationText::minutesFromTypedText(QString::fromUtf8(c.text), &refusal);
      const int expected = german ? c.inGerman : c.inEnglish;
      EXPECT_EQ(minutes.value_or(-1), expected) << name << " \"" << c.text << '"';
      EXPECT_EQ(refusal.isEmpty(), expected >= 0) << name << " \"" << c.text << '"';
    }
  }
}

}  // namespace
