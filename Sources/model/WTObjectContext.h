#pragma once

#include "KeyPath.h"
#include "Result.h"
#include "WTChangeJournal.h"
#include "WTEntity.h"
#include "WTObject.h"
#include "WTRoundingRule.h"
#include "WTStore.h"
#include "WTUndoManager.h"

#include <QHash>
#include <QList>
#include <QObject>

#include <functional>
#include <memory>
#include <optional>
#include <unordered_set>
#include <vector>

class UserDefaults;

// The one object graph of the application: every record lives here, in memory, found by identity. A
// store file (WTStore) mirrors it; save() writes what changed since the last save, and the change
// journal's entries for it, in one transaction.
//
// Changes are announced synchronously to observers of (record, key), with every key that depends on the
// changed one, and once per event-loop turn as objectsDidChange (which also closes the undo group).
// Main thread only.
class WTObjectContext : public QObject {
  Q_OBJECT
 public:
  // `defaults` (not owned, may be null) answers "WTDefaultRate" and "WTStopsOtherTimes".
  explicit WTObjectContext(UserDefaults* defaults = nullptr, QObject* parent = nullptr);
  ~WTObjectContext() override;

  // The context that class operations taking no context use (WTTask::insertNewObject()); set by the
  // application delegate, or by a test. May be null.
  static WTObjectContext* defaultContext();
  static void setDefaultContext(WTObjectContext* context);
  // `context` when given, else the default context; asserts that one exists.
  static WTObjectContext* resolve(WTObjectContext* context);

  UserDefaults* userDefaults() const { return defaults_; }

  // What the preferences bill by where no client, project or task says otherwise: "WTCurrency" (else the
  // locale's currency) and the rule of "WTRoundingMinutes" and "WTRoundingMode". Read from the settings
  // once and again only after one of them changed, since every record's billed figures begin here.
  struct BillingDefaults {
    QString currency;
    WTRoundingRule rule;
  };
  const BillingDefaults& billingDefaults() const;

  // Store. Attaching loads every record of the store into this (empty) context. A context that loads only
  // the timer records sees no other items: it may start and stop timers and save, but must not delete
  // records (their unloaded items would be left behind in the file) nor answer totals; one that loads the
  // running and named records alone must not change the owners it lacks either, nor look for them.
  Result<void> attachStore(std::unique_ptr<WTStore> store);
  Result<void> attachStore(std::unique_ptr<WTStore> store, WTStore::Records which,
                           const QStringList& keys = {});
  bool hasStore() const { return store_ != nullptr; }
  // Closes the store's file for a process that ends next; the records stay in memory, and a later save
  // fails as it does without a store.
  void closeStore() { store_.reset(); }
  WTStore* store() const { return store_.get(); }

  // The journal that saved records report to; null restores the one that records nothing.
  void setChangeJournal(WTChangeJournal* journal);
  WTChangeJournal* changeJournal() const { return journal_; }

  // Records.
  WTObject* insertNewObject(WTEntity entity);
  template <class T>
  T* insertNewObject() {
    return static_cast<T*>(insertNewObject(T::kEntity));
  }
  // Makes room for `records` more records of `entity` about to be inserted (an import of many).
  void reserveForInsertions(WTEntity entity, size_t records);
  // Removes a record; a client's projects stay (without client), a project's tasks and a task's items
  // go with their owner.
  void deleteObject(WTObject* object);

  // The record with this identity, or none. With `forceInsert`, an unknown identity makes a new record
  // of the entity named after its last "@", under exactly that identity; a value that is not a string,
  // or names no entity, still gives none.
  WTObject* objectWithUUID(const QVariant& uuid, bool forceInsert = false);
  WTObject* objectWithUUID(const QString& uuid, bool forceInsert = false) {
    return objectWithUUID(QVariant(uuid), forceInsert);
  }

  // Every live record of that entity or kind ("WTItem" gives every item); none when the model has no
  // entity of that name. The predicate and sort descriptors apply when given.
  std::optional<QList<WTObject*>> fetchObjectsForEntityName(
      const QString& entityName, const QList<KeyPath::SortDescriptor>& sortDescriptors = {},
      const std::function<bool(const WTObject*)>& predicate = {}) const;
  template <class T>
  QList<T*> fetch(const std::function<bool(const T*)>& predicate = {}) const {
    QList<T*> result;
    for (WTObject* object : objects_[static_cast<int>(T::kEntity)]) {
      T* typed = static_cast<T*>(object);
      if (!predicate || predicate(typed)) result.append(typed);
    }
    return result;
  }
  qsizetype count() const;

  // Saving.
  bool hasChanges() const;
  // Writes every change since the last save and reports each record to the journal, which writes its
  // rows in the same transaction. On failure nothing is forgotten and nothing is journaled: the changes
  // stay and the next save tries again.
  Result<void> save();

  // Undo and redo of whole event-loop turns.
  WTUndoManager& undoManager() { return undo_; }

  // Observation. An empty `key` observes every key of the record. The callback runs synchronously on
  // each announcement; it may add or remove observers.
  using Observer = std::function<void(WTObject* object, const QString& key)>;
  using ObserverId = quint64;
  ObserverId addObserver(const WTObject* object, const QString& key, Observer observer);
  void removeObserver(ObserverId id);

  // Announces `key` of `object` and everything that depends on it, in this record and related ones.
  void announce(WTObject* object, const QString& key);

  // Ends the present event-loop turn now: posts objectsDidChange and closes the undo group. Runs by
  // itself at the end of every turn in which something changed.
  void processPendingChanges();

 signals:
  // Once per event-loop turn in which records were inserted, changed or deleted.
  void objectsDidChange(const QList<WTObject*>& inserted, const QList<WTObject*>& updated,
                        const QList<WTObject*>& deleted);
  // Every announcement of a key, derived keys included.
  void objectValueDidChange(WTObject* object, const QString& key);
  void didSave();
  // What Undo and Redo would do, or their names, may have changed.
  void undoStateChanged();

 private:
  friend class WTObject;

  WTObject* makeObject(WTEntity entity);
  // A new record under `identity`, or under a new one of its own when that is empty.
  WTObject* insertNewObject(WTEntity entity, const QString& identity);
  void registerObject(WTObject* object, bool adoptOwnership);
  void unregisterObject(WTObject* object);
  void reinsertObject(WTObject* object);
  void removeFromGraph(WTObject* object);
  void storedValueChanged(WTObject* object, const QString& key, const QVariant& oldValue);
  void ownerChanged(WTObject* object, WTObject* oldOwner, int oldIndex);
  void markChanged(WTObject* object, const QString& key);
  void scheduleProcessing();
  void notifyObservers(WTObject* object, const QString& key);
  void announceClosure(WTObject* object, const QString& key,
                       std::vector<std::pair<WTObject*, QString>>& seen);
  // The user's default rate is where every inherited rate begins: the records that read it announce a
  // new rate, and the costs below them follow.
  void defaultRateDidChange();
  // The same for the preferences' currency ("billingCurrency") and rule ("roundingRule").
  void billingDefaultDidChange(const QString& key);
  void uuidChanged(WTObject* object, const QString& oldUuid);
  // Puts the items loaded from the store into the identity map, once.
  void indexItems() const;

  UserDefaults* defaults_;
  mutable std::optional<BillingDefaults> billingDefaults_;
  std::unique_ptr<WTStore> store_;
  WTNullChangeJournal nullJournal_;
  WTChangeJournal* journal_ = &nullJournal_;
  WTUndoManager undo_;

  // Live records per entity, and by identity. Records are owned through `owned_`; deleted ones stay
  // alive there so that undo can bring them back and nobody holding one is left dangling.
  std::vector<WTObject*> objects_[8];
  mutable QHash<QString, WTObject*> byUuid_;
  mutable bool itemsIndexed_ = true;
  std::vector<std::unique_ptr<WTObject>> owned_;

  // Since the last save.
  std::unordered_set<WTObject*> inserted_, updated_, deleted_;
  // Since the last processPendingChanges.
  QList<WTObject*> turnInserted_, turnUpdated_, turnDeleted_;
  // What turnInserted_ and turnUpdated_ hold, to announce each record once per turn.
  std::unordered_set<WTObject*> turnAnnounced_;
  bool processingScheduled_ = false;

  struct ObserverEntry {
    ObserverId id;
    QString key;
    Observer callback;
  };
  QHash<const WTObject*, std::vector<ObserverEntry>> observers_;
  QHash<ObserverId, const WTObject*> observerOwners_;
  ObserverId nextObserverId_ = 1;
  int announceDepth_ = 0;
};
