#pragma once

#include "Decimal.h"
#include "KeyPath.h"
#include "WTEntity.h"
#include "WTKeyTable.h"

#include <QList>
#include <QMetaType>
#include <QString>
#include <QStringList>
#include <QVariant>

#include <functional>
#include <optional>

class WTObjectContext;
struct WTStoreRecord;

// What every stored record offers the change journal: the identity it travels under.
class RZSyncObject {
 public:
  virtual ~RZSyncObject() = default;
  virtual QString uuid() const = 0;
};

class WTObject;

// Relationship values as reported to the change journal (see WTChangeJournal.h).
struct WTOrderedRelationship {
  QList<WTObject*> objects;
};
struct WTUnorderedRelationship {
  QList<WTObject*> objects;
};
Q_DECLARE_METATYPE(WTOrderedRelationship)
Q_DECLARE_METATYPE(WTUnorderedRelationship)

// Base of every stored record. Records are owned by their WTObjectContext and live in its memory; the
// store file only mirrors them. Every change of a stored value goes through setStoredValue, which records
// the undo step, marks the record for the next save and announces the key (and every key that depends on
// it) to the context's observers. Records are not QObjects: the context does the telling.
class WTObject : public KeyValueCoding, public RZSyncObject {
 public:
  ~WTObject() override;
  WTObject(const WTObject&) = delete;
  WTObject& operator=(const WTObject&) = delete;

  WTEntity entity() const { return entity_; }
  QString entityName() const { return WTEntities::name(entity_); }
  // The context that owns the record; never null.
  WTObjectContext* context() const { return context_; }

  QString uuid() const override { return uuid_; }
  // Identity changes are for the sync only, when it takes over a record under a known identity.
  void setUuid(const QString& uuid);
  // A new, process-wide unique identity: the text of a random UUID, "@" and the entity name.
  void assignNewIdentity();

  QString name() const { return name_; }
  void setName(const QString& name);
  // Whether two names name the same record where a person types one (the commands, an import): without
  // regard to case.
  static bool sameName(const QString& a, const QString& b) { return a.compare(b, Qt::CaseInsensitive) == 0; }
  QString notes() const { return notes_; }
  void setNotes(const QString& notes);
  // The colour: a QColor where the GUI module is loaded (the desktop, reports), the store's text
  // "#aarrggbb" where it is not (the command line), null when there is none. The model meets the GUI's
  // colour type only as a QVariant, through the conversions that module registers, so it links no GUI
  // library.
  QVariant color() const { return color_; }
  // A QColor or a colour's text ("#rrggbb", "#aarrggbb", a name); null or not a colour: none.
  void setColor(const QVariant& color);
  // The store's and the sync's text of a colour: "#aarrggbb", null when there is none.
  static QString colorText(const QVariant& color);
  bool archived() const { return archived_; }
  void setArchived(bool archived);

  // The rate stored on this record itself; none means "inherit".
  std::optional<Decimal> storedRate() const { return rate_; }
  // Stores the record's own rate; clients, projects and tasks also announce the cost change upward.
  virtual void setRate(const std::optional<Decimal>& rate);
  // The rate in force for this record after inheritance: its own rate, else rateFromAbove().
  Decimal inheritedRate() const { return rate_ ? *rate_ : rateFromAbove(); }
  // What this record inherits while it has no rate of its own (its owner's rate, or the default rate
  // of its kind); the base answers a client's built-in rate.
  virtual Decimal rateFromAbove() const;

  // Key-value access by the stored and derived key names the lists, reports and sync use, as the entity's
  // key table declares them.
  QVariant valueForKey(const QString& key) const override;
  // Sets a writable key through the same setter a caller would use (so the same announcements follow).
  // Relationships take a record (variantFromObject) or null. Returns false for unknown or derived keys
  // and for values of the wrong kind; nothing changes then.
  bool setValue(const QString& key, const QVariant& value);

  // Save bookkeeping, as the journal sees it.
  bool isInserted() const;
  bool isUpdated() const;
  bool isDeleted() const;
  // Changed values since the last save: for a new record every value that is set, otherwise the
  // changed keys only. Relationships are reported as WTChangeJournal.h describes.
  QVariantMap changedValues() const;
  // Every value that is set, as a new record reports them, and the ordered members (a project's tasks).
  QVariantMap setValues() const;
  // The values changedValues() reports of a new record, one at a time in the order of their keys' names
  // (a QVariantMap's order), without building the map.
  void visitReportedValues(const std::function<void(const QString& key, const QVariant& value)>& visit) const;
  // Whether the identity was drawn at random here for a record never saved since: no journal row can
  // name it yet.
  bool hasUnsavedNewIdentity() const { return unsavedNewIdentity_; }
  // Reports this record to the context's change journal as it is about to be saved.
  void willSave();

  // The stored keys of this entity (attributes and to-one relationships, not to-many sides).
  QStringList storedKeys() const { return keys_->storedKeys(); }
  // The keys of this record's entity, and of any entity.
  const WTKeyTable& keyTable() const { return *keys_; }
  static const WTKeyTable& keyTable(WTEntity entity);

 protected:
  WTObject(WTEntity entity, WTObjectContext* context);

  // Life cycle: a brand-new record gets its identity here (unless made under a known one); subclasses add
  // their initial values.
  virtual void awakeFromInsert();
  virtual void awakeFromFetch() {}

  // Reads and writes stored attributes by key without any bookkeeping; false for keys it does not keep.
  QVariant primitiveValue(const QString& key) const;
  bool writePrimitive(const QString& key, const QVariant& value);
  // Runs after a stored attribute changed (also during undo and redo): the place for upward
  // announcements that must follow the value wherever the change came from.
  virtual void storedValueDidChange(const QString& key);

  // The one path of a stored attribute change; a value equal to the present one changes nothing.
  void setStoredValue(const QString& key, const QVariant& value);
  // Tells observers that `key` (a derived key, usually) changed, with everything that depends on it.
  void announce(const QString& key) const;

  // The to-one owner (client, project or task) and its relink; none for clients.
  virtual WTObject* owner() const { return nullptr; }
  QString ownerKey() const {
    const WTKeyDescriptor* key = keys_->ownerKey();
    return key ? key->name : QString();
  }
  virtual void relinkOwner(WTObject* owner, int index);
  // The place among the owner's ordered children; -1 where the owner keeps no order.
  virtual int indexInOwner() const { return -1; }
  // The records of a to-many relationship this entity holds, for announcements and the journal.
  QList<WTObject*> relatedObjects(const QString& relationship) const;

  // "WTDefaultRate" from the user's settings, when set to a number.
  std::optional<Decimal> userDefaultRate() const;

  // Store row mapping, by the stored keys' columns.
  void readRecord(const WTStoreRecord& record);
  void writeRecord(WTStoreRecord& record) const;

  // Moves this record under `owner` (or out, with null) keeping both sides of the relationship and the
  // undo step; `index` is the place among the owner's ordered children (-1: at the end).
  void changeOwner(WTObject* owner, int index = -1);

 private:
  // With `everySetValue`, as a new record reports: every set value and the changed relationships.
  QVariantMap changedValues(bool everySetValue) const;
  // The generic paths by a key's declaration.
  QVariant fieldValue(const WTKeyDescriptor& key) const;
  // A key's value as the journal is told it (relationships as WTChangeJournal.h describes).
  QVariant reportedValue(const WTKeyDescriptor& key) const;
  void writeField(const WTKeyDescriptor& key, const QVariant& value);
  bool setByType(const WTKeyDescriptor& key, const QVariant& value);
  void setStoredValue(const WTKeyDescriptor& key, const QVariant& value);
  // The keys every record has.
  static const WTKeyTable& objectKeys();

  friend class WTObjectContext;
  friend class WTBillingRecord;
  friend class WTClient;
  friend class WTProject;
  friend class WTTask;
  friend class WTItem;

  WTObjectContext* context_;
  const WTKeyTable* keys_;
  QString uuid_;
  QString name_;
  QString notes_;
  std::optional<Decimal> rate_;
  QVariant color_;
  WTEntity entity_;
  bool archived_ = false;

  // Kept by the context.
  bool registered_ = false;  // part of the live graph (false once deleted)
  int registryIndex_ = -1;   // place in the context's list of its entity
  bool persisted_ = false;   // a row for it is in the store file
  QStringList changedKeys_;  // since the last save
  bool unsavedNewIdentity_ = false;
};

// Each entity class declares its entity and the class operations that act on the default context.
#define WT_ENTITY_CLASS(Class, Entity)                                                           \
 public:                                                                                         \
  static constexpr WTEntity kEntity = WTEntity::Entity;                                          \
  /* Inserts a new record into `context` (the default context when none is given). */            \
  static Class* insertNewObject(WTObjectContext* context = nullptr);                             \
  /* Every record of this entity that the predicate accepts (all when it is empty). */           \
  static QList<Class*> fetchByPredicate(const std::function<bool(const Class*)>& predicate = {}, \
                                        WTObjectContext* context = nullptr);                     \
  /* The record of that identity in the default context, or none; never creates one. */          \
  static Class* objectWithUUID(const QString& uuid, WTObjectContext* context = nullptr);         \
  /* The keys of this entity, declared once in its source file. */                               \
  static const WTKeyTable& keys();

#define WT_ENTITY_CLASS_IMPL(Class)                                                              \
  Class* Class::insertNewObject(WTObjectContext* context) {                                      \
    return WTObjectContext::resolve(context)->insertNewObject<Class>();                          \
  }                                                                                              \
  QList<Class*> Class::fetchByPredicate(const std::function<bool(const Class*)>& predicate,      \
                                        WTObjectContext* context) {                              \
    return WTObjectContext::resolve(context)->fetch<Class>(predicate);                           \
  }                                                                                              \
  Class* Class::objectWithUUID(const QString& uuid, WTObjectContext* context) {                  \
    return dynamic_cast<Class*>(WTObjectContext::resolve(context)->objectWithUUID(uuid, false)); \
  }
