#pragma once

#include <cstdint>

// Measures elapsed time over several start/stop spans on the monotonic clock.
class WTStopwatch {
 public:
  WTStopwatch();
  void reset();
  // Does nothing while running.
  void start();
  // Does nothing unless running.
  void stop();
  bool started() const { return started_; }
  // The sum of the finished spans plus the running one, in seconds.
  double elapsedSeconds() const;

 private:
  static std::uint64_t clock();
  double conversionToSeconds_;
  bool started_ = false;
  std::uint64_t lastStart_ = 0;
  std::uint64_t sum_ = 0;
};
