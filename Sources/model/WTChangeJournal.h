#pragma once

#include "Result.h"
#include "WTObject.h"
#include "WTStore.h"

#include <QString>
#include <QVariantMap>

// Where stored records report themselves as they are saved, so that the sync can send local changes.
// `values` maps attribute and relationship names to their new values: plain values (QString, integers,
// booleans, Decimal, Date, QColor), a to-one relationship as the related record (KeyValueCoding*, which
// also is an RZSyncObject), an ordered to-many relationship as WTOrderedRelationship and an unordered one
// as WTUnorderedRelationship (see WTObject.h).
//
// A save reports its records inside its store transaction and then lets the journal write the rows of
// what the reports changed (writeChanges), so that the store and its journal always agree.
class WTChangeJournal {
 public:
  virtual ~WTChangeJournal() = default;
  virtual void insertValues(const QVariantMap& values, const QString& uuid) = 0;
  virtual void updateValues(const QVariantMap& values, const QString& uuid) = 0;
  virtual void deleteObjectWithId(const QString& uuid) = 0;
  // A new record whose identity no journal row names yet (WTObject::hasUnsavedNewIdentity), reported
  // inside the save's transaction with the writer of the journal's rows: a journal that does not hold
  // its entries in memory may write the entry at once, straight from the record's values. By default it
  // is reported as every new record is.
  virtual Result<void> insertNew(const WTObject& record, WTStore::JournalWriter& writer) {
    Q_UNUSED(writer);
    insertValues(record.changedValues(), record.uuid());
    return {};
  }
  // Whether the other devices hold `uuid` as deleted for good, so that nothing sent under it again would
  // reach them: a record coming back (by undo or redo) must come back under a new identity.
  virtual bool isRetired(const QString& uuid) const {
    Q_UNUSED(uuid);
    return false;
  }
  // Whether saved records are reported at all (computing every changed value is not free).
  virtual bool recordsSaves() const { return true; }
  // Inside the save's transaction: writes the journal rows of what the records reported since the last
  // call changed. A save calls it after its last report, and a large one also every so many reports.
  // An error undoes the whole save.
  virtual Result<void> writeChanges(WTStore::JournalWriter& writer) {
    Q_UNUSED(writer);
    return {};
  }
  // The save is over: `written` when its rows (and the journal's) are in the file; otherwise nothing of
  // it is, and the journal forgets what it was told.
  virtual void saveEnded(bool written) { Q_UNUSED(written); }
};

// The journal in force while no sync is set up: it records nothing.
class WTNullChangeJournal final : public WTChangeJournal {
 public:
  void insertValues(const QVariantMap&, const QString&) override {}
  void updateValues(const QVariantMap&, const QString&) override {}
  void deleteObjectWithId(const QString&) override {}
  bool recordsSaves() const override { return false; }
};
