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

#include <algorithm>
#include <array>
#include <cstring>
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
  std::array<unsigned char, 16> bytes;
  std::memcpy(bytes.data(), words.data(), bytes.size());
  bytes[6] = (bytes[6] & 0x0f) | 0x40;
  bytes[8] = (bytes[8] & 0x3f) | 0x80;
  // Its text in capitals, "8-4-4-4-12" digits, written at once: an import makes a hundred thousand.
  static constexpr char kDigits[] = "0123456789ABCDEF";
  const QString entity = entityName();
  QString identity(36 + 1 + entity.size(), Qt::Uninitialized);
  QChar* out = identity.data();
  for (size_t i = 0; i < bytes.size(); ++i) {
    if (i == 4 || i == 6 || i == 8 || i == 10) *out++ = u'-';
    *out++ = QLatin1Char(kDigits[bytes[i] >> 4]);
    *out++ = QLatin1Char(kDigits[bytes[i] & 0xf]);
  }
  *out++ = u'@';
  std::copy(entity.begin(), entity.end(), out);
  setUuid(identity);
  unsavedNewIdentity_ = true;
}

void WTObject::setUuid(const QString& uuid) {
  if (uuid == uuid_) return;
  unsavedNewIdentity_ = false;
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
  if (everySetValue) {
    visitReportedValues([&](const QString& key, const QVariant& value) { values.insert(key, value); });
    return values;
  }
  for (const QString& name : changedKeys_) {
    if (const WTKeyDescriptor* key = keys_->find(name)) values.insert(name, reportedValue(*key));
  }
  return values;
}

QVariant WTObject::reportedValue(const WTKeyDescriptor& key) const {
  switch (key.type) {
    case WTKeyType::ToOne: {
      WTObject* related = owner();
      return related ? KeyPath::variantFromObject(related) : QVariant();
    }
    case WTKeyType::Ordered:
      return QVariant::fromValue(WTOrderedRelationship{key.members(*this)});
    case WTKeyType::Unordered:
      return QVariant::fromValue(WTUnorderedRelationship{key.members(*this)});
    default:
      return fieldValue(key);
  }
}

void WTObject::visitReportedValues(const std::function<void(const QString&, const QVariant&)>& visit) const {
  // A new record reports every stored value it has (unset ones stay out) and the other keys it changed.
  for (const int index : keys_->byName()) {
    const WTKeyDescriptor& key = keys_->keys()[size_t(index)];
    if (key.stored && key.type == WTKeyType::ToOne) {
      if (const WTObject* related = owner()) visit(key.name, KeyPath::variantFromObject(related));
    } else if (key.stored) {
      if (const QVariant value = fieldValue(key); !value.isNull()) visit(key.name, value);
    } else if (key.journaled && changedKeys_.contains(key.name)) {  // a change marks journaled keys alone
      visit(key.name, reportedValue(key));
    }
  }
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
