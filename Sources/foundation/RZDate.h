#pragma once

#include "Date.h"

#include <QString>

#include <array>

// Calendar arithmetic over instants, in a Gregorian calendar and the current default time zone
// (ICU's default zone at the moment of the call). Stepping sets a field on a lenient calendar and lets it
// normalise, so 31 January + 1 month is early March, never clamped to the end of February.
// Weeks always begin on Sunday. Main thread only (the short-format formatter is shared).
namespace RZDate {

// Calendar unit flags; the values are fixed because callers pass them as numbers.
enum Unit : unsigned {
  Year = 4,
  Month = 8,
  Day = 16,
  Hour = 32,
  Minute = 64,
  Second = 128,
  Weekday = 512,
  DayUnits = 28,
  MinuteUnits = 124,
  TimeUnits = 224,
  WeekUnits = 540,
  AllFields = 252,
};

// The six fields of an instant in the current calendar; a field not set is "unset".
struct DateComponents {
  static constexpr int kUnset = -0x7fffffff;
  int year = kUnset, month = kUnset, day = kUnset, hour = kUnset, minute = kUnset, second = kUnset;
};

using Range = std::array<Date, 2>;  // start, then the start of the following period

Date midnight(Date date);
Date tomorrow(Date date);
Date yesterday(Date date);
Date nextWeek(Date date);
Date lastWeek(Date date);
Date beginOfMonth(Date date);
Date beginOfNextMonth(Date date);
Date beginOfLastMonth(Date date);
Date beginOfWeek(Date date);
Date beginOfYear(Date date);
Date beginOfNextYear(Date date);
Date beginOfLastYear(Date date);
Date beginOfMinute(Date date);
Date addMonth(Date date, int months);

// Copies those of the six fields that `flags` names from `date` into `components`.
void assignFlags(Date date, unsigned flags, DateComponents& components);
// Builds an instant from components in the current calendar; unset fields count as their minimum.
Date dateFromComponents(const DateComponents& components);

QString shortFormat(Date date);
// The date as text by an ICU (Unicode) pattern such as "HH:mm", in the default zone and locale.
QString stringWithPattern(Date date, const QString& pattern);
QString shortFormatWithTime(Date date);

Range rangeForToday();
Range rangeForYesterday();
Range rangeForThisWeek();
Range rangeForLastWeek();
Range rangeForThisMonth();
Range rangeForLastMonth();
Range rangeForThisYear();
Range rangeForLastYear();

// Makes `zoneId` (an Olson name such as "Australia/Lord_Howe") ICU's default zone and drops the cached
// calendar. Returns false, changing nothing, when ICU does not know the zone.
bool setDefaultTimeZone(const QString& zoneId);

}  // namespace RZDate
