#include "RZDate.h"
#include "TessalLogging.h"

#include <QtGlobal>

#include <unicode/basictz.h>
#include <unicode/datefmt.h>
#include <unicode/gregocal.h>
#include <unicode/locid.h>
#include <unicode/timezone.h>
#include <unicode/tztrans.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <memory>
#include <optional>
#include <string>
#include <vector>

// How days and fields are found:
// - One lenient GregorianCalendar in ICU's default zone is kept for the life of the process (or until
//   setDefaultTimeZone) because making one per call costs more than the arithmetic itself; grouping
//   thousands of items asks for midnight() once per item. Everything here is main-thread only. The zone
//   must therefore be changed through setDefaultTimeZone: a change made directly through ICU is not seen.
// - Stepping reads the fields of the receiver, changes one of them and builds a new instant from the
//   fields on a cleared calendar. The lenient calendar normalises out-of-range fields (day 0 is the last
//   day of the month before, 31 February is early March); Calendar::add would clamp instead. Fields
//   beyond ICU's span of years (addMonth by millions) give an unspecified instant.
// - Wall times that a zone transition skips or repeats are resolved as ICU does by default: a skipped
//   time is read with the offset in force before the transition (00:30 on a day whose clocks jump from
//   00:00 to 01:00 is 01:30, and a skipped midnight is therefore the first instant of that day), and a
//   repeated time is its later occurrence. Where midnight itself repeats, the hour before the later
//   midnight has its midnight ahead of it. beginOfMinute alone works on the instant, not on fields,
//   and stays in the pass it was given.
// - ICU counts in whole milliseconds: instants go in snapped to the millisecond (rounding noise of the
//   double is ignored, true fractions of a millisecond are dropped).

namespace RZDate {

namespace {

struct Fields {
  int year = 0, month = 0, day = 0, hour = 0, minute = 0, second = 0;
  int weekday = 0;  // 1 for Sunday to 7 for Saturday
};

struct CachedFormat {
  std::unique_ptr<icu::DateFormat> format;
  std::string locale;  // the default locale the format was made for
};

struct State {
  std::unique_ptr<icu::GregorianCalendar> calendar;
  // The default zone alone, for the offset look-ups that need no calendar: making a calendar also reads
  // the locale's calendar data, which a command that only measures a running entry never uses.
  std::unique_ptr<icu::TimeZone> zone;
  // [dayStart, nextDayStart): instants known to share the local day whose midnight is dayStart.
  UDate dayStart = std::numeric_limits<double>::quiet_NaN();
  UDate nextDayStart = std::numeric_limits<double>::quiet_NaN();
  CachedFormat shortDate;
  CachedFormat shortDateTime;
  // Stretches of time between two transitions of the zone, each with its one offset from GMT, sorted.
  struct OffsetSpan {
    UDate from, to;
    int32_t offset;
  };
  std::vector<OffsetSpan> offsetSpans;

  void reset() {
    calendar.reset();
    zone.reset();
    offsetSpans.clear();
    dayStart = nextDayStart = std::numeric_limits<double>::quiet_NaN();
    shortDate.format.reset();
    shortDateTime.format.reset();
  }
};

State& state() {
  static State shared;
  return shared;
}

icu::GregorianCalendar& calendar() {
  State& s = state();
  if (!s.calendar) {
    UErrorCode status = U_ZERO_ERROR;
    // Default zone and locale; the locale only sets the first weekday, which nothing here uses.
    s.calendar = std::make_unique<icu::GregorianCalendar>(status);
    if (U_FAILURE(status)) qCWarning(lcFoundation, "ICU calendar: %s", u_errorName(status));
    s.calendar->setLenient(true);
  }
  return *s.calendar;
}

UDate toUDate(Date date) {
  const double ms = date.secondsSince1970() * 1000.0;
  const double nearest = std::round(ms);
  return std::abs(ms - nearest) < 1e-3 ? nearest : std::floor(ms);
}

Date fromUDate(UDate ms) {
  return Date::fromSeconds(ms / 1000.0);
}

int clampedSum(int a, long long b) {
  const long long sum = static_cast<long long>(a) + b;
  return int(std::clamp<long long>(sum, std::numeric_limits<int>::min(), std::numeric_limits<int>::max()));
}

// The stretch between the zone's transitions that holds an instant, with its one offset from GMT in
// milliseconds. Durations and day groups ask for it once or twice per item, so stretches once found are
// remembered and later questions about them are answered without ICU.
State::OffsetSpan spanAt(UDate ms) {
  auto& spans = state().offsetSpans;
  auto after = std::upper_bound(spans.begin(), spans.end(), ms,
                                [](UDate value, const State::OffsetSpan& span) { return value < span.from; });
  if (after != spans.begin() && ms < std::prev(after)->to) return *std::prev(after);

  constexpr double kForever = std::numeric_limits<double>::infinity();
  State& s = state();
  if (!s.zone) s.zone.reset(icu::TimeZone::createDefault());
  const icu::TimeZone& zone = *s.zone;
  int32_t raw = 0, dst = 0;
  UErrorCode status = U_ZERO_ERROR;
  zone.getOffset(ms, false, raw, dst, status);
  // Unknown bounds make a stretch of this instant alone, so nothing else is ever answered from it.
  if (U_FAILURE(status)) return {ms, ms, 0};
  const auto* basic = dynamic_cast<const icu::BasicTimeZone*>(&zone);
  if (!basic) return {ms, ms, raw + dst};
  icu::TimeZoneTransition previous, next;
  const UDate from = basic->getPreviousTransition(ms, true, previous) ? previous.getTime() : -kForever;
  const UDate to = basic->getNextTransition(ms, false, next) ? next.getTime() : kForever;
  const State::OffsetSpan span{from, to, raw + dst};
  if (spans.size() >= 512) spans.clear();
  spans.insert(std::upper_bound(spans.begin(), spans.end(), from,
                                [](UDate value, const State::OffsetSpan& span) { return value < span.from; }),
               span);
  return span;
}

int32_t offsetAt(UDate ms) {
  return spanAt(ms).offset;
}

constexpr double kDayMs = 86400000.0;

// Days since 1970-01-01 of a date in the proleptic Gregorian calendar, and back (Howard Hinnant's
// algorithms). ICU's calendar is Julian before October 1582, so only later dates may take this way.
long long daysFromCivil(long long y, int m, int d) {
  y -= m <= 2;
  const long long era = (y >= 0 ? y : y - 399) / 400;
  const long long yoe = y - era * 400;
  const long long doy = (153 * (m + (m > 2 ? -3 : 9)) + 2) / 5 + d - 1;
  const long long doe = yoe * 365 + yoe / 4 - yoe / 100 + doy;
  return era * 146097 + doe - 719468;
}

void civilFromDays(long long z, Fields& f) {
  z += 719468;
  const long long era = (z >= 0 ? z : z - 146096) / 146097;
  const long long doe = z - era * 146097;
  const long long yoe = (doe - doe / 1460 + doe / 36524 - doe / 146096) / 365;
  const long long doy = doe - (365 * yoe + yoe / 4 - yoe / 100);
  const long long mp = (5 * doy + 2) / 153;
  f.day = int(doy - (153 * mp + 2) / 5 + 1);
  f.month = int(mp < 10 ? mp + 3 : mp - 9);
  f.year = int(yoe + era * 400 + (f.month <= 2));
}

// Local wall-clock instants (milliseconds as if the zone were GMT) that the arithmetic above reads as ICU
// does: from 1583 to the end of 9999.
const double kArithmeticFrom = double(daysFromCivil(1583, 1, 1)) * kDayMs;
const double kArithmeticTo = double(daysFromCivil(10000, 1, 1)) * kDayMs;

bool fieldsByArithmetic(UDate ms, Fields& f) {
  const double local = ms + offsetAt(ms);
  if (!(local >= kArithmeticFrom && local < kArithmeticTo)) return false;
  const double days = std::floor(local / kDayMs);
  civilFromDays((long long)days, f);
  const long long msOfDay = (long long)(local - days * kDayMs);
  f.hour = int(msOfDay / 3600000);
  f.minute = int(msOfDay / 60000 % 60);
  f.second = int(msOfDay / 1000 % 60);
  // 1970-01-01 was a Thursday, weekday 5 when Sunday is 1.
  f.weekday = int((((long long)days + 4) % 7 + 7) % 7) + 1;
  return true;
}

Fields fieldsOf(UDate ms) {
  Fields f;
  if (fieldsByArithmetic(ms, f)) return f;
  icu::GregorianCalendar& cal = calendar();
  UErrorCode status = U_ZERO_ERROR;
  cal.setTime(ms, status);
  // The extended year runs on through 0 and below, so years before the common era round-trip.
  f.year = cal.get(UCAL_EXTENDED_YEAR, status);
  f.month = cal.get(UCAL_MONTH, status) + 1;
  f.day = cal.get(UCAL_DATE, status);
  f.hour = cal.get(UCAL_HOUR_OF_DAY, status);
  f.minute = cal.get(UCAL_MINUTE, status);
  f.second = cal.get(UCAL_SECOND, status);
  f.weekday = cal.get(UCAL_DAY_OF_WEEK, status);  // UCAL_SUNDAY is 1 in every locale
  if (U_FAILURE(status)) qCWarning(lcFoundation, "ICU calendar fields: %s", u_errorName(status));
  return f;
}

// The first instant of the local day `daysBefore` days before the one holding `ms`, when the zone keeps
// one offset from then to the end of that day of `ms`: the days are then whole, and their midnights are
// where ICU puts them. None near a transition, which the calendar then resolves.
std::optional<UDate> dayStartByArithmetic(UDate ms, int daysBefore = 0) {
  const State::OffsetSpan span = spanAt(ms);
  const double local = ms + span.offset;
  if (!(local >= kArithmeticFrom && local < kArithmeticTo)) return std::nullopt;
  const double dayStart = ms - (local - std::floor(local / kDayMs) * kDayMs);
  const double start = dayStart - daysBefore * kDayMs;
  if (start < span.from || dayStart + kDayMs > span.to) return std::nullopt;
  return start;
}

Fields fieldsOf(Date date) {
  return fieldsOf(toUDate(date));
}

// Builds an instant from wall-clock fields on a cleared lenient calendar; out-of-range fields roll over.
// NaN when ICU reports an error.
UDate build(int year, int month, int day, int hour = 0, int minute = 0, int second = 0) {
  icu::GregorianCalendar& cal = calendar();
  cal.clear();
  cal.set(UCAL_EXTENDED_YEAR, year);
  cal.set(UCAL_MONTH, month - 1);
  cal.set(UCAL_DATE, day);
  cal.set(UCAL_HOUR_OF_DAY, hour);
  cal.set(UCAL_MINUTE, minute);
  cal.set(UCAL_SECOND, second);
  UErrorCode status = U_ZERO_ERROR;
  const UDate ms = cal.getTime(status);
  return U_SUCCESS(status) ? ms : std::numeric_limits<double>::quiet_NaN();
}

bool sameDay(const Fields& a, const Fields& b) {
  return a.year == b.year && a.month == b.month && a.day == b.day;
}

QString fromUnicode(const icu::UnicodeString& text) {
  return QString(reinterpret_cast<const QChar*>(text.getBuffer()), text.length());
}

QString formatShort(Date date, bool withTime) {
  CachedFormat& cached = withTime ? state().shortDateTime : state().shortDate;
  const char* locale = icu::Locale::getDefault().getName();
  if (!cached.format || cached.locale != locale) {
    // Made in the default zone and locale of the moment; setDefaultTimeZone drops it.
    cached.format.reset(
        withTime ? icu::DateFormat::createDateTimeInstance(icu::DateFormat::kShort, icu::DateFormat::kShort)
                 : icu::DateFormat::createDateInstance(icu::DateFormat::kShort));
    cached.locale = locale;
    if (!cached.format) return {};
  }
  icu::UnicodeString text;
  cached.format->format(toUDate(date), text);
  return fromUnicode(text);
}

}  // namespace

Date midnight(Date date) {
  const UDate ms = toUDate(date);
  State& s = state();
  if (ms >= s.dayStart && ms < s.nextDayStart) return fromUDate(s.dayStart);
  if (const std::optional<UDate> start = dayStartByArithmetic(ms)) {
    s.dayStart = *start;
    s.nextDayStart = *start + kDayMs;
    return fromUDate(*start);
  }

  const Fields f = fieldsOf(ms);
  const UDate start = build(f.year, f.month, f.day);
  const UDate next = build(f.year, f.month, f.day + 1);
  // Keep the bounds only when the whole span is on this day. It is not when midnight repeats (a
  // transition from 01:00 back to 00:00 at the start of the next day): the later 00:00 is then the
  // next day's start, and the hour before it already belongs to the next day.
  if (start <= ms && ms < next && sameDay(fieldsOf(next - 1), f)) {
    s.dayStart = start;
    s.nextDayStart = next;
  }
  return fromUDate(start);
}

Date tomorrow(Date date) {
  const Fields f = fieldsOf(date);
  return fromUDate(build(f.year, f.month, f.day + 1));
}

Date yesterday(Date date) {
  const Fields f = fieldsOf(date);
  return fromUDate(build(f.year, f.month, f.day - 1));
}

Date nextWeek(Date date) {
  const Fields f = fieldsOf(date);
  return fromUDate(build(f.year, f.month, f.day + 7));
}

Date lastWeek(Date date) {
  const Fields f = fieldsOf(date);
  return fromUDate(build(f.year, f.month, f.day - 7));
}

Date beginOfMonth(Date date) {
  const Fields f = fieldsOf(date);
  if (const std::optional<UDate> start = dayStartByArithmetic(toUDate(date), f.day - 1)) return fromUDate(*start);
  return fromUDate(build(f.year, f.month, 1));
}

Date beginOfNextMonth(Date date) {
  const Fields f = fieldsOf(date);
  return fromUDate(build(f.year, f.month + 1, 1));
}

Date beginOfLastMonth(Date date) {
  const Fields f = fieldsOf(date);
  return fromUDate(build(f.year, f.month - 1, 1));
}

Date beginOfWeek(Date date) {
  const Fields f = fieldsOf(date);
  return fromUDate(build(f.year, f.month, f.day + 1 - f.weekday));
}

Date beginOfYear(Date date) {
  const Fields f = fieldsOf(date);
  return fromUDate(build(f.year, 1, 1));
}

Date beginOfNextYear(Date date) {
  const Fields f = fieldsOf(date);
  return fromUDate(build(clampedSum(f.year, 1), 1, 1));
}

Date beginOfLastYear(Date date) {
  const Fields f = fieldsOf(date);
  return fromUDate(build(clampedSum(f.year, -1), 1, 1));
}


Date beginOfMinute(Date date) {
  // Dropping the seconds of the local wall clock is subtracting them from the instant, so no calendar
  // fields are needed: one offset look-up. Rebuilding from fields would also move an instant in the
  // first pass of a repeated hour into the second pass, and a time entry across it would gain an hour.
  // Durations call this twice per entry, so it must stay cheap. Since Monrovia left its offset of
  // -0:44:30 on 7 January 1972, every zone of the database has kept whole minutes from UTC: a local
  // minute begins with a UTC one, and a command that measures a running entry reads no zone at all.
  constexpr UDate kWholeMinuteOffsetsSince = 63593070000.0;
  const UDate ms = toUDate(date);
  if (ms >= kWholeMinuteOffsetsSince) return fromUDate(std::floor(ms / 60000.0) * 60000.0);
  const double local = ms + offsetAt(ms);
  return fromUDate(ms - (local - std::floor(local / 60000.0) * 60000.0));
}

Date addMonth(Date date, int months) {
  const Fields f = fieldsOf(date);
  return fromUDate(build(f.year, clampedSum(f.month, months), f.day));
}

void assignFlags(Date date, unsigned flags, DateComponents& components) {
  if ((flags & AllFields) == 0) return;
  const Fields f = fieldsOf(date);
  if (flags & Year) components.year = f.year;
  if (flags & Month) components.month = f.month;
  if (flags & Day) components.day = f.day;
  if (flags & Hour) components.hour = f.hour;
  if (flags & Minute) components.minute = f.minute;
  if (flags & Second) components.second = f.second;
}

Date dateFromComponents(const DateComponents& c) {
  auto orMinimum = [](int value, int minimum) { return value == DateComponents::kUnset ? minimum : value; };
  return fromUDate(build(orMinimum(c.year, 1), orMinimum(c.month, 1), orMinimum(c.day, 1),
                         orMinimum(c.hour, 0), orMinimum(c.minute, 0), orMinimum(c.second, 0)));
}

QString shortFormat(Date date) {
  return formatShort(date, false);
}

QString shortFormatWithTime(Date date) {
  return formatShort(date, true);
}

Range rangeForToday() {
  const Date now = Date::now();
  return {midnight(now), midnight(tomorrow(now))};
}

Range rangeForYesterday() {
  const Date now = Date::now();
  return {midnight(yesterday(now)), midnight(now)};
}

Range rangeForThisWeek() {
  const Date now = Date::now();
  return {beginOfWeek(now), beginOfWeek(nextWeek(now))};
}

Range rangeForLastWeek() {
  const Date now = Date::now();
  return {beginOfWeek(lastWeek(now)), beginOfWeek(now)};
}

Range rangeForThisMonth() {
  const Date now = Date::now();
  return {beginOfMonth(now), beginOfNextMonth(now)};
}

Range rangeForLastMonth() {
  const Date now = Date::now();
  return {beginOfLastMonth(now), beginOfMonth(now)};
}

Range rangeForThisYear() {
  const Date now = Date::now();
  return {beginOfYear(now), beginOfNextYear(now)};
}

Range rangeForLastYear() {
  const Date now = Date::now();
  return {beginOfLastYear(now), beginOfYear(now)};
}

bool setDefaultTimeZone(const QString& zoneId) {
  const icu::UnicodeString id(reinterpret_cast<const UChar*>(zoneId.utf16()), int32_t(zoneId.size()));
  std::unique_ptr<icu::TimeZone> zone(icu::TimeZone::createTimeZone(id));
  // ICU answers an id it does not know with the "Etc/Unknown" zone rather than with an error.
  if (!zone) return false;
  icu::UnicodeString resolved, unknown;
  zone->getID(resolved);
  icu::TimeZone::getUnknown().getID(unknown);
  if (resolved == unknown) return false;
  icu::TimeZone::adoptDefault(zone.release());
  state().reset();
  return true;
}

}  // namespace RZDate
