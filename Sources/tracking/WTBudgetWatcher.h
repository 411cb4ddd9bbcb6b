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
// tick before. It also says when one is back below a line it stood past at the tick before (an entry
// shortened, the budget raised), so that a warning that no longer holds goes, and when what one billed
// changed without a crossing, so that a warning's figures follow. Records without a running
// timer are not watched; the rows' bars show where they stand.
class WTBudgetWatcher : public QObject {
  Q_OBJECT
 public:
  // `updater` is not owned and must outlive the watcher.
  explicit WTBudgetWatcher(WTStopwatchUpdater* updater, QObject* parent = nullptr);

 signals:
  void budgetCrossed(WTObject* object, WTBudget::Level level);
  // `level` is where it stands now, below where it stood.
  void budgetEased(WTObject* object, WTBudget::Level level);
  // What it billed changed, and it stands where it stood: at `level`.
  void budgetMoved(WTObject* object, WTBudget::Level level);

 private:
  void check();

  WTStopwatchUpdater* updater_;
  // What each task and project with a running timer billed at the last tick, and where that stood, by
  // uuid.
  struct Standing {
    Decimal billed;
    WTBudget::Level level;
  };
  QHash<QString, Standing> standing_;
};
