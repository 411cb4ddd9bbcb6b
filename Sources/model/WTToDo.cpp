#include "WTToDo.h"

#include "WTObjectContext.h"
#include "WTStoreRecord.h"

WT_ENTITY_CLASS_IMPL(WTToDo)

void WTToDo::setCompleted(bool completed) {
  setStoredValue(QStringLiteral("completed"), completed);
}

void WTToDo::markCompleted(bool completed) {
  if (completed == completed_) return;
  setCompleted(completed);
  if (completed) setStartDate(Date::now());
}

QVariant WTToDo::valueForKey(const QString& key) const {
  if (key == QLatin1String("completed")) return completed_;
  return WTItem::valueForKey(key);
}

bool WTToDo::setValue(const QString& key, const QVariant& value) {
  if (key == QLatin1String("completed")) {
    setCompleted(value.toBool());
    return true;
  }
  return WTItem::setValue(key, value);
}

QStringList WTToDo::storedKeys() const {
  return WTItem::storedKeys() << QStringLiteral("completed");
}

QVariant WTToDo::primitiveValue(const QString& key) const {
  if (key == QLatin1String("completed")) return completed_;
  return WTItem::primitiveValue(key);
}

bool WTToDo::writePrimitive(const QString& key, const QVariant& value) {
  if (key == QLatin1String("completed")) {
    completed_ = value.toBool();
    return true;
  }
  return WTItem::writePrimitive(key, value);
}

void WTToDo::readRecord(const WTStoreRecord& record) {
  WTItem::readRecord(record);
  completed_ = record.completed;
}

void WTToDo::writeRecord(WTStoreRecord& record) const {
  WTItem::writeRecord(record);
  record.completed = completed_;
}
