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

// "money" takes its currency from a variable, else as written; without one, two places as "decimal". A
// rate keeps the places it has beyond the currency's: the yen's 85.5, a cent's fraction. One filter writes
// every row, as in a report: an amount written before in another currency or as a rate is written anew.
TEST_F(WTReportFiltersTest, DurationsAndMoneyAreWrittenOfNumbersOnly) {
  GXTemplateEngine engine;
  engine.setObject(QStringLiteral("JPY"), QStringLiteral("currency"));
  WTReportFilters filters;
  WTMoneyFilter money(&engine);
  const struct {
    const char* filter;
    QVariant value;
    QStringList args;
    const char* text;  // null: no value at all
  } cases[] = {        // clang-format off
      {"digiclock", 90, {}, "01:30"}, {"digiclock", 2.9, {}, "00:02"}, {"digiclock", dec("61.9"), {}, "01:01"},
      {"digiclock", QStringLiteral("125 min"), {}, "02:05"}, {"digiclock", QStringLiteral("abc"), {}, "00:00"},
      {"digiclock", true, {}, "00:01"}, {"decimal", dec("1234.5"), {}, "1,234.50"},
      {"decimal", 1234567, {}, "1,234,567.00"}, {"decimal", 0.1, {}, "0.10"},
      {"decimal", QStringLiteral("12"), {}, nullptr}, {"uppercase", QStringLiteral("x"), {}, nullptr},
      {"money", dec("1234.5"), {"EUR"}, "1,234.50"}, {"money", dec("1234.5"), {"currency"}, "1,235"},
      {"money", dec("-1.2345"), {"KWD"}, "-1.235"}, {"money", dec("2.345"), {}, "2.35"},
      {"money", dec("2.345"), {"client.none"}, "2.35"}, {"money", QStringLiteral("12"), {"EUR"}, nullptr},
      {"rate", dec("85.50"), {"currency"}, "85.5"}, {"rate", dec("12.345"), {"EUR"}, "12.345"},
      {"rate", dec("2"), {"KWD"}, "2.000"}, {"money", dec("12.345"), {"EUR"}, "12.35"}};
  // clang-format on
  for (const auto& c : cases) {
    const std::string_view name = c.filter;  // "money" and "rate" are the money filter's
    GXTemplateFilter& filter =
        name == "money" || name == "rate" ? static_cast<GXTemplateFilter&>(money) : filters;
    EXPECT_EQ(filter.filterInvoked(QString::fromLatin1(c.filter), c.args, c.value),
              c.text ? QVariant(QString::fromUtf8(c.text)) : QVariant())
        << c.filter << " of " << c.value.toString().toStdString() << " " << c.args.join(' ').toStdString();
  }
}

}  // namespace
