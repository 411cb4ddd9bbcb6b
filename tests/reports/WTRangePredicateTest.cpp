#include "ModelFixture.h"

#include "WTRangePredicate.h"

#include <QDateTime>
#include <QTimeZone>

namespace {

struct Wall {
  int year, month, day, hour = 0, minute = 0, second = 0;
};

// An instant given as local wall-clock time in `zone`.
Date local(const char* zone, const Wall& w) {
  const QDateTime at(QDate(w.year, w.month, w.day), QTime(w.hour, w.minute, w.second), QTimeZone(zone));
  return Date::fromSeconds(double(at.toSecsSinceEpoch()));
}

class RangePredicateTest : public ModelTest {
 protected:
  WTTime* entryAt(Date start) { return makeTime(task, start, start.addingSeconds(600)); }

  // Which of the eight preset tags accept `item`, as a string of 0/1 in tag order.
  static std::string presets(const WTItem* item) {
    std::string result;
    for (int tag = WTRangePredicate::Today; tag <= WTRangePredicate::LastYear; ++tag) {
      const WTItemPredicate predicate = WTRangePredicate::predicateForTag(tag);
      result += predicate && predicate(item) ? '1' : '0';
    }
    return result;
  }

  void SetUp() override {
    ModelTest::SetUp();
    task = makeTask();
  }

  WTTask* task = nullptr;
};

}  // namespace

// Which presets take an entry: each range includes both of its bounds, so a week's first instant lies
// in both weeks; weeks begin on Sunday, here the night clocks went forward in Berlin; and the same
// instant may be 2024 in New York but 2025 in Berlin.
TEST_F(RangePredicateTest, PresetsAcrossDaylightChangesAndYearEnds) {
  const struct {
    const char* zone;
    Wall now, entry;
    const char* presets;  // today, yesterday, this/last week, this/last month, this/last year
  } cases[] = {
      // Tuesday 2 April 2024; the week began on Sunday 31 March.
      {"Europe/Berlin", {2024, 4, 2, 12}, {2024, 4, 2}, "11101010"},
      {"Europe/Berlin", {2024, 4, 2, 12}, {2024, 4, 1, 23, 59}, "01101010"},
      {"Europe/Berlin", {2024, 4, 2, 12}, {2024, 3, 31}, "00110110"},
      {"Europe/Berlin", {2024, 4, 2, 12}, {2024, 3, 31, 3, 30}, "00100110"},
      {"Europe/Berlin", {2024, 4, 2, 12}, {2024, 3, 30, 23, 59, 59}, "00010110"},
      {"Europe/Berlin", {2024, 4, 2, 12}, {2024, 3, 24}, "00010110"},
      {"Europe/Berlin", {2024, 4, 2, 12}, {2024, 3, 23, 23, 59}, "00000110"},
      {"Europe/Berlin", {2024, 4, 2, 12}, {2024, 4, 7}, "00101010"},
      {"Europe/Berlin", {2024, 4, 2, 12}, {2023, 12, 31, 23}, "00000001"},
      // New Year's morning 2025.
      {"America/New_York", {2025, 1, 1, 10}, {2024, 12, 31, 23, 30}, "01100101"},
      {"America/New_York", {2025, 1, 1, 10}, {2025, 1, 1}, "11101111"},
      {"America/New_York", {2025, 1, 1, 10}, {2024, 12, 29}, "00110101"},
      {"America/New_York", {2025, 1, 1, 10}, {2024, 12, 28, 12}, "00010101"},
      {"America/New_York", {2025, 1, 1, 10}, {2024, 12, 31, 20}, "01100101"},
  };
  for (const auto& c : cases) {
    ASSERT_TRUE(RZDate::setDefaultTimeZone(QString::fromLatin1(c.zone)));
    setNow(local(c.zone, c.now));
    EXPECT_EQ(presets(entryAt(local(c.zone, c.entry))), c.presets)
        << c.zone << " " << c.entry.month << "/" << c.entry.day;
  }
}

// A custom range covers its end day whole; "any date" takes items without a date too.
TEST_F(RangePredicateTest, CustomRangesAndAnyDate) {
  setNow(berlin(2024, 4, 2, 12));
  const Date march3 = berlin(2024, 3, 3, 15, 20);
  const WTItemPredicate custom = WTRangePredicate::predicateForTag(WTRangePredicate::Custom, march3, march3);
  ASSERT_TRUE(custom);
  // clang-format off
  for (const auto& [entry, taken] : {std::pair{berlin(2024, 3, 3), true},
                                     {berlin(2024, 3, 3, 23, 59, 59), true},
                                     {berlin(2024, 3, 4), true}, {berlin(2024, 3, 2, 23, 59, 59), false},
                                     {berlin(2024, 3, 4, 0, 0, 1), false}})
    // clang-format on
    EXPECT_EQ(custom(entryAt(entry)), taken) << entry.secondsSince1970();
  // Missing custom dates and unknown tags give no predicate at all.
  EXPECT_FALSE(WTRangePredicate::predicateForTag(WTRangePredicate::Custom, march3, std::nullopt));
  EXPECT_FALSE(WTRangePredicate::predicateForTag(WTRangePredicate::Custom));
  EXPECT_FALSE(WTRangePredicate::predicateForTag(8));
  EXPECT_FALSE(WTRangePredicate::predicateForTag(-1));

  WTTime* undated = makeItem<WTTime>(task, berlin(2024, 4, 2, 9));
  undated->setStartDate(std::nullopt);
  const WTItemPredicate any = WTRangePredicate::predicateForTag(WTRangePredicate::AnyDate);
  ASSERT_TRUE(any);
  EXPECT_TRUE(any(undated));
  EXPECT_TRUE(any(entryAt(berlin(1999, 1, 1))));
  EXPECT_EQ(presets(undated), "00000000");
}

TEST_F(RangePredicateTest, CommandLineWords) {
  setNow(berlin(2024, 4, 2, 12));
  const WTItem* monday = entryAt(berlin(2024, 4, 1, 9));
  const WTItem* lastYear = entryAt(berlin(2023, 6, 1, 9));
  const struct {
    const char* word;
    bool monday;
    bool lastYear;
  } cases[] = {// clang-format off
      {"today", false, false}, {"yesterday", true, false}, {"this-week", true, false},
      {"last-week", false, false}, {"this-month", true, false}, {"last-month", false, false},
      {"this-year", true, false}, {"last-year", false, true}, {"any", true, true},
      {"2024-04-01..2024-04-01", true, false}, {"2023-01-01..2024-03-31", false, true}};
  // clang-format on
  for (const auto& c : cases) {
    const Result<WTItemPredicate> predicate =
        WTRangePredicate::predicateForRangeWord(QString::fromUtf8(c.word));
    ASSERT_TRUE(predicate.ok()) << c.word;
    EXPECT_EQ(predicate.value()(monday), c.monday) << c.word;
    EXPECT_EQ(predicate.value()(lastYear), c.lastYear) << c.word;
  }
  for (const char* bad : {"", "week", "2024-04-01", "2024-02-30..2024-03-01", "2024-04-02..2024-04-01",
                          "2024-4-1..2024-4-2", "today.."}) {
    const Result<WTItemPredicate> predicate = WTRangePredicate::predicateForRangeWord(QString::fromUtf8(bad));
    EXPECT_FALSE(predicate.ok()) << bad;
    EXPECT_FALSE(predicate.error().message.isEmpty()) << bad;
  }
}
