#include "WTObject.h"

#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTClient.h"
#include "WTExpense.h"
#include "WTFlat.h"
#include "WTNote.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTStoreRecord.h"
#include "WTTask.h"
#include "WTTime.h"
#include "WTToDo.h"

#include <QRandomGenerator>
#include <QUuid>

#include <array>
#include <type_traits>

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

template <class>
struct Pointee;
template <class T, class C>
struct Pointee<T C::*> {
  using Type = T;
};

QVariant variantOf(const QString& text) {
  return text.isNull() ? QVariant() : QVariant(text);
}
QVariant variantOf(bool flag) {
  return flag;
}
QVariant variantOf(const std::optional<qint64>& number) {
  return number ? QVariant(*number) : QVariant();
}
QVariant variantOf(const std::optional<Decimal>& number) {
  return number ? QVariant::fromValue(*number) : QVariant();
}
QVariant variantOf(const std::optional<Date>& date) {
  return dateVariant(date);
}
QVariant variantOf(const QVariant& color) {
  return color;
}

void assign(QString& text, const QVariant& value) {
  text = value.isNull() ? QString() : value.toString();
}
void assign(bool& flag, const QVariant& value) {
  flag = value.toBool();
}
void assign(std::optional<qint64>& number, const QVariant& value) {
  number = value.isNull() ? std::nullopt : std::optional<qint64>(value.toLongLong());
}
void assign(std::optional<Decimal>& number, const QVariant& value) {
  number = Decimal::fromVariant(value);
}
void assign(std::optional<Date>& date, const QVariant& value) {
  date = value.isNull() ? std::nullopt : std::optional<Date>(value.value<Date>());
}
void assign(QVariant& color, const QVariant& value) {
  color = colorFromText(WTObject::colorText(value));
}

}  // namespace

const WTKeyTable& WTObject::objectKeys() {
  using namespace WTKeys;
  static const WTKeyTable table(
      nullptr, {
                   stored("uuid", &WTObject::uuid_, &WTStoreRecord::uuid,
                          [](WTObject& object, const QVariant& value) {
                            if (!value.canConvert<QString>()) return false;
                            object.setUuid(value.toString());
                            return true;
                          }),
                   stored("name", &WTObject::name_, &WTStoreRecord::name),
                   stored("notes", &WTObject::notes_, &WTStoreRecord::notes),
                   stored("rate", &WTObject::rate_, &WTStoreRecord::rate,
                          [](WTObject& object, const QVariant& value) {
                            const std::optional<Decimal> rate = Decimal::fromVariant(value);
                            if (!value.isNull() && !rate) return false;
                            object.setRate(rate);
                            return true;
                          }),
                   [] {
                     WTKeyDescriptor color;
                     color.name = QStringLiteral("color");
                     color.type = WTKeyType::Color;
                     color.stored = color.journaled = true;
                     color.field = &WTObject::color_;
                     color.column = &WTStoreRecord::color;
                     color.set = [](WTObject& object, const QVariant& value) {
                       const QMetaType type = guiColorType();
                       if (!value.isNull() &&
                           !(type.isValid() ? value.canConvert(type) : value.typeId() == QMetaType::QString))
                         return false;
                       object.setColor(value);
                       return true;
                     };
                     return color;
                   }(),
                   stored("archived", &WTObject::archived_, &WTStoreRecord::archived),
                   derived<&WTObject::inheritedRate>("inheritedRate"),
                   derived<&WTObject::entityName>("entity"),
                   derived<&WTObject::entityName>("entityName"),
               });
  return table;
}

const WTKeyTable& WTObject::keyTable(WTEntity entity) {
  switch (entity) {
    case WTEntity::Client:
      return WTClient::keys();
    case WTEntity::Project:
      return WTProject::keys();
    case WTEntity::Task:
      return WTTask::keys();
    case WTEntity::Time:
      return WTTime::keys();
    case WTEntity::Flat:
      return WTFlat::keys();
    case WTEntity::Expense:
      return WTExpense::keys();
    case WTEntity::Note:
      return WTNote::keys();
    case WTEntity::ToDo:
      return WTToDo::keys();
  }
  return objectKeys();
}

QVariant WTObject::fieldValue(const WTKeyDescriptor& key) const {
  return std::visit(
      [this](auto field) -> QVariant {
        if constexpr (std::is_same_v<decltype(field), std::monostate>) {
          return {};
        } else {
          return variantOf(this->*field);
        }
      },
      key.field);
}

void WTObject::writeField(const WTKeyDescriptor& key, const QVariant& value) {
  std::visit(
      [&](auto field) {
        if constexpr (!std::is_same_v<decltype(field), std::monostate>) assign(this->*field, value);
      },
      key.field);
}

QVariant WTObject::primitiveValue(const QString& key) const {
  const WTKeyDescriptor* descriptor = keys_->find(key);
  return descriptor ? fieldValue(*descriptor) : QVariant();
}

bool WTObject::writePrimitive(const QString& key, const QVariant& value) {
  const WTKeyDescriptor* descriptor = keys_->find(key);
  if (!descriptor || descriptor->field.index() == 0) return false;
  writeField(*descriptor, value);
  return true;
}

void WTObject::storedValueDidChange(const QString&) {}

QVariant WTObject::valueForKey(const QString& key) const {
  const WTKeyDescriptor* descriptor = keys_->find(key);
  if (!descriptor) return {};
  if (descriptor->get) return descriptor->get(*this);
  if (descriptor->type == WTKeyType::ToOne) {
    WTObject* related = owner();
    return related ? KeyPath::variantFromObject(related) : QVariant();
  }
  if (descriptor->members) {
    QVariantList list;
    for (WTObject* record : descriptor->members(*this)) list.append(KeyPath::variantFromObject(record));
    return list;
  }
  return fieldValue(*descriptor);
}

bool WTObject::setValue(const QString& key, const QVariant& value) {
  const WTKeyDescriptor* descriptor = keys_->find(key);
  if (!descriptor) return false;
  if (descriptor->set) return descriptor->set(*this, value);
  return descriptor->stored && setByType(*descriptor, value);
}

// Each type converts as its typed setter takes it, so that a value set by key is stored the same way.
bool WTObject::setByType(const WTKeyDescriptor& key, const QVariant& value) {
  switch (key.type) {
    case WTKeyType::Text:
      setStoredValue(key, QVariant(value.isNull() ? QString() : value.toString()));
      return true;
    case WTKeyType::Flag:
      setStoredValue(key, QVariant(value.toBool()));
      return true;
    case WTKeyType::Integer: {
      if (value.isNull()) {
        setStoredValue(key, QVariant());
        return true;
      }
      bool ok = false;
      const qint64 number = value.toLongLong(&ok);
      if (!ok) return false;
      setStoredValue(key, QVariant(number));
      return true;
    }
    case WTKeyType::Decimal: {
      const std::optional<Decimal> number = Decimal::fromVariant(value);
      if (!value.isNull() && !number) return false;
      setStoredValue(key, number ? QVariant::fromValue(*number) : QVariant());
      return true;
    }
    case WTKeyType::Date: {
      bool ok = false;
      const std::optional<Date> date = dateFromVariant(value, &ok);
      if (!ok) return false;
      setStoredValue(key, dateVariant(date));
      return true;
    }
    case WTKeyType::ToOne: {
      auto* related = dynamic_cast<WTObject*>(KeyPath::objectFromVariant(value));
      if (related && related->entity() != WTEntities::owner(entity_)) related = nullptr;
      if (!value.isNull() && !related) return false;
      changeOwner(related);
      return true;
    }
    default:
      return false;
  }
}

void WTObject::readRecord(const WTStoreRecord& record) {
  for (const WTKeyDescriptor& key : keys_->keys()) {
    if (!key.stored) continue;
    std::visit(
        [&](auto field, auto column) {
          using Field = decltype(field);
          using Column = decltype(column);
          if constexpr (std::is_same_v<Field, std::monostate> || std::is_same_v<Column, std::monostate>) {
            return;
          } else if constexpr (std::is_same_v<typename Pointee<Field>::Type, QVariant>) {
            if constexpr (std::is_same_v<typename Pointee<Column>::Type, QString>)
              this->*field = colorFromText(record.*column);
          } else if constexpr (std::is_same_v<typename Pointee<Field>::Type,
                                              typename Pointee<Column>::Type>) {
            this->*field = record.*column;
          }
        },
        key.field, key.column);
  }
}

void WTObject::writeRecord(WTStoreRecord& record) const {
  record.entity = entityName();
  for (const WTKeyDescriptor& key : keys_->keys()) {
    if (!key.stored) continue;
    if (key.type == WTKeyType::ToOne) {
      const WTObject* related = owner();
      record.*std::get<QString WTStoreRecord::*>(key.column) = related ? related->uuid_ : QString();
      continue;
    }
    std::visit(
        [&](auto field, auto column) {
          using Field = decltype(field);
          using Column = decltype(column);
          if constexpr (std::is_same_v<Field, std::monostate> || std::is_same_v<Column, std::monostate>) {
            return;
          } else if constexpr (std::is_same_v<typename Pointee<Field>::Type, QVariant>) {
            if constexpr (std::is_same_v<typename Pointee<Column>::Type, QString>)
              record.*column = colorText(this->*field);
          } else if constexpr (std::is_same_v<typename Pointee<Field>::Type,
                                              typename Pointee<Column>::Type>) {
            record.*column = this->*field;
          }
        },
        key.field, key.column);
  }
  // The place among the project's tasks.
  if (entity_ == WTEntity::Task) record.position = indexInOwner();
}

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

WTObject::WTObject(WTEntity entity, WTObjectContext* context)
    : context_(context), keys_(&keyTable(entity)), entity_(entity) {}

WTObject::~WTObject() = default;

void WTObject::awakeFromInsert() {
  if (uuid_.isEmpty()) assignNewIdentity();
}

void WTObject::assignNewIdentity() {
  // The entity can be read back from the identity.
  // A random (version 4) UUID from the securely seeded generator: the system's own is asked once per
  // identity otherwise, and an import makes a hundred thousand.
  std::array<quint32, 4> words;
  QRandomGenerator::global()->fillRange(words.data(), qsizetype(words.size()));
  QByteArray bytes(reinterpret_cast<const char*>(words.data()), sizeof(words));
  bytes[6] = char((bytes[6] & 0x0f) | 0x40);
  bytes[8] = char((bytes[8] & 0x3f) | 0x80);
  const QString unique = QUuid::fromRfc4122(bytes).toString(QUuid::WithoutBraces).toUpper();
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

void WTObject::setStoredValue(const QString& key, const QVariant& value) {
  if (const WTKeyDescriptor* descriptor = keys_->find(key)) setStoredValue(*descriptor, value);
}

void WTObject::setStoredValue(const WTKeyDescriptor& key, const QVariant& value) {
  if (key.field.index() == 0) return;
  const QVariant old = fieldValue(key);
  if (old == value && old.isNull() == value.isNull()) return;
  writeField(key, value);
  context_->storedValueChanged(this, key.name, old);
  storedValueDidChange(key.name);
  announce(key.name);
}

void WTObject::announce(const QString& key) const {
  context_->announce(const_cast<WTObject*>(this), key);
}

void WTObject::relinkOwner(WTObject*, int) {}

QList<WTObject*> WTObject::relatedObjects(const QString& relationship) const {
  const WTKeyDescriptor* key = keys_->find(relationship);
  return key && key->members ? key->members(*this) : QList<WTObject*>();
}

void WTObject::changeOwner(WTObject* newOwner, int index) {
  WTObject* oldOwner = owner();
  if (oldOwner == newOwner && index < 0) return;
  const int oldIndex = indexInOwner();
  relinkOwner(newOwner, index);
  if (oldOwner == newOwner && oldIndex == indexInOwner()) return;
  context_->ownerChanged(this, oldOwner, oldIndex);
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

QVariantMap WTObject::setValues() const {
  QVariantMap values = changedValues(true);
  for (const WTKeyDescriptor& key : keys_->keys()) {
    if (key.type == WTKeyType::Ordered)
      values.insert(key.name, QVariant::fromValue(WTOrderedRelationship{key.members(*this)}));
  }
  return values;
}

QVariantMap WTObject::changedValues() const {
  return changedValues(isInserted());
}

QVariantMap WTObject::changedValues(bool everySetValue) const {
  QVariantMap values;
  auto add = [&](const QString& name) {
    const WTKeyDescriptor* key = keys_->find(name);
    if (!key) return;
    switch (key->type) {
      case WTKeyType::ToOne: {
        WTObject* related = owner();
        values.insert(name, related ? KeyPath::variantFromObject(related) : QVariant());
        return;
      }
      case WTKeyType::Ordered:
        values.insert(name, QVariant::fromValue(WTOrderedRelationship{key->members(*this)}));
        return;
      case WTKeyType::Unordered:
        values.insert(name, QVariant::fromValue(WTUnorderedRelationship{key->members(*this)}));
        return;
      default:
        values.insert(name, fieldValue(*key));
    }
  };
  if (everySetValue) {
    // A new record reports every value it has; unset ones stay out.
    for (const WTKeyDescriptor& key : keys_->keys()) {
      if (!key.stored) continue;
      if (key.type == WTKeyType::ToOne ? owner() != nullptr : !fieldValue(key).isNull()) add(key.name);
    }
    for (const QString& key : changedKeys_) {
      if (!values.contains(key) && !keys_->storedKeys().contains(key)) add(key);
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

std::optional<Decimal> WTObject::userDefaultRate() const {
  const UserDefaults* defaults = context_->userDefaults();
  return defaults ? defaults->decimalForKey(SettingsKeys::kDefaultRate) : std::nullopt;
}
