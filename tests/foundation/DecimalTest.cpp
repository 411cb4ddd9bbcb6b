#include "Decimal.h"

#include <gtest/gtest.h>

#include <QDate>
#include <QFile>
#include <QVariant>

#include <cmath>
#include <limits>
#include <ostream>
#include <string>
#include <vector>

// Failure messages show the plain text and the exponent.
void PrintTo(const Decimal& value, std::ostream* out) {
  *out << value.toString().toStdString() << " (exponent " << value.exponent() << ")";
}

namespace {

Decimal dec(const char* text) {
  const std::optional<Decimal> value = Decimal::fromString(QString::fromUtf8(text));
  EXPECT_TRUE(value.has_value()) << "does not parse: " << text;
  return value.value_or(Decimal());
}

// Sign and coefficient digits, read back from the plain text and the exponent.
std::string coefficientDigits(const Decimal& value) {
  std::string digits;
  for (char c : value.toString().toStdString())
    if (c != '-' && c != '.') digits += c;
  if (value.exponent() > 0 && !value.isZero())
    digits.erase(digits.size() - std::min(digits.size(), std::size_t(value.exponent())));
  const std::size_t first = std::min(digits.find_first_not_of('0'), digits.size() - 1);
  return (value.isNegative() ? "-" : "") + digits.substr(first);
}

// One line of decimal_vectors.tsv: an operation, its operands and Python's answer.
struct Vector {
  int line = 0;
  std::string op, a, b, plain, exponent;
};

std::vector<Vector> loadVectors(const std::string& op) {
  QFile file(QStringLiteral(TESSAL_TEST_DATA_DIR "/decimal_vectors.tsv"));
  EXPECT_TRUE(file.open(QIODevice::ReadOnly | QIODevice::Text)) << file.fileName().toStdString();
  std::vector<Vector> vectors;
  for (int line = 1; !file.atEnd(); ++line) {
    const QByteArray text = file.readLine().trimmed();
    if (text.isEmpty() || text.startsWith('#')) continue;
    const QList<QByteArray> f = text.split('\t');
    EXPECT_EQ(f.size(), 5) << "line " << line;
    if (f.size() == 5 && f[0].toStdString() == op)
      vectors.push_back(
          {line, op, f[1].toStdString(), f[2].toStdString(), f[3].toStdString(), f[4].toStdString()});
  }
  return vectors;
}

std::optional<Decimal> apply(const std::string& op, const Decimal& a, const Decimal& b) {
  if (op == "add") return a + b;
  if (op == "sub") return a - b;
  if (op == "mul") return a * b;
  if (op == "round") return a.rounded(int(b.toInt64()));  // to b places
  return Decimal::divide(a, b);
}

class DecimalVectorTest : public ::testing::TestWithParam<const char*> {};

TEST_P(DecimalVectorTest, AgreesWithPythonsDecimalModule) {
  const std::string op = GetParam();
  const std::vector<Vector> vectors = loadVectors(op);
  ASSERT_GE(vectors.size(), 80u) << "too few vectors for " << op;
  for (const Vector& v : vectors) {
    SCOPED_TRACE("decimal_vectors.tsv line " + std::to_string(v.line) + ": " + v.op + " " + v.a + " " + v.b);
    if (op == "cmp") {
      const Decimal a = dec(v.a.c_str()), b = dec(v.b.c_str());
      const std::strong_ordering order = a <=> b;
      EXPECT_EQ(order < 0 ? "-1" : order > 0 ? "1" : "0", v.plain);
      EXPECT_EQ(a == b, v.plain == "0");
      EXPECT_EQ(a.isIdenticalTo(b), v.exponent == "same");
      continue;
    }
    const std::optional<Decimal> result = op == "parse" ? Decimal::fromString(QString::fromStdString(v.a))
                                                        : apply(op, dec(v.a.c_str()), dec(v.b.c_str()));
    if (v.plain == "none") {
      EXPECT_FALSE(result.has_value());
      continue;
    }
    ASSERT_TRUE(result.has_value());
    EXPECT_EQ(std::to_string(result->exponent()), v.exponent);
    if (v.plain.starts_with('~')) {
      EXPECT_EQ(coefficientDigits(*result), v.plain.substr(1));
    } else {
      EXPECT_EQ(result->toString().toStdString(), v.plain);
    }
  }
}

INSTANTIATE_TEST_SUITE_P(Decimal, DecimalVectorTest,
                         ::testing::Values("add", "sub", "mul", "div", "parse", "cmp", "round"));

// The forms people and files write; below the smallest exponent digits round away, half away from zero.
TEST(DecimalTest, ParsesNumbersAsWrittenAndKeepsTheirExponent) {
  // clang-format off
  const std::tuple<const char*, const char*, int> cases[] = {
      {"80", "80", 0}, {"-12.30", "-12.30", -2}, {"1e3", "1000", 3}, {"1E-5", "0.00001", -5},
      {".5", "0.5", -1}, {"5.", "5", 0}, {" 5 ", "5", 0}, {"\t42\n", "42", 0}, {"+7", "7", 0},
      {"-.5", "-0.5", -1}, {"1e+3", "1000", 3}, {"0.00", "0.00", -2}, {"-0", "0", 0}, {"007.50", "7.50", -2},
      {"12.5e-1", "1.25", -2}, {"0e5", "0", 5}, {"-0.00", "0.00", -2}, {"123.456E+1", "1234.56", -2},
      {"5E-38", "0.00000000000000000000000000000000000005", -38}, {"1E-999999", nullptr, -999999},
      {"1e-1000037", nullptr, -1000036}, {"0e-99999999999999999999", nullptr, -1000036},
      {"9.9999999999999999999999999999999999999E+999999", nullptr, 999962}};
  // clang-format on
  for (const auto& [text, plain, exponent] : cases) {
    const std::optional<Decimal> value = Decimal::fromString(QString::fromUtf8(text));
    ASSERT_TRUE(value.has_value()) << text;
    EXPECT_EQ(std::pair(plain ? value->toString() : QString(), value->exponent()),
              std::pair(QString::fromUtf8(plain), exponent))
        << text;
  }
  EXPECT_EQ(Decimal(std::numeric_limits<std::int64_t>::min()).toString(), "-9223372036854775808");
  EXPECT_TRUE(dec("1e-1000037").isZero() && !dec("5e-1000037").isZero());
  // clang-format off
  for (const char* text : {"", "   ", "abc", "1.2.3", "--1", "+-1", "1e", "1e+", "e5", ".", "-", "+", "NaN",
                           "nan", "Infinity", "inf", "-Infinity", "1 000", "1,5", "0x10", "1e5.5", "1_000",
                           "12abc", "1e1000000", "9.99999999999999999999999999999999999995E+999999",
                           "\xd9\xa1\xd9\xa2"})
    // clang-format on
    EXPECT_FALSE(Decimal::fromString(QString::fromUtf8(text)).has_value()) << text;
}

TEST(DecimalTest, ComparesValuesAcrossScalesAndSigns) {
  EXPECT_EQ(dec("-0"), Decimal());
  EXPECT_TRUE(dec("-0.00").isIdenticalTo(dec("0.00")));
  EXPECT_NE(dec("12.3"), dec("12.300000000000000000000000000000000001"));
  // clang-format off
  const char* ascending[] = {"-1.1E+38", "-1E+3", "-999.99", "-12.31", "-12.3", "-0.001", "0", "1E-999999", "1E-40",
                             "0.01", "0.1", "12.3", "12.300001", "99.999999999999999999999999999999999999", "100",
                             "1E+38", "1.1E+38"};
  // clang-format on
  const int count = int(std::size(ascending));
  for (int i = 0; i < count; ++i)
    for (int j = 0; j < count; ++j)
      EXPECT_EQ(dec(ascending[i]) <=> dec(ascending[j]), i <=> j) << ascending[i] << " vs " << ascending[j];
}

TEST(DecimalTest, ResultsBeyondTheLargestValueSaturateAndNegationMakesNoNegativeZero) {
  const Decimal largest = dec("9.9999999999999999999999999999999999999E+999999"), tiny = dec("1E-999999");
  for (const Decimal& result :
       {largest + largest, -(-largest * Decimal(10)), Decimal::divide(largest, dec("0.1")).value()})
    EXPECT_TRUE(result.isIdenticalTo(largest)) << result.toString().toStdString();
  EXPECT_TRUE((tiny * tiny).isIdenticalTo(dec("0E-1000036")));
  EXPECT_TRUE((-dec("12.30")).isIdenticalTo(dec("-12.30")));
  EXPECT_FALSE((-dec("-12.30")).isNegative());
  EXPECT_EQ((-dec("0.00")).toString(), QStringLiteral("0.00"));
}

TEST(DecimalTest, ConvertsToDoubleAndTruncatesToInteger) {
  // clang-format off
  const std::pair<const char*, double> doubles[] = {
      {"12.30", 12.3}, {"-0.5", -0.5}, {"0.1", 0.1}, {"1E-400", 0.0}, {"-1E+400", -HUGE_VAL},
      {"1E+308", 1e308}, {"123456789012345678901234567890123456.78", 1.2345678901234568e35}};
  // clang-format on
  for (const auto& [text, expected] : doubles) EXPECT_EQ(dec(text).toDouble(), expected) << text;
  const std::int64_t max = std::numeric_limits<std::int64_t>::max(),
                     min = std::numeric_limits<std::int64_t>::min();
  // clang-format off
  const std::pair<const char*, std::int64_t> integers[] = {
      {"12.99", 12}, {"-12.99", -12}, {"5E+3", 5000}, {"1E-50", 0}, {"-0.9", 0}, {"1E+19", max},
      {"1E+40", max}, {"-1E+19", min}, {"9223372036854775807.9", max}, {"-9223372036854775808", min},
      {"-9223372036854775809", min}, {"123456789012345678901234567890", max}};
  // clang-format on
  for (const auto& [text, expected] : integers) EXPECT_EQ(dec(text).toInt64(), expected) << text;
}

// Doubles take the shortest text that reads back; variants of numbers and numeric text read as written.
TEST(DecimalTest, FromDoubleAndVariants) {
  const qlonglong min = std::numeric_limits<qlonglong>::min();
  const qulonglong max = std::numeric_limits<qulonglong>::max();
  // clang-format off
  const std::pair<QVariant, const char*> cases[] = {
      {80.5, "80.5"}, {-2.5, "-2.5"}, {1e22, "10000000000000000000000"}, {1e-7, "0.0000001"},
      {0.30000000000000004, "0.30000000000000004"}, {100.0, "100"}, {0.1f, "0.1"}, {7, "7"}, {7u, "7"},
      {min, "-9223372036854775808"}, {max, "18446744073709551615"}, {true, "1"}, {false, "0"},
      {QStringLiteral("12.30"), "12.30"}, {QByteArray(" -5e1 "), "-50"},
      {QVariant::fromValue(dec("-0.0700")), "-0.0700"}};
  // clang-format on
  for (const auto& [variant, plain] : cases) {
    const std::optional<Decimal> value = Decimal::fromVariant(variant);
    ASSERT_TRUE(value.has_value()) << plain;
    EXPECT_EQ(value->toString(), QString::fromLatin1(plain));
    EXPECT_TRUE(variant.typeId() != QMetaType::Double || Decimal::fromDouble(variant.toDouble()) == value)
        << plain;
  }
  EXPECT_EQ(Decimal::fromDouble(5e-324)->exponent(), -324);
  for (double none : {std::nan(""), HUGE_VAL, -HUGE_VAL}) EXPECT_FALSE(Decimal::fromDouble(none).has_value());
  for (const QVariant& none : {QVariant(), QVariant(QStringLiteral("abc")), QVariant(QString()),
                               QVariant(QDate(2026, 3, 2)), QVariant(std::nan(""))})
    EXPECT_FALSE(Decimal::fromVariant(none).has_value()) << none.toString().toStdString();

  const QVariant a = QVariant::fromValue(dec("12.30"));
  EXPECT_EQ(a, QVariant::fromValue(dec("12.3")));
  EXPECT_EQ(QVariant::compare(a, QVariant::fromValue(dec("12.31"))), QPartialOrdering::Less);
  EXPECT_NE(a, QVariant(12.3));  // different types are never equal, and comparing them is safe
  EXPECT_EQ(std::pair(a.toString(), a.toDouble()), std::pair(QStringLiteral("12.30"), 12.3));
  EXPECT_EQ(QMetaType::fromName("Decimal"), QMetaType::fromType<Decimal>());
}

}  // namespace
