#include "WTRecentTasks.h"

#include "WTObjectContext.h"
#include "WTTask.h"

#include <algorithm>
#include <optional>

WTRecentTasks::WTRecentTasks(WTObjectContext* context, int limit, QObject* parent)
    : QObject(parent), context_(context), limit_(limit) {
  connect(context_, &WTObjectContext::objectsDidChange, this, &WTRecentTasks::objectsDidChange);
}

const QList<WTTask*>& WTRecentTasks::tasks() {
  if (dirty_) rearrangeObjects();
  return arranged_;
}

void WTRecentTasks::setActive(bool active) {
  active_ = active;
  if (active_ && rearrangeObjects()) emit tasksDidChange();
}

void WTRecentTasks::objectsDidChange(const QList<WTObject*>& inserted, const QList<WTObject*>& updated,
                                     const QList<WTObject*>& deleted) {
  // Only tasks and their items move a task in this list (a renamed task changes nothing of its place, but
  // its row shows the new name, so it counts as a change too).
  auto concernsTasks = [](const QList<WTObject*>& objects) {
    return std::any_of(objects.begin(), objects.end(), [](const WTObject* object) {
      return object->entity() != WTEntity::Client && object->entity() != WTEntity::Project;
    });
  };
  if (!concernsTasks(inserted) && !concernsTasks(updated) && !concernsTasks(deleted)) return;
  dirty_ = true;
  if (!active_) return;
  rearrangeObjects();
  // Rows show names and buttons that may have changed even where the order did not.
  emit tasksDidChange();
}

bool WTRecentTasks::rearrangeObjects() {
  dirty_ = false;
  struct Candidate {
    WTTask* task;
    bool running;
    std::optional<Date> latestEnd;
    qsizetype order;  // in the store: what decides between equals, so the list never shuffles itself
  };
  std::vector<Candidate> candidates;
  for (WTTask* task : context_->fetch<WTTask>())
    candidates.push_back({task, task->running(), task->maxTimeEndDate(), qsizetype(candidates.size())});
  const auto cut = candidates.begin() + std::min<qsizetype>(limit_, qsizetype(candidates.size()));
  std::partial_sort(candidates.begin(), cut, candidates.end(), [](const Candidate& a, const Candidate& b) {
    if (a.running != b.running) return a.running;
    if (a.latestEnd.has_value() != b.latestEnd.has_value()) return a.latestEnd.has_value();
    if (a.latestEnd && *a.latestEnd != *b.latestEnd) return *a.latestEnd > *b.latestEnd;
    return a.order < b.order;
  });
  QList<WTTask*> arranged;
  for (auto candidate = candidates.begin(); candidate != cut; ++candidate) arranged.append(candidate->task);
  if (arranged == arranged_) return false;
  arranged_ = std::move(arranged);
  return true;
}
