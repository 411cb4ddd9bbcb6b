#pragma once

#include <QDateTime>
#include <QMetaType>

#include <compare>
#include <functional>

// An instant: seconds since 1970-01-01 00:00:00 UTC, with fractions. Carries no zone or calendar;
// the calendar operations in RZDate.h interpret it in the current default time zone.
class Date {
 public:
  constexpr Date() = default;
  static constexpr Date fromSeconds(double secondsSince1970) { return Date(secondsSince1970); }
  static Date fromQDateTime(const QDateTime& dateTime);

  // The current instant, from the system clock unless a test replaced the clock.
  static Date now();
  // Replaces the clock for tests; an empty function restores the system clock. Main thread only.
  static void setClockForTesting(std::function<Date()> clock);

  constexpr double secondsSince1970() const { return seconds_; }
  constexpr double timeIntervalSince(Date other) const { return seconds_ - other.seconds_; }
  constexpr Date addingSeconds(double seconds) const { return Date(seconds_ + seconds); }
  QDateTime toQDateTime() const;

  friend constexpr auto operator<=>(Date a, Date b) = default;

 private:
  constexpr explicit Date(double seconds) : seconds_(seconds) {}
  double seconds_ = 0;
};

Q_DECLARE_METATYPE(Date)
