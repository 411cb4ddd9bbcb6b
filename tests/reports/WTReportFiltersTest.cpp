#include "Decimal.h"
#include "WTReportFilters.h"

#include <gtest/gtest.h>

#include <unicode/locid.h>

namespace {

TEST(WTReportFilters, DigiclockWritesMinutesAndDecimalWritesMoneyOfNumbersOnly) {
  UErrorCode status = U_ZERO_ERROR;  // money text follows the locale
  icu::Locale::setDefault(icu::Locale("en_US"), status);
  const auto dec = [](const char* text) {
    return QVariant::fromValue(*Decimal::fromString(QString::fromLatin1(text)));
  };
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
  EXPECT_EQ(filters.filters(), (QStringList{QStringLiteral("digiclock"), QStringLiteral("decimal")}));
  for (const auto& c : cases)
    EXPECT_EQ(filters.filterInvoked(QString::fromLatin1(c.filter), {}, c.value),
              c.text ? QVariant(QString::fromUtf8(c.text)) : QVariant())
        << c.filter << " of " << c.value.toString().toStdString();
}

}  // namespace
