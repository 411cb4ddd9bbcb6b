#include "Decimal.h"
#include "WTReportFilters.h"

#include <gtest/gtest.h>

#include <unicode/locid.h>

namespace {

QVariant dec(const char* text) {
  return QVariant::fromValue(*Decimal::fromString(QString::fromLatin1(text)));
}

TEST(WTReportFilters, DigiclockWritesMinutesAndDecimalWritesMoneyOfNumbersOnly) {
  // Money text depends on the locale, and its formatter is made on first use.
  UErrorCode status = U_ZERO_ERROR;
  icu::Locale::setDefault(icu::Locale("en_US"), status);
  ASSERT_TRUE(U_SUCCESS(status));
  struct Case {
    const char* filter;
    QVariant value;
    const char* text;  // null: no value at all
  };
  const Case cases[] = {
      {"digiclock", 90, "01:30"},
      {"digiclock", 0, "00:00"},
      {"digiclock", 6000, "100:00"},
      {"digiclock", -90, "0-1:0-30"},
      {"digiclock", 2.9, "00:02"},
      {"digiclock", dec("61.9"), "01:01"},
      {"digiclock", QStringLiteral("125 min"), "02:05"},
      {"digiclock", QStringLiteral("abc"), "00:00"},
      {"digiclock", true, "00:01"},
      {"decimal", dec("1234.5"), "1,234.50"},
      {"decimal", dec("-0.005"), "-0.01"},
      {"decimal", 1234567, "1,234,567.00"},
      {"decimal", 0.1, "0.10"},
      {"decimal", QStringLiteral("12"), nullptr},  // not a number
      {"uppercase", QStringLiteral("x"), nullptr},
  };
  WTReportFilters filters;
  EXPECT_EQ(filters.filters(), (QStringList{QStringLiteral("digiclock"), QStringLiteral("decimal")}));
  for (const Case& c : cases) {
    const QVariant text = c.text ? QVariant(QString::fromUtf8(c.text)) : QVariant();
    EXPECT_EQ(filters.filterInvoked(QString::fromLatin1(c.filter), {}, c.value), text)
        << c.filter << " of " << c.value.toString().toStdString();
  }
}

}  // namespace
