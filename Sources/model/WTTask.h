#pragma once

#include "Date.h"
#include "WTBillingRecord.h"

#include <QHash>
#include <QSet>

#include <memory>
#include <vector>

class WTItem;
class WTItemContainer;
class WTProject;
class WTTime;

using WTItemContainerList = std::vector<std::shared_ptr<WTItemContainer>>;

// A task of a project: owns its items of every kind, sums them and runs their timers.
class WTTask final : public WTBillingRecord {
  WT_ENTITY_CLASS(WTTask, Task)
 public:
  explicit WTTask(WTObjectContext* context) : WTBillingRecord(WTEntity::Task, context) {}
  ~WTTask() override;

  WTProject* project() const { return project_; }
  // Files the task at the end of `project`'s tasks (or at `index` among them).
  void setProject(WTProject* project, int index = -1);
  std::optional<Decimal> budget() const { return budget_; }
  void setBudget(const std::optional<Decimal>& budget);

  // Its project's rule; the preferences' without a project.
  WTRoundingRule roundingRuleFromAbove() const override;
  // The project's billing currency; the preferences' without a project.
  QString billingCurrency() const override;

  // Every item of the task, of every kind, in no particular order.
  const QList<WTItem*>& items() const { return items_; }
  // Takes `items` into this task, each keeping its date. Returns them; none when a time entry among them
  // would share time with another of the task's (clashOfAdopting).
  QList<WTItem*> adoptItems(const QList<WTItem*>& items);
  // Takes `items` into this task's group of `day`: a day books them on it (WTItem::setDate); none is
  // "Pending", where only to-dos come, opened again, and other items stay where they were. Returns the
  // items that came; none when a day would make two of the task's time entries share time.
  QList<WTItem*> adoptItems(const QList<WTItem*>& items, std::optional<Date> day);

  // A time entry that adopting would make share time with another of this task's entries: where each
  // would be. The other is one the task keeps, or another entry that moves with it.
  struct Clash {
    const WTTime* moving = nullptr;
    const WTTime* other = nullptr;
    Date otherStart, otherEnd;
  };
  // The clash that adoptItems(items, *day) would cause, or adoptItems(items) without a day; none when
  // every entry fits. Checked before a move, so that the same minute is never billed twice in a task.
  std::optional<Clash> clashOfAdopting(const QList<WTItem*>& items, std::optional<Date> day) const;

  // Own rate, else the project's inherited rate; without a project "WTDefaultRate", else builtInRate().
  Decimal rateFromAbove() const override;
  // What a task without a project bills, with no rate of its own and no default set: 75.
  static Decimal builtInRate() { return Decimal(75); }

  int duration() const override;
  Decimal cost() const override;
  // The sums of the items' billed minutes and billed costs (see WTItem::billedCost).
  int billedDuration() const override;
  Decimal billedCost() const override;

  // While one lives, each task's duration and cost are worked out once and then remembered. For a
  // report, which reads every task's totals again for its project's subtotal and for the grand total, and
  // during which nothing changes: whoever makes one must change no record while it lives. Main thread.
  class TotalsMemo {
   public:
    TotalsMemo();
    ~TotalsMemo();
    TotalsMemo(const TotalsMemo&) = delete;
    TotalsMemo& operator=(const TotalsMemo&) = delete;

   private:
    friend class WTTask;
    TotalsMemo* previous_;
    QHash<const WTTask*, int> durations_;
    QHash<const WTTask*, Decimal> costs_;
    QHash<const WTTask*, int> billedDurations_;
    QHash<const WTTask*, Decimal> billedCosts_;
  };

  // Announce the change upward: task, then project, then client.
  void durationDidChange();
  void costDidChange();

  // Subsets of the items.
  QList<WTTime*> times() const;
  // The earliest of the task's time entries but `except` that shares time with [start, end) (a running
  // one up to now), or null: one minute is never billed twice in a task. Entries that only touch share none.
  const WTTime* timeOverlapping(Date start, Date end, const WTTime* except = nullptr) const;
  QList<WTItem*> pendingToDos() const;  // open to-dos, newest first
  QList<WTItem*> itemsWithoutPendingToDos() const;
  QList<WTItem*> valuableItems() const;  // time entries, flat fees and expenses, newest first
  // The start dates of the oldest and the newest of the valuable items that have one: the period a report
  // of the task covers, found without listing the items.
  std::optional<Date> firstItemDate() const;
  std::optional<Date> lastItemDate() const;
  WTItemContainerList dailyItems() const;
  WTItemContainerList monthlyItems() const;

  // Groups for the items outline: "Pending" first, then one group per day, newest first.
  const WTItemContainerList& cachedChildren() const { return cachedChildren_; }
  const WTItemContainerList& children();
  void updateChildren();
  // The cached group that holds `item` (its day's group, or "Pending" for an open to-do); never rebuilds.
  std::shared_ptr<WTItemContainer> itemContainerForItem(const WTItem* item) const;

  // Timers.
  QList<WTTime*> runningTimes() const;
  int runningDuration() const;
  bool running() const;
  std::optional<Date> maxTimeEndDate() const;
  void runningDidChange();
  void stopAllTimers();
  // Stops the task's timers when one runs (returns none); otherwise starts a new entry and returns it,
  // first stopping every other task's timers when "WTStopsOtherTimes" is set.
  WTTime* toggleTimer();

  // "notepad_clock_32" while running, else "notepad_32".
  QString tableImage() const;
  // "stop_32" while running, else "play_32".
  QString timerButtonImage() const;
  // "Stop" while running, else "Start" (translated).
  QString buttonTitle() const;

 protected:
  // A rate tells the project its cost changed.
  void storedValueDidChange(const QString& key) override;
  WTObject* owner() const override;
  void relinkOwner(WTObject* owner, int index) override;
  int indexInOwner() const override;

 private:
  friend class WTItem;
  friend class WTProject;
  friend class WTObjectContext;
  // Runs whenever an item joins or leaves the task.
  void itemsDidChange();

  WTProject* project_ = nullptr;
  std::optional<Decimal> budget_;
  QList<WTItem*> items_;
  WTItemContainerList cachedChildren_;
  // The last "dailyItems" and "monthlyItems" read by key; valid until the same key is read again.
  mutable WTItemContainerList keyedGroups_[2];
};
