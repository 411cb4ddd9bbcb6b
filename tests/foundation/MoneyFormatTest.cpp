#include "MoneyFormat.h"

#include <gtest/gtest.h>

#include <unicode/dcfmtsym.h>
#include <unicode/decimfmt.h>

#include <random>
#include <string>
#include <vector>

namespace {

// What ICU's own formatter writes for "#,##0.00", half away from zero, in `locale`.
QString byIcu(const QString& plain, const icu::Locale& locale) {
  UErrorCode status = U_ZERO_ERROR;
  icu::DecimalFormat format(icu::UnicodeString(u"#,##0.00"), icu::DecimalFormatSymbols(locale, status), status);
  format.setRoundingMode(icu::DecimalFormat::kRoundHalfUp);
  const QByteArray digits = plain.toLatin1();
  icu::UnicodeString text;
  format.format(icu::StringPiece(digits.constData(), int32_t(digits.size())), text, nullptr, status);
  EXPECT_TRUE(U_SUCCESS(status)) << u_errorName(status);
  return QString(reinterpret_cast<const QChar*>(text.getBuffer()), text.length());
}

// Amounts are written without ICU where they can be; whatever the way, the text must be ICU's to the
// character: ties and carries at the second place, grouping (also where a locale groups only from five
// digits), locales with other signs, other digits or another minus, and negative amounts.
TEST(MoneyFormat, EveryAmountReadsAsIcuWritesItInEveryLocale) {
  std::vector<QString> amounts = {"0",        "0.004",       "0.005",         "0.125",     "0.1249999",
                                  "9.995",    "999.995",     "999999.999",    "1234",      "12345.675",
                                  "1000",     "100000.5",    "1234567890123.455", "7E+3", "-0.001",
                                  "-1234.565", "-9.995",      "0.00000000001", "1.2"};
  std::mt19937_64 random(3);
  for (int i = 0; i < 300; ++i) {
    const long long coefficient = std::uniform_int_distribution<long long>(0, 99999999999LL)(random);
    const int places = std::uniform_int_distribution<int>(0, 6)(random);
    QString text = QString::number(coefficient);
    if (places > 0) {
      text = text.rightJustified(places + 1, u'0');
      text.insert(text.size() - places, u'.');
    }
    if (i % 7 == 0) text.prepend(u'-');
    amounts.push_back(text);
  }
  for (const char* name : {"en_US", "de_DE", "fr_FR", "es_ES", "de_CH", "hi_IN", "sv_SE", "ar_EG", "bn_BD"}) {
    const icu::Locale locale(name);
    for (const QString& amount : amounts) {
      const std::optional<Decimal> decimal = Decimal::fromString(amount);
      ASSERT_TRUE(decimal) << amount.toStdString();
      EXPECT_EQ(MoneyFormat::format(*decimal, locale), byIcu(decimal->toString(), locale))
          << name << ' ' << amount.toStdString();
    }
  }
}

}  // namespace
