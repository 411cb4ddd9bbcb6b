#pragma once

#include <QString>
#include <QVariant>

#include <cstdint>
#include <optional>

// Durations as clock-like text: minutes as "H:MM", seconds as "H:MM:SS". Hours never roll into days.
namespace DurationText {

QString stringWithMinutes(std::int32_t minutes);
QString stringWithSeconds(std::int32_t seconds);
// The integer value of a number (2.9 counts as 2), as minutes; a null variant counts as 0.
QString durationString(const QVariant& number);
// Lenient parse of typed text: "M", "H:M" or "D:H:M" (pieces further left ignored); pieces that do
// not read as numbers count as 0. Never fails.
int minutesFromString(const QString& text);
// What a person types as a duration, read strictly: "M", "H:M" or "D:H:M", each piece a whole number in
// the user's locale (grouping as TypedNumber takes it); a blank piece counts as 0, blank text is 0
// minutes. None for anything else (a fraction, a negative piece, more pieces, a total beyond 32 bits),
// with the reason in `refusal`: nothing typed is read as some other length.
std::optional<int> minutesFromTypedText(const QString& text, QString* refusal = nullptr);

}  // namespace DurationText

// Number <-> duration text, for editors that bind a duration field.
class WTDurationFormatter {
 public:
  QString stringForObjectValue(const QVariant& value) const;
  // Always succeeds: returns the parsed minutes as an integer variant.
  bool getObjectValue(QVariant* result, const QString& text, QString* errorDescription) const;
};

class WTDurationTransformer {
 public:
  static QMetaType transformedValueClass() { return QMetaType::fromType<QString>(); }
  static bool allowsReverseTransformation() { return true; }
  QVariant transformedValue(const QVariant& value) const;
  QVariant reverseTransformedValue(const QVariant& value) const;
};
