#include "WTProject.h"

#include "MoneyFormat.h"
#include "WTClient.h"
#include "WTBudget.h"
#include "WTObjectContext.h"
#include "WTStoreRecord.h"
#include "WTTask.h"

#include <algorithm>

WT_ENTITY_CLASS_IMPL(WTProject)

const WTKeyTable& WTProject::keys() {
  using namespace WTKeys;
  static const WTKeyTable table(
      &billingKeys(),
      {
          toOne("client", &WTStoreRecord::clientUuid),
          stored("budget", &WTProject::budget_, &WTStoreRecord::budget),
          refine("rate", nullptr, nullptr, {"inheritedRate", "client", "client.rate"}),
          refine("inheritedRate", nullptr, nullptr, {"rate"}),
          toMany("tasks", WTKeyType::Ordered, &records<&WTProject::tasks>,
                 [](WTObject& object, const QVariant& value) {
                   // An ordered list of tasks: each is filed here at its place.
                   int index = 0;
                   for (const QVariant& element : value.toList()) {
                     auto* task = dynamic_cast<WTTask*>(KeyPath::objectFromVariant(element));
                     if (task) task->setProject(static_cast<WTProject*>(&object), index++);
                   }
                   return value.canConvert<QVariantList>();
                 }),
          derived<&WTProject::duration>("duration", {"tasks"}),
          derived<&WTProject::cost>("cost", {"duration", "rate"}),
          derived<&WTProject::tasksArray>("tasksArray", {"tasks"}),
          derived<&WTProject::tableImage>("tableImage", {"archived"}),
          derived<&WTProject::running>("running", {"tasks"}),
          refine("roundingRule", nullptr, nullptr,
                 {"roundingMinutes", "roundingMode", "client", "client.roundingRule"}),
          derived<&WTProject::billingCurrency>("billingCurrency", {"client", "client.billingCurrency"}),
          derived<&WTProject::billedDuration>("billedDuration", {"duration", "roundingRule"}),
          // Where the billed cost stands against the budget, for a report: none without a budget.
          derived("budgetStanding", WTKeyType::Text,
                  [](const WTObject& object) { return WTBudget::reportedStanding(&object); },
                  {"budget", "billedCost"}),
          derived<&WTProject::billedCost>("billedCost", {"cost", "billedDuration", "billingCurrency"}),
      });
  return table;
}

void WTProject::setClient(WTClient* client) {
  changeOwner(client);
}

WTObject* WTProject::owner() const {
  return client_;
}

void WTProject::relinkOwner(WTObject* owner, int) {
  if (client_) client_->projects_.removeOne(this);
  client_ = static_cast<WTClient*>(owner);
  if (client_) client_->projects_.append(this);
}

void WTProject::moveTask(WTTask* task, int index) {
  if (!task || task->project() != this) return;
  task->changeOwner(this, std::clamp(index, 0, static_cast<int>(tasks_.size()) - 1));
}

void WTProject::moveTasks(const QList<WTTask*>& tasks, int row) {
  QList<WTTask*> order = tasks_;
  for (WTTask* task : tasks) {
    const qsizetype from = order.indexOf(task);
    if (from < 0) continue;
    // The place is counted with the moving task still in it: past that task, it is one less.
    const qsizetype to = row < 0 ? order.size() : row;
    if (to == from) continue;
    order.move(from, to > from ? to - 1 : to);
  }
  for (int i = 0; i < order.size(); ++i) {
    if (tasks_.indexOf(order[i]) != i) moveTask(order[i], i);
  }
}

Decimal WTProject::rateFromAbove() const {
  if (client_) return client_->inheritedRate();
  return userDefaultRate().value_or(builtInRate());
}

// Here rather than in the setter, so that a rate put back by undo or redo reaches the client too.
void WTProject::storedValueDidChange(const QString& key) {
  if (key == QLatin1String("rate") && client_) client_->costDidChange();
  if ((key == QLatin1String("roundingMinutes") || key == QLatin1String("roundingMode")) && client_)
    client_->billingDidChange();
}

void WTProject::setBudget(const std::optional<Decimal>& budget) {
  setStoredValue(QStringLiteral("budget"), budget ? QVariant::fromValue(*budget) : QVariant());
}

WTRoundingRule WTProject::roundingRuleFromAbove() const {
  return client_ ? client_->roundingRule() : WTBillingRecord::roundingRuleFromAbove();
}

QString WTProject::billingCurrency() const {
  return client_ ? client_->billingCurrency() : context()->billingDefaults().currency;
}

int WTProject::billedDuration() const {
  int total = 0;
  for (const WTTask* task : tasks_) total += task->billedDuration();
  return total;
}

Decimal WTProject::billedCost() const {
  Decimal total = Decimal().rounded(MoneyFormat::minorUnitDigits(billingCurrency()));
  for (const WTTask* task : tasks_) total += task->billedCost();
  return total;
}

void WTProject::billingDidChange() {
  announce(QStringLiteral("billedDuration"));
  if (client_) client_->billingDidChange();
}

int WTProject::duration() const {
  int total = 0;
  for (const WTTask* task : tasks_) total += task->duration();
  return total;
}

Decimal WTProject::cost() const {
  Decimal total;
  for (const WTTask* task : tasks_) total += task->cost();
  return total;
}

// Announces the project's duration only: its cost follows through the key dependencies.
void WTProject::durationDidChange() {
  announce(QStringLiteral("duration"));
  if (client_) client_->durationDidChange();
}

void WTProject::costDidChange() {
  announce(QStringLiteral("cost"));
  if (client_) client_->costDidChange();
}

bool WTProject::running() const {
  return std::any_of(tasks_.begin(), tasks_.end(), [](const WTTask* task) { return task->running(); });
}

void WTProject::runningDidChange() {
  announce(QStringLiteral("running"));
}

QString WTProject::tableImage() const {
  return archived() ? QStringLiteral("folder_32_dis") : QStringLiteral("folder_32");
}
