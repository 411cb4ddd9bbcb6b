#pragma once

#include "Date.h"
#include "WTObject.h"
#include "WTRoundingRule.h"

class WTTask;

// Reads a date value (Date or QDateTime; null is none). `ok` is false for anything else.
std::optional<Date> dateFromVariant(const QVariant& value, bool* ok);
// A date as a variant; none gives a null variant.
inline QVariant dateVariant(const std::optional<Date>& date) {
  return date ? QVariant::fromValue(*date) : QVariant();
}

// Base of the five kinds of item a task holds. An item is dated by `startDate` (its `date`).
class WTItem : public WTObject {
 public:
  WTTask* task() const { return task_; }
  void setTask(WTTask* task);

  std::optional<Date> startDate() const { return startDate_; }
  void setStartDate(const std::optional<Date>& date);
  std::optional<Date> date() const { return startDate_; }
  // Books the item on another date; a time entry keeps its time of day and length.
  virtual void setDate(const std::optional<Date>& date);
  // Where an imported item came from ("toggl:…"): a second import of the same file knows it. Null when
  // the item was made here.
  QString importId() const { return importId_; }
  void setImportId(const QString& importId);

  // Whole minutes this item stands for; 0 for kinds that are not time.
  virtual int duration() const { return 0; }
  // What the item costs: its task's inherited rate times its hours.
  virtual Decimal cost() const;
  // The same at a rate already known (sums over a task's items read the rate once).
  virtual Decimal costAtRate(const Decimal& rate) const;
  // The rate in force for the item: always its task's inherited rate (a rate stored on an item is
  // never used); none without a task, and the item then costs nothing.
  std::optional<Decimal> rate() const;
  virtual QString title() const { return name(); }

  // What the item bills. A time entry's minutes are rounded by its task's rule; a flat fee's minutes
  // and an expense are billed as typed; notes and to-dos bill nothing. The cost is the rate times the
  // billed minutes (an expense's amount), rounded once, half away from zero, to the minor unit of the
  // currency. A change of the task's rule, rate or currency is announced by the task ("roundingRule",
  // "rate", "billingCurrency"), not by each of its items.
  QString billingCurrency() const;
  int billedDuration() const;
  Decimal billedCost() const;
  // The same with what the task resolves once for all its items: its rule, rate and minor unit places.
  virtual int billedDurationWithRule(const WTRoundingRule& rule) const;
  virtual Decimal billedCostWith(const WTRoundingRule& rule, const Decimal& rate, int places) const;

 protected:
  WTItem(WTEntity entity, WTObjectContext* context) : WTObject(entity, context) {}
  // The keys every kind of item has.
  static const WTKeyTable& itemKeys();
  void awakeFromInsert() override;
  WTObject* owner() const override;
  void relinkOwner(WTObject* owner, int index) override;

  // rate x (minutes / 60), exactly.
  static Decimal timeCost(const Decimal& rate, int minutes);

 private:
  friend class WTTask;
  WTTask* task_ = nullptr;
  std::optional<Date> startDate_;
  QString importId_;
};
