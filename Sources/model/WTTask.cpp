#include "WTTask.h"

#include "MoneyFormat.h"
#include "RZDate.h"
#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTBudget.h"
#include "WTItemContainer.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTStoreRecord.h"
#include "WTTime.h"
#include "WTToDo.h"

#include <QCoreApplication>

#include <algorithm>
#include <functional>
#include <vector>

WT_ENTITY_CLASS_IMPL(WTTask)

WTTask::~WTTask() = default;

namespace {

QVariant groupsVariant(const WTItemContainerList& list) {
  QVariantList result;
  result.reserve(qsizetype(list.size()));
  for (const auto& group : list) result.append(KeyPath::variantFromObject(group.get()));
  return result;
}

}  // namespace

const WTKeyTable& WTTask::keys() {
  using namespace WTKeys;
  static const WTKeyTable table(
      &billingKeys(),
      {
          stored("budget", &WTTask::budget_, &WTStoreRecord::budget),
          toOne("project", &WTStoreRecord::projectUuid),
          refine("rate", nullptr, nullptr, {"project", "project.rate"}),
          refine("inheritedRate", nullptr, nullptr, {"rate"}),
          toMany("items", WTKeyType::Unordered, &records<&WTTask::items>),
          derived<&WTTask::duration>("duration", {"items"}),
          derived<&WTTask::cost>("cost", {"rate", "items"}),
          derived<&WTTask::times>("times", {"items"}),
          derived<&WTTask::runningTimes>("runningTimes", {"times"}),
          derived<&WTTask::runningDuration>("runningDuration", {"duration"}),
          derived<&WTTask::running>("running"),
          derived<&WTTask::maxTimeEndDate>("maxTimeEndDate"),
          derived<&WTTask::pendingToDos>("pendingToDos"),
          derived<&WTTask::valuableItems>("valuableItems"),
          derived<&WTTask::firstItemDate>("firstItemDate"),
          derived<&WTTask::lastItemDate>("lastItemDate"),
          derived<&WTTask::itemsWithoutPendingToDos>("itemsWithoutPendingToDos"),
          // Groups are made afresh on each read; the task keeps the last list of each key alive so the
          // records handed out stay valid while a template walks them.
          derived("dailyItems", WTKeyType::Other,
                  [](const WTObject& object) {
                    const auto& task = static_cast<const WTTask&>(object);
                    return groupsVariant(task.keyedGroups_[0] = task.dailyItems());
                  }),
          derived("monthlyItems", WTKeyType::Other,
                  [](const WTObject& object) {
                    const auto& task = static_cast<const WTTask&>(object);
                    return groupsVariant(task.keyedGroups_[1] = task.monthlyItems());
                  }),
          derived("children", WTKeyType::Other,
                  [](const WTObject& object) {
                    return groupsVariant(const_cast<WTTask&>(static_cast<const WTTask&>(object)).children());
                  },
                  {"items"}),
          derived<&WTTask::buttonTitle>("buttonTitle", {"running"}),
          derived<&WTTask::timerButtonImage>("timerButtonImage", {"running"}),
          derived<&WTTask::tableImage>("tableImage", {"running"}),
          refine("roundingRule", nullptr, nullptr,
                 {"roundingMinutes", "roundingMode", "project", "project.roundingRule"}),
          derived<&WTTask::billingCurrency>("billingCurrency", {"project", "project.billingCurrency"}),
          derived<&WTTask::billedDuration>("billedDuration", {"duration", "roundingRule"}),
          // Where the billed cost stands against the budget, for a report: none without a budget.
          derived("budgetStanding", WTKeyType::Text,
                  [](const WTObject& object) { return WTBudget::reportedStanding(&object); },
                  {"budget", "billedCost"}),
          derived<&WTTask::billedCost>("billedCost", {"cost", "billedDuration", "billingCurrency"}),
          // The time-entry export reads a task's "title": it is the task's name.
          derived<&WTObject::name>("title"),
      });
  return table;
}

void WTTask::setProject(WTProject* project, int index) {
  changeOwner(project, index);
}

QList<WTItem*> WTTask::adoptItems(const QList<WTItem*>& items) {
  if (clashOfAdopting(items, std::nullopt)) return {};
  for (WTItem* item : items) item->setTask(this);
  return items;
}

QList<WTItem*> WTTask::adoptItems(const QList<WTItem*>& items, std::optional<Date> day) {
  if (day && clashOfAdopting(items, day)) return {};
  QList<WTItem*> adopted;
  for (WTItem* item : items) {
    if (day) {
      item->setTask(this);
      item->setDate(day);
    } else if (item->entity() == WTEntity::ToDo) {
      static_cast<WTToDo*>(item)->setCompleted(false);
      item->setTask(this);
    } else {
      continue;
    }
    adopted << item;
  }
  return adopted;
}

void WTTask::setBudget(const std::optional<Decimal>& budget) {
  setStoredValue(QStringLiteral("budget"), budget ? QVariant::fromValue(*budget) : QVariant());
}

WTRoundingRule WTTask::roundingRuleFromAbove() const {
  return project_ ? project_->roundingRule() : WTBillingRecord::roundingRuleFromAbove();
}

QString WTTask::billingCurrency() const {
  return project_ ? project_->billingCurrency() : context()->billingDefaults().currency;
}

WTObject* WTTask::owner() const {
  return project_;
}

int WTTask::indexInOwner() const {
  return project_ ? static_cast<int>(project_->tasks_.indexOf(this)) : -1;
}

void WTTask::relinkOwner(WTObject* owner, int index) {
  if (project_) project_->tasks_.removeOne(this);
  project_ = static_cast<WTProject*>(owner);
  if (!project_) return;
  auto& tasks = project_->tasks_;
  if (index < 0 || index > tasks.size()) index = static_cast<int>(tasks.size());
  tasks.insert(index, this);
}

Decimal WTTask::rateFromAbove() const {
  if (project_) return project_->inheritedRate();
  return userDefaultRate().value_or(builtInRate());
}

// Here rather than in the setter, so that a rate put back by undo or redo reaches the totals above too.
void WTTask::storedValueDidChange(const QString& key) {
  if (key == QLatin1String("rate") && project_) project_->costDidChange();
  // The task's own billed figures follow through the key dependencies; the project's and client's here.
  if ((key == QLatin1String("roundingMinutes") || key == QLatin1String("roundingMode")) && project_)
    project_->billingDidChange();
}

namespace {

WTTask::TotalsMemo* gTotalsMemo = nullptr;

// A task's total from the memo while one is in force (and `compute`d into it once), else computed.
template <class Value, class Compute>
Value remembered(QHash<const WTTask*, Value> WTTask::TotalsMemo::*table, const WTTask* task,
                 Compute compute) {
  if (!gTotalsMemo) return compute();
  QHash<const WTTask*, Value>& known = gTotalsMemo->*table;
  if (const auto found = known.constFind(task); found != known.cend()) return *found;
  const Value total = compute();
  known.insert(task, total);
  return total;
}

}  // namespace

WTTask::TotalsMemo::TotalsMemo() : previous_(gTotalsMemo) {
  gTotalsMemo = this;
}

WTTask::TotalsMemo::~TotalsMemo() {
  gTotalsMemo = previous_;
}

int WTTask::duration() const {
  return remembered(&TotalsMemo::durations_, this, [this] {
    int total = 0;
    for (const WTItem* item : items_) total += item->duration();
    return total;
  });
}

Decimal WTTask::cost() const {
  return remembered(&TotalsMemo::costs_, this, [this] {
    // Every item bills at the task's rate: read it once for all of them.
    const Decimal rate = inheritedRate();
    Decimal total;
    for (const WTItem* item : items_) total += item->costAtRate(rate);
    return total;
  });
}

int WTTask::billedDuration() const {
  return remembered(&TotalsMemo::billedDurations_, this, [this] {
    const WTRoundingRule rule = roundingRule();
    int total = 0;
    for (const WTItem* item : items_) total += item->billedDurationWithRule(rule);
    return total;
  });
}

Decimal WTTask::billedCost() const {
  return remembered(&TotalsMemo::billedCosts_, this, [this] {
    // What every item of the task bills by, resolved once for all of them.
    const WTRoundingRule rule = roundingRule();
    const Decimal rate = inheritedRate();
    const int places = MoneyFormat::minorUnitDigits(billingCurrency());
    Decimal total = Decimal().rounded(places);
    for (const WTItem* item : items_) total += item->billedCostWith(rule, rate, places);
    return total;
  });
}

void WTTask::durationDidChange() {
  announce(QStringLiteral("duration"));
  announce(QStringLiteral("cost"));
  if (project_) project_->durationDidChange();
}

void WTTask::costDidChange() {
  announce(QStringLiteral("cost"));
  if (project_) project_->costDidChange();
}

void WTTask::itemsDidChange() {
  durationDidChange();
}

QList<WTTime*> WTTask::times() const {
  QList<WTTime*> result;
  for (WTItem* item : items_) {
    if (item->entity() == WTEntity::Time) result.append(static_cast<WTTime*>(item));
  }
  return result;
}

const WTTime* WTTask::timeOverlapping(Date start, Date end, const WTTime* except) const {
  const Date now = Date::now();
  const WTTime* earliest = nullptr;
  for (const WTTime* time : times()) {
    if (time == except || !time->startDate()) continue;
    const Date otherStart = *time->startDate();
    const Date otherEnd = time->running() ? now : time->endDate().value_or(otherStart);
    if (otherStart < end && start < otherEnd && (!earliest || otherStart < *earliest->startDate()))
      earliest = time;
  }
  return earliest;
}

std::optional<WTTask::Clash> WTTask::clashOfAdopting(const QList<WTItem*>& items,
                                                     std::optional<Date> day) const {
  const Date now = Date::now();
  struct Span {
    const WTTime* time;
    Date start, end;
  };
  // As timeOverlapping sees an entry: a running one up to now, one without an end as a moment.
  const auto spanOf = [&](const WTTime& time, Date start) {
    const Date end = time.endDate().value_or(*time.startDate());
    return Span{&time, start,
                time.running() ? now : start.addingSeconds(end.timeIntervalSince(*time.startDate()))};
  };
  std::vector<Span> moving;
  for (const WTItem* item : items) {
    const auto* time = item->entity() == WTEntity::Time ? static_cast<const WTTime*>(item) : nullptr;
    if (time && time->startDate())
      moving.push_back(spanOf(*time, day ? time->startOnDayOf(*day) : *time->startDate()));
  }
  // What a moving entry may meet: the entries the task keeps, earliest first, then the others that move.
  std::vector<Span> others;
  for (const WTTime* time : times()) {
    const bool moves =
        std::any_of(moving.begin(), moving.end(), [&](const Span& span) { return span.time == time; });
    if (!moves && time->startDate()) others.push_back(spanOf(*time, *time->startDate()));
  }
  std::sort(others.begin(), others.end(), [](const Span& a, const Span& b) { return a.start < b.start; });
  others.insert(others.end(), moving.begin(), moving.end());
  for (const Span& span : moving) {
    for (const Span& other : others) {
      if (other.time != span.time && other.start < span.end && span.start < other.end)
        return Clash{span.time, other.time, other.start, other.end};
    }
  }
  return std::nullopt;
}

QList<WTItem*> WTTask::pendingToDos() const {
  QList<WTItem*> result;
  for (WTItem* item : items_) {
    if (item->entity() == WTEntity::ToDo && !static_cast<WTToDo*>(item)->completed()) result.append(item);
  }
  std::stable_sort(result.begin(), result.end(),
                   [](const WTItem* a, const WTItem* b) { return a->startDate() > b->startDate(); });
  return result;
}

QList<WTItem*> WTTask::itemsWithoutPendingToDos() const {
  QList<WTItem*> result;
  for (WTItem* item : items_) {
    if (item->entity() != WTEntity::ToDo || static_cast<WTToDo*>(item)->completed()) result.append(item);
  }
  return result;
}

namespace {

bool isValuable(const WTItem* item) {
  const WTEntity entity = item->entity();
  return entity == WTEntity::Time || entity == WTEntity::Flat || entity == WTEntity::Expense;
}

}  // namespace

QList<WTItem*> WTTask::valuableItems() const {
  QList<WTItem*> result;
  for (WTItem* item : items_) {
    if (isValuable(item)) result.append(item);
  }
  // Newest first, as the day and month groups are, so a report reads the same at every level; items
  // without a date last.
  std::stable_sort(result.begin(), result.end(), [](const WTItem* a, const WTItem* b) {
    return a->startDate() && (!b->startDate() || *a->startDate() > *b->startDate());
  });
  return result;
}

namespace {

// The date of the valuable items that comes first by `earlier`, or none when none has a date.
template <class Order>
std::optional<Date> extremeItemDate(const QList<WTItem*>& items, Order earlier) {
  std::optional<Date> found;
  for (const WTItem* item : items) {
    if (isValuable(item) && item->startDate() && (!found || earlier(*item->startDate(), *found)))
      found = item->startDate();
  }
  return found;
}

}  // namespace

std::optional<Date> WTTask::firstItemDate() const {
  return extremeItemDate(items_, std::less<Date>());
}

std::optional<Date> WTTask::lastItemDate() const {
  return extremeItemDate(items_, std::greater<Date>());
}

WTItemContainerList WTTask::dailyItems() const {
  return WTItemContainer::containersByKeyPath(QStringLiteral("startDate.midnight"), valuableItems());
}

WTItemContainerList WTTask::monthlyItems() const {
  return WTItemContainer::containersByKeyPath(QStringLiteral("startDate.beginOfMonth"), valuableItems());
}

const WTItemContainerList& WTTask::children() {
  updateChildren();
  return cachedChildren_;
}

void WTTask::updateChildren() {
  cachedChildren_.clear();
  WTItemContainerList children;
  const QList<WTItem*> pending = pendingToDos();
  if (!pending.isEmpty()) children.push_back(std::make_shared<WTItemContainer>(pending, std::nullopt, this));

  // Newest day first, and the newest item first within a day.
  struct Dated {
    Date day;
    WTItem* item;
  };
  std::vector<Dated> dated;
  const QList<WTItem*> rest = itemsWithoutPendingToDos();
  dated.reserve(rest.size());
  for (WTItem* item : rest) dated.push_back({RZDate::midnight(item->startDate().value_or(Date())), item});
  std::stable_sort(dated.begin(), dated.end(), [](const Dated& a, const Dated& b) {
    if (a.day != b.day) return a.day > b.day;
    return a.item->startDate() > b.item->startDate();
  });
  for (size_t begin = 0; begin < dated.size();) {
    size_t end = begin;
    QList<WTItem*> group;
    while (end < dated.size() && dated[end].day == dated[begin].day) group.append(dated[end++].item);
    const Date day = RZDate::midnight(group.last()->startDate().value_or(Date()));
    children.push_back(std::make_shared<WTItemContainer>(std::move(group), day, this));
    begin = end;
  }
  cachedChildren_ = std::move(children);
}

std::shared_ptr<WTItemContainer> WTTask::itemContainerForItem(const WTItem* item) const {
  if (!item) return nullptr;
  std::optional<Date> date = item->date();
  if (item->entity() == WTEntity::ToDo && !static_cast<const WTToDo*>(item)->completed()) date.reset();
  if (date) date = RZDate::midnight(*date);
  for (auto it = cachedChildren_.rbegin(); it != cachedChildren_.rend(); ++it) {
    // The "Pending" group has no date and is found for open to-dos only.
    if ((*it)->date() == date) return *it;
  }
  return nullptr;
}

QList<WTTime*> WTTask::runningTimes() const {
  QList<WTTime*> result;
  for (WTTime* time : times()) {
    if (time->running()) result.append(time);
  }
  return result;
}

int WTTask::runningDuration() const {
  int total = 0;
  for (const WTTime* time : runningTimes()) total += time->duration();
  return total;
}

bool WTTask::running() const {
  for (const WTItem* item : items_) {
    if (item->entity() == WTEntity::Time && static_cast<const WTTime*>(item)->running()) return true;
  }
  return false;
}

std::optional<Date> WTTask::maxTimeEndDate() const {
  std::optional<Date> latest;
  for (const WTTime* time : times()) {
    if (time->endDate() && (!latest || *time->endDate() > *latest)) latest = time->endDate();
  }
  return latest;
}

void WTTask::runningDidChange() {
  announce(QStringLiteral("running"));
  if (project_) project_->runningDidChange();
}

void WTTask::stopAllTimers() {
  for (WTTime* time : times()) {
    if (time->running()) time->setRunning(false);
  }
}

WTTime* WTTask::toggleTimer() {
  if (running()) {
    stopAllTimers();
    return nullptr;
  }
  const UserDefaults* defaults = context()->userDefaults();
  if (defaults && defaults->boolForKey(SettingsKeys::kStopsOtherTimes)) {
    for (WTTask* task : context()->fetch<WTTask>()) task->stopAllTimers();
  }
  auto* time = WTTime::insertNewObject(context());
  time->setTask(this);
  time->setRunning(true);
  return time;
}

QString WTTask::tableImage() const {
  return running() ? QStringLiteral("notepad_clock_32") : QStringLiteral("notepad_32");
}

QString WTTask::timerButtonImage() const {
  return running() ? QStringLiteral("stop_32") : QStringLiteral("play_32");
}

QString WTTask::buttonTitle() const {
  return running() ? QCoreApplication::translate("WTTask", "Stop")
                   : QCoreApplication::translate("WTTask", "Start");
}
