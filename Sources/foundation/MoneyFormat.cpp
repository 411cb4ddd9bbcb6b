#include "MoneyFormat.h"

#include <QCoreApplication>
#include <QHash>
#include <QRegularExpression>
#include <QVarLengthArray>

#include <unicode/dcfmtsym.h>
#include <unicode/decimfmt.h>
#include <unicode/locid.h>
#include <unicode/ucurr.h>

#include <algorithm>
#include <array>
#include <memory>

namespace MoneyFormat {

namespace {

QString fromUnicode(const icu::UnicodeString& text) {
  return QString(reinterpret_cast<const QChar*>(text.getBuffer()), text.length());
}

// "#,##0.00" (or as many places as `places` asks) in one locale. Amounts that are not negative, in a
// locale writing Latin digits, are written from the decimal's own digits with the locale's two signs: a
// report writes one amount per row, and ICU's formatter costs more than the rest of the row. Everything
// else goes through ICU.
class Formatter {
 public:
  explicit Formatter(const icu::Locale& locale, int places = 2) : places_(places) {
    UErrorCode status = U_ZERO_ERROR;
    const icu::DecimalFormatSymbols symbols(locale, status);
    if (U_FAILURE(status)) return;
    icu::UnicodeString pattern(u"#,##0");
    if (places > 0) pattern.append(u'.').append(icu::UnicodeString(places, u'0', places));
    format_ = std::make_unique<icu::DecimalFormat>(pattern, symbols, status);
    if (U_FAILURE(status)) {
      format_.reset();
      return;
    }
    format_->setRoundingMode(icu::DecimalFormat::kRoundHalfUp);
    latinDigits_ = symbols.getConstDigitSymbol(0) == icu::UnicodeString(u"0");
    decimalSign_ = fromUnicode(symbols.getSymbol(icu::DecimalFormatSymbols::kDecimalSeparatorSymbol));
    groupingSign_ = fromUnicode(symbols.getSymbol(icu::DecimalFormatSymbols::kGroupingSeparatorSymbol));
  }

  QString format(const Decimal& amount) const {
    const QString plain = amount.toString();
    if (!format_) return plain;
    if (latinDigits_ && !amount.isNegative()) return writeDirectly(plain);
    const QByteArray digits = plain.toLatin1();
    icu::UnicodeString text;
    UErrorCode status = U_ZERO_ERROR;
    format_->format(icu::StringPiece(digits.constData(), int32_t(digits.size())), text, nullptr, status);
    return U_FAILURE(status) ? plain : fromUnicode(text);
  }

 private:
  // `plain` is the decimal's text: digits, at most one point, no sign, no exponent.
  QString writeDirectly(const QString& plain) const {
    const qsizetype point = plain.indexOf(u'.');
    const qsizetype wholeLength = point < 0 ? plain.size() : point;
    // The whole digits and the places, with room for a carry in front.
    QVarLengthArray<char, 48> digits(wholeLength + places_ + 1);
    digits[0] = '0';
    for (qsizetype i = 0; i < wholeLength; ++i) digits[1 + i] = char(plain[i].unicode());
    for (qsizetype place = 0; place < places_; ++place) {
      const qsizetype at = point + 1 + place;
      digits[1 + wholeLength + place] = point >= 0 && at < plain.size() ? char(plain[at].unicode()) : '0';
    }
    const qsizetype firstDropped = point + 1 + places_;
    if (point >= 0 && firstDropped < plain.size() && plain[firstDropped] >= u'5') {
      qsizetype i = digits.size() - 1;
      for (; digits[i] == '9'; --i) digits[i] = '0';
      ++digits[i];
    }
    // Leading zeros go, but one digit always stays before the point.
    qsizetype first = 0;
    while (first < digits.size() - places_ - 1 && digits[first] == '0') ++first;
    const qsizetype whole = digits.size() - places_ - first;
    // Written into a buffer and made a string once: a character at a time, a string costs a call each.
    QVarLengthArray<QChar, 64> text;
    text.reserve(whole + whole / 3 * groupingSign_.size() + decimalSign_.size() + places_);
    for (qsizetype i = 0; i < whole; ++i) {
      if (i > 0 && (whole - i) % 3 == 0) text.append(groupingSign_.constData(), groupingSign_.size());
      text.append(QLatin1Char(digits[first + i]));
    }
    if (places_ > 0) text.append(decimalSign_.constData(), decimalSign_.size());
    for (qsizetype i = digits.size() - places_; i < digits.size(); ++i) text.append(QLatin1Char(digits[i]));
    return QString(text.constData(), text.size());
  }

  int places_;
  std::unique_ptr<icu::DecimalFormat> format_;
  bool latinDigits_ = false;
  QString decimalSign_;
  QString groupingSign_;
};

// ICU's answer is read from its resource data on every call: the few codes in use are remembered, per
// thread, so that a list of many amounts asks once.
int lookUpMinorUnitDigits(const QString& currency) {
  if (currency.size() != 3) return 2;
  const std::array<UChar, 4> code = {UChar(currency[0].toUpper().unicode()),
                                     UChar(currency[1].toUpper().unicode()),
                                     UChar(currency[2].toUpper().unicode()), 0};
  for (size_t i = 0; i < 3; ++i) {
    if (code[i] < u'A' || code[i] > u'Z') return 2;
  }
  UErrorCode status = U_ZERO_ERROR;
  const int32_t digits = ucurr_getDefaultFractionDigits(code.data(), &status);
  return U_FAILURE(status) || digits < 0 ? 2 : int(digits);
}

}  // namespace

QString format(const Decimal& amount) {
  // Made once, in the locale of the first use.
  static const Formatter formatter(icu::Locale::getDefault());
  return formatter.format(amount);
}

namespace {

QString formatWithPlaces(const Decimal& amount, int places) {
  if (places == 2) return format(amount);
  // Made once per number of places, in the default locale of their first use.
  static const std::array<Formatter, 5> formatters = {
      Formatter(icu::Locale::getDefault(), 0), Formatter(icu::Locale::getDefault(), 1),
      Formatter(icu::Locale::getDefault(), 2), Formatter(icu::Locale::getDefault(), 3),
      Formatter(icu::Locale::getDefault(), 4)};
  if (places < int(formatters.size())) return formatters[size_t(places)].format(amount);
  return Formatter(icu::Locale::getDefault(), places).format(amount);
}

}  // namespace

QString format(const Decimal& amount, const QString& currency) {
  return formatWithPlaces(amount, minorUnitDigits(currency));
}

QString formatRate(const Decimal& rate, const QString& currency) {
  int places = minorUnitDigits(currency);
  while (places < 6 && rate.rounded(places) != rate) ++places;
  return formatWithPlaces(rate, places);
}

QString format(const Decimal& amount, const QString& currency, const icu::Locale& locale) {
  return Formatter(locale, minorUnitDigits(currency)).format(amount);
}

int minorUnitDigits(const QString& currency) {
  thread_local QHash<QString, int> known;
  const auto found = known.constFind(currency);
  if (found != known.cend()) return *found;
  const int digits = lookUpMinorUnitDigits(currency);
  if (known.size() < 64) known.insert(currency, digits);
  return digits;
}

QString localeCurrency() {
  std::array<UChar, 8> code{};
  UErrorCode status = U_ZERO_ERROR;
  const int32_t length =
      ucurr_forLocale(icu::Locale::getDefault().getName(), code.data(), int32_t(code.size()), &status);
  if (U_FAILURE(status) || length != 3) return QStringLiteral("USD");
  return QString(reinterpret_cast<const QChar*>(code.data()), 3);
}

Decimal billed(const Decimal& amount, const QString& currency) {
  return amount.rounded(minorUnitDigits(currency));
}

QString format(const Decimal& amount, const icu::Locale& locale) {
  return Formatter(locale).format(amount);
}

TypedNumber::Reading parse(const QString& typed, const icu::Locale& locale) {
  return TypedNumber::read(typed, locale, true);
}

TypedNumber::Reading parse(const QString& typed) {
  return parse(typed, icu::Locale::getDefault());
}

namespace {

// The code and the signs `locale` writes `currency` with ("CHF"; "EUR", "€"; "USD", "US$", "$").
QStringList signsOf(const QString& currency, const icu::Locale& locale) {
  QStringList signs{currency};
  const std::u16string code = currency.toStdU16String();
  for (const UCurrNameStyle style : {UCURR_SYMBOL_NAME, UCURR_NARROW_SYMBOL_NAME}) {
    UErrorCode status = U_ZERO_ERROR;
    int32_t length = 0;
    const UChar* name = ucurr_getName(code.c_str(), locale.getName(), style, nullptr, &length, &status);
    const QString sign =
        U_SUCCESS(status) ? QString(reinterpret_cast<const QChar*>(name), length) : QString();
    if (!sign.isEmpty() && !signs.contains(sign)) signs.append(sign);
  }
  // The longest first: "US$" is not "$" with "US" left over.
  std::stable_sort(signs.begin(), signs.end(),
            [](const QString& a, const QString& b) { return a.size() > b.size(); });
  return signs;
}

bool namesACurrency(const QString& text) {
  static const QRegularExpression code(QStringLiteral("\\b[A-Z]{3}\\b"));
  return std::any_of(text.begin(), text.end(),
                     [](QChar c) { return c.category() == QChar::Symbol_Currency; }) ||
         code.match(text).hasMatch();
}

}  // namespace

TypedNumber::Reading parse(const QString& typed, const QString& currency, const icu::Locale& locale) {
  const QStringList signs = signsOf(currency, locale);
  TypedNumber::Reading reading = TypedNumber::read(typed, locale, signs);
  if (!reading.taken() && namesACurrency(typed)) {
    reading.refusal =
        QCoreApplication::translate("MoneyFormat", "Billed in %1: type the amount alone or with “%2”")
            .arg(currency, signs.size() > 1 ? signs.constLast() : currency);
  }
  return reading;
}

TypedNumber::Reading parseAmount(const QString& typed, const QString& currency) {
  TypedNumber::Reading reading = parse(typed, currency);
  const int places = minorUnitDigits(currency);
  if (reading.value && reading.value->rounded(places) != *reading.value) {
    reading.value.reset();
    reading.refusal =
        places == 0 ? QCoreApplication::translate("MoneyFormat", "%1 is billed in whole units").arg(currency)
                    : QCoreApplication::translate("MoneyFormat", "%1 is billed to %2 decimal places")
                          .arg(currency)
                          .arg(places);
  }
  return reading;
}

}  // namespace MoneyFormat
