#include "DurationText.h"

#include "Decimal.h"
#include "TypedNumber.h"

#include <QCoreApplication>
#include <QLocale>
#include <QStringList>

#include <algorithm>
#include <cmath>
#include <limits>

namespace {

// "00" for zero, plain digits above 9, otherwise a "0" in front, negative values included: -5 is "0-5".
// The odd text for negative values is what the lists have always shown and is kept.
QString twoDigits(std::int32_t value) {
  if (value == 0) return QStringLiteral("00");
  if (value > 9) return QString::number(value);
  return QLatin1Char('0') + QString::number(value);
}

int clampToInt(long long value) {
  return int(std::clamp<long long>(value, std::numeric_limits<int>::min(), std::numeric_limits<int>::max()));
}

// One piece of typed duration text as an integer: a whole number in the user's locale (or in the C
// locale, so "2.5" is read the same everywhere), blanks around it ignored, fractions cut off.
// Anything else is 0.
long long readPiece(const QString& piece) {
  const QString text = piece.trimmed();
  if (text.isEmpty()) return 0;
  for (const QLocale& locale : {QLocale(), QLocale::c()}) {
    bool ok = false;
    const qlonglong whole = locale.toLongLong(text, &ok);
    if (ok) return clampToInt(whole);
    const double number = locale.toDouble(text, &ok);
    if (ok && std::isfinite(number)) {
      return clampToInt(
          static_cast<long long>(std::clamp(std::trunc(number), double(std::numeric_limits<int>::min()),
                                            double(std::numeric_limits<int>::max()))));
    }
  }
  return 0;
}

}  // namespace

namespace DurationText {

QString stringWithMinutes(std::int32_t minutes) {
  // Truncating division: the remainder keeps the sign of the minutes.
  return twoDigits(minutes / 60) + QLatin1Char(':') + twoDigits(minutes % 60);
}

int minutesFromString(const QString& text) {
  // Minutes last, then hours, then days; anything further left is ignored.
  static constexpr long long kWeights[] = {1, 60, 1440};
  const QStringList pieces = text.split(QLatin1Char(':'));
  long long minutes = 0;
  for (qsizetype i = 0; i < 3 && i < pieces.size(); ++i)
    minutes += kWeights[i] * readPiece(pieces[pieces.size() - 1 - i]);
  return clampToInt(minutes);
}

std::optional<int> minutesFromTypedText(const QString& text, QString* refusal) {
  auto refuse = [refusal]() -> std::optional<int> {
    if (refusal) {
      *refusal = QCoreApplication::translate(
          "DurationText",
          "Not a duration: type minutes, hours:minutes or days:hours:minutes in whole numbers, as in 1:30");
    }
    return std::nullopt;
  };
  if (refusal) refusal->clear();
  static constexpr long long kWeights[] = {1, 60, 1440};
  const QStringList pieces = text.split(QLatin1Char(':'));
  if (pieces.size() > 3) return refuse();
  // Whole numbers have no decimal sign, not even before a nought fraction: "2,00" meant as hours, or an
  // amount of money typed into a flat fee's duration, is not taken as minutes.
  if (text.contains(TypedNumber::decimalSign())) return refuse();
  long long minutes = 0;
  for (qsizetype i = 0; i < pieces.size(); ++i) {
    const TypedNumber::Reading piece = TypedNumber::read(pieces[pieces.size() - 1 - i]);
    if (!piece.taken()) return refuse();
    if (!piece.value) continue;
    const Decimal value = *piece.value;
    // Whole and not negative: the value has no fraction when truncating keeps it.
    if (value.isNegative() || Decimal(value.toInt64()) != value) return refuse();
    if (value > Decimal(std::int64_t(std::numeric_limits<int>::max()))) return refuse();
    minutes += kWeights[i] * value.toInt64();
    if (minutes > std::numeric_limits<int>::max()) return refuse();
  }
  return int(minutes);
}

}  // namespace DurationText
