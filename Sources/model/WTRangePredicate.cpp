#include "WTRangePredicate.h"

#include "WTItem.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTTime.h"

#include <QDate>
#include <QRegularExpression>

namespace WTRangePredicate {

namespace {

std::optional<Date> dateForKey(const WTItem* item, const QString& key) {
  bool ok = false;
  std::optional<Date> date = dateFromVariant(item->valueForKey(key), &ok);
  return ok ? date : std::nullopt;
}

bool between(const std::optional<Date>& date, const RZDate::Range& bounds) {
  return date && *date >= bounds[0] && *date <= bounds[1];
}

std::optional<RZDate::Range> rangeForTag(int tag) {
  switch (tag) {
    case Today:
      return RZDate::rangeForToday();
    case Yesterday:
      return RZDate::rangeForYesterday();
    case ThisWeek:
      return RZDate::rangeForThisWeek();
    case LastWeek:
      return RZDate::rangeForLastWeek();
    case ThisMonth:
      return RZDate::rangeForThisMonth();
    case LastMonth:
      return RZDate::rangeForLastMonth();
    case ThisYear:
      return RZDate::rangeForThisYear();
    case LastYear:
      return RZDate::rangeForLastYear();
    default:
      return std::nullopt;
  }
}

std::optional<Date> localDay(const QString& text) {
  const QDate day = QDate::fromString(text, QStringLiteral("yyyy-MM-dd"));
  if (!day.isValid()) return std::nullopt;
  RZDate::DateComponents components;
  components.year = day.year();
  components.month = day.month();
  components.day = day.day();
  components.hour = components.minute = components.second = 0;
  return RZDate::dateFromComponents(components);
}

}  // namespace

WTItemPredicate predicateForBounds(const RZDate::Range& bounds) {
  return [bounds](const WTItem* item) {
    if (!item) return false;
    if (!item->valueForKey(QStringLiteral("chargeFlat")).toBool()) {
      return between(dateForKey(item, QStringLiteral("startTime")), bounds);
    }
    return between(dateForKey(item, QStringLiteral("flatDateBegin")), bounds) ||
           between(dateForKey(item, QStringLiteral("flatDateEnd")), bounds);
  };
}

bool startsIn(const WTItem* item, const RZDate::Range& period) {
  const std::optional<Date> start = item ? item->startDate() : std::nullopt;
  return start && *start >= period[0] && *start < period[1];
}

WTItemPredicate predicateForPeriod(const std::optional<RZDate::Range>& period) {
  if (!period) return [](const WTItem*) { return true; };
  return [bounds = *period](const WTItem* item) { return startsIn(item, bounds); };
}

std::optional<RZDate::Range> boundsForTag(int tag, std::optional<Date> customBegin,
                                          std::optional<Date> customEnd) {
  if (tag == Custom) {
    if (!customBegin || !customEnd) return std::nullopt;
    return RZDate::Range{RZDate::midnight(*customBegin), RZDate::midnight(RZDate::tomorrow(*customEnd))};
  }
  return rangeForTag(tag);
}

WTItemPredicate predicateForTag(int tag, std::optional<Date> customBegin, std::optional<Date> customEnd) {
  if (tag == AnyDate) return [](const WTItem*) { return true; };
  const std::optional<RZDate::Range> bounds = boundsForTag(tag, customBegin, customEnd);
  if (!bounds) return {};
  return predicateForBounds(*bounds);
}

Result<std::optional<RZDate::Range>> boundsForRangeWord(const QString& word) {
  static const QStringList words = {QStringLiteral("today"),      QStringLiteral("yesterday"),
                                    QStringLiteral("this-week"),  QStringLiteral("last-week"),
                                    QStringLiteral("this-month"), QStringLiteral("last-month"),
                                    QStringLiteral("this-year"),  QStringLiteral("last-year")};
  const qsizetype index = words.indexOf(word);
  if (index >= 0) return boundsForTag(int(index));
  if (word == QLatin1String("any")) return std::optional<RZDate::Range>();
  static const QRegularExpression custom(
      QStringLiteral("^(\\d{4}-\\d{2}-\\d{2})\\.\\.(\\d{4}-\\d{2}-\\d{2})$"));
  const QRegularExpressionMatch match = custom.match(word);
  if (match.hasMatch()) {
    const std::optional<Date> begin = localDay(match.captured(1));
    const std::optional<Date> end = localDay(match.captured(2));
    if (!begin || !end) return Error{1, QStringLiteral("%1: not a date in the calendar").arg(word)};
    if (*end < *begin) return Error{1, QStringLiteral("%1: the range ends before it begins").arg(word)};
    return boundsForTag(Custom, begin, end);
  }
  return Error{1, QStringLiteral("%1: not a range (today, yesterday, this-week, last-week, this-month, "
                                 "last-month, this-year, last-year, any or YYYY-MM-DD..YYYY-MM-DD)")
                      .arg(word)};
}

Result<WTItemPredicate> predicateForRangeWord(const QString& word) {
  const Result<std::optional<RZDate::Range>> bounds = boundsForRangeWord(word);
  if (!bounds) return bounds.error();
  return bounds.value() ? predicateForBounds(*bounds.value()) : predicateForTag(AnyDate);
}

QList<WTTime*> timesMatching(const WTObjectContext& context, const WTItemPredicate& predicate,
                             const WTProject* project) {
  return context.fetch<WTTime>([&](const WTTime* time) {
    if (project && (!time->task() || time->task()->project() != project)) return false;
    return !predicate || predicate(time);
  });
}

}  // namespace WTRangePredicate
