#include "MoneyFormat.h"
#include "UserLocale.h"

#include <gtest/gtest.h>

#include <unicode/dcfmtsym.h>
#include <unicode/decimfmt.h>

#include <array>
#include <random>
#include <string>
#include <tuple>
#include <vector>

namespace {

// What ICU's own formatter writes for "#,##0.00" (or another number of places), half away from zero, in
// `locale`.
QString byIcu(const QString& plain, const icu::Locale& locale, int places = 2) {
  UErrorCode status = U_ZERO_ERROR;
  const std::u16string pattern = u"#,##0" + (places > 0 ? u"." + std::u16string(size_t(places), u'0') : u"");
  icu::DecimalFormat format(icu::UnicodeString(pattern.data(), int32_t(pattern.size())),
                            icu::DecimalFormatSymbols(locale, status), status);
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
  // clang-format off
  std::vector<QString> amounts = {"0", "0.004", "0.005", "0.125", "0.1249999", "9.995", "999.995", "999999.999", "1234",
                                  "12345.675", "1000", "100000.5", "1234567890123.455", "7E+3", "-0.001", "-1234.565",
                                  "-9.995", "0.00000000001", "1.2"};
  // clang-format on
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
      SCOPED_TRACE(std::string(name) + ' ' + amount.toStdString());
      const QString written = MoneyFormat::format(*decimal, locale);
      EXPECT_EQ(written, byIcu(decimal->toString(), locale));
      // A currency's places: EUR's are the two above, JPY has none and KWD three.
      for (const auto& [currency, places] : {std::pair{"EUR", 2}, {"JPY", 0}, {"KWD", 3}})
        EXPECT_EQ(MoneyFormat::format(*decimal, currency, locale), byIcu(decimal->toString(), locale, places))
            << currency;
      // What is shown reads back to the cent; an editor's exact text as the amount with its places.
      const std::optional<Decimal> cents =
          Decimal::fromString(byIcu(decimal->toString(), icu::Locale("en_US_POSIX")).remove(u','));
      EXPECT_EQ(MoneyFormat::parse(written, locale).value, cents) << written.toStdString();
      const TypedNumber::Reading exact =
          TypedNumber::read(TypedNumber::editableText(*decimal, locale), locale);
      ASSERT_TRUE(exact.value);
      EXPECT_TRUE(*exact.value == *decimal && exact.value->exponent() == std::min(decimal->exponent(), 0))
          << exact.value->toString().toStdString();
    }
  }
}

// ICU's minor units; what is billed is rounded half away from zero to them, and shown with them.
TEST(MoneyFormat, CurrenciesBillToTheirMinorUnit) {
  const UserLocale user("en_US");
  // clang-format off
  const std::tuple<const char*, int, const char*, const char*, const char*> rows[] = {
      // currency, places, amount, billed, shown
      {"EUR", 2, "12.345", "12.35", "12.35"}, {"USD", 2, "1234.5", "1234.50", "1,234.50"},
      {"JPY", 0, "1234.5", "1235", "1,235"}, {"JPY", 0, "-2.5", "-3", "-3"},
      {"KWD", 3, "0.0005", "0.001", "0.001"}, {"KWD", 3, "16.6666", "16.667", "16.667"},
      {"kwd", 3, "1", "1.000", "1.000"}, {"XQQ", 2, "0.125", "0.13", "0.13"}, {"", 2, "7", "7.00", "7.00"},
      {"EURO", 2, "0.005", "0.01", "0.01"}};
  // clang-format on
  for (const auto& [currency, places, amount, billed, shown] : rows) {
    SCOPED_TRACE(std::string(currency) + ' ' + amount);
    EXPECT_EQ(MoneyFormat::minorUnitDigits(currency), places);
    const Decimal value = *Decimal::fromString(QString::fromLatin1(amount));
    EXPECT_EQ(MoneyFormat::billed(value, currency).toString(), billed);
    EXPECT_EQ(MoneyFormat::format(value, currency), shown);
  }
  // The currency of the locale the user works in, also of one that names no country.
  for (const auto& [locale, currency] : {std::pair{"ja_JP", "JPY"}, {"en", "USD"}}) {
    const UserLocale there(locale);
    EXPECT_EQ(MoneyFormat::localeCurrency(), currency) << locale;
  }
}

// Readings in C, en_US, de_DE, fr_FR, de_CH: the amount, "x" refused with a reason, "_" blank.
TEST(MoneyFormat, TypedAmountsAreReadStrictlyInTheUsersLocale) {
  // clang-format off
  const std::pair<const char*, const char*> rows[] = {
      {"75,5", "x x 75.5 75.5 x"}, {"75.5", "75.5 75.5 x x 75.5"}, {"12,50", "x x 12.5 12.5 x"},
      {"1,250.00", "1250 1250 x x x"}, {"1.250,00", "x x 1250 x x"}, {"1\u202F250,00", "x x x 1250 x"},
      {"1\u00A0250,00", "x x x 1250 x"}, {"1 250,00", "x x x 1250 x"}, {"1\u2019250.50", "x x x x 1250.5"},
      {"1'250.50", "x x x x 1250.5"}, {"1,000", "1000 1000 1 1 x"}, {"1.000", "1 1 1000 x 1"},
      {"1,2345", "x x 1.2345 1.2345 x"}, {"12,34,567", "x x x x x"}, {"1.234.567,5", "x x 1234567.5 x x"},
      {"1,234.5,6", "x x x x x"}, {"1,,000", "x x x x x"}, {",100", "x x 0.1 0.1 x"}, {".5", "0.5 0.5 x x 0.5"},
      {"-12.5", "-12.5 -12.5 x x -12.5"}, {"\u22125", "-5 -5 -5 -5 -5"}, {" 80 ", "80 80 80 80 80"},
      {"  ", "_ _ _ _ _"}, {"$80", "80 80 x x x"}, {"80 \u20AC", "x x 80 80 x"},
      {"CHF 1\u2019250.50", "x x x x 1250.5"}, {"\u20AC", "x x x x x"}, {"abc", "x x x x x"},
      {"12abc", "x x x x x"}, {"1e3", "x x x x x"}, {"-", "x x x x x"}, {"+5", "x x x x x"},
      // One digit more than a Decimal keeps would be rounded away.
      {"1234567890123456789012345678901234567.89", "x x x x x"}};
  // clang-format on
  for (const auto& [typed, expected] : rows) {
    QStringList read;
    for (const char* name : UserLocale::kNames) {
      const UserLocale user(name);
      const TypedNumber::Reading reading = MoneyFormat::parse(QString::fromUtf8(typed));
      EXPECT_EQ(reading.taken(), reading.refusal.isEmpty()) << name << " \"" << typed << '"';
      read << (!reading.taken() ? (reading.value ? "?" : "x")
               : reading.value  ? QString::number(reading.value->toDouble(), 'g', 15)
                                : "_");
    }
    EXPECT_EQ(read.join(' '), expected) << '"' << typed << '"';
  }
  const UserLocale user("en_US");
  EXPECT_EQ(
      MoneyFormat::parse("75,5").refusal.toStdString(),
      "\u201C,\u201D only separates thousands, in groups of three digits; decimals follow \u201C.\u201D, as "
      "in 1,234.50");

  // Typed for what bills in a currency other than the locale's: its code and signs are taken, another's
  // sign is refused naming the currency; an expense finer than its currency bills is refused.
  const UserLocale german("de_DE");
  // clang-format off
  const std::tuple<const char*, const char*, bool, const char*> billedIn[] = {
      {"CHF 130,00", "CHF", false, "130"}, {"€7,00", "EUR", false, "7"}, {"1.000 ¥", "JPY", true, "1000"},
      {"120,00 €", "CHF", false, "Billed in CHF: type the amount alone or with “CHF”"},
      {"EUR 7,00", "CHF", false, "Billed in CHF: type the amount alone or with “CHF”"},
      {"$ 5,00", "EUR", false, "Billed in EUR: type the amount alone or with “€”"},
      {"1.000,50", "JPY", false, "1000.5"},  // a rate may be finer
      {"1.000,50", "JPY", true, "JPY is billed in whole units"}, {"-12,345", "EUR", true, "EUR is billed to 2 decimal places"}};
  // clang-format on
  for (const auto& [typed, currency, amount, expected] : billedIn) {
    const TypedNumber::Reading reading =
        amount ? MoneyFormat::parseAmount(QString::fromUtf8(typed), currency)
               : MoneyFormat::parse(QString::fromUtf8(typed), QString::fromLatin1(currency));
    EXPECT_EQ(reading.taken() ? QString::number(reading.value->toDouble(), 'g', 15) : reading.refusal,
              QString::fromUtf8(expected))
        << typed << " in " << currency;
  }
}

}  // namespace
