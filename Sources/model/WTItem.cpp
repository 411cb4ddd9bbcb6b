#include "WTItem.h"

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

QVariant WTItem::valueForKey(const QString& key) const {
  // "startTime", "flatDateBegin" and "flatDateEnd" are what the time-entry export reads: an item is
  // dated by its start (and a time entry ends at its end), and no item is billed as a flat charge.
  if (key == QLatin1String("startDate") || key == QLatin1String("date") ||
      key == QLatin1String("startTime") || key == QLatin1String("flatDateBegin")) {
    return dateVariant(startDate_);
  }
  if (key == QLatin1String("flatDateEnd")) {
    const QVariant end = valueForKey(QStringLiteral("endDate"));
    return end.isNull() ? dateVariant(startDate_) : end;
  }
  if (key == QLatin1String("chargeFlat")) return false;
  if (key == QLatin1String("task")) return task_ ? KeyPath::variantFromObject(task_) : QVariant();
  if (key == QLatin1String("duration")) return duration();
  if (key == QLatin1String("cost")) return QVariant::fromValue(cost());
  if (key == QLatin1String("rate")) {
    const auto itemRate = rate();
    return itemRate ? QVariant::fromValue(*itemRate) : QVariant();
  }
  if (key == QLatin1String("title")) return title();
  return WTObject::valueForKey(key);
}

bool WTItem::setValue(const QString& key, const QVariant& value) {
  if (key == QLatin1String("task")) {
    auto* task = dynamic_cast<WTTask*>(KeyPath::objectFromVariant(value));
    if (!value.isNull() && !task) return false;
    setTask(task);
    return true;
  }
  if (key == QLatin1String("startDate") || key == QLatin1String("date")) {
    bool ok = false;
    const std::optional<Date> date = dateFromVariant(value, &ok);
    if (!ok) return false;
    if (key == QLatin1String("date")) {
      setDate(date);
    } else {
      setStartDate(date);
    }
    return true;
  }
  return WTObject::setValue(key, value);
}

QStringList WTItem::storedKeys() const {
  return WTObject::storedKeys() << QStringLiteral("startDate") << QStringLiteral("task");
}

QVariant WTItem::primitiveValue(const QString& key) const {
  if (key == QLatin1String("startDate")) return dateVariant(startDate_);
  return WTObject::primitiveValue(key);
}

bool WTItem::writePrimitive(const QString& key, const QVariant& value) {
  if (key == QLatin1String("startDate")) {
    startDate_ = value.isNull() ? std::nullopt : std::optional<Date>(value.value<Date>());
    return true;
  }
  return WTObject::writePrimitive(key, value);
}

void WTItem::readRecord(const WTStoreRecord& record) {
  WTObject::readRecord(record);
  startDate_ = record.startDate;
}

void WTItem::writeRecord(WTStoreRecord& record) const {
  WTObject::writeRecord(record);
  record.startDate = startDate_;
  record.taskUuid = task_ ? task_->uuid() : QString();
}
