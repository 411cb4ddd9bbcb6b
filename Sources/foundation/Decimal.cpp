#include "Decimal.h"

#include "WideUnsigned.h"

#include <QByteArray>
#include <QDebug>

#include <algorithm>
#include <array>
#include <bit>
#include <charconv>
#include <cmath>
#include <limits>
#include <type_traits>

namespace {

using wide::u128;
using wide::U256;
using wide::u64;

constexpr int kPrec = Decimal::kPrecision;
// The default exponent range of the General Decimal Arithmetic context (and of Python's decimal).
constexpr int kEmax = 999999;
constexpr int kEmin = -999999;
constexpr int kEtiny = kEmin - kPrec + 1;  // exponent of the smallest subnormal
constexpr int kEtop = kEmax - kPrec + 1;   // largest exponent of a full-length coefficient

constexpr std::array<u128, kPrec + 1> kPow10 = [] {
  std::array<u128, kPrec + 1> table{};
  table[0] = 1;
  for (std::size_t i = 1; i < table.size(); ++i) table[i] = table[i - 1] * 10;
  return table;
}();
constexpr u128 kCoefficientLimit = kPow10[kPrec];  // first value with too many digits

constexpr int kWidestDigits = 77;
constexpr std::array<U256, kWidestDigits + 1> kWidePow10 = [] {
  std::array<U256, kWidestDigits + 1> table{};
  table[0] = U256::from(1);
  for (std::size_t i = 1; i < table.size(); ++i) {
    table[i] = table[i - 1];
    table[i].multiplySmall(10);
  }
  return table;
}();

// Decimal digits of the value; zero counts as one digit.
int digitCount(u128 value);

int digitCount(const U256& value) {
  if (value.fitsU128()) return digitCount(value.low());
  // bits * log10(2) is within one of the answer; the table settles it.
  int n = std::min((value.bitLength() * 1233) >> 12, kWidestDigits);
  while (n < kWidestDigits && value.compare(kWidePow10[n]) >= 0) ++n;
  while (n > 1 && value.compare(kWidePow10[n - 1]) < 0) --n;
  return n;
}

int digitCount(u128 value) {
  if (value < 10) return 1;
  if (value >= kCoefficientLimit) return kPrec + 1;  // the most a u128 holds
  const int bits =
      128 - (u64(value >> 64) ? std::countl_zero(u64(value >> 64)) : 64 + std::countl_zero(u64(value)));
  int n = std::min((bits * 1233) >> 12, kPrec);
  while (n < kPrec && value >= kPow10[n]) ++n;
  while (n > 1 && value < kPow10[n - 1]) --n;
  return n;
}

// value * 10^n for n up to 77 - digits(value).
U256 scaledUp(u128 value, long long n) {
  U256 r = U256::product(value, kPow10[std::min<long long>(n, kPrec)]);
  for (n -= kPrec; n > 0; n -= 19) r.multiplySmall(u64(kPow10[std::min<long long>(n, 19)]));
  return r;
}

// value / 10^n, truncated.
U256 scaledDown(U256 value, long long n) {
  if (value.fitsU128()) return U256::from(n > kPrec ? 0 : value.low() / kPow10[n]);
  for (; n > 0 && !value.isZero(); n -= 19) value.divideSmall(u64(kPow10[std::min<long long>(n, 19)]));
  return value;
}

// A decimal taken apart, for the arithmetic below.
struct Parts {
  u128 coefficient = 0;
  int exponent = 0;
  bool negative = false;
};

Parts saturated(bool negative) {
  return {kCoefficientLimit - 1, kEtop, negative};
}

// Rounds an exact result to kPrec digits, half away from zero, and brings its exponent into range.
// Only the first dropped digit decides the rounding, so the digits below it need not be kept.
Parts finish(U256 coefficient, long long exponent, bool negative) {
  // Most money results already fit: at most kPrec digits at an exponent well inside the range.
  if (coefficient.fitsU128() && coefficient.low() < kCoefficientLimit && exponent >= kEtiny &&
      exponent <= kEtop)
    return {coefficient.low(), int(exponent), negative};
  if (coefficient.isZero()) return {0, int(std::clamp<long long>(exponent, kEtiny, kEmax)), negative};
  const int length = digitCount(coefficient);
  long long minimum = length + exponent - kPrec;  // the exponent that leaves exactly kPrec digits
  if (minimum > kEtop) return saturated(negative);
  minimum = std::max<long long>(minimum, kEtiny);
  if (exponent >= minimum) return {coefficient.low(), int(exponent), negative};

  const long long drop = minimum - exponent;
  u128 kept = 0;
  bool roundUp = false;
  if (drop <= 19) {  // the dropped digits fit one word: a single division
    const u64 dropped = coefficient.divideSmall(u64(kPow10[drop]));
    roundUp = dropped >= 5 * u64(kPow10[drop - 1]);
    kept = coefficient.low();
  } else if (drop <= length) {
    coefficient = scaledDown(coefficient, drop - 1);
    roundUp = coefficient.divideSmall(10) >= 5;
    kept = coefficient.low();
  }
  if (roundUp && ++kept == kCoefficientLimit) {
    kept = kPow10[kPrec - 1];
    if (++minimum > kEtop) return saturated(negative);
  }
  return {kept, int(minimum), negative};
}

Parts add(Parts x, Parts y) {
  const long long exponent = std::min(x.exponent, y.exponent);
  if (x.coefficient == 0 && y.coefficient == 0) return finish(U256{}, exponent, x.negative && y.negative);
  if (x.coefficient == 0 || y.coefficient == 0) {
    const Parts& value = x.coefficient == 0 ? y : x;
    // Zeros padded beyond the precision would only be rounded away again.
    const long long target = std::max<long long>(exponent, value.exponent - kPrec - 1);
    return finish(scaledUp(value.coefficient, value.exponent - target), target, value.negative);
  }

  Parts& high = x.exponent < y.exponent ? y : x;  // the operand with the larger exponent
  Parts& low = x.exponent < y.exponent ? x : y;
  // An operand lying wholly below the rounding position of the other counts like any amount that small:
  // one unit just below that position stands in for it, which keeps the aligned numbers short.
  const long long floor = high.exponent + std::min(-1, digitCount(high.coefficient) - kPrec - 2);
  if (digitCount(low.coefficient) + low.exponent - 1 < floor) {
    low.coefficient = 1;
    low.exponent = int(floor);
  }
  U256 big = scaledUp(high.coefficient, (long long)high.exponent - low.exponent);
  U256 small = U256::from(low.coefficient);
  if (high.negative == low.negative) {
    big.add(small);
    return finish(big, low.exponent, high.negative);
  }
  const int order = big.compare(small);
  if (order == 0) return finish(U256{}, exponent, false);  // x - x is a positive zero
  if (order > 0) {
    big.subtract(small);
    return finish(big, low.exponent, high.negative);
  }
  small.subtract(big);
  return finish(small, low.exponent, low.negative);
}

// Divides by 10 as often as it divides evenly, at most `room` times; returns how often.
long long stripZeros(U256& value, long long room) {
  long long stripped = 0;
  auto tryStrip = [&](int digits) {
    if (room - stripped < digits) return false;
    U256 quotient = value;
    if (quotient.divideSmall(u64(kPow10[digits])) != 0) return false;
    value = quotient;
    stripped += digits;
    return true;
  };
  while (tryStrip(19)) {
  }
  for (int digits : {16, 8, 4, 2, 1}) tryStrip(digits);  // fewer than 19 left: binary steps find them
  return stripped;
}

Parts divide(const Parts& x, const Parts& y) {
  const bool negative = x.negative != y.negative;
  const long long ideal = (long long)x.exponent - y.exponent;
  if (x.coefficient == 0) return finish(U256{}, ideal, negative);
  // Widen the dividend so that the quotient has kPrec + 1 or kPrec + 2 digits: enough to round.
  const int shift = digitCount(y.coefficient) - digitCount(x.coefficient) + kPrec + 1;
  U256 quotient = scaledUp(x.coefficient, shift);
  long long exponent = ideal - shift;
  // An exact quotient keeps no more trailing zeros than the ideal exponent asks for (90 / 60 = 1.5).
  if (quotient.divide(y.coefficient) == 0) exponent += stripZeros(quotient, shift);
  return finish(quotient, exponent, negative);
}

bool isBlank(char16_t c) {
  return QChar(c).isSpace();
}
bool isBlank(char c) {
  return QChar::fromLatin1(c).isSpace();
}

// Exponents in text are read up to this magnitude; anything beyond is far outside the range anyway.
constexpr long long kExponentTextLimit = 1'000'000'000'000'000LL;

// [sign] (digits [. [digits]] | . digits) [(e|E) [sign] digits], with blanks around it. Digits beyond
// the precision are rounded half away from zero.
template <typename Char>
std::optional<Parts> parse(const Char* text, qsizetype size) {
  qsizetype i = 0, end = size;
  while (i < end && isBlank(text[i])) ++i;
  while (end > i && isBlank(text[end - 1])) --end;
  auto isDigit = [&](qsizetype at) { return text[at] >= Char('0') && text[at] <= Char('9'); };

  bool negative = false;
  if (i < end && (text[i] == Char('+') || text[i] == Char('-'))) negative = text[i++] == Char('-');
  const qsizetype mantissaBegin = i;
  long long digits = 0, fractionDigits = 0;
  bool point = false;
  for (; i < end; ++i) {
    if (isDigit(i)) {
      ++digits;
      if (point) ++fractionDigits;
    } else if (text[i] == Char('.') && !point) {
      point = true;
    } else {
      break;
    }
  }
  const qsizetype mantissaEnd = i;
  if (digits == 0) return std::nullopt;

  long long exponent = 0;
  if (i < end && (text[i] == Char('e') || text[i] == Char('E'))) {
    ++i;
    bool negativeExponent = false;
    if (i < end && (text[i] == Char('+') || text[i] == Char('-'))) negativeExponent = text[i++] == Char('-');
    const qsizetype exponentBegin = i;
    for (; i < end && isDigit(i); ++i)
      exponent = std::min(exponent * 10 + (text[i] - Char('0')), kExponentTextLimit);
    if (i == exponentBegin) return std::nullopt;
    if (negativeExponent) exponent = -exponent;
  }
  if (i != end) return std::nullopt;
  exponent -= fractionDigits;

  // The significant digits start after the leading zeros.
  qsizetype first = mantissaBegin;
  long long length = digits;
  for (; first < mantissaEnd && (text[first] == Char('0') || text[first] == Char('.')); ++first)
    if (text[first] == Char('0')) --length;
  if (length == 0) return Parts{0, int(std::clamp<long long>(exponent, kEtiny, kEmax)), negative};

  long long minimum = length + exponent - kPrec;
  if (minimum > kEtop) return std::nullopt;
  minimum = std::max<long long>(minimum, kEtiny);
  const bool rounds = exponent < minimum;
  const long long keep = rounds ? length - (minimum - exponent) : length;
  u128 coefficient = 0;
  int firstDropped = 0;
  long long taken = 0;
  for (qsizetype at = first; at < mantissaEnd && taken <= keep; ++at) {
    if (text[at] == Char('.')) continue;
    const int digit = int(text[at] - Char('0'));
    if (taken++ < keep)
      coefficient = coefficient * 10 + u128(digit);
    else
      firstDropped = digit;
  }
  if (!rounds) return Parts{coefficient, int(exponent), negative};
  if (firstDropped >= 5 && ++coefficient == kCoefficientLimit) {
    coefficient = kPow10[kPrec - 1];
    if (++minimum > kEtop) return std::nullopt;
  }
  return Parts{coefficient, int(minimum), negative};
}

// Writes the coefficient's digits to the end of buffer; returns where they start.
char* writeDigits(u128 value, char* end) {
  char* p = end;
  // A 128-bit division is a library call, a 64-bit one an instruction: a wide coefficient (a cost at
  // full precision has 38 digits) is cut into runs of nineteen digits, each written in 64 bits.
  constexpr std::uint64_t kRun = 10'000'000'000'000'000'000ULL;
  while (value > std::numeric_limits<std::uint64_t>::max()) {
    auto run = static_cast<std::uint64_t>(value % kRun);
    value /= kRun;
    for (int digit = 0; digit < 19; ++digit) {
      *--p = char('0' + int(run % 10));
      run /= 10;
    }
  }
  auto narrow = static_cast<std::uint64_t>(value);
  do {
    *--p = char('0' + int(narrow % 10));
    narrow /= 10;
  } while (narrow != 0);
  return p;
}

// Lets QVariant find the type by name and read it as text or as a double.
[[maybe_unused]] const bool kMetaTypeRegistered = [] {
  qRegisterMetaType<Decimal>();
  QMetaType::registerConverter<Decimal, QString>(&Decimal::toString);
  QMetaType::registerConverter<Decimal, double>(&Decimal::toDouble);
  return true;
}();

}  // namespace

// Negated in unsigned arithmetic so that INT64_MIN works too.
Decimal::Decimal(std::int64_t value)
    : coefficient_(value < 0 ? u128(u64(0) - u64(value)) : u128(value)), negative_(value < 0) {}

std::optional<Decimal> Decimal::fromString(QStringView text) {
  const std::optional<Parts> parts = parse(text.utf16(), text.size());
  if (!parts) return std::nullopt;
  return Decimal(parts->coefficient, parts->exponent, parts->negative);
}

std::optional<Decimal> Decimal::fromDouble(double value) {
  if (!std::isfinite(value)) return std::nullopt;
  char buffer[64];
  const auto written = std::to_chars(buffer, buffer + sizeof buffer, value);
  const std::optional<Parts> parts = parse(buffer, written.ptr - buffer);
  if (!parts) return std::nullopt;
  return Decimal(parts->coefficient, parts->exponent, parts->negative);
}

std::optional<Decimal> Decimal::fromVariant(const QVariant& value) {
  if (!value.isValid()) return std::nullopt;
  if (value.metaType() == QMetaType::fromType<Decimal>()) return value.value<Decimal>();
  switch (value.typeId()) {
    case QMetaType::Bool:
      return Decimal(value.toBool() ? 1 : 0);
    case QMetaType::Int:
    case QMetaType::Long:
    case QMetaType::LongLong:
    case QMetaType::Short:
    case QMetaType::SChar:
    case QMetaType::Char:
      return Decimal(std::int64_t(value.toLongLong()));
    case QMetaType::UInt:
    case QMetaType::ULong:
    case QMetaType::ULongLong:
    case QMetaType::UShort:
    case QMetaType::UChar:
      return Decimal(u128(value.toULongLong()), 0, false);
    case QMetaType::Double:
      return fromDouble(value.toDouble());
    case QMetaType::Float: {
      // The float's own shortest text: 0.1f is 0.1, not 0.100000001490116...
      const float single = value.toFloat();
      if (!std::isfinite(single)) return std::nullopt;
      char buffer[64];
      const auto written = std::to_chars(buffer, buffer + sizeof buffer, single);
      const std::optional<Parts> parts = parse(buffer, written.ptr - buffer);
      if (!parts) return std::nullopt;
      return Decimal(parts->coefficient, parts->exponent, parts->negative);
    }
    case QMetaType::QString:
      return fromString(value.toString());
    case QMetaType::QByteArray: {
      const QByteArray bytes = value.toByteArray();
      const std::optional<Parts> parts = parse(bytes.constData(), bytes.size());
      if (!parts) return std::nullopt;
      return Decimal(parts->coefficient, parts->exponent, parts->negative);
    }
    default:
      return std::nullopt;
  }
}

Decimal Decimal::rounded(int places) const {
  const long long target = -static_cast<long long>(places);
  if (exponent_ >= target) {
    // Zeros appended, as long as the coefficient keeps to the precision.
    const long long grow = exponent_ - target;
    if (grow > kPrec || (coefficient_ != 0 && digitCount(coefficient_) + grow > kPrec)) return *this;
    return Decimal(coefficient_ * kPow10[grow], int(target), negative_);
  }
  const long long drop = target - exponent_;
  if (drop > kPrec) return Decimal(0, int(target), negative_);  // below half a unit of the last place
  const u128 unit = kPow10[drop];
  u128 kept = coefficient_ / unit;
  if (coefficient_ - kept * unit >= unit / 2) ++kept;  // the remainder, without a second division
  return Decimal(kept, int(target), negative_);
}

QString Decimal::toString() const {
  char buffer[kPrec + 1];
  char* const end = buffer + sizeof buffer;
  const char* digits = writeDigits(coefficient_, end);
  const qsizetype length = end - digits;
  const bool minus = isNegative();
  QString text;
  if (exponent_ >= 0) {
    if (coefficient_ == 0) return QStringLiteral("0");  // 0E+2 is plain "0"
    text.reserve(minus + length + exponent_);
    if (minus) text += QLatin1Char('-');
    text += QLatin1StringView(digits, length);
    text += QString(exponent_, QLatin1Char('0'));
    return text;
  }
  const qsizetype places = -qsizetype(exponent_);
  text.reserve(minus + std::max(length, places + 1) + 1);
  if (minus) text += QLatin1Char('-');
  if (length > places) {
    text += QLatin1StringView(digits, length - places);
    text += QLatin1Char('.');
    text += QLatin1StringView(digits + (length - places), places);
  } else {
    text += QLatin1StringView("0.");
    text += QString(places - length, QLatin1Char('0'));
    text += QLatin1StringView(digits, length);
  }
  return text;
}

double Decimal::toDouble() const {
  // "<digits>e<exponent>" read back by from_chars is correctly rounded.
  char buffer[kPrec + 16];
  char* p = buffer;
  if (isNegative()) *p++ = '-';
  char digits[kPrec + 1];
  const char* first = writeDigits(coefficient_, digits + sizeof digits);
  p = std::copy(first, static_cast<const char*>(digits + sizeof digits), p);
  *p++ = 'e';
  p = std::to_chars(p, buffer + sizeof buffer, exponent_).ptr;
  double value = 0;
  const auto read = std::from_chars(buffer, p, value);
  if (read.ec == std::errc::result_out_of_range) {
    const bool huge = digitCount(coefficient_) + exponent_ > 0;
    value = huge ? std::numeric_limits<double>::infinity() : 0.0;
    if (isNegative()) value = -value;
  }
  return value;
}

std::int64_t Decimal::toInt64() const {
  if (coefficient_ == 0) return 0;
  const u128 limit = u128(std::numeric_limits<std::int64_t>::max()) + (negative_ ? 1 : 0);
  u128 magnitude;
  if (exponent_ >= 0) {
    if (exponent_ > 19 || (coefficient_ >> 64) != 0) {
      magnitude = limit;
    } else {
      magnitude = coefficient_ * kPow10[exponent_];  // < 2^64 * 10^19, no overflow
    }
  } else {
    magnitude = exponent_ < -kPrec ? 0 : coefficient_ / kPow10[-exponent_];
  }
  magnitude = std::min(magnitude, limit);
  return negative_ ? std::int64_t(u64(0) - u64(magnitude)) : std::int64_t(magnitude);
}

Decimal Decimal::operator-() const {
  // The negation of a zero is a positive zero, as in the decimal arithmetic rules.
  return Decimal(coefficient_, exponent_, coefficient_ != 0 && !negative_);
}

Decimal operator+(const Decimal& a, const Decimal& b) {
  const Parts r = add({a.coefficient_, a.exponent_, a.negative_}, {b.coefficient_, b.exponent_, b.negative_});
  return Decimal(r.coefficient, r.exponent, r.negative);
}

Decimal operator-(const Decimal& a, const Decimal& b) {
  const Parts r =
      add({a.coefficient_, a.exponent_, a.negative_}, {b.coefficient_, b.exponent_, !b.negative_});
  return Decimal(r.coefficient, r.exponent, r.negative);
}

Decimal operator*(const Decimal& a, const Decimal& b) {
  const Parts r = finish(U256::product(a.coefficient_, b.coefficient_), (long long)a.exponent_ + b.exponent_,
                         a.negative_ != b.negative_);
  return Decimal(r.coefficient, r.exponent, r.negative);
}

std::optional<Decimal> Decimal::divide(const Decimal& dividend, const Decimal& divisor) {
  if (divisor.coefficient_ == 0) return std::nullopt;
  const Parts r = ::divide({dividend.coefficient_, dividend.exponent_, dividend.negative_},
                           {divisor.coefficient_, divisor.exponent_, divisor.negative_});
  return Decimal(r.coefficient, r.exponent, r.negative);
}

std::strong_ordering operator<=>(const Decimal& a, const Decimal& b) {
  const bool aNegative = a.isNegative(), bNegative = b.isNegative();
  if (aNegative != bNegative) return aNegative ? std::strong_ordering::less : std::strong_ordering::greater;
  // Same sign from here: compare magnitudes, reversed for negatives.
  std::strong_ordering magnitude = std::strong_ordering::equal;
  if (a.coefficient_ == 0 || b.coefficient_ == 0) {
    magnitude = (a.coefficient_ != 0) <=> (b.coefficient_ != 0);
  } else {
    const int aAdjusted = digitCount(a.coefficient_) + a.exponent_;
    const int bAdjusted = digitCount(b.coefficient_) + b.exponent_;
    if (aAdjusted != bAdjusted) {
      magnitude = aAdjusted <=> bAdjusted;
    } else if (a.exponent_ >= b.exponent_) {
      // Equal leading positions: the one with the larger exponent, widened, has at most 38 digits.
      magnitude = a.coefficient_ * kPow10[a.exponent_ - b.exponent_] <=> b.coefficient_;
    } else {
      magnitude = a.coefficient_ <=> b.coefficient_ * kPow10[b.exponent_ - a.exponent_];
    }
  }
  return aNegative ? 0 <=> magnitude : magnitude;
}

bool Decimal::isIdenticalTo(const Decimal& other) const {
  return exponent_ == other.exponent_ && *this == other;
}

QDebug operator<<(QDebug debug, const Decimal& value) {
  QDebugStateSaver saver(debug);
  debug.nospace().noquote() << "Decimal(" << value.toString() << ')';
  return debug;
}
