#include "WTItem.h"

#include "MoneyFormat.h"
#include "WTObjectContext.h"
#include "WTStoreRecord.h"
#include "WTTask.h"

#include <array>

std::optional<Date> dateFromVariant(const QVariant& value, bool* ok) {
  *ok = true;
  if (value.isNull()) return std::nullopt;
  if (value.metaType() == QMetaType::fromType<Date>()) return value.value<Date>();
  if (value.metaType() == QMetaType::fromType<QDateTime>()) return Date::fromQDateTime(value.toDateTime());
  *ok = false;
  return std::nullopt;
}

void WTItem::awakeFromInsert() {
  WTObject::awakeFromInsert();
  setStartDate(Date::now());
}

void WTItem::setTask(WTTask* task) {
  changeOwner(task);
}

void WTItem::setStartDate(const std::optional<Date>& date) {
  setStoredValue(QStringLiteral("startDate"), dateVariant(date));
}

void WTItem::setDate(const std::optional<Date>& date) {
  setStartDate(date);
}

std::optional<Decimal> WTItem::rate() const {
  if (!task_) return std::nullopt;
  return task_->inheritedRate();
}

Decimal WTItem::cost() const {
  const std::optional<Decimal> itemRate = rate();
  return itemRate ? costAtRate(*itemRate) : Decimal();
}

Decimal WTItem::costAtRate(const Decimal& rate) const {
  return timeCost(rate, duration());
}

QString WTItem::billingCurrency() const {
  return task_ ? task_->billingCurrency() : context()->billingDefaults().currency;
}

int WTItem::billedDuration() const {
  return billedDurationWithRule(task_ ? task_->roundingRule() : context()->billingDefaults().rule);
}

Decimal WTItem::billedCost() const {
  if (!task_) return Decimal().rounded(MoneyFormat::minorUnitDigits(billingCurrency()));
  return billedCostWith(task_->roundingRule(), task_->inheritedRate(),
                        MoneyFormat::minorUnitDigits(task_->billingCurrency()));
}

int WTItem::billedDurationWithRule(const WTRoundingRule&) const {
  return duration();
}

Decimal WTItem::billedCostWith(const WTRoundingRule& rule, const Decimal& rate, int places) const {
  return timeCost(rate, billedDurationWithRule(rule)).rounded(places);
}

Decimal WTItem::timeCost(const Decimal& rate, int minutes) {
  // minutes / 60 is the same few values over and over: keep the exact quotients of the first day.
  static std::array<std::optional<Decimal>, 24 * 60> hours;
  Decimal fraction;
  if (minutes >= 0 && minutes < static_cast<int>(hours.size())) {
    auto& cached = hours[static_cast<size_t>(minutes)];
    if (!cached) cached = Decimal::divide(Decimal(minutes), Decimal(60));
    fraction = *cached;
  } else {
    fraction = *Decimal::divide(Decimal(minutes), Decimal(60));
  }
  return rate * fraction;
}

WTObject* WTItem::owner() const {
  return task_;
}

void WTItem::relinkOwner(WTObject* owner, int) {
  if (task_) task_->items_.removeOne(this);
  task_ = static_cast<WTTask*>(owner);
  if (task_) task_->items_.append(this);
}

const WTKeyTable& WTItem::itemKeys() {
  using namespace WTKeys;
  static const WTKeyTable table(
      &objectKeys(),
      {
          stored("startDate", &WTItem::startDate_, &WTStoreRecord::startDate),
          stored("importId", &WTItem::importId_, &WTStoreRecord::importId),
          toOne("task", &WTStoreRecord::taskUuid),
          refine("rate", &read<&WTItem::rate>),
          // Read and set as a date, but not stored: the sync takes a value for it as it comes.
          derived("date", WTKeyType::Other, &read<&WTItem::startDate>, {},
                  [](WTObject& object, const QVariant& value) {
                    bool ok = false;
                    const std::optional<Date> date = dateFromVariant(value, &ok);
                    if (ok) static_cast<WTItem&>(object).setDate(date);
                    return ok;
                  }),
          // What the time-entry export reads: an item is dated by its start (and a time entry ends at its
          // end), and no item is billed as a flat charge.
          derived("startTime", WTKeyType::Date, &read<&WTItem::startDate>),
          derived("flatDateBegin", WTKeyType::Date, &read<&WTItem::startDate>),
          derived("flatDateEnd", WTKeyType::Date,
                  [](const WTObject& object) {
                    const QVariant end = object.valueForKey(QStringLiteral("endDate"));
                    return end.isNull() ? dateVariant(static_cast<const WTItem&>(object).startDate_) : end;
                  }),
          derived("chargeFlat", WTKeyType::Flag, [](const WTObject&) { return QVariant(false); }),
          derived<&WTItem::duration>("duration"),
          derived<&WTItem::cost>("cost", {"duration"}),
          derived<&WTItem::title>("title"),
          derived<&WTItem::billingCurrency>("billingCurrency", {"task"}),
          derived<&WTItem::billedDuration>("billedDuration", {"duration", "task"}),
          derived<&WTItem::billedCost>("billedCost", {"cost", "billedDuration", "billingCurrency"}),
      });
  return table;
}

void WTItem::setImportId(const QString& importId) {
  setStoredValue(QStringLiteral("importId"), importId);
}
