#include "TypedNumber.h"

#include <QCoreApplication>
#include <QStringList>

#include <unicode/dcfmtsym.h>

#include <string>

namespace TypedNumber {

namespace {

QString fromUnicode(const icu::UnicodeString& text) {
  return QString(reinterpret_cast<const QChar*>(text.getBuffer()), text.length());
}

bool isSpaceSign(const QString& sign) {
  return sign.size() == 1 && (sign[0] == u' ' || sign[0] == u'\u00A0' || sign[0] == u'\u202F');
}

bool isApostropheSign(const QString& sign) {
  return sign.size() == 1 && (sign[0] == u'\'' || sign[0] == u'\u2019');
}

// The signs of one locale, as typing meets them.
struct Signs {
  QString decimal;
  QString grouping;  // the locale's own, for messages
  QStringList groupings;
  QStringList minuses;
  QString digits[10];
  QStringList currencies;
};

Signs makeSigns(const icu::Locale& locale) {
  Signs signs;
  UErrorCode status = U_ZERO_ERROR;
  const icu::DecimalFormatSymbols symbols(locale, status);
  if (U_FAILURE(status)) {
    signs.decimal = QStringLiteral(".");
    signs.minuses = {QStringLiteral("-")};
    return signs;
  }
  using Symbol = icu::DecimalFormatSymbols;
  signs.decimal = fromUnicode(symbols.getSymbol(Symbol::kDecimalSeparatorSymbol));
  signs.grouping = fromUnicode(symbols.getSymbol(Symbol::kGroupingSeparatorSymbol));
  // The locale's grouping sign is often one nobody can type (a narrow no-break space, a right single
  // quotation mark); what people type in its place is taken as well.
  if (isSpaceSign(signs.grouping))
    signs.groupings = {QStringLiteral(" "), QStringLiteral("\u00A0"), QStringLiteral("\u202F")};
  else if (isApostropheSign(signs.grouping))
    signs.groupings = {QStringLiteral("'"), QStringLiteral("\u2019")};
  else if (!signs.grouping.isEmpty() && signs.grouping != signs.decimal)
    signs.groupings = {signs.grouping};
  signs.minuses = {fromUnicode(symbols.getSymbol(Symbol::kMinusSignSymbol)), QStringLiteral("-"),
                   QStringLiteral("\u2212")};
  for (int digit = 0; digit < 10; ++digit)
    signs.digits[digit] = fromUnicode(symbols.getConstDigitSymbol(digit));
  for (const auto symbol : {Symbol::kCurrencySymbol, Symbol::kIntlCurrencySymbol}) {
    const QString currency = fromUnicode(symbols.getSymbol(symbol));
    if (!currency.isEmpty()) signs.currencies.append(currency);
  }
  return signs;
}

// The last locale's signs are kept: people type in one locale, and ICU takes long to gather them.
const Signs& signsOf(const icu::Locale& locale) {
  thread_local std::string name;
  thread_local Signs signs;
  if (name.empty() || name != locale.getName()) {
    signs = makeSigns(locale);
    name = locale.getName();
  }
  return signs;
}

// The sign as a message names it: quoted, or "a space".
QString nameOf(const QString& sign) {
  if (isSpaceSign(sign)) return QCoreApplication::translate("TypedNumber", "a space");
  return QStringLiteral("\u201C%1\u201D").arg(sign);
}

QString exampleWith(const Signs& signs) {
  return QStringLiteral("1") + signs.grouping + QStringLiteral("234") + signs.decimal + QStringLiteral("50");
}

Reading refused(const QString& reason) {
  return Reading{std::nullopt, reason};
}

Reading notANumber(const Signs& signs) {
  return refused(QCoreApplication::translate(
                     "TypedNumber", "Not a number: type digits, with %1 before any decimals, as in %2")
                     .arg(nameOf(signs.decimal), exampleWith(signs)));
}

Reading misgrouped(const Signs& signs) {
  return refused(QCoreApplication::translate(
                     "TypedNumber",
                     "%1 only separates thousands, in groups of three digits; decimals follow %2, as in %3")
                     .arg(nameOf(signs.grouping), nameOf(signs.decimal), exampleWith(signs)));
}

// The length of `sign` when `text` has it at `at`, else 0.
qsizetype signAt(const QString& text, qsizetype at, const QString& sign) {
  return !sign.isEmpty() && QStringView(text).mid(at).startsWith(sign) ? sign.size() : 0;
}

}  // namespace

Reading read(const QString& typed, const icu::Locale& locale, bool currency) {
  return read(typed, locale, currency ? signsOf(locale).currencies : QStringList());
}

Reading read(const QString& typed, const icu::Locale& locale, const QStringList& currencySigns) {
  QString text = typed.trimmed();
  if (text.isEmpty()) return {};
  const Signs& signs = signsOf(locale);
  for (const QString& sign : currencySigns) {
    // A currency sign alone is no amount, and is refused below as text that is not a number.
    if (text.size() > sign.size() && text.startsWith(sign)) {
      text = text.mid(sign.size()).trimmed();
      break;
    }
    if (text.size() > sign.size() && text.endsWith(sign)) {
      text.chop(sign.size());
      text = text.trimmed();
      break;
    }
  }

  qsizetype i = 0;
  bool negative = false;
  for (const QString& minus : signs.minuses) {
    if (const qsizetype length = signAt(text, 0, minus)) {
      negative = true;
      i = length;
      break;
    }
  }
  QString whole;
  QString fraction;
  bool point = false;
  QList<qsizetype> groups;  // lengths of the whole part's groups, when it is grouped
  qsizetype group = 0;
  while (i < text.size()) {
    const char16_t c = text[i].unicode();
    int digit = c >= u'0' && c <= u'9' ? int(c - u'0') : -1;
    qsizetype length = 1;
    for (int d = 0; digit < 0 && d < 10; ++d) {
      if ((length = signAt(text, i, signs.digits[d]))) digit = d;
    }
    if (digit >= 0) {
      (point ? fraction : whole) += QLatin1Char(char('0' + digit));
      if (!point) ++group;
      i += std::max<qsizetype>(length, 1);
      continue;
    }
    if ((length = signAt(text, i, signs.decimal))) {
      if (point) return notANumber(signs);
      point = true;
      i += length;
      continue;
    }
    qsizetype grouping = 0;
    for (const QString& sign : signs.groupings) {
      if ((grouping = signAt(text, i, sign))) break;
    }
    if (!grouping) return notANumber(signs);
    if (point) return misgrouped(signs);
    groups.append(group);
    group = 0;
    i += grouping;
  }
  if (!groups.isEmpty()) {
    groups.append(group);
    if (groups.first() < 1 || groups.first() > 3) return misgrouped(signs);
    for (qsizetype at = 1; at < groups.size(); ++at) {
      if (groups[at] != 3) return misgrouped(signs);
    }
  }
  if (whole.isEmpty() && fraction.isEmpty()) return notANumber(signs);

  // Digits beyond what a Decimal holds would be rounded away: a different number, so refused.
  const QString digits = whole + fraction;
  qsizetype first = 0;
  qsizetype last = digits.size();
  while (first < last && digits[first] == u'0') ++first;
  while (last > first && digits[last - 1] == u'0') --last;
  if (last - first > Decimal::kPrecision) {
    return refused(QCoreApplication::translate("TypedNumber", "Too many digits: at most %1 are kept")
                       .arg(Decimal::kPrecision));
  }
  QString plain = negative ? QStringLiteral("-") : QString();
  plain += whole.isEmpty() ? QStringLiteral("0") : whole;
  if (!fraction.isEmpty()) plain += QLatin1Char('.') + fraction;
  const std::optional<Decimal> value = Decimal::fromString(plain);
  if (!value) return notANumber(signs);
  return Reading{value, {}};
}

Reading read(const QString& typed) {
  return read(typed, icu::Locale::getDefault());
}

QString editableText(const Decimal& value, const icu::Locale& locale) {
  QString text = value.toString();
  const qsizetype point = text.indexOf(u'.');
  if (point >= 0) text.replace(point, 1, signsOf(locale).decimal);
  return text;
}

QString editableText(const Decimal& value) {
  return editableText(value, icu::Locale::getDefault());
}

QString decimalSign() {
  return signsOf(icu::Locale::getDefault()).decimal;
}

}  // namespace TypedNumber
