#pragma once

#include "Date.h"
#include "Decimal.h"
#include "KeyPath.h"

#include <QHash>
#include <QList>
#include <QString>
#include <QStringList>
#include <QVariant>

#include <initializer_list>
#include <optional>
#include <type_traits>
#include <variant>
#include <vector>

class WTObject;
struct WTStoreRecord;

// What a key holds: how a value set by key is checked and converted, and how the sync reads it.
// `Other` travels as it comes (lists of records, images, a date key that is not stored).
enum class WTKeyType : unsigned char {
  Other,
  Text,
  Flag,
  Integer,
  Decimal,
  Date,
  Color,
  ToOne,
  Ordered,
  Unordered
};

// One key of an entity, declared once: the store, the journal, key-value access and the templates all
// read it from here. A stored key names the record's field and the store row's column; a relationship
// names its records; a derived key names what answers it. `get` and `set`, when given, take the place of
// reading the field and of the conversion by type (a setter with rules of its own goes through them).
struct WTKeyDescriptor {
  using Getter = QVariant (*)(const WTObject&);
  using Setter = bool (*)(WTObject&, const QVariant&);
  using Members = QList<WTObject*> (*)(const WTObject&);
  using Field =
      std::variant<std::monostate, QString WTObject::*, bool WTObject::*, std::optional<qint64> WTObject::*,
                   std::optional<Decimal> WTObject::*, std::optional<Date> WTObject::*, QVariant WTObject::*>;
  using Column = std::variant<std::monostate, QString WTStoreRecord::*, bool WTStoreRecord::*,
                              std::optional<qint64> WTStoreRecord::*, std::optional<Decimal> WTStoreRecord::*,
                              std::optional<Date> WTStoreRecord::*>;

  QString name;
  WTKeyType type = WTKeyType::Other;
  // A column of the store file: saved, loaded and reported to the journal.
  bool stored = false;
  // Reported to the journal when changed: the stored keys and the to-many sides of relationships.
  bool journaled = false;
  Field field;
  Column column;  // for a to-one relationship: the owner's uuid
  Getter get = nullptr;
  Setter set = nullptr;
  Members members = nullptr;  // to-many relationships
  // The key paths whose change this key follows ("rate", "project.rate"); see WTKeyDependencies.h.
  QStringList affectedBy;
  // Declared by a subclass over its base's key of the same name: what it gives replaces the base's.
  bool refines = false;
};

// The keys of one entity class, its base class's first, found by name through a hash built once.
class WTKeyTable {
 public:
  WTKeyTable(const WTKeyTable* base, std::initializer_list<WTKeyDescriptor> keys);

  const WTKeyDescriptor* find(const QString& name) const {
    const auto it = index_.constFind(name);
    return it == index_.constEnd() ? nullptr : &keys_[size_t(*it)];
  }
  const std::vector<WTKeyDescriptor>& keys() const { return keys_; }
  // Stored keys (attributes and to-one relationships), in declaration order.
  const QStringList& storedKeys() const { return stored_; }
  // The to-one relationship to the owner, or none.
  const WTKeyDescriptor* ownerKey() const { return owner_ < 0 ? nullptr : &keys_[size_t(owner_)]; }
  // Every key's place in keys(), in the order of their names (the order a map of values by key keeps).
  const std::vector<int>& byName() const { return byName_; }

 private:
  std::vector<WTKeyDescriptor> keys_;
  QHash<QString, int> index_;
  QStringList stored_;
  int owner_ = -1;
  std::vector<int> byName_;
};

// Declarations for the tables; each entity class declares its keys in its own source file.
namespace WTKeys {

namespace detail {
template <class>
struct MemberOf;
template <class R, class C>
struct MemberOf<R (C::*)() const> {
  using Class = C;
  using Result = R;
};

inline QVariant toVariant(const QString& value) {
  return value;
}
inline QVariant toVariant(bool value) {
  return value;
}
inline QVariant toVariant(int value) {
  return value;
}
inline QVariant toVariant(const Decimal& value) {
  return QVariant::fromValue(value);
}
inline QVariant toVariant(const std::optional<Decimal>& value) {
  return value ? QVariant::fromValue(*value) : QVariant();
}
inline QVariant toVariant(const std::optional<Date>& value) {
  return value ? QVariant::fromValue(*value) : QVariant();
}
template <class T>
QVariant toVariant(const QList<T*>& records) {
  QVariantList list;
  list.reserve(records.size());
  for (T* record : records) list.append(KeyPath::variantFromObject(record));
  return list;
}

template <class T>
constexpr WTKeyType typeOf() {
  if constexpr (std::is_same_v<T, QString>) return WTKeyType::Text;
  if constexpr (std::is_same_v<T, bool>) return WTKeyType::Flag;
  if constexpr (std::is_same_v<T, int> || std::is_same_v<T, std::optional<qint64>>) return WTKeyType::Integer;
  if constexpr (std::is_same_v<T, Decimal> || std::is_same_v<T, std::optional<Decimal>>)
    return WTKeyType::Decimal;
  if constexpr (std::is_same_v<T, std::optional<Date>>) return WTKeyType::Date;
  return WTKeyType::Other;
}
}  // namespace detail

// Answers a key by calling a const method of the record's class.
template <auto Method>
QVariant read(const WTObject& object) {
  using Info = detail::MemberOf<decltype(Method)>;
  return detail::toVariant((static_cast<const typename Info::Class&>(object).*Method)());
}

// The records of a to-many relationship, as a const method of the record's class lists them.
template <auto Method>
QList<WTObject*> records(const WTObject& object) {
  using Info = detail::MemberOf<decltype(Method)>;
  const auto& list = (static_cast<const typename Info::Class&>(object).*Method)();
  return QList<WTObject*>(list.begin(), list.end());
}

// A stored attribute: the record's field and the store row's column of the same type.
template <class C, class T>
WTKeyDescriptor stored(const char* name, T C::*field, T WTStoreRecord::*column,
                       WTKeyDescriptor::Setter set = nullptr, QStringList affectedBy = {}) {
  WTKeyDescriptor key;
  key.name = QString::fromLatin1(name);
  key.type = detail::typeOf<T>();
  key.stored = key.journaled = true;
  key.field = static_cast<T WTObject::*>(field);
  key.column = column;
  key.set = set;
  key.affectedBy = std::move(affectedBy);
  return key;
}

// A to-one relationship to the record's owner, stored as the owner's uuid.
inline WTKeyDescriptor toOne(const char* name, QString WTStoreRecord::*ownerUuid,
                             QStringList affectedBy = {}) {
  WTKeyDescriptor key;
  key.name = QString::fromLatin1(name);
  key.type = WTKeyType::ToOne;
  key.stored = key.journaled = true;
  key.column = ownerUuid;
  key.affectedBy = std::move(affectedBy);
  return key;
}

// A to-many relationship: the owner's side of the records' to-one; changes reach the journal.
inline WTKeyDescriptor toMany(const char* name, WTKeyType type, WTKeyDescriptor::Members members,
                              WTKeyDescriptor::Setter set = nullptr) {
  WTKeyDescriptor key;
  key.name = QString::fromLatin1(name);
  key.type = type;
  key.journaled = true;
  key.members = members;
  key.set = set;
  return key;
}

// A key worked out from others, never stored; a setter makes it writable.
inline WTKeyDescriptor derived(const char* name, WTKeyType type, WTKeyDescriptor::Getter get,
                               QStringList affectedBy = {}, WTKeyDescriptor::Setter set = nullptr) {
  WTKeyDescriptor key;
  key.name = QString::fromLatin1(name);
  key.type = type;
  key.get = get;
  key.set = set;
  key.affectedBy = std::move(affectedBy);
  return key;
}
template <auto Method>
WTKeyDescriptor derived(const char* name, QStringList affectedBy = {},
                        WTKeyDescriptor::Setter set = nullptr) {
  using Result = std::decay_t<typename detail::MemberOf<decltype(Method)>::Result>;
  return derived(name, detail::typeOf<Result>(), &read<Method>, std::move(affectedBy), set);
}

// A subclass's own reading, writing or dependencies of a key its base declares; what is not given stays.
inline WTKeyDescriptor refine(const char* name, WTKeyDescriptor::Getter get,
                              WTKeyDescriptor::Setter set = nullptr, QStringList affectedBy = {}) {
  WTKeyDescriptor key;
  key.name = QString::fromLatin1(name);
  key.get = get;
  key.set = set;
  key.affectedBy = std::move(affectedBy);
  key.refines = true;
  return key;
}

}  // namespace WTKeys
