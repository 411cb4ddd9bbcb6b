#include "Decimal.h"
#include "GXTemplateEngine.h"
#include "WTReportFilters.h"

#include <gtest/gtest.h>

#include <unicode/locid.h>

namespace {

QVariant dec(const char* text) {
  return QVariant::fromValue(*Decimal::fromString(QString::fromLatin1(text)));
}

// Money text follows the locale.
class WTReportFiltersTest : public ::testing::Test {
 protected:
  void SetUp() override {
    UErrorCode status = U_ZERO_ERROR;
    icu::Locale::setDefault(icu::Locale("en_US"), status);
  }
};

TEST_F(WTReportFiltersTest, DigiclockWritesMinutesAndDecimalWritesMoneyOfNumbersOnly) {
  const struct {
    const char* filter;
    QVariant value;
    const char* text;  // null: no value at all
  } cases[] = {        // clang-format off
      {"digiclock", 90, "01:30"}, {"digiclock", 2.9, "00:02"}, {"digiclock", dec("61.9"), "01:01"},
      {"digiclock", QStringLiteral("125 min"), "02:05"}, {"digiclock", QStringLiteral("abc"), "00:00"},
      {"digiclock", true, "00:01"}, {"decimal", dec("1234.5"), "1,234.50"},
      {"decimal", 1234567, "1,234,567.00"}, {"decimal", 0.1, "0.10"},
      {"decimal", QStringLiteral("12"), nullptr}, {"uppercase", QStringLiteral("x"), nullptr}};
  // clang-format on
  WTReportFilters filters;
  for (const auto& c : cases)
    EXPECT_EQ(filters.filterInvoked(QString::fromLatin1(c.filter), {}, c.value),
              c.text ? QVariant(QString::fromUtf8(c.text)) : QVariant())
        << c.filter << " of " << c.value.toString().toStdString();
}

// "money" takes its currency from a variable, else as written; without one, two places as "decimal".
TEST_F(WTReportFiltersTest, MoneyWritesAnAmountInTheMinorUnitOfItsCurrency) {
  GXTemplateEngine engine;
  engine.setObject(QStringLiteral("JPY"), QStringLiteral("currency"));
  WTMoneyFilter filter(&engine);
  const struct {
    QVariant value;
    QStringList args;
    const char* text;  // null: no value at all
  } cases[] = {{dec("1234.5"), {"EUR"}, "1,234.50"},    {dec("1234.5"), {"currency"}, "1,235"},
               {dec("-1.2345"), {"KWD"}, "-1.235"},     {dec("2.345"), {}, "2.35"},
               {dec("2.345"), {"client.none"}, "2.35"}, {QStringLiteral("12"), {"EUR"}, nullptr}};
  for (const auto& c : cases)
    EXPECT_EQ(filter.filterInvoked(QStringLiteral("money"), c.args, c.value),
              c.text ? QVariant(QString::fromUtf8(c.text)) : QVariant())
        << c.value.toString().toStdString() << " " << c.args.join(' ').toStdString();
  // A rate keeps the places it has beyond the currency's: the yen's 85.5, a cent's fraction.
  const QStringList rates = {filter.filterInvoked("rate", {"currency"}, dec("85.50")).toString(),
                             filter.filterInvoked("rate", {"EUR"}, dec("12.345")).toString(),
                             filter.filterInvoked("rate", {"KWD"}, dec("2")).toString()};
  EXPECT_EQ(rates, QStringList({"85.5", "12.345", "2.000"}));
}

}  // namespace
