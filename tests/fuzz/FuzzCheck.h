#pragma once
// What every fuzzer does with a property that fails: abort, which libFuzzer reports with the input.
#include <cstdlib>

inline void check(bool condition) {
  if (!condition) std::abort();
}
