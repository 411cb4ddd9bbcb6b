#pragma once

#include <QString>

#include <cstdint>
#include <optional>

// Durations as clock-like text: minutes as "H:MM". Hours never roll into days.
namespace DurationText {

QString stringWithMinutes(std::int32_t minutes);
// Lenient parse of typed text: "M", "H:M" or "D:H:M" (pieces further left ignored); pieces that do
// not read as numbers count as 0. Never fails.
int minutesFromString(const QString& text);
// What a person types as a duration, read strictly: "M", "H:M" or "D:H:M", each piece a whole number in
// the user's locale (grouping as TypedNumber takes it); a blank piece counts as 0, blank text is 0
// minutes. None for anything else (a fraction, a negative piece, more pieces, a total beyond 32 bits),
// with the reason in `refusal`: nothing typed is read as some other length.
std::optional<int> minutesFromTypedText(const QString& text, QString* refusal = nullptr);

}  // namespace DurationText
