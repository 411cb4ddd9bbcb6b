#include "WTReportPeriod.h"

#include "MoneyFormat.h"
#include "WTClient.h"
#include "WTItem.h"
#include "WTItemContainer.h"
#include "WTProject.h"
#include "WTRangePredicate.h"
#include "WTTask.h"
#include "WTTime.h"

#include <optional>

namespace {

template <class Record>
QVariantList variants(const QList<Record*>& records) {
  QVariantList list;
  list.reserve(records.size());
  for (Record* record : records) list.append(KeyPath::variantFromObject(record));
  return list;
}

QVariant groupsVariant(const WTItemContainerList& groups) {
  QVariantList list;
  list.reserve(qsizetype(groups.size()));
  for (const auto& group : groups) list.append(KeyPath::variantFromObject(group.get()));
  return list;
}

// What a view sums over the period's items, as its record sums over all of them.
struct Totals {
  int duration = 0;
  Decimal cost;
  int billedDuration = 0;
  Decimal billedCost;

  // None billed yet, written with the places of `currency`, as the records' own sums start.
  explicit Totals(const QString& currency)
      : billedCost(Decimal().rounded(MoneyFormat::minorUnitDigits(currency))) {}

  void add(const Totals& other) {
    duration += other.duration;
    cost += other.cost;
    billedDuration += other.billedDuration;
    billedCost += other.billedCost;
  }
  // True when `key` names a total; its value is then in `value`.
  bool answer(const QString& key, QVariant& value) const {
    if (key == QLatin1String("duration")) {
      value = duration;
      return true;
    }
    if (key == QLatin1String("cost")) {
      value = QVariant::fromValue(cost);
      return true;
    }
    if (key == QLatin1String("billedDuration")) {
      value = billedDuration;
      return true;
    }
    if (key == QLatin1String("billedCost")) {
      value = QVariant::fromValue(billedCost);
      return true;
    }
    return false;
  }
};

}  // namespace

// A record as the period shows it: the keys a subclass answers itself, every other key the record's.
class WTReportPeriod::View : public KeyValueCoding {
 public:
  View(WTReportPeriod& period, const WTObject* record) : period_(period), record_(record) {}

  QVariant valueForKey(const QString& key) const final {
    QVariant value;
    if (answer(key, value)) return value;
    return record_->valueForKey(key);
  }

 protected:
  virtual bool answer(const QString& key, QVariant& value) const = 0;

  WTReportPeriod& period_;
  const WTObject* record_;
};

class WTReportPeriod::TaskView final : public View {
 public:
  TaskView(WTReportPeriod& period, WTTask* task)
      : View(period, task),
        task_(task),
        items_(period.filtered(task->items())),
        valuable_(period.filtered(task->valuableItems())),
        totals_(task->billingCurrency()) {
    // Every item bills by the task's rate, rule and currency, resolved once as the task's own sums do.
    const Decimal rate = task->inheritedRate();
    const WTRoundingRule rule = task->roundingRule();
    const int places = MoneyFormat::minorUnitDigits(task->billingCurrency());
    for (const WTItem* item : items_) {
      totals_.duration += item->duration();
      totals_.cost += item->costAtRate(rate);
      totals_.billedDuration += item->billedDurationWithRule(rule);
      totals_.billedCost += item->billedCostWith(rule, rate, places);
    }
  }

  bool isEmpty() const { return valuable_.isEmpty(); }
  const Totals& totals() const { return totals_; }

 protected:
  bool answer(const QString& key, QVariant& value) const override {
    if (totals_.answer(key, value)) return true;
    if (key == QLatin1String("valuableItems")) {
      value = variants(valuable_);
    } else if (key == QLatin1String("items")) {
      value = variants(items_);
    } else if (key == QLatin1String("itemsWithoutPendingToDos")) {
      value = variants(period_.filtered(task_->itemsWithoutPendingToDos()));
    } else if (key == QLatin1String("pendingToDos")) {
      value = variants(period_.filtered(task_->pendingToDos()));
    } else if (key == QLatin1String("times")) {
      QList<WTTime*> times = task_->times();
      times.removeIf([this](const WTTime* time) { return !period_.contains(time); });
      value = variants(times);
    } else if (key == QLatin1String("dailyItems") || key == QLatin1String("monthlyItems")) {
      const bool daily = key == QLatin1String("dailyItems");
      // Kept until the same key is read again, as the task keeps its own, while a template walks them.
      WTItemContainerList& groups = groups_[daily ? 0 : 1];
      groups = WTItemContainer::containersByKeyPath(
          daily ? QStringLiteral("startDate.midnight") : QStringLiteral("startDate.beginOfMonth"), valuable_);
      value = groupsVariant(groups);
    } else if (key == QLatin1String("children")) {
      WTItemContainerList& groups = groups_[2];
      groups.clear();
      const QList<WTItem*> pending = period_.filtered(task_->pendingToDos());
      if (!pending.isEmpty())
        groups.push_back(std::make_shared<WTItemContainer>(pending, std::nullopt, task_));
      for (auto& day : WTItemContainer::containersByKeyPath(
               QStringLiteral("startDate.midnight"), period_.filtered(task_->itemsWithoutPendingToDos())))
        groups.push_back(std::move(day));
      value = groupsVariant(groups);
    } else if (key == QLatin1String("firstItemDate") || key == QLatin1String("lastItemDate")) {
      const bool first = key == QLatin1String("firstItemDate");
      std::optional<Date> found;
      for (const WTItem* item : valuable_) {
        const Date start = *item->startDate();  // an item in the period has a date
        if (!found || (first ? start < *found : start > *found)) found = start;
      }
      value = found ? QVariant::fromValue(*found) : QVariant();
    } else if (key == QLatin1String("project")) {
      value = KeyPath::variantFromObject(period_.viewOfProject(task_->project()));
    } else {
      return false;
    }
    return true;
  }

 private:
  WTTask* task_;
  QList<WTItem*> items_;
  QList<WTItem*> valuable_;
  Totals totals_;
  mutable WTItemContainerList groups_[3];
};

class WTReportPeriod::ProjectView final : public View {
 public:
  ProjectView(WTReportPeriod& period, WTProject* project)
      : View(period, project), project_(project), totals_(project->billingCurrency()) {
    for (WTTask* task : project->tasks()) {
      TaskView* view = period.taskView(task);
      if (view->isEmpty()) continue;
      tasks_.append(KeyPath::variantFromObject(view));
      totals_.add(view->totals());
    }
  }

  bool isEmpty() const { return tasks_.isEmpty(); }
  const Totals& totals() const { return totals_; }

 protected:
  bool answer(const QString& key, QVariant& value) const override {
    if (totals_.answer(key, value)) return true;
    if (key == QLatin1String("tasks") || key == QLatin1String("tasksArray")) {
      value = tasks_;
    } else if (key == QLatin1String("client")) {
      value = KeyPath::variantFromObject(period_.viewOfClient(project_->client()));
    } else {
      return false;
    }
    return true;
  }

 private:
  WTProject* project_;
  QVariantList tasks_;
  Totals totals_;
};

class WTReportPeriod::ClientView final : public View {
 public:
  ClientView(WTReportPeriod& period, WTClient* client)
      : View(period, client), client_(client), totals_(client->billingCurrency()) {}

 protected:
  bool answer(const QString& key, QVariant& value) const override {
    // A client's other projects are read only when a template asks for the client's own lists or totals.
    const bool total = key == QLatin1String("duration") || key == QLatin1String("cost") ||
                       key == QLatin1String("billedDuration") || key == QLatin1String("billedCost");
    if (!total && key != QLatin1String("projects")) return false;
    if (!projects_) {
      projects_.emplace();
      for (WTProject* project : client_->projects()) {
        ProjectView* view = period_.projectView(project);
        if (view->isEmpty()) continue;
        projects_->append(KeyPath::variantFromObject(view));
        totals_.add(view->totals());
      }
    }
    if (total) return totals_.answer(key, value);
    value = *projects_;
    return true;
  }

 private:
  WTClient* client_;
  mutable std::optional<QVariantList> projects_;
  mutable Totals totals_;
};

WTReportPeriod::WTReportPeriod(const RZDate::Range& bounds) : bounds_(bounds) {}

WTReportPeriod::~WTReportPeriod() = default;

bool WTReportPeriod::contains(const WTItem* item) const {
  return WTRangePredicate::startsIn(item, bounds_);
}

QList<WTItem*> WTReportPeriod::filtered(const QList<WTItem*>& items) const {
  QList<WTItem*> result;
  for (WTItem* item : items) {
    if (contains(item)) result.append(item);
  }
  return result;
}

QVariantMap WTReportPeriod::variable() const {
  return {{QStringLiteral("begin"), QVariant::fromValue(bounds_[0])},
          {QStringLiteral("end"), QVariant::fromValue(RZDate::yesterday(bounds_[1]))}};
}

// A view is made before it is filed: making one files the views it lists, which may grow the table.
template <class Kind, class Record>
Kind* WTReportPeriod::view(Record* record) {
  if (const auto found = views_.find(record); found != views_.end())
    return static_cast<Kind*>(found->second.get());
  auto made = std::make_unique<Kind>(*this, record);
  Kind* kept = made.get();
  views_.emplace(record, std::move(made));
  return kept;
}

WTReportPeriod::TaskView* WTReportPeriod::taskView(WTTask* task) {
  return view<TaskView>(task);
}

WTReportPeriod::ProjectView* WTReportPeriod::projectView(WTProject* project) {
  return view<ProjectView>(project);
}

const KeyValueCoding* WTReportPeriod::viewOfClient(WTClient* client) {
  return client ? view<ClientView>(client) : nullptr;
}

const KeyValueCoding* WTReportPeriod::viewOfProject(WTProject* project) {
  if (!project) return nullptr;
  ProjectView* view = projectView(project);
  return view->isEmpty() ? nullptr : view;
}

const KeyValueCoding* WTReportPeriod::viewOfTask(WTTask* task) {
  if (!task) return nullptr;
  TaskView* view = taskView(task);
  return view->isEmpty() ? nullptr : view;
}
