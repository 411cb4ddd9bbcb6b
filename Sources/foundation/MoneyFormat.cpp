#include "MoneyFormat.h"

#include <QVarLengthArray>

#include <unicode/dcfmtsym.h>
#include <unicode/decimfmt.h>
#include <unicode/locid.h>

#include <memory>

namespace MoneyFormat {

namespace {

QString fromUnicode(const icu::UnicodeString& text) {
  return QString(reinterpret_cast<const QChar*>(text.getBuffer()), text.length());
}

// "#,##0.00" in one locale. Amounts that are not negative, in a locale writing Latin digits, are written
// from the decimal's own digits with the locale's two signs: a report writes one amount per row, and
// ICU's formatter costs more than the rest of the row. Everything else goes through ICU.
class Formatter {
 public:
  explicit Formatter(const icu::Locale& locale) {
    UErrorCode status = U_ZERO_ERROR;
    const icu::DecimalFormatSymbols symbols(locale, status);
    if (U_FAILURE(status)) return;
    format_ = std::make_unique<icu::DecimalFormat>(icu::UnicodeString(u"#,##0.00"), symbols, status);
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
    // The whole digits and two places, with room for a carry in front.
    QVarLengthArray<char, 48> digits(wholeLength + 3);
    digits[0] = '0';
    for (qsizetype i = 0; i < wholeLength; ++i) digits[1 + i] = char(plain[i].unicode());
    for (qsizetype place = 0; place < 2; ++place) {
      const qsizetype at = point + 1 + place;
      digits[1 + wholeLength + place] = point >= 0 && at < plain.size() ? char(plain[at].unicode()) : '0';
    }
    const qsizetype third = point + 3;
    if (point >= 0 && third < plain.size() && plain[third] >= u'5') {
      qsizetype i = digits.size() - 1;
      for (; digits[i] == '9'; --i) digits[i] = '0';
      ++digits[i];
    }
    // Leading zeros go, but one digit always stays before the point.
    qsizetype first = 0;
    while (first < digits.size() - 3 && digits[first] == '0') ++first;
    const qsizetype whole = digits.size() - 2 - first;
    // Written into a buffer and made a string once: a character at a time, a string costs a call each.
    QVarLengthArray<QChar, 64> text;
    text.reserve(whole + whole / 3 * groupingSign_.size() + decimalSign_.size() + 2);
    for (qsizetype i = 0; i < whole; ++i) {
      if (i > 0 && (whole - i) % 3 == 0) text.append(groupingSign_.constData(), groupingSign_.size());
      text.append(QLatin1Char(digits[first + i]));
    }
    text.append(decimalSign_.constData(), decimalSign_.size());
    text.append(QLatin1Char(digits[digits.size() - 2]));
    text.append(QLatin1Char(digits[digits.size() - 1]));
    return QString(text.constData(), text.size());
  }

  std::unique_ptr<icu::DecimalFormat> format_;
  bool latinDigits_ = false;
  QString decimalSign_;
  QString groupingSign_;
};

}  // namespace

QString format(const Decimal& amount) {
  // Made once, in the locale of the first use.
  static const Formatter formatter(icu::Locale::getDefault());
  return formatter.format(amount);
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

}  // namespace MoneyFormat
