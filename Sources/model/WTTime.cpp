#include "WTTime.h"

#include "RZDate.h"
#include "WTObjectContext.h"
#include "WTStoreRecord.h"
#include "WTTask.h"

#include <QCoreApplication>

#include <cmath>
#include <limits>

WT_ENTITY_CLASS_IMPL(WTTime)

const WTKeyTable& WTTime::keys() {
  using namespace WTKeys;
  static const WTKeyTable table(
      &itemKeys(), {
                       stored("endDate", &WTTime::endDate_, &WTStoreRecord::endDate, nullptr, {"duration"}),
                       stored("running", &WTTime::running_, &WTStoreRecord::running,
                              [](WTObject& object, const QVariant& value) {
                                static_cast<WTTime&>(object).setRunning(value.toBool());
                                return true;
                              }),
                       derived("lastDuration", WTKeyType::Integer,
                               [](const WTObject& object) {
                                 const std::optional<int> minutes =
                                     static_cast<const WTTime&>(object).lastDuration_;
                                 return minutes ? QVariant(*minutes) : QVariant();
                               }),
                       refine("duration", nullptr,
                              [](WTObject& object, const QVariant& value) {
                                bool ok = false;
                                const int minutes = value.toInt(&ok);
                                if (ok) static_cast<WTTime&>(object).setDuration(minutes);
                                return ok;
                              },
                              {"startDate", "endDate"}),
                   });
  return table;
}

void WTTime::awakeFromInsert() {
  WTItem::awakeFromInsert();
  setEndDate(startDate());
}

void WTTime::setEndDate(const std::optional<Date>& date) {
  setStoredValue(QStringLiteral("endDate"), dateVariant(date));
}

void WTTime::setRunning(bool running) {
  setStoredValue(QStringLiteral("running"), running);
  if (running) {
    setEndDate(std::nullopt);
  } else if (!endDate()) {
    setEndDate(Date::now());
  }
  if (task()) task()->runningDidChange();
  context()->undoManager().setActionName(running ? QCoreApplication::translate("WTTime", "Start Timer")
                                                 : QCoreApplication::translate("WTTime", "Stop Timer"));
}

void WTTime::storedValueDidChange(const QString& key) {
  // Either end of the span changes its length, whoever moves it: an edit, undo, redo or sync.
  if (key == QLatin1String("endDate") || key == QLatin1String("startDate")) {
    if (task()) task()->durationDidChange();
  } else if (key == QLatin1String("running")) {
    // The setter tells the task itself once the end date is settled; undo and redo replay values only.
    const WTUndoManager& undo = context()->undoManager();
    if (task() && (undo.isUndoing() || undo.isRedoing())) task()->runningDidChange();
  }
}

int WTTime::duration() const {
  const std::optional<Date> start = startDate();
  const std::optional<Date> end = running() ? std::optional<Date>(Date::now()) : endDate();
  if (!start || !end) return 0;
  // Minute boundaries crossed, not elapsed seconds: both ends are cut to their minute first.
  const double seconds = RZDate::beginOfMinute(*end).timeIntervalSince(RZDate::beginOfMinute(*start));
  const double clamped = std::clamp(std::trunc(seconds), double(std::numeric_limits<std::int32_t>::min()),
                                    double(std::numeric_limits<std::int32_t>::max()));
  return static_cast<std::int32_t>(clamped) / 60;
}

void WTTime::setDuration(int minutes) {
  if (!startDate()) return;
  setEndDate(startDate()->addingSeconds(double(minutes) * 60.0));
}

void WTTime::setDurationKeepingEnd(int minutes) {
  if (!endDate()) return;
  setStartDate(endDate()->addingSeconds(-double(minutes) * 60.0));
}

void WTTime::setDate(const std::optional<Date>& date) {
  if (!date || !startDate()) {
    WTItem::setDate(date);
    return;
  }
  const std::optional<Date> end = endDate();
  const double length = end ? end->timeIntervalSince(*startDate()) : 0;
  const Date start = startOnDayOf(*date);
  setStartDate(start);
  // A running entry has no end to move.
  if (end) setEndDate(start.addingSeconds(length));
}

Date WTTime::startOnDayOf(const Date& date) const {
  // Seconds are dropped on purpose.
  RZDate::DateComponents components;
  RZDate::assignFlags(date, RZDate::DayUnits, components);
  RZDate::assignFlags(startDate().value_or(date), RZDate::Hour | RZDate::Minute, components);
  components.second = 0;
  return RZDate::dateFromComponents(components);
}

bool WTTime::isSpentOnDayOf(const Date& date) const {
  if (!startDate()) return true;
  const double length = running() || !endDate() ? 0 : endDate()->timeIntervalSince(*startDate());
  return startOnDayOf(date).addingSeconds(length) <= Date::now();
}

QString WTTime::title() const {
  return startDate() ? RZDate::stringWithPattern(*startDate(), QStringLiteral("HH:mm")) : QString();
}

bool WTTime::peek() {
  const int minutes = duration();
  const bool changed = !lastDuration_ || *lastDuration_ != minutes;
  if (changed) {
    announce(QStringLiteral("duration"));
    if (task()) task()->durationDidChange();
  }
  lastDuration_ = minutes;
  return changed;
}
