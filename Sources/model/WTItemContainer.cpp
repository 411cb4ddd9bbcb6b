#include "WTItemContainer.h"

#include <QMetaMethod>
#include <QSet>

#include "MoneyFormat.h"
#include "RZDate.h"
#include "WTItem.h"
#include "WTTask.h"

#include <QCoreApplication>

#include <algorithm>

namespace {

// The grouping value of one item; the two date paths the app uses are answered without the generic
// key-path machinery.
QVariant groupValue(const WTItem* item, const QString& keyPath) {
  if (keyPath == QLatin1String("startDate.midnight")) {
    return item->startDate() ? QVariant::fromValue(RZDate::midnight(*item->startDate())) : QVariant();
  }
  if (keyPath == QLatin1String("startDate.beginOfMonth")) {
    return item->startDate() ? QVariant::fromValue(RZDate::beginOfMonth(*item->startDate())) : QVariant();
  }
  return KeyPath::valueForKeyPath(KeyPath::variantFromObject(item), keyPath);
}

}  // namespace

WTItemContainer::WTItemContainer(QList<WTItem*> items, std::optional<Date> date, WTTask* task)
    : date_(date), task_(task) {
  setItems(std::move(items));
}

WTItemContainer::~WTItemContainer() {
  stopObserving();
}

std::vector<std::shared_ptr<WTItemContainer>> WTItemContainer::containersByKeyPath(
    const QString& keyPath, const QList<WTItem*>& items) {
  struct Keyed {
    QVariant value;
    WTItem* item;
    double seconds;  // of a date value
  };
  std::vector<Keyed> keyed;
  keyed.reserve(items.size());
  // Days and months, the groups of reports and of the outline, are dates or none: those are ordered by
  // their seconds, not through the general order of values, which costs many times more per comparison.
  const QMetaType dateType = QMetaType::fromType<Date>();
  bool datesOnly = true;
  for (WTItem* item : items) {
    QVariant value = groupValue(item, keyPath);
    const bool dated = value.metaType() == dateType;
    datesOnly = datesOnly && (dated || !value.isValid());
    const double seconds = dated ? static_cast<const Date*>(value.constData())->secondsSince1970() : 0.0;
    keyed.push_back({std::move(value), item, seconds});
  }
  const auto compare = [datesOnly](const Keyed& a, const Keyed& b) {
    if (!datesOnly) return KeyPath::compareValues(a.value, b.value);
    const bool aDated = a.value.isValid(), bDated = b.value.isValid();
    if (aDated != bDated) return aDated ? 1 : -1;  // none orders below every date
    return a.seconds < b.seconds ? -1 : (a.seconds > b.seconds ? 1 : 0);
  };
  // Groups by value, newest first; inside a group the newest item first.
  std::stable_sort(keyed.begin(), keyed.end(), [&compare](const Keyed& a, const Keyed& b) {
    const int order = compare(a, b);
    if (order != 0) return order > 0;
    return a.item->startDate() > b.item->startDate();
  });
  std::vector<std::shared_ptr<WTItemContainer>> containers;
  for (size_t begin = 0; begin < keyed.size();) {
    size_t end = begin;
    QList<WTItem*> group;
    while (end < keyed.size() && compare(keyed[end], keyed[begin]) == 0) group.append(keyed[end++].item);
    WTItem* last = group.last();
    containers.push_back(
        std::make_shared<WTItemContainer>(std::move(group), last->startDate(), last->task()));
    begin = end;
  }
  return containers;
}

std::vector<std::shared_ptr<WTItemContainer>> WTItemContainer::containersByKeyPath(
    const QString& keyPath, const QList<WTTask*>& tasks) {
  QList<WTItem*> items;
  for (const WTTask* task : tasks) items += task->valuableItems();
  return containersByKeyPath(keyPath, items);
}

QString WTItemContainer::title() const {
  if (date_) return RZDate::shortFormat(*date_);
  return QCoreApplication::translate("WTItemContainer", "Pending");
}

QVariantMap WTItemContainer::uuid() const {
  return {{QStringLiteral("date"), date_ ? QVariant::fromValue(*date_) : QVariant()},
          {QStringLiteral("task"), task_ ? QVariant(task_->uuid()) : QVariant()}};
}

int WTItemContainer::duration() const {
  int total = 0;
  for (const WTItem* item : items_) total += item->duration();
  return total;
}

Decimal WTItemContainer::cost() const {
  Decimal total;
  for (const WTItem* item : items_) total += item->cost();
  return total;
}

QString WTItemContainer::billingCurrency() const {
  if (task_) return task_->billingCurrency();
  return items_.isEmpty() ? QString() : items_.first()->billingCurrency();
}

namespace {

// The rule, rate and places of one task, worked out again only when the next item is of another task.
struct TaskBilling {
  const WTTask* task = nullptr;
  WTRoundingRule rule;
  Decimal rate;
  int places = 2;

  const TaskBilling& of(const WTTask* itemTask) {
    if (itemTask == task) return *this;
    task = itemTask;
    rule = task->roundingRule();
    rate = task->inheritedRate();
    places = MoneyFormat::minorUnitDigits(task->billingCurrency());
    return *this;
  }
};

}  // namespace

int WTItemContainer::billedDuration() const {
  int total = 0;
  TaskBilling billing;
  for (const WTItem* item : items_) {
    total +=
        item->task() ? item->billedDurationWithRule(billing.of(item->task()).rule) : item->billedDuration();
  }
  return total;
}

Decimal WTItemContainer::billedCost() const {
  Decimal total = Decimal().rounded(MoneyFormat::minorUnitDigits(billingCurrency()));
  TaskBilling billing;
  for (const WTItem* item : items_) {
    if (!item->task()) {
      total += item->billedCost();
      continue;
    }
    const TaskBilling& task = billing.of(item->task());
    total += item->billedCostWith(task.rule, task.rate, task.places);
  }
  return total;
}

void WTItemContainer::setItems(QList<WTItem*> items) {
  stopObserving();
  items_ = std::move(items);
  if (listeners_ > 0) startObserving();
}

// Qt calls these with its connection lock held, so they count instead of asking isSignalConnected().
void WTItemContainer::connectNotify(const QMetaMethod& signal) {
  if (signal != QMetaMethod::fromSignal(&WTItemContainer::valueChanged)) return;
  if (listeners_++ == 0) startObserving();
}

void WTItemContainer::disconnectNotify(const QMetaMethod& signal) {
  // An invalid method stands for "some or all signals" and says not how many listeners went: keep
  // observing then, which costs a little and never misses a change.
  if (signal != QMetaMethod::fromSignal(&WTItemContainer::valueChanged) || listeners_ == 0) return;
  if (--listeners_ == 0) stopObserving();
}

void WTItemContainer::startObserving() {
  stopObserving();
  if (items_.isEmpty()) return;
  context_ = items_.first()->context();
  observers_.reserve(items_.size());
  for (WTItem* item : items_) {
    observers_.push_back(context_->addObserver(item, QString(), [this](WTObject*, const QString& key) {
      if (key == QLatin1String("duration") || key == QLatin1String("cost") ||
          key == QLatin1String("billedDuration") || key == QLatin1String("billedCost"))
        emit valueChanged(key);
    }));
  }
}

void WTItemContainer::stopObserving() {
  if (context_) {
    for (WTObjectContext::ObserverId id : observers_) context_->removeObserver(id);
  }
  observers_.clear();
}

QString WTItemContainer::itemNames() const {
  // Most days of a report hold one item.
  if (items_.size() == 1) return items_.first()->name().trimmed();
  QStringList names;
  QSet<QString> seen;
  for (const WTItem* item : items_) {
    const QString name = item->name().trimmed();
    if (name.isEmpty() || seen.contains(name)) continue;
    seen.insert(name);
    names.append(name);
  }
  return names.join(QStringLiteral("; "));
}

QVariant WTItemContainer::valueForKey(const QString& key) const {
  if (key == QLatin1String("items") || key == QLatin1String("children")) {
    QVariantList list;
    list.reserve(items_.size());
    for (WTItem* item : items_) list.append(KeyPath::variantFromObject(item));
    return list;
  }
  if (key == QLatin1String("date")) return date_ ? QVariant::fromValue(*date_) : QVariant();
  if (key == QLatin1String("task")) return task_ ? KeyPath::variantFromObject(task_) : QVariant();
  if (key == QLatin1String("duration")) return duration();
  if (key == QLatin1String("cost")) return QVariant::fromValue(cost());
  if (key == QLatin1String("billedDuration")) return billedDuration();
  if (key == QLatin1String("billedCost")) return QVariant::fromValue(billedCost());
  if (key == QLatin1String("billingCurrency")) return billingCurrency();
  if (key == QLatin1String("title")) return title();
  if (key == QLatin1String("itemNames")) {
    // None rather than an empty text, which a template's condition would take for a value.
    const QString names = itemNames();
    return names.isEmpty() ? QVariant() : QVariant(names);
  }
  if (key == QLatin1String("uuid")) return uuid();
  return {};
}
