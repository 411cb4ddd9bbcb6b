#include "Date.h"

#include <chrono>
#include <cmath>
#include <utility>

namespace {

// Replaced only by tests; empty means the system clock.
std::function<Date()>& testClock() {
  static std::function<Date()> clock;
  return clock;
}

}  // namespace

Date Date::fromQDateTime(const QDateTime& dateTime) {
  return Date(double(dateTime.toMSecsSinceEpoch()) / 1000.0);
}

Date Date::now() {
  if (const auto& clock = testClock()) return clock();
  // Microseconds: fine enough to order instants taken in quick succession.
  const auto sinceEpoch = std::chrono::duration_cast<std::chrono::microseconds>(
      std::chrono::system_clock::now().time_since_epoch());
  return Date(double(sinceEpoch.count()) / 1e6);
}

void Date::setClockForTesting(std::function<Date()> clock) {
  testClock() = std::move(clock);
}

QDateTime Date::toQDateTime() const {
  // QDateTime keeps whole milliseconds; the result is in the system's local time.
  return QDateTime::fromMSecsSinceEpoch(std::llround(seconds_ * 1000.0));
}
