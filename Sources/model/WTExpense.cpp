#include "WTExpense.h"

#include "WTObjectContext.h"
#include "WTStoreRecord.h"
#include "WTTask.h"

WT_ENTITY_CLASS_IMPL(WTExpense)

void WTExpense::setExpense(const std::optional<Decimal>& amount) {
  setStoredValue(QStringLiteral("expense"), amount ? QVariant::fromValue(*amount) : QVariant());
}

void WTExpense::storedValueDidChange(const QString& key) {
  if (key == QLatin1String("expense") && task()) task()->costDidChange();
}

QVariant WTExpense::valueForKey(const QString& key) const {
  if (key == QLatin1String("expense")) return primitiveValue(key);
  return WTItem::valueForKey(key);
}

bool WTExpense::setValue(const QString& key, const QVariant& value) {
  if (key == QLatin1String("expense")) {
    const std::optional<Decimal> amount = Decimal::fromVariant(value);
    if (!value.isNull() && !amount) return false;
    setExpense(amount);
    return true;
  }
  return WTItem::setValue(key, value);
}

QStringList WTExpense::storedKeys() const {
  return WTItem::storedKeys() << QStringLiteral("expense");
}

QVariant WTExpense::primitiveValue(const QString& key) const {
  if (key == QLatin1String("expense")) return expense_ ? QVariant::fromValue(*expense_) : QVariant();
  return WTItem::primitiveValue(key);
}

bool WTExpense::writePrimitive(const QString& key, const QVariant& value) {
  if (key == QLatin1String("expense")) {
    expense_ = Decimal::fromVariant(value);
    return true;
  }
  return WTItem::writePrimitive(key, value);
}

void WTExpense::readRecord(const WTStoreRecord& record) {
  WTItem::readRecord(record);
  expense_ = record.expense;
}

void WTExpense::writeRecord(WTStoreRecord& record) const {
  WTItem::writeRecord(record);
  record.expense = expense_;
}
