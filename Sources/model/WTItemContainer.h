#pragma once

#include "Date.h"
#include "Decimal.h"
#include "KeyPath.h"
#include "WTObjectContext.h"

#include <QList>
#include <QObject>
#include <QPointer>
#include <QVariantMap>

#include <memory>
#include <optional>
#include <vector>

class WTItem;
class WTTask;

// A group of items shown together: the open to-dos of a task ("Pending", no date), or the items of one
// day or month. Never stored; made afresh whenever a task's groups or a report are rebuilt. It keeps
// an identity of date and task so the outline can find the same group again after a rebuild.
//
// While it holds items and someone listens to valueChanged, it observes their duration and cost (raw and
// billed) and re-announces them as its own, so a running entry's minutes reach the group's total. Groups
// nobody listens to (those of a report, made by the ten thousand) cost no observers.
class WTItemContainer : public QObject, public KeyValueCoding {
  Q_OBJECT
 public:
  // `task` is not owned; none for a group that spans tasks.
  WTItemContainer(QList<WTItem*> items, std::optional<Date> date, WTTask* task);
  ~WTItemContainer() override;

  // Groups `items` by the value of `keyPath` ("startDate.midnight", "startDate.beginOfMonth" or any key
  // path of the items), newest group first and the newest item first in each. A group's date is the
  // start date of its last item (not cut to the day) and its task that item's task.
  static std::vector<std::shared_ptr<WTItemContainer>> containersByKeyPath(const QString& keyPath,
                                                                           const QList<WTItem*>& items);
  // The same over the time entries, flat fees and expenses of all `tasks` together.
  static std::vector<std::shared_ptr<WTItemContainer>> containersByKeyPath(const QString& keyPath,
                                                                           const QList<WTTask*>& tasks);

  // The names its items carry, each once, in the items' order, joined by "; " (for a report's line of a
  // day or a month); empty when none of them has a name.
  QString itemNames() const;
  // The short date, or "Pending" (translated) without a date.
  QString title() const;
  // {"date": date or null, "task": the task's uuid}.
  QVariantMap uuid() const;
  int duration() const;
  Decimal cost() const;
  // What its items bill, each by its own task's rule, rate and currency (see WTItem::billedCost); the
  // currency is its task's, or its first item's for a group that spans tasks.
  QString billingCurrency() const;
  int billedDuration() const;
  Decimal billedCost() const;

  const QList<WTItem*>& items() const { return items_; }
  const QList<WTItem*>& children() const { return items_; }
  void setItems(QList<WTItem*> items);

  std::optional<Date> date() const { return date_; }
  void setDate(std::optional<Date> date) { date_ = date; }
  WTTask* task() const { return task_; }

  void startObserving();
  void stopObserving();

  QVariant valueForKey(const QString& key) const override;

 signals:
  // "duration", "cost", "billedDuration" or "billedCost" of the group changed because one of its items'
  // did (a rule, rate or currency changed above is announced by the task, not by its groups).
  void valueChanged(const QString& key);

 protected:
  void connectNotify(const QMetaMethod& signal) override;
  void disconnectNotify(const QMetaMethod& signal) override;

 private:
  int listeners_ = 0;  // connections to valueChanged
  QList<WTItem*> items_;
  std::optional<Date> date_;
  WTTask* task_;
  QPointer<WTObjectContext> context_;
  std::vector<WTObjectContext::ObserverId> observers_;
};
