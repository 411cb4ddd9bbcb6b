#include "WTClient.h"

#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTStoreRecord.h"

WT_ENTITY_CLASS_IMPL(WTClient)

void WTClient::setAddressBookUID(const QString& uid) {
  setStoredValue(QStringLiteral("addressBookUID"), uid);
}
void WTClient::setTotalsUID(const QString& uid) {
  setStoredValue(QStringLiteral("totalsUID"), uid);
}

Decimal WTClient::rateFromAbove() const {
  return userDefaultRate().value_or(builtInRate());
}

// Here rather than in the setter, so that a rate put back by undo or redo is announced as a cost too.
void WTClient::storedValueDidChange(const QString& key) {
  if (key == QLatin1String("rate")) costDidChange();
}

int WTClient::duration() const {
  int total = 0;
  for (const WTProject* project : projects_) total += project->duration();
  return total;
}

Decimal WTClient::cost() const {
  Decimal total;
  for (const WTProject* project : projects_) total += project->cost();
  return total;
}

void WTClient::durationDidChange() {
  announce(QStringLiteral("duration"));
  costDidChange();
}

void WTClient::costDidChange() {
  announce(QStringLiteral("cost"));
}

QString WTClient::tableImage() const {
  return archived() ? QStringLiteral("admin_2_32_dis") : QStringLiteral("admin_2_32");
}

QVariant WTClient::valueForKey(const QString& key) const {
  if (key == QLatin1String("projects")) {
    QVariantList list;
    for (WTProject* project : projects_) list.append(KeyPath::variantFromObject(project));
    return list;
  }
  if (key == QLatin1String("duration")) return duration();
  if (key == QLatin1String("cost")) return QVariant::fromValue(cost());
  if (key == QLatin1String("tableImage")) return tableImage();
  return WTObject::valueForKey(key);
}

bool WTClient::setValue(const QString& key, const QVariant& value) {
  if (key == QLatin1String("addressBookUID")) {
    setAddressBookUID(value.isNull() ? QString() : value.toString());
    return true;
  }
  if (key == QLatin1String("totalsUID")) {
    setTotalsUID(value.isNull() ? QString() : value.toString());
    return true;
  }
  return WTObject::setValue(key, value);
}

QStringList WTClient::storedKeys() const {
  return WTObject::storedKeys() << QStringLiteral("addressBookUID") << QStringLiteral("totalsUID");
}

QVariant WTClient::primitiveValue(const QString& key) const {
  if (key == QLatin1String("addressBookUID"))
    return addressBookUID_.isNull() ? QVariant() : QVariant(addressBookUID_);
  if (key == QLatin1String("totalsUID")) return totalsUID_.isNull() ? QVariant() : QVariant(totalsUID_);
  return WTObject::primitiveValue(key);
}

bool WTClient::writePrimitive(const QString& key, const QVariant& value) {
  if (key == QLatin1String("addressBookUID")) {
    addressBookUID_ = value.isNull() ? QString() : value.toString();
    return true;
  }
  if (key == QLatin1String("totalsUID")) {
    totalsUID_ = value.isNull() ? QString() : value.toString();
    return true;
  }
  return WTObject::writePrimitive(key, value);
}

QList<WTObject*> WTClient::relatedObjects(const QString& relationship) const {
  if (relationship != QLatin1String("projects")) return {};
  return QList<WTObject*>(projects_.begin(), projects_.end());
}

void WTClient::readRecord(const WTStoreRecord& record) {
  WTObject::readRecord(record);
  addressBookUID_ = record.addressBookUID;
  totalsUID_ = record.totalsUID;
}

void WTClient::writeRecord(WTStoreRecord& record) const {
  WTObject::writeRecord(record);
  record.addressBookUID = addressBookUID_;
  record.totalsUID = totalsUID_;
}
