#include "WTStopwatch.h"

#include <chrono>

WTStopwatch::WTStopwatch() {
  using Period = std::chrono::steady_clock::period;
  conversionToSeconds_ = double(Period::num) / double(Period::den);
  reset();
}

std::uint64_t WTStopwatch::clock() {
  return static_cast<std::uint64_t>(std::chrono::steady_clock::now().time_since_epoch().count());
}

void WTStopwatch::reset() {
  started_ = false;
  sum_ = 0;
}

void WTStopwatch::start() {
  if (started_) return;
  lastStart_ = clock();
  started_ = true;
}

void WTStopwatch::stop() {
  if (!started_) return;
  sum_ += clock() - lastStart_;
  started_ = false;
}

double WTStopwatch::elapsedSeconds() const {
  const std::uint64_t running = started_ ? clock() - lastStart_ : 0;
  return double(sum_ + running) * conversionToSeconds_;
}
