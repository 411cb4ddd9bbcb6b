#pragma once

#include "Date.h"
#include "RZDate.h"
#include "Result.h"

#include <QList>

#include <functional>
#include <optional>

class WTItem;
class WTObjectContext;
class WTProject;
class WTTime;

// A test over items; an empty function means "no predicate" (the choice gives no range).
using WTItemPredicate = std::function<bool(const WTItem*)>;

// The ranges of the date-range pop-up, without the widget: each tag of its menu turns into a predicate
// over the item keys "chargeFlat", "startTime", "flatDateBegin" and "flatDateEnd". A timed item matches
// by its start, a flat-charged one when either end of its flat period lies in the range; both bounds
// count as inside.
namespace WTRangePredicate {

enum Tag {
  Today = 0,
  Yesterday = 1,
  ThisWeek = 2,
  LastWeek = 3,
  ThisMonth = 4,
  LastMonth = 5,
  ThisYear = 6,
  LastYear = 7,
  Custom = 20,
  AnyDate = 21,
};

// The bounds of a menu tag, read at the present instant: the start of the range and the start of the
// following period (Custom: midnight of `customBegin` to midnight of the day after `customEnd`). None
// for AnyDate, an unknown tag, and Custom without both dates.
std::optional<RZDate::Range> boundsForTag(int tag, std::optional<Date> customBegin = {},
                                          std::optional<Date> customEnd = {});

// The bounds of a range word of the command line (see predicateForRangeWord); none for "any".
Result<std::optional<RZDate::Range>> boundsForRangeWord(const QString& word);

// The predicate of the items whose dates lie in [bounds[0], bounds[1]], both included.
WTItemPredicate predicateForBounds(const RZDate::Range& bounds);

// Whether `item` starts in the billing period [period[0], period[1]): the next period's first instant is
// not in it, so an entry starting at midnight on the 1st is billed in the new month only and consecutive
// periods never share an item. What is billed (reports, the spreadsheet, the log) takes its items so.
bool startsIn(const WTItem* item, const RZDate::Range& period);
// The items that start in `period` (see startsIn); every item when there is none.
WTItemPredicate predicateForPeriod(const std::optional<RZDate::Range>& period);

// The predicate of a menu tag, read at the present instant (Date::now()). Custom covers the whole of
// its end day (midnight of `customBegin` to midnight of the day after `customEnd`) and is empty when
// either date is missing; AnyDate is always true (items without dates too); an unknown tag is empty.
WTItemPredicate predicateForTag(int tag, std::optional<Date> customBegin = {},
                                std::optional<Date> customEnd = {});

// The predicate of a range word of the command line: today, yesterday, this-week, last-week,
// this-month, last-month, this-year, last-year, any, or YYYY-MM-DD..YYYY-MM-DD (local days, the end
// day whole). A word that is none of these, or a range ending before it begins, is an error.
Result<WTItemPredicate> predicateForRangeWord(const QString& word);

// The time entries of `context` that `predicate` accepts (all when it is empty) and, when `project` is
// given, that belong to it; in no particular order.
QList<WTTime*> timesMatching(const WTObjectContext& context, const WTItemPredicate& predicate,
                             const WTProject* project = nullptr);

}  // namespace WTRangePredicate
