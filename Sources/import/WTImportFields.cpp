#include "WTImportFields.h"

#include <QRegularExpression>

#include <algorithm>

namespace {

// Reads the numbers and marks of a date, a time or a duration from left to right. Every row has three
// or four of them, so a scanner instead of a regular expression per field is most of the reading's speed.
class Scanner {
 public:
  explicit Scanner(QStringView text) : text_(text.trimmed()) {}
  // A number of minDigits to maxDigits digits, or none (and nothing read).
  std::optional<int> number(qsizetype minDigits, qsizetype maxDigits) {
    qsizetype end = at_;
    int value = 0;
    while (end < text_.size() && end - at_ < maxDigits && text_[end].isDigit() && text_[end].unicode() < 128)
      value = value * 10 + (text_[end++].unicode() - '0');
    if (end - at_ < minDigits || (end < text_.size() && text_[end].isDigit())) return std::nullopt;
    at_ = end;
    return value;
  }
  // The next character when it is one of `marks`, or a null QChar (and nothing read).
  QChar mark(QStringView marks) {
    if (at_ >= text_.size() || !marks.contains(text_[at_])) return QChar();
    return text_[at_++];
  }
  void skipSpaces() {
    while (at_ < text_.size() && text_[at_].isSpace()) ++at_;
  }
  bool atEnd() const { return at_ == text_.size(); }

 private:
  QStringView text_;
  qsizetype at_ = 0;
};

}  // namespace

namespace WTImportFields {

std::optional<QDate> parseDate(const QString& text, SlashedDates slashed, bool strictly) {
  Scanner scan(text);
  QDate date;
  if (const auto year = scan.number(4, 4)) {
    const auto month = scan.mark(u"-").isNull() ? std::nullopt : scan.number(1, 2);
    const auto day = !month || scan.mark(u"-").isNull() ? std::nullopt : scan.number(1, 2);
    if (day && scan.atEnd()) date = QDate(*year, *month, *day);
  } else if (const auto first = scan.number(1, 2)) {
    const QChar mark = scan.mark(u".-/");
    const auto second = mark.isNull() ? std::nullopt : scan.number(1, 2);
    const bool isSlashed = mark == u'/';
    const bool marked = second && !scan.mark(isSlashed ? u"/" : u".-").isNull();
    const auto year = marked ? scan.number(4, 4) : std::nullopt;
    if (year && scan.atEnd()) {
      const QDate dayFirst(*year, *second, *first), monthFirst(*year, *first, *second);
      const bool preferDay = !isSlashed || slashed == SlashedDates::DayFirst;
      date = preferDay ? dayFirst : monthFirst;
      if (isSlashed && !date.isValid() && !strictly) date = preferDay ? monthFirst : dayFirst;
      if (isSlashed && slashed == SlashedDates::OnlyOneWay && dayFirst.isValid() && monthFirst.isValid() &&
          dayFirst != monthFirst)
        date = QDate();
    }
  }
  if (!date.isValid()) return std::nullopt;
  return date;
}

std::optional<QTime> parseTime(const QString& text) {
  Scanner scan(text);
  std::optional<int> hour = scan.number(1, 2);
  if (!hour || scan.mark(u":").isNull()) return std::nullopt;
  const std::optional<int> minute = scan.number(2, 2);
  std::optional<int> second = 0;
  if (!scan.mark(u":").isNull()) second = scan.number(2, 2);
  if (!minute || !second) return std::nullopt;
  scan.skipSpaces();
  if (const QChar half = scan.mark(u"AaPp"); !half.isNull()) {
    scan.mark(u".");
    if (scan.mark(u"Mm").isNull()) return std::nullopt;
    scan.mark(u".");
    if (*hour < 1 || *hour > 12) return std::nullopt;
    hour = *hour % 12 + (half.toLower() == u'p' ? 12 : 0);
  }
  const QTime time(*hour, *minute, *second);
  if (!scan.atEnd() || !time.isValid()) return std::nullopt;
  return time;
}

std::optional<qint64> parseDuration(const QString& text) {
  Scanner scan(text);
  const std::optional<int> hours = scan.number(1, 9);
  if (!hours || scan.mark(u":").isNull()) return std::nullopt;
  const std::optional<int> minutes = scan.number(2, 2);
  std::optional<int> seconds = 0;
  if (!scan.mark(u":").isNull()) seconds = scan.number(2, 2);
  if (!minutes || !seconds || !scan.atEnd()) return std::nullopt;
  return qint64(*hours) * 3600 + *minutes * 60 + *seconds;
}

// Of two marks the last is the decimal one; a mark repeated, or one between groups of three digits beside
// the other, groups. One mark alone before three digits ("1,500", "1.500") is 1.5 in one convention and
// 1500 in the other: nothing is read, as for anything else that is not such a number ("1e3"), rather than
// take a thousandth of an amount.
std::optional<Decimal> parseNumber(const QString& text, bool* ambiguous) {
  if (ambiguous) *ambiguous = false;
  QString number = text.trimmed();
  // A sign or code before or after the figures: letters and currency symbols.
  const auto isMarking = [](QChar c) {
    return c.isLetter() || c.category() == QChar::Symbol_Currency || c.isSpace();
  };
  while (!number.isEmpty() && isMarking(number.front())) number.remove(0, 1);
  while (!number.isEmpty() && isMarking(number.back())) number.chop(1);
  const bool negative = number.startsWith(u'-');
  if (negative) number.remove(0, 1);
  // Spaces (also no-break and narrow ones) group digits in many locales, in threes as any grouping.
  if (std::any_of(number.begin(), number.end(), [](QChar c) { return c.isSpace(); })) {
    static const QRegularExpression kSpaced(QStringLiteral("^\\d{1,3}(\\s\\d{3})+([.,]\\d+)?$"),
                                            QRegularExpression::UseUnicodePropertiesOption);
    if (!kSpaced.match(number).hasMatch()) return std::nullopt;
    number.removeIf([](QChar c) { return c.isSpace(); });
  }
  if (number.isEmpty() || !number.front().isDigit() || !number.back().isDigit()) return std::nullopt;
  for (QChar c : number)
    if (!c.isDigit() && c != u'.' && c != u',') return std::nullopt;
  const qsizetype comma = number.lastIndexOf(u','), point = number.lastIndexOf(u'.');
  QChar decimal, grouping;
  if (comma >= 0 && point >= 0) {
    decimal = comma > point ? u',' : u'.';
    grouping = comma > point ? u'.' : u',';
  } else if (comma >= 0 || point >= 0) {
    const QChar mark = comma >= 0 ? u',' : u'.';
    const qsizetype at = number.indexOf(mark);
    if (number.count(mark) > 1) {
      grouping = mark;
    } else if (number.size() - at - 1 == 3 && !number.startsWith(u'0')) {
      if (ambiguous) *ambiguous = true;
      return std::nullopt;
    } else {
      decimal = mark;
    }
  }
  // Grouping marks stand only before the decimal one, between groups of three digits.
  const qsizetype decimalAt = decimal.isNull() ? number.size() : number.lastIndexOf(decimal);
  if (!decimal.isNull() && number.indexOf(decimal) != decimalAt) return std::nullopt;
  const QStringView whole = QStringView(number).first(decimalAt);
  if (!grouping.isNull()) {
    const QList<QStringView> groups = whole.split(grouping);
    if (groups.first().isEmpty() || groups.first().size() > 3) return std::nullopt;
    for (qsizetype i = 1; i < groups.size(); ++i)
      if (groups[i].size() != 3) return std::nullopt;
  }
  QString plain = whole.toString();
  if (!grouping.isNull()) plain.remove(grouping);
  if (!decimal.isNull()) plain += QLatin1Char('.') + number.sliced(decimalAt + 1);
  return Decimal::fromString(negative ? u'-' + plain : plain);
}

std::optional<Decimal> rateOfAmount(const Decimal& amount, qint64 seconds, int places) {
  if (seconds <= 0) return std::nullopt;
  const Decimal time{std::int64_t(seconds)}, hour(3600);
  const auto perHour = [&](const Decimal& cost) {
    return Decimal::divide(cost * hour, time).value_or(Decimal());
  };
  if (!amount.isNegative()) {
    // The costs that round to the amount, half a unit of its last place either side (rounding goes up
    // from the half).
    const int last = std::max(places, -amount.exponent());
    const Decimal half = *Decimal::fromString(QStringLiteral("5e%1").arg(-last - 1));
    const Decimal low = perHour(amount - half), high = perHour(amount + half);
    for (int fewest = 0; fewest <= 2; ++fewest) {
      Decimal rate = low.rounded(fewest);
      if (rate < low) rate += *Decimal::fromString(QStringLiteral("1e%1").arg(-fewest));
      if (rate < high) return rate.rounded(2);
    }
  }
  return perHour(amount).rounded(2);
}

QString numberProblem(const char* what, const QString& text) {
  bool ambiguous = false;
  parseNumber(text, &ambiguous);
  if (!ambiguous) return QStringLiteral("the %1 “%2” cannot be read").arg(QLatin1String(what), text);
  QString digits = text;
  digits.removeIf([](QChar c) { return !c.isDigit(); });
  QString fraction = digits.right(3);
  while (fraction.endsWith(u'0')) fraction.chop(1);
  const QString small = digits.chopped(3) + (fraction.isEmpty() ? QString() : u'.' + fraction);
  return QStringLiteral("the %1 “%2” could be %3 or %4").arg(QLatin1String(what), text, small, digits);
}

std::optional<bool> parseFlag(const QString& text) {
  const QString word = text.trimmed().toCaseFolded();
  if (word.isEmpty() || word == u"yes" || word == u"true" || word == u"1" || word == u"billable") return true;
  if (word == u"no" || word == u"false" || word == u"0" || word == u"non-billable") return false;
  return std::nullopt;
}

QStringList splitTags(const QString& text) {
  QStringList tags;
  for (const QString& tag : text.split(u',', Qt::SkipEmptyParts))
    if (!tag.trimmed().isEmpty()) tags.append(tag.trimmed());
  return tags;
}

}  // namespace WTImportFields
