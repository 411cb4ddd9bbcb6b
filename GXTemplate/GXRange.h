#pragma once

#include <QString>

#include <cstdint>
#include <limits>

// A run of UTF-16 units of a text: where it starts and how many it holds, both unsigned 64-bit as the
// regular-expression operations and the template engine count them.
struct GXRange {
  std::uint64_t location = 0;
  std::uint64_t length = 0;

  friend constexpr bool operator==(const GXRange&, const GXRange&) = default;
};

// The location of a range that holds nothing found: the largest signed 64-bit number.
inline constexpr std::uint64_t kGXNotFound = std::uint64_t(std::numeric_limits<std::int64_t>::max());
// The length that stands for "to the end of the string".
inline constexpr std::uint64_t kGXMaxLength = std::numeric_limits<std::uint64_t>::max();

// True when the range lies within a text of `textLength` units (its end computed without overflow).
constexpr bool GXRangeFitsLength(GXRange range, std::uint64_t textLength) {
  return range.location <= textLength && range.length <= textLength - range.location;
}

// "{location, length}": the text form of a range, used to key state by template position.
inline QString GXStringFromRange(GXRange range) {
  return QStringLiteral("{%1, %2}").arg(range.location).arg(range.length);
}
