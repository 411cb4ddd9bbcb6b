#pragma once

#include <QString>
#include <QVariantMap>

// Where stored records report themselves as they are saved, so that the sync can send local changes.
// `values` maps attribute and relationship names to their new values: plain values (QString, integers,
// booleans, Decimal, Date, QColor), a to-one relationship as the related record (KeyValueCoding*, which
// also is an RZSyncObject), an ordered to-many relationship as WTOrderedRelationship and an unordered one
// as WTUnorderedRelationship (see WTObject.h).
class WTChangeJournal {
 public:
  virtual ~WTChangeJournal() = default;
  virtual void insertValues(const QVariantMap& values, const QString& uuid) = 0;
  virtual void updateValues(const QVariantMap& values, const QString& uuid) = 0;
  virtual void deleteObjectWithId(const QString& uuid) = 0;
  // Whether the other devices hold `uuid` as deleted for good, so that nothing sent under it again would
  // reach them: a record coming back (by undo or redo) must come back under a new identity.
  virtual bool isRetired(const QString& uuid) const {
    Q_UNUSED(uuid);
    return false;
  }
};

// The journal in force while no sync is set up: it records nothing.
class WTNullChangeJournal final : public WTChangeJournal {
 public:
  void insertValues(const QVariantMap&, const QString&) override {}
  void updateValues(const QVariantMap&, const QString&) override {}
  void deleteObjectWithId(const QString&) override {}
};
