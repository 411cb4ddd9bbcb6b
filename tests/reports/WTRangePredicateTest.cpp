#include "ModelFixture.h"

#include "WTRangePredicate.h"

#include <QDateTime>
#include <QTimeZone>

namespace {

// An instant given as local wall-clock time in `zone`.
Date local(const char* zone, int year, int month, int day, int hour = 0, int minute = 0, int second = 0) {
  const QDateTime at(QDate(year, month, day), QTime(hour, minute, second), QTimeZone(zone));
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

// Now is Tuesday 2 April 2024 in Berlin; the week began on Sunday 31 March, the night clocks went forward.
TEST_F(RangePredicateTest, PresetsAcrossTheSpringDaylightChange) {
  setNow(local("Europe/Berlin", 2024, 4, 2, 12));
  //                                                      today yday thisW lastW thisM lastM thisY lastY
  // Today's first instant is also yesterday's end bound.
  EXPECT_EQ(presets(entryAt(local("Europe/Berlin", 2024, 4, 2, 0))), "11101010");
  EXPECT_EQ(presets(entryAt(local("Europe/Berlin", 2024, 4, 1, 23, 59))), "01101010");
  // The week's first instant lies in both weeks: each range includes both of its bounds.
  EXPECT_EQ(presets(entryAt(local("Europe/Berlin", 2024, 3, 31, 0))), "00110110");
  EXPECT_EQ(presets(entryAt(local("Europe/Berlin", 2024, 3, 31, 3, 30))), "00100110");
  EXPECT_EQ(presets(entryAt(local("Europe/Berlin", 2024, 3, 30, 23, 59, 59))), "00010110");
  EXPECT_EQ(presets(entryAt(local("Europe/Berlin", 2024, 3, 24, 0))), "00010110");
  EXPECT_EQ(presets(entryAt(local("Europe/Berlin", 2024, 3, 23, 23, 59))), "00000110");
  // The end of this week is included as its bound.
  EXPECT_EQ(presets(entryAt(local("Europe/Berlin", 2024, 4, 7, 0))), "00101010");
  EXPECT_EQ(presets(entryAt(local("Europe/Berlin", 2023, 12, 31, 23))), "00000001");
}

// Now is New Year's morning 2025 in New York.
TEST_F(RangePredicateTest, PresetsAcrossTheYearEndInAnotherZone) {
  ASSERT_TRUE(RZDate::setDefaultTimeZone(QStringLiteral("America/New_York")));
  setNow(local("America/New_York", 2025, 1, 1, 10));
  //                                                         today yday thisW lastW thisM lastM thisY lastY
  EXPECT_EQ(presets(entryAt(local("America/New_York", 2024, 12, 31, 23, 30))), "01100101");
  EXPECT_EQ(presets(entryAt(local("America/New_York", 2025, 1, 1, 0))), "11101111");
  EXPECT_EQ(presets(entryAt(local("America/New_York", 2024, 12, 29, 0))), "00110101");
  EXPECT_EQ(presets(entryAt(local("America/New_York", 2024, 12, 28, 12))), "00010101");
  // The same instant is still 2024 in New York but already 2025 in Berlin.
  EXPECT_EQ(presets(entryAt(local("America/New_York", 2024, 12, 31, 20))), "01100101");
}

TEST_F(RangePredicateTest, CustomRangeCoversItsEndDayWhole) {
  setNow(local("Europe/Berlin", 2024, 4, 2, 12));
  const Date march3 = local("Europe/Berlin", 2024, 3, 3, 15, 20);
  const WTItemPredicate predicate =
      WTRangePredicate::predicateForTag(WTRangePredicate::Custom, march3, march3);
  ASSERT_TRUE(predicate);
  EXPECT_TRUE(predicate(entryAt(local("Europe/Berlin", 2024, 3, 3, 0))));
  EXPECT_TRUE(predicate(entryAt(local("Europe/Berlin", 2024, 3, 3, 23, 59, 59))));
  EXPECT_TRUE(predicate(entryAt(local("Europe/Berlin", 2024, 3, 4, 0))));  // the bound, included
  EXPECT_FALSE(predicate(entryAt(local("Europe/Berlin", 2024, 3, 2, 23, 59, 59))));
  EXPECT_FALSE(predicate(entryAt(local("Europe/Berlin", 2024, 3, 4, 0, 0, 1))));
  // Missing custom dates and unknown tags give no predicate at all.
  EXPECT_FALSE(WTRangePredicate::predicateForTag(WTRangePredicate::Custom, march3, std::nullopt));
  EXPECT_FALSE(WTRangePredicate::predicateForTag(WTRangePredicate::Custom));
  EXPECT_FALSE(WTRangePredicate::predicateForTag(8));
  EXPECT_FALSE(WTRangePredicate::predicateForTag(-1));
}

TEST_F(RangePredicateTest, AnyDateMatchesItemsWithoutDates) {
  setNow(local("Europe/Berlin", 2024, 4, 2, 12));
  WTTime* undated = makeItem<WTTime>(task, local("Europe/Berlin", 2024, 4, 2, 9));
  undated->setStartDate(std::nullopt);
  ASSERT_FALSE(undated->startDate());
  const WTItemPredicate any = WTRangePredicate::predicateForTag(WTRangePredicate::AnyDate);
  ASSERT_TRUE(any);
  EXPECT_TRUE(any(undated));
  EXPECT_TRUE(any(entryAt(local("Europe/Berlin", 1999, 1, 1))));
  EXPECT_EQ(presets(undated), "00000000");
}

TEST_F(RangePredicateTest, CommandLineWords) {
  setNow(local("Europe/Berlin", 2024, 4, 2, 12));
  const WTItem* monday = entryAt(local("Europe/Berlin", 2024, 4, 1, 9));
  const WTItem* lastYear = entryAt(local("Europe/Berlin", 2023, 6, 1, 9));
  const struct {
    const char* word;
    bool monday;
    bool lastYear;
  } cases[] = {{"today", false, false},
               {"yesterday", true, false},
               {"this-week", true, false},
               {"last-week", false, false},
               {"this-month", true, false},
               {"last-month", false, false},
               {"this-year", true, false},
               {"last-year", false, true},
               {"any", true, true},
               {"2024-04-01..2024-04-01", true, false},
               {"2023-01-01..2024-03-31", false, true}};
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
