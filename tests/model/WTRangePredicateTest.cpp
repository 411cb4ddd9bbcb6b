#include "ModelFixture.h"

#include "WTRangePredicate.h"

namespace {

class RangePredicateTest : public ModelTest {
 protected:
  WTTime* entryAt(Date start) { return makeTime(task, start, start.addingSeconds(600)); }

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
    setNow(berlin(2024, 4, 2, 12));  // a Tuesday
    task = makeTask();
  }
  WTTask* task = nullptr;
};

}  // namespace

// Ranges include both bounds; weeks begin on Sunday: Tuesday 2 April 2024's week began on 31 March.
TEST_F(RangePredicateTest, PresetsAcrossDaylightChangesAndYearEnds) {
  // clang-format off
  const std::pair<Date, const char*> entries[] = {
      {berlin(2024, 4, 2), "11101010"}, {berlin(2024, 4, 1, 23, 59), "01101010"}, {berlin(2024, 3, 31), "00110110"},
      {berlin(2024, 3, 31, 3, 30), "00100110"}, {berlin(2024, 3, 30, 23, 59, 59), "00010110"},
      {berlin(2024, 3, 24), "00010110"}, {berlin(2024, 3, 23, 23, 59), "00000110"}, {berlin(2024, 4, 7), "00101010"},
      {berlin(2023, 12, 31, 23), "00000001"}};
  // clang-format on
  for (const auto& [entry, expected] : entries)
    EXPECT_EQ(presets(entryAt(entry)), expected) << entry.secondsSince1970();
}

// A custom range covers its end day; "any date" takes undated items; incomplete tags give no predicate.
TEST_F(RangePredicateTest, CustomRangesAndAnyDate) {
  const Date march3 = berlin(2024, 3, 3, 15, 20);
  const WTItemPredicate custom = WTRangePredicate::predicateForTag(WTRangePredicate::Custom, march3, march3);
  ASSERT_TRUE(custom);
  // clang-format off
  for (const auto& [entry, taken] : {std::pair{berlin(2024, 3, 3), true}, {berlin(2024, 3, 3, 23, 59, 59), true},
                                     {berlin(2024, 3, 4), true}, {berlin(2024, 3, 2, 23, 59, 59), false},
                                     {berlin(2024, 3, 4, 0, 0, 1), false}})
    // clang-format on
    EXPECT_EQ(custom(entryAt(entry)), taken) << entry.secondsSince1970();
  EXPECT_FALSE(WTRangePredicate::predicateForTag(WTRangePredicate::Custom, march3, std::nullopt) ||
               WTRangePredicate::predicateForTag(WTRangePredicate::Custom) ||
               WTRangePredicate::predicateForTag(8) || WTRangePredicate::predicateForTag(-1));
  WTTime* undated = makeItem<WTTime>(task, berlin(2024, 4, 2, 9));
  undated->setStartDate(std::nullopt);
  const WTItemPredicate any = WTRangePredicate::predicateForTag(WTRangePredicate::AnyDate);
  ASSERT_TRUE(any);
  EXPECT_TRUE(any(undated) && any(entryAt(berlin(1999, 1, 1))));
  EXPECT_EQ(presets(undated), "00000000");
}

// Whether each word of the command line takes an entry of Monday 1 April 2024 and one of June 2023.
TEST_F(RangePredicateTest, CommandLineWords) {
  const WTItem* monday = entryAt(berlin(2024, 4, 1, 9));
  const WTItem* lastYear = entryAt(berlin(2023, 6, 1, 9));
  // clang-format off
  const std::pair<const char*, const char*> cases[] = {
      {"today", "00"}, {"yesterday", "10"}, {"this-week", "10"}, {"last-week", "00"}, {"this-month", "10"},
      {"last-month", "00"}, {"this-year", "10"}, {"last-year", "01"}, {"any", "11"},
      {"2024-04-01..2024-04-01", "10"}, {"2023-01-01..2024-03-31", "01"}};
  // clang-format on
  for (const auto& [word, expected] : cases) {
    const Result<WTItemPredicate> predicate =
        WTRangePredicate::predicateForRangeWord(QString::fromUtf8(word));
    ASSERT_TRUE(predicate.ok()) << word;
    EXPECT_EQ(std::string({predicate.value()(monday) ? '1' : '0', predicate.value()(lastYear) ? '1' : '0'}),
              expected)
        << word;
  }
  for (const char* bad : {"", "week", "2024-04-01", "2024-02-30..2024-03-01", "2024-04-02..2024-04-01",
                          "2024-4-1..2024-4-2", "today.."}) {
    const Result<WTItemPredicate> predicate = WTRangePredicate::predicateForRangeWord(QString::fromUtf8(bad));
    EXPECT_TRUE(!predicate.ok() && !predicate.error().message.isEmpty()) << bad;
  }
}
