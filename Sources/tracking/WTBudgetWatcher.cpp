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
  QHash<QString, Standing> now;
  QList<std::pair<WTObject*, WTBudget::Level>> crossings, easings, moves;
  for (WTObject* object : watched) {
    const Decimal billedNow = WTBudget::billed(object);
    const std::optional<Decimal> budget = WTBudget::budget(object);
    const WTBudget::Level levelNow = WTBudget::level(billedNow, budget).value_or(WTBudget::Level::Within);
    // A timer just started has nothing to compare with yet: it only sets where the next tick starts.
    const auto before = standing_.constFind(object->uuid());
    if (before != standing_.cend()) {
      if (const auto level = WTBudget::crossed(before->billed, billedNow, budget))
        crossings.append({object, *level});
      else if (levelNow < before->level)
        easings.append({object, levelNow});
      else if (billedNow != before->billed && WTBudget::level(billedNow, budget))
        moves.append({object, levelNow});
    }
    now.insert(object->uuid(), {billedNow, levelNow});
  }
  standing_ = std::move(now);
  for (const auto& [object, level] : crossings) emit budgetCrossed(object, level);
  for (const auto& [object, level] : easings) emit budgetEased(object, level);
  for (const auto& [object, level] : moves) emit budgetMoved(object, level);
}
