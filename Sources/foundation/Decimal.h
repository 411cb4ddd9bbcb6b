#pragma once

#include <QMetaType>
#include <QString>
#include <QVariant>

#include <compare>
#include <cstdint>
#include <optional>

// Exact base-10 number for money: a coefficient of at most 38 decimal digits, an exponent and a sign.
// Every arithmetic result is rounded to 38 significant digits, half away from zero. The exponent is kept
// as written ("12.30" stays 12.30, with two places), following the General Decimal Arithmetic rules for
// the exponent of sums, products and quotients. Money is never held as binary floating point.
// Exponents stay within the default context of those rules (adjusted exponent -999999 to 999999): tinier
// results lose digits as subnormals down to zero, larger ones saturate at the largest finite value with
// their sign (+-9.99...9E+999999), and text beyond that range is rejected.
class Decimal {
 public:
  static constexpr int kPrecision = 38;

  Decimal() = default;  // zero
  Decimal(int value) : Decimal(static_cast<std::int64_t>(value)) {}
  Decimal(std::int64_t value);

  // Reads "80", "-12.30", "1e3", " 5 " (blanks around are ignored). None for anything else.
  static std::optional<Decimal> fromString(QStringView text);
  // The shortest decimal that reads back as this double: 80.5 gives 80.5, 0.1 gives 0.1. None for NaN/inf.
  static std::optional<Decimal> fromDouble(double value);
  // Decimal, integers, booleans, doubles and numeric strings; none for anything else (and for null).
  static std::optional<Decimal> fromVariant(const QVariant& value);

  // Plain text with no exponent: "12.30", "-0.5", "1200". Never scientific notation; zero has no sign
  // ("0.00", even for a negative zero).
  QString toString() const;
  double toDouble() const;
  // Truncated toward zero; saturates at the int64 limits.
  std::int64_t toInt64() const;

  bool isZero() const { return coefficient_ == 0; }
  bool isNegative() const { return negative_ && coefficient_ != 0; }
  int exponent() const { return exponent_; }

  Decimal operator-() const;
  friend Decimal operator+(const Decimal& a, const Decimal& b);
  friend Decimal operator-(const Decimal& a, const Decimal& b);
  friend Decimal operator*(const Decimal& a, const Decimal& b);
  // Division by zero gives none.
  static std::optional<Decimal> divide(const Decimal& dividend, const Decimal& divisor);

  Decimal& operator+=(const Decimal& other) { return *this = *this + other; }

  // Rounded half away from zero to `places` digits after the point, and written with exactly that many
  // (12.345 gives 12.35, 12.3 gives 12.30, and with none 12.5 gives 13). A value too large to carry that
  // many places in 38 digits is left as it is.
  Decimal rounded(int places) const;

  // Compares values, not representations: 12.30 == 12.3, and -0 == 0.
  friend std::strong_ordering operator<=>(const Decimal& a, const Decimal& b);
  friend bool operator==(const Decimal& a, const Decimal& b) { return (a <=> b) == 0; }

  // Same value and same exponent (12.30 is not identical to 12.3).
  bool isIdenticalTo(const Decimal& other) const;

 private:
  Decimal(unsigned __int128 coefficient, int exponent, bool negative)
      : coefficient_(coefficient), exponent_(exponent), negative_(negative) {}

  unsigned __int128 coefficient_ = 0;
  int exponent_ = 0;
  bool negative_ = false;
};

class QDebug;
// Writes "Decimal(12.30)".
QDebug operator<<(QDebug debug, const Decimal& value);

Q_DECLARE_METATYPE(Decimal)
