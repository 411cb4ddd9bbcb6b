#include "WTObject.h"

#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTClient.h"
#include "WTObjectContext.h"
#include "WTStoreRecord.h"

#include <QUuid>

namespace {

// The GUI module's colour type when that module is loaded; it registers the conversions from and to text.
QMetaType guiColorType() {
  return QMetaType::isRegistered(QMetaType::QColor) ? QMetaType(QMetaType::QColor) : QMetaType();
}

// The colour a text names, as color() holds it; null for none.
QVariant colorFromText(const QString& text) {
  if (text.isEmpty()) return {};
  const QMetaType type = guiColorType();
  if (!type.isValid()) return text;
  QVariant color(text);
  if (!color.convert(type)) return {};
  return color;
}

}  // namespace

QString WTObject::colorText(const QVariant& color) {
  if (color.isNull()) return {};
  const QMetaType type = guiColorType();
  // Without the GUI module a colour only ever comes as its text, from the store or the sync.
  if (!type.isValid()) return color.typeId() == QMetaType::QString ? color.toString() : QString();
  QVariant value = color;
  if (value.metaType() != type && !value.convert(type)) return {};
  if (value == QVariant(type)) return {};  // QColor(): no colour
  QString name = value.toString();         // "#rrggbb" when opaque, else "#aarrggbb"
  if (name.size() == 7) name.insert(1, QStringLiteral("ff"));
  return name;
}

WTObject::WTObject(WTEntity entity, WTObjectContext* context) : context_(context), entity_(entity) {}

WTObject::~WTObject() = default;

void WTObject::awakeFromInsert() {
  assignNewIdentity();
}

void WTObject::assignNewIdentity() {
  // The entity can be read back from the identity.
  const QString unique = QUuid::createUuid().toString(QUuid::WithoutBraces).toUpper();
  setUuid(unique + u'@' + entityName());
}

void WTObject::setUuid(const QString& uuid) {
  if (uuid == uuid_) return;
  const QString old = uuid_;
  setStoredValue(QStringLiteral("uuid"), uuid);
  context_->uuidChanged(this, old);
}

void WTObject::setName(const QString& name) {
  setStoredValue(QStringLiteral("name"), name);
}
void WTObject::setNotes(const QString& notes) {
  setStoredValue(QStringLiteral("notes"), notes);
}
void WTObject::setColor(const QVariant& color) {
  setStoredValue(QStringLiteral("color"), colorFromText(colorText(color)));
}
void WTObject::setArchived(bool archived) {
  setStoredValue(QStringLiteral("archived"), archived);
}

void WTObject::setRate(const std::optional<Decimal>& rate) {
  setStoredValue(QStringLiteral("rate"), rate ? QVariant::fromValue(*rate) : QVariant());
}

Decimal WTObject::rateFromAbove() const {
  return WTClient::builtInRate();
}

QVariant WTObject::primitiveValue(const QString& key) const {
  if (key == QLatin1String("uuid")) return uuid_;
  if (key == QLatin1String("name")) return name_.isNull() ? QVariant() : QVariant(name_);
  if (key == QLatin1String("notes")) return notes_.isNull() ? QVariant() : QVariant(notes_);
  if (key == QLatin1String("rate")) return rate_ ? QVariant::fromValue(*rate_) : QVariant();
  if (key == QLatin1String("color")) return color_;
  if (key == QLatin1String("archived")) return archived_;
  return {};
}

bool WTObject::writePrimitive(const QString& key, const QVariant& value) {
  if (key == QLatin1String("uuid")) {
    uuid_ = value.toString();
  } else if (key == QLatin1String("name")) {
    name_ = value.isNull() ? QString() : value.toString();
  } else if (key == QLatin1String("notes")) {
    notes_ = value.isNull() ? QString() : value.toString();
  } else if (key == QLatin1String("rate")) {
    rate_ = Decimal::fromVariant(value);
  } else if (key == QLatin1String("color")) {
    color_ = colorFromText(colorText(value));
  } else if (key == QLatin1String("archived")) {
    archived_ = value.toBool();
  } else {
    return false;
  }
  return true;
}

void WTObject::storedValueDidChange(const QString&) {}

QStringList WTObject::storedKeys() const {
  return {QStringLiteral("uuid"), QStringLiteral("name"),  QStringLiteral("notes"),
          QStringLiteral("rate"), QStringLiteral("color"), QStringLiteral("archived")};
}

void WTObject::setStoredValue(const QString& key, const QVariant& value) {
  const QVariant old = primitiveValue(key);
  if (old == value && old.isNull() == value.isNull()) return;
  if (!writePrimitive(key, value)) return;
  context_->storedValueChanged(this, key, old);
  storedValueDidChange(key);
  announce(key);
}

void WTObject::announce(const QString& key) const {
  context_->announce(const_cast<WTObject*>(this), key);
}

void WTObject::relinkOwner(WTObject*, int) {}

QList<WTObject*> WTObject::relatedObjects(const QString&) const {
  return {};
}

void WTObject::changeOwner(WTObject* newOwner, int index) {
  WTObject* oldOwner = owner();
  if (oldOwner == newOwner && index < 0) return;
  const int oldIndex = indexInOwner();
  relinkOwner(newOwner, index);
  if (oldOwner == newOwner && oldIndex == indexInOwner()) return;
  context_->ownerChanged(this, oldOwner, oldIndex);
}

QVariant WTObject::valueForKey(const QString& key) const {
  if (key == QLatin1String("inheritedRate")) return QVariant::fromValue(inheritedRate());
  if (key == QLatin1String("entity") || key == QLatin1String("entityName")) return entityName();
  QVariant value = primitiveValue(key);
  if (value.isValid()) return value;
  if (WTObject* related = owner(); related && key == ownerKey()) return KeyPath::variantFromObject(related);
  return {};
}

bool WTObject::setValue(const QString& key, const QVariant& value) {
  if (key == QLatin1String("uuid")) {
    if (!value.canConvert<QString>()) return false;
    setUuid(value.toString());
  } else if (key == QLatin1String("name")) {
    setName(value.isNull() ? QString() : value.toString());
  } else if (key == QLatin1String("notes")) {
    setNotes(value.isNull() ? QString() : value.toString());
  } else if (key == QLatin1String("rate")) {
    const std::optional<Decimal> rate = Decimal::fromVariant(value);
    if (!value.isNull() && !rate) return false;
    setRate(rate);
  } else if (key == QLatin1String("color")) {
    const QMetaType type = guiColorType();
    if (!value.isNull() && !(type.isValid() ? value.canConvert(type) : value.typeId() == QMetaType::QString))
      return false;
    setColor(value);
  } else if (key == QLatin1String("archived")) {
    setArchived(value.toBool());
  } else {
    return false;
  }
  return true;
}

bool WTObject::isInserted() const {
  return context_->inserted_.count(const_cast<WTObject*>(this)) > 0;
}
bool WTObject::isUpdated() const {
  return context_->updated_.count(const_cast<WTObject*>(this)) > 0;
}
bool WTObject::isDeleted() const {
  return context_->deleted_.count(const_cast<WTObject*>(this)) > 0;
}

QVariantMap WTObject::changedValues() const {
  QVariantMap values;
  auto add = [&](const QString& key) {
    if (key == ownerKey()) {
      WTObject* related = owner();
      values.insert(key, related ? KeyPath::variantFromObject(related) : QVariant());
      return;
    }
    for (const QString& relationship :
         {QStringLiteral("projects"), QStringLiteral("tasks"), QStringLiteral("items")}) {
      if (key != relationship) continue;
      const QList<WTObject*> related = relatedObjects(relationship);
      values.insert(key, isOrderedRelationship(relationship)
                             ? QVariant::fromValue(WTOrderedRelationship{related})
                             : QVariant::fromValue(WTUnorderedRelationship{related}));
      return;
    }
    values.insert(key, primitiveValue(key));
  };
  if (isInserted()) {
    // A new record reports every value it has; unset ones stay out.
    for (const QString& key : storedKeys()) {
      if (key == ownerKey() ? owner() != nullptr : !primitiveValue(key).isNull()) add(key);
    }
    for (const QString& key : changedKeys_) {
      if (!values.contains(key) && !storedKeys().contains(key)) add(key);
    }
    return values;
  }
  for (const QString& key : changedKeys_) add(key);
  return values;
}

void WTObject::willSave() {
  WTChangeJournal* journal = context_->changeJournal();
  if (isInserted()) {
    journal->insertValues(changedValues(), uuid_);
  }
  if (isUpdated()) {
    journal->updateValues(changedValues(), uuid_);
    return;
  }
  if (isDeleted()) journal->deleteObjectWithId(uuid_);
}

void WTObject::readRecord(const WTStoreRecord& record) {
  uuid_ = record.uuid;
  name_ = record.name;
  notes_ = record.notes;
  rate_ = record.rate;
  color_ = colorFromText(record.color);
  archived_ = record.archived;
}

void WTObject::writeRecord(WTStoreRecord& record) const {
  record.uuid = uuid_;
  record.entity = entityName();
  record.name = name_;
  record.notes = notes_;
  record.rate = rate_;
  record.color = colorText(color_);
  record.archived = archived_;
}

std::optional<Decimal> WTObject::userDefaultRate() const {
  const UserDefaults* defaults = context_->userDefaults();
  return defaults ? defaults->decimalForKey(SettingsKeys::kDefaultRate) : std::nullopt;
}
