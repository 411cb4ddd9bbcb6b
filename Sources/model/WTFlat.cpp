#include "WTFlat.h"

#include "WTObjectContext.h"
#include "WTStoreRecord.h"
#include "WTTask.h"

WT_ENTITY_CLASS_IMPL(WTFlat)

void WTFlat::setMinutes(const std::optional<qint64>& minutes) {
  setStoredValue(QStringLiteral("minutes"), minutes ? QVariant(*minutes) : QVariant());
}

void WTFlat::storedValueDidChange(const QString& key) {
  if (key == QLatin1String("minutes") && task()) task()->durationDidChange();
}

QVariant WTFlat::valueForKey(const QString& key) const {
  if (key == QLatin1String("minutes")) return primitiveValue(key);
  return WTItem::valueForKey(key);
}

bool WTFlat::setValue(const QString& key, const QVariant& value) {
  if (key == QLatin1String("minutes")) {
    if (value.isNull()) {
      setMinutes(std::nullopt);
      return true;
    }
    bool ok = false;
    const qint64 minutes = value.toLongLong(&ok);
    if (!ok) return false;
    setMinutes(minutes);
    return true;
  }
  return WTItem::setValue(key, value);
}

QStringList WTFlat::storedKeys() const {
  return WTItem::storedKeys() << QStringLiteral("minutes");
}

QVariant WTFlat::primitiveValue(const QString& key) const {
  if (key == QLatin1String("minutes")) return minutes_ ? QVariant(*minutes_) : QVariant();
  return WTItem::primitiveValue(key);
}

bool WTFlat::writePrimitive(const QString& key, const QVariant& value) {
  if (key == QLatin1String("minutes")) {
    minutes_ = value.isNull() ? std::nullopt : std::optional<qint64>(value.toLongLong());
    return true;
  }
  return WTItem::writePrimitive(key, value);
}

void WTFlat::readRecord(const WTStoreRecord& record) {
  WTItem::readRecord(record);
  minutes_ = record.minutes;
}

void WTFlat::writeRecord(WTStoreRecord& record) const {
  WTItem::writeRecord(record);
  record.minutes = minutes_;
}
