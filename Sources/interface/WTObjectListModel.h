#pragma once

#include "WTEntity.h"

#include <QAbstractListModel>
#include <QHash>
#include <QSet>
#include <QTimer>

#include <functional>

class WTObject;
class WTObjectContext;

// The records of one entity as a list: filtered (archived ones hidden unless shown), ordered by name
// without regard to case, and kept up to date from the context's change notices with exact row
// inserts, removals and moves, never a reset after the first fill. Text, totals and images are
// offered under the roles below.
//
// A project in which a timer runs is listed whatever the filter says: a running timer is never out of
// sight, even on an archived project (which stays archived, and is marked as running).
class WTObjectListModel : public QAbstractListModel {
  Q_OBJECT
 public:
  enum Role {
    ObjectRole = Qt::UserRole + 1,  // WTObject* as a pointer (quintptr)
    NameRole,
    SubtitleRole,
    DurationTextRole,
    CostTextRole,
    BilledTextRole,  // what the record's rounding rules bill where it differs from the totals; else empty
    ImageRole,
    ArchivedRole,
    ClientRole,   // projects: the client (WTObject* as quintptr), settable
    RunningRole,  // projects: whether a timer runs in it
    BudgetRole,   // projects with a budget: a WTBudgetState
  };

  // `context` is not owned and must outlive the model.
  WTObjectListModel(WTObjectContext* context, WTEntity entity, QObject* parent = nullptr);
  ~WTObjectListModel() override;

  WTEntity entity() const { return entity_; }
  WTObjectContext* context() const { return context_; }

  // Which records are listed; empty lists them all. Re-arranges at once.
  void setFilterPredicate(std::function<bool(const WTObject*)> predicate);

  const QList<WTObject*>& arrangedObjects() const { return arranged_; }
  WTObject* objectAt(int row) const;
  // The row of `object`, or -1 when it is not listed.
  int rowOfObject(const WTObject* object) const;
  QModelIndex indexOfObject(const WTObject* object) const;

  // Filters and orders again now; normally this runs by itself after every change.
  void rearrangeObjects();

  int rowCount(const QModelIndex& parent = QModelIndex()) const override;
  QVariant data(const QModelIndex& index, int role = Qt::DisplayRole) const override;
  bool setData(const QModelIndex& index, const QVariant& value, int role = Qt::EditRole) override;
  Qt::ItemFlags flags(const QModelIndex& index) const override;
  QHash<int, QByteArray> roleNames() const override;

  static WTObject* objectFromVariant(const QVariant& value);
  static QVariant variantFromObject(const WTObject* object);

 private:
  void objectValueDidChange(WTObject* object, const QString& key);
  void objectsDidChange(const QList<WTObject*>& inserted, const QList<WTObject*>& updated,
                        const QList<WTObject*>& deleted);
  void flushChangedRows();
  QList<WTObject*> computeArrangement() const;
  void reindex();

  WTObjectContext* context_;
  WTEntity entity_;
  std::function<bool(const WTObject*)> predicate_;
  QList<WTObject*> arranged_;
  QHash<const WTObject*, int> rows_;
  QSet<const WTObject*> changed_;
  QTimer changeTimer_;
  QTimer rearrangeTimer_;
};
