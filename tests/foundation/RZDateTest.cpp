#include "RZDate.h"

#include <gtest/gtest.h>

#include <QDate>
#include <QDateTime>
#include <QTimeZone>

#include <unicode/gregocal.h>
#include <unicode/locid.h>
#include <unicode/smpdtfmt.h>
#include <unicode/timezone.h>

#include <algorithm>
#include <cmath>
#include <memory>
#include <ostream>
#include <random>
#include <vector>

// Failures show the instant in UTC with milliseconds.
static void PrintTo(const Date& date, std::ostream* out) {
  *out << date.toQDateTime().toUTC().toString(Qt::ISODateWithMs).toStdString();
}

namespace {

using namespace Qt::StringLiterals;

// Expected instants are built by Qt's own time-zone code (the system's tz files), not by ICU.
Date utc(int year, int month, int day, int hour = 0, int minute = 0, int second = 0, int ms = 0) {
  return Date::fromQDateTime(
      QDateTime(QDate(year, month, day), QTime(hour, minute, second, ms), QTimeZone::utc()));
}

const auto fromIcu = [](const icu::UnicodeString& text) {
  return QString(reinterpret_cast<const QChar*>(text.getBuffer()), text.length());
};

QString defaultZoneId() {
  icu::UnicodeString id;
  std::unique_ptr<icu::TimeZone>(icu::TimeZone::createDefault())->getID(id);
  return fromIcu(id);
}

void setLocale(const char* name) {
  UErrorCode status = U_ZERO_ERROR;
  icu::Locale::setDefault(icu::Locale(name), status);
  ASSERT_TRUE(U_SUCCESS(status));
}

const auto setZone = [](const char* zone) {
  ASSERT_TRUE(RZDate::setDefaultTimeZone(QString::fromLatin1(zone)));
};

const auto fixClock = [](Date now) { Date::setClockForTesting([now] { return now; }); };

// Restores the default zone, the clock and the ICU locale whatever a test changed.
class RZDateTest : public ::testing::Test {
 protected:
  void TearDown() override {
    Date::setClockForTesting({});
    setLocale(locale_.getName());
    RZDate::setDefaultTimeZone(zone_);
  }
  QString zone_ = defaultZoneId();
  icu::Locale locale_ = icu::Locale::getDefault();
};

// A wall-clock time in the zone under test.
struct Wall {
  int year, month, day, hour = 0, minute = 0, second = 0, ms = 0;
};

using Op = Date (*)(Date);

// Behaviour that must be the same in every zone, on days without a transition.
class RZDateInZone : public RZDateTest, public ::testing::WithParamInterface<const char*> {
 protected:
  void SetUp() override { setZone(GetParam()); }
  Date at(const Wall& w) const {
    const QDateTime local(QDate(w.year, w.month, w.day), QTime(w.hour, w.minute, w.second, w.ms),
                          QTimeZone(QByteArray(GetParam())));
    EXPECT_TRUE(local.isValid());
    return Date::fromQDateTime(local);
  }
};

// Fields that name no day roll over in the lenient calendar.
TEST_P(RZDateInZone, FieldsToAndFromComponents) {
  RZDate::DateComponents c;
  c.minute = 7;
  RZDate::assignFlags(at({2024, 5, 14, 14, 30, 15}), RZDate::Year | RZDate::Hour | RZDate::Weekday, c);
  const int unset = RZDate::DateComponents::kUnset;
  EXPECT_EQ(std::vector<int>({c.year, c.month, c.day, c.hour, c.minute, c.second}),
            std::vector<int>({2024, unset, unset, 14, 7, unset}));
  EXPECT_EQ(RZDate::dateFromComponents({2024, 2, 30, 25, 0, 0}), at({2024, 3, 2, 1}));
  EXPECT_EQ(RZDate::dateFromComponents({2024, 13, 0, 0, 0, 0}), at({2024, 12, 31}));
  EXPECT_EQ(RZDate::dateFromComponents({.year = 2024, .hour = 9}), at({2024, 1, 1, 9}));
}

// Cached day bounds against Qt's days of the zone, across transitions, walked forwards, backwards, shuffled.
TEST_P(RZDateInZone, DaysAndRangesAgreeWithTheZone) {
  const QTimeZone zone{QByteArray(GetParam())};
  std::vector<Date> instants;
  for (const QDate& day :
       {QDate(2024, 3, 8), QDate(2024, 3, 29), QDate(2024, 4, 4), QDate(2024, 10, 3), QDate(2024, 10, 25),
        QDate(2024, 11, 1), QDate(2024, 9, 5), QDate(2024, 12, 29), QDate(2024, 2, 27), QDate(2023, 1, 29)}) {
    const Date from = Date::fromQDateTime(day.startOfDay(zone));
    for (int step = 0; step < 4 * 24 * 5; ++step) instants.push_back(from.addingSeconds(step * 900.0 + 7.5));
  }
  auto check = [&](const std::vector<Date>& order) {
    for (Date t : order) {
      const QDate day = t.toQDateTime().toTimeZone(zone).date();
      const QDate month(day.year(), day.month(), 1), year(day.year(), 1, 1),
          week = day.addDays(-(day.dayOfWeek() % 7));
      const auto start = [&](QDate first, int days = 0) {
        return Date::fromQDateTime(first.addDays(days).startOfDay(zone));
      };
      const auto months = [&](int n) { return start(month.addMonths(n), day.day() - 1); };
      const std::string at = t.toQDateTime().toUTC().toString(Qt::ISODate).toStdString();
      // clang-format off
      const std::pair<Op, Date> days[] = {
          {RZDate::midnight, start(day)}, {RZDate::tomorrow, start(day, 1)}, {RZDate::yesterday, start(day, -1)},
          {RZDate::nextWeek, start(day, 7)}, {RZDate::lastWeek, start(day, -7)}, {RZDate::beginOfWeek, start(week)},
          {RZDate::beginOfNextMonth, start(month.addMonths(1))}, {RZDate::beginOfLastMonth, start(month.addMonths(-1))},
          {RZDate::beginOfYear, start(year)}, {RZDate::beginOfNextYear, start(year.addYears(1))},
          {RZDate::beginOfLastYear, start(year.addYears(-1))},
          {RZDate::beginOfMinute, Date::fromSeconds(std::floor(t.secondsSince1970() / 60) * 60)}};
      // clang-format on
      for (std::size_t i = 0; i < std::size(days); ++i)
        ASSERT_EQ(days[i].first(t), days[i].second) << at << " #" << i;
      for (int n : {-17, -1, 0, 1, 12, 25}) ASSERT_EQ(RZDate::addMonth(t, n), months(n)) << at << " " << n;
      fixClock(t);
      // clang-format off
      const std::pair<RZDate::Range (*)(), RZDate::Range> ranges[] = {
          {RZDate::rangeForToday, {start(day), start(day, 1)}}, {RZDate::rangeForYesterday, {start(day, -1), start(day)}},
          {RZDate::rangeForThisWeek, {start(week), start(week, 7)}}, {RZDate::rangeForLastWeek, {start(week, -7), start(week)}},
          {RZDate::rangeForThisMonth, {start(month), start(month.addMonths(1))}},
          {RZDate::rangeForLastMonth, {start(month.addMonths(-1)), start(month)}},
          {RZDate::rangeForThisYear, {start(year), start(year.addYears(1))}},
          {RZDate::rangeForLastYear, {start(year.addYears(-1)), start(year)}}};
      // clang-format on
      for (const auto& [range, expected] : ranges) ASSERT_EQ(range(), expected) << at;
    }
  };
  check(instants);
  std::reverse(instants.begin(), instants.end());
  check(instants);
  std::shuffle(instants.begin(), instants.end(), std::mt19937(42));
  check(instants);
}

INSTANTIATE_TEST_SUITE_P(Zones, RZDateInZone,
                         ::testing::Values("Europe/Berlin", "America/New_York", "Australia/Lord_Howe",
                                           "America/Santiago"),
                         [](const auto& info) {
                           std::string name = info.param;
                           std::replace(name.begin(), name.end(), '/', '_');
                           return name;
                         });

// A local minute begins with the offset's seconds: Monrovia's clocks ran 44:30 behind UTC until 1972.
TEST_F(RZDateTest, MinutesBeginWithTheZonesOffset) {
  setZone("Africa/Monrovia");
  EXPECT_EQ(RZDate::beginOfMinute(utc(1971, 6, 1, 12, 0, 40)), utc(1971, 6, 1, 12, 0, 30));
  EXPECT_EQ(RZDate::beginOfMinute(utc(1972, 6, 1, 12, 0, 40)), utc(1972, 6, 1, 12));
}

// Fields worked out without the calendar must be ICU's, over five centuries and odd zones.
TEST_F(RZDateTest, ArithmeticAgreesWithTheCalendar) {
  std::mt19937_64 random(7);
  for (const char* zoneId : {"UTC", "Asia/Kathmandu", "Pacific/Apia", "America/Sao_Paulo", "Europe/Dublin",
                             "America/St_Johns", "Australia/Lord_Howe"}) {
    setZone(zoneId);
    UErrorCode status = U_ZERO_ERROR;
    icu::GregorianCalendar calendar(icu::TimeZone::createTimeZone(icu::UnicodeString::fromUTF8(zoneId)),
                                    status);
    ASSERT_TRUE(U_SUCCESS(status));
    calendar.setLenient(true);
    auto startOf = [&](int year, int month, int day) {
      calendar.clear();
      calendar.set(UCAL_EXTENDED_YEAR, year);
      calendar.set(UCAL_MONTH, month - 1);
      calendar.set(UCAL_DATE, day);
      return Date::fromSeconds(calendar.getTime(status) / 1000.0);
    };
    std::vector<double> seconds;
    std::uniform_real_distribution<double> centuries(-14e9, 4.2e9);  // about 1526 to 2103
    for (int i = 0; i < 3000; ++i) seconds.push_back(std::floor(centuries(random)));
    for (double edge : {-12212553600.0, -12219292800.0, 253402300799.0, 253402214400.0, 1325239200.0})
      for (int hour = -30; hour <= 30; ++hour) seconds.push_back(edge + hour * 3600.0 + 59);
    for (double s : seconds) {
      const Date date = Date::fromSeconds(s);
      calendar.setTime(s * 1000.0, status);
      const int year = calendar.get(UCAL_EXTENDED_YEAR, status), month = calendar.get(UCAL_MONTH, status) + 1,
                day = calendar.get(UCAL_DATE, status);
      RZDate::DateComponents c;
      RZDate::assignFlags(date, RZDate::AllFields, c);
      const std::string where = std::string(zoneId) + " at " + std::to_string(qint64(s));
      ASSERT_EQ(std::vector<int>({c.year, c.month, c.day, c.hour, c.minute, c.second}),
                std::vector<int>({year, month, day, calendar.get(UCAL_HOUR_OF_DAY, status),
                                  calendar.get(UCAL_MINUTE, status), calendar.get(UCAL_SECOND, status)}))
          << where;
      const int weekday = calendar.get(UCAL_DAY_OF_WEEK, status);
      ASSERT_EQ(RZDate::beginOfWeek(date), startOf(year, month, day + 1 - weekday)) << where;
      ASSERT_EQ(RZDate::midnight(date), startOf(year, month, day)) << where;
      ASSERT_EQ(RZDate::beginOfMonth(date), startOf(year, month, 1)) << where;
      ASSERT_TRUE(U_SUCCESS(status));
    }
  }
}

// Numeric patterns are written without ICU's formatter, yet must be exactly what it writes.
TEST_F(RZDateTest, NumericPatternsAreWrittenAsTheFormatterWritesThem) {
  setLocale("en_US");
  std::mt19937_64 random(11);
  std::uniform_real_distribution<double> instants(-15e9, 254e9);  // about 1494 to 10018
  for (const char* zoneId : {"UTC", "Asia/Kathmandu", "America/Sao_Paulo", "Pacific/Apia"}) {
    setZone(zoneId);
    for (const char* pattern : {"yyyy-MM-dd HH:mm", "y/M/d H:m:s", "dd.MM.yy", "yyyy-MM", "MMMM yyyy"}) {
      UErrorCode status = U_ZERO_ERROR;
      icu::SimpleDateFormat format(icu::UnicodeString::fromUTF8(pattern), icu::Locale("en_US"), status);
      ASSERT_TRUE(U_SUCCESS(status));
      format.adoptTimeZone(icu::TimeZone::createTimeZone(icu::UnicodeString::fromUTF8(zoneId)));
      for (int i = 0; i < 500; ++i) {
        const double seconds = std::floor(instants(random));
        icu::UnicodeString expected;
        ASSERT_EQ(RZDate::stringWithPattern(Date::fromSeconds(seconds), QString::fromUtf8(pattern)),
                  fromIcu(format.format(seconds * 1000.0, expected)))
            << zoneId << ' ' << pattern << " at " << qint64(seconds);
      }
    }
  }
  setLocale("ar_EG");
  setZone("UTC");
  EXPECT_EQ(
      RZDate::stringWithPattern(utc(2024, 5, 14, 9, 30), QStringLiteral("yyyy/MM/dd HH.mm")),
      QString::fromUtf8("\u0662\u0660\u0662\u0664/\u0660\u0665/\u0661\u0664 \u0660\u0669.\u0663\u0660"));
}

// Havana's 3 Nov 2024 midnight comes twice; the later counts, and 2 November must not stretch over the hour.
TEST_F(RZDateTest, RepeatedMidnightIsTheLaterOne) {
  setZone("America/Havana");
  const std::pair<Date, Date> walk[] = {
      // an instant and its midnight
      {utc(2024, 11, 2, 16), utc(2024, 11, 2, 4)},    {utc(2024, 11, 3, 3, 59, 59), utc(2024, 11, 2, 4)},
      {utc(2024, 11, 3, 4, 30), utc(2024, 11, 3, 5)}, {utc(2024, 11, 3, 4, 59, 59), utc(2024, 11, 3, 5)},
      {utc(2024, 11, 3, 5), utc(2024, 11, 3, 5)},     {utc(2024, 11, 3, 5, 30), utc(2024, 11, 3, 5)},
      {utc(2024, 11, 2, 16), utc(2024, 11, 2, 4)},    {utc(2024, 11, 3, 4, 15), utc(2024, 11, 3, 5)}};
  for (const auto& [at, midnight] : walk) EXPECT_EQ(RZDate::midnight(at), midnight) << at.secondsSince1970();
  EXPECT_EQ(RZDate::tomorrow(utc(2024, 11, 2, 16)), utc(2024, 11, 3, 5));
}

// A change of zone drops cached days; an unknown zone changes nothing; weeks start on Sunday in any locale.
TEST_F(RZDateTest, ZoneChangesAndSundayWeeks) {
  const Date t = utc(2024, 5, 14, 23, 30);
  setZone("Europe/Berlin");
  EXPECT_EQ(RZDate::midnight(t), utc(2024, 5, 14, 22));
  EXPECT_EQ(RZDate::midnight(t.addingSeconds(60)), utc(2024, 5, 14, 22));
  setZone("America/New_York");
  EXPECT_EQ(RZDate::midnight(t), utc(2024, 5, 14, 4));
  EXPECT_EQ(RZDate::tomorrow(t), utc(2024, 5, 15, 4));
  for (const char* id : {"Not/AZone", "", "Europe/Atlantis", "Etc/Unknown"}) {
    EXPECT_FALSE(RZDate::setDefaultTimeZone(QString::fromLatin1(id))) << id;
    EXPECT_TRUE(defaultZoneId() == "America/New_York" && RZDate::midnight(t) == utc(2024, 5, 14, 4)) << id;
  }
  setLocale("de_DE");
  setZone("Europe/Berlin");  // the calendar is made afresh under de_DE
  for (int day : {12, 13, 15})
    EXPECT_EQ(RZDate::beginOfWeek(utc(2024, 5, day, 10)), utc(2024, 5, 11, 22)) << day;
  fixClock(utc(2024, 5, 13, 10));  // a Monday
  EXPECT_EQ(RZDate::rangeForThisWeek()[0], utc(2024, 5, 11, 22));
}

TEST_F(RZDateTest, ShortFormatsFollowLocaleAndZone) {
  const Date afternoon = utc(2024, 5, 14, 12, 30, 40), lateEvening = utc(2024, 5, 14, 23, 30);
  const std::tuple<const char*, const char*, Date, QString, QString> cases[] = {
      {"en_US", "Europe/Berlin", lateEvening, "5/15/24", u"5/15/24, 1:30\u202fAM"_s},
      {"en_US", "America/New_York", lateEvening, "5/14/24", u"5/14/24, 7:30\u202fPM"_s},
      {"de_DE", "Australia/Lord_Howe", afternoon, "14.05.24", "14.05.24, 23:00"},
  };
  for (const auto& [locale, zone, date, dateText, dateTimeText] : cases) {
    setLocale(locale);
    setZone(zone);  // the date alone again last: the time style must not stick
    EXPECT_EQ(QStringList(
                  {RZDate::shortFormat(date), RZDate::shortFormatWithTime(date), RZDate::shortFormat(date)}),
              QStringList({dateText, dateTimeText, dateText}))
        << locale << " " << zone;
  }
  setLocale("en_US");  // a change of locale alone is seen too
  EXPECT_EQ(RZDate::shortFormat(afternoon), "5/14/24");
}

// The system clock reads with fractions of a second (a few readings, in case one falls on a whole second).
TEST(DateTest, TheClockCarriesFractionsAndQDateTimesKeepMilliseconds) {
  bool sawFraction = false;
  for (int i = 0; i < 5 && !sawFraction; ++i) sawFraction = std::fmod(Date::now().secondsSince1970(), 1) != 0;
  EXPECT_TRUE(sawFraction);
  EXPECT_NEAR(Date::now().secondsSince1970(), double(QDateTime::currentMSecsSinceEpoch()) / 1000.0, 5.0);
  const QDateTime dateTime(QDate(2024, 5, 14), QTime(12, 30, 40, 123), QTimeZone::utc());
  EXPECT_DOUBLE_EQ(Date::fromQDateTime(dateTime).secondsSince1970(), 1715689840.123);
  EXPECT_EQ(Date::fromQDateTime(dateTime).toQDateTime(), dateTime);
}

}  // namespace
