#pragma once

#include "Decimal.h"
#include "WTBudget.h"

#include <QHash>
#include <QObject>
#include <QString>

#include <optional>

class WTObject;
class WTStopwatchUpdater;

// Watches the tasks and projects in which a timer runs, tick by tick, and says when a tick takes one
// past 80 % or past the whole of its budget: once per crossing, compared with what it billed at the
// tick before. Records without a running timer are not watched; the rows' bars show where they stand.
class WTBudgetWatcher : public QObject {
  Q_OBJECT
 public:
  // `updater` is not owned and must outlive the watcher.
  explicit WTBudgetWatcher(WTStopwatchUpdater* updater, QObject* parent = nullptr);

 signals:
  void budgetCrossed(WTObject* object, WTBudget::Level level);

 private:
  void check();

  WTStopwatchUpdater* updater_;
  // What each task and project with a running timer billed at the last tick, by uuid.
  QHash<QString, Decimal> billed_;
};
