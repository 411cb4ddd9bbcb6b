#include "WTBudgetWatcher.h"

#include "WTProject.h"
#include "WTStopwatchUpdater.h"
#include "WTTask.h"
#include "WTTime.h"

WTBudgetWatcher::WTBudgetWatcher(WTStopwatchUpdater* updater, QObject* parent)
    : QObject(parent), updater_(updater) {
  connect(updater_, &WTStopwatchUpdater::stopwatchDidUpdate, this, &WTBudgetWatcher::check);
}

void WTBudgetWatcher::check() {
  QList<WTObject*> watched;
  for (WTTime* time : updater_->times()) {
    WTTask* task = time->task();
    if (!task) continue;
    for (WTObject* object : {static_cast<WTObject*>(task), static_cast<WTObject*>(task->project())}) {
      if (object && !watched.contains(object)) watched.append(object);
    }
  }
  QHash<QString, Decimal> now;
  QList<std::pair<WTObject*, WTBudget::Level>> crossings;
  for (WTObject* object : watched) {
    const Decimal billedNow = WTBudget::billed(object);
    // A timer just started has nothing to compare with yet: it only sets where the next tick starts.
    const auto before = billed_.constFind(object->uuid());
    if (before != billed_.cend()) {
      if (const auto level = WTBudget::crossed(*before, billedNow, WTBudget::budget(object)))
        crossings.append({object, *level});
    }
    now.insert(object->uuid(), billedNow);
  }
  billed_ = std::move(now);
  for (const auto& [object, level] : crossings) emit budgetCrossed(object, level);
}
