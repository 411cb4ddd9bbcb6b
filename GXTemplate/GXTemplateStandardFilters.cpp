#include "GXTemplateStandardFilters.h"

#include "GXTemplateValue.h"
#include "RZDate.h"

#include <unicode/uchar.h>

QStringList GXTemplateStandardFilters::filters() const {
  return {QStringLiteral("uppercase"), QStringLiteral("lowercase"), QStringLiteral("capitalized"),
          QStringLiteral("date_format"), QStringLiteral("color_format")};
}

QVariant GXTemplateStandardFilters::filterInvoked(const QString& filter, const QStringList& args,
                                                  const QVariant& value) {
  if (filter == QLatin1String("uppercase")) return GXTemplateValue::description(value).toUpper();
  if (filter == QLatin1String("lowercase")) return GXTemplateValue::description(value).toLower();
  if (filter == QLatin1String("capitalized")) return capitalized(GXTemplateValue::description(value));
  if (filter == QLatin1String("date_format")) {
    const std::optional<Date> date = GXTemplateValue::dateValue(value);
    if (!date || args.size() != 1) return value;
    return formatDate(*date, args.first());
  }
  if (filter == QLatin1String("color_format")) {
    if (!GXTemplateValue::isColor(value) || args.size() != 1 ||
        args.first().toLower() != QLatin1String("hex")) {
      return value;
    }
    return hexColor(value);
  }
  return value;
}

bool GXTemplateStandardFilters::patternHasOnlyDayFields(const QString& pattern) {
  // Era, years, quarters, months, weeks, days and weekdays; anything else (hours, minutes, seconds,
  // am/pm, zones, unknown letters) may differ within a day.
  static const QString kDayFields = QStringLiteral("GyYuUrQqMLlwWdDFgEec");
  bool quoted = false;
  for (QChar c : pattern) {
    if (c == u'\'') {
      quoted = !quoted;  // "''" toggles twice: a quote character, no change
    } else if (!quoted && ((c >= u'a' && c <= u'z') || (c >= u'A' && c <= u'Z')) && !kDayFields.contains(c)) {
      return false;
    }
  }
  return true;
}

QString GXTemplateStandardFilters::formatDate(Date date, const QString& pattern) {
  if (lastDay_.pattern != pattern || lastDay_.pattern.isNull()) {
    lastDay_ = DayText{pattern, patternHasOnlyDayFields(pattern), Date(), QString(), false};
  }
  if (!lastDay_.onlyDayFields) return RZDate::stringWithPattern(date, pattern);
  const Date day = RZDate::midnight(date);
  if (lastDay_.hasText && lastDay_.day == day) return lastDay_.text;
  lastDay_.text = RZDate::stringWithPattern(date, pattern);
  lastDay_.day = day;
  lastDay_.hasText = true;
  return lastDay_.text;
}

QString GXTemplateStandardFilters::capitalized(const QString& text) {
  QString result;
  result.reserve(text.size());
  bool inWord = false;
  const QList<uint> codePoints = text.toUcs4();
  for (const uint codePoint : codePoints) {
    const UChar32 c = UChar32(codePoint);
    UChar32 mapped = c;
    if (u_hasBinaryProperty(c, UCHAR_CASED)) {
      mapped = inWord ? u_tolower(c) : u_totitle(c);
      inWord = true;
    } else if (!u_hasBinaryProperty(c, UCHAR_CASE_IGNORABLE)) {
      inWord = false;
    }
    const char32_t unit = char32_t(mapped);
    result += QString::fromUcs4(&unit, 1);
  }
  return result;
}

QString GXTemplateStandardFilters::hexColor(const QVariant& color) {
  // The colour type belongs to the GUI module, which registers its text form "#rrggbb" (or "#aarrggbb"
  // when not opaque); the last six digits are red, green and blue.
  QString name;
  if (!QMetaType::convert(color.metaType(), color.constData(), QMetaType::fromType<QString>(), &name)) {
    return QStringLiteral("000000");
  }
  if (name.size() != 7 && name.size() != 9) return QStringLiteral("000000");
  return name.right(6).toLower();
}
