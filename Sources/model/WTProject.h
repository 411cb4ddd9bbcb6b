#pragma once

#include "WTBillingRecord.h"

#include <functional>

class WTClient;
class WTTask;

// A project: belongs to a client (or none) and owns its tasks in the user's order.
class WTProject final : public WTBillingRecord {
  WT_ENTITY_CLASS(WTProject, Project)
 public:
  explicit WTProject(WTObjectContext* context) : WTBillingRecord(WTEntity::Project, context) {}

  WTClient* client() const { return client_; }
  void setClient(WTClient* client);

  // The tasks in their stored order (`tasksArray` is the same list).
  const QList<WTTask*>& tasks() const { return tasks_; }
  const QList<WTTask*>& tasksArray() const { return tasks_; }
  // Moves one of this project's tasks to `index` among the others (clamped to the list).
  void moveTask(WTTask* task, int index);
  // Moves each of `tasks` in turn to the place `row` names between the tasks as they stand (-1: after
  // the last), as a drag of several rows does; tasks of other projects are left where they are.
  void moveTasks(const QList<WTTask*>& tasks, int row);

  // Own rate, else the client's inherited rate; without a client "WTDefaultRate", else builtInRate().
  Decimal rateFromAbove() const override;
  // What a project without a client bills, with no rate of its own and no default set: 50.
  static Decimal builtInRate() { return Decimal(50); }

  int duration() const override;
  Decimal cost() const override;
  void durationDidChange();
  void costDidChange();

  // Money the project may cost; none for no budget.
  std::optional<Decimal> budget() const { return budget_; }
  void setBudget(const std::optional<Decimal>& budget);

  // Its client's rule; the preferences' without a client.
  WTRoundingRule roundingRuleFromAbove() const override;
  // The client's billing currency; the preferences' without a client.
  QString billingCurrency() const override;
  // The sums of its tasks' billed minutes and billed costs.
  int billedDuration() const override;
  Decimal billedCost() const override;
  // Announces the billed figures of the project and its client (a task's rule changed).
  void billingDidChange();

  // Whether a timer runs in one of its tasks; announced as "running".
  bool running() const;
  void runningDidChange();

  // "folder_32", or "folder_32_dis" when archived.
  QString tableImage() const;

 protected:
  // A rate tells the client its cost changed.
  void storedValueDidChange(const QString& key) override;
  WTObject* owner() const override;
  void relinkOwner(WTObject* owner, int index) override;

 private:
  friend class WTTask;
  friend class WTObjectContext;
  WTClient* client_ = nullptr;
  QList<WTTask*> tasks_;
  std::optional<Decimal> budget_;
};
