#include "WTProject.h"

#include "WTClient.h"
#include "WTObjectContext.h"
#include "WTStoreRecord.h"
#include "WTTask.h"

#include <algorithm>

WT_ENTITY_CLASS_IMPL(WTProject)

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

QVariant WTProject::valueForKey(const QString& key) const {
  if (key == QLatin1String("tasks") || key == QLatin1String("tasksArray")) {
    QVariantList list;
    for (WTTask* task : tasks_) list.append(KeyPath::variantFromObject(task));
    return list;
  }
  if (key == QLatin1String("client")) return client_ ? KeyPath::variantFromObject(client_) : QVariant();
  if (key == QLatin1String("duration")) return duration();
  if (key == QLatin1String("cost")) return QVariant::fromValue(cost());
  if (key == QLatin1String("tableImage")) return tableImage();
  if (key == QLatin1String("running")) return running();
  return WTObject::valueForKey(key);
}

bool WTProject::setValue(const QString& key, const QVariant& value) {
  if (key == QLatin1String("client")) {
    auto* client = dynamic_cast<WTClient*>(KeyPath::objectFromVariant(value));
    if (!value.isNull() && !client) return false;
    setClient(client);
    return true;
  }
  if (key == QLatin1String("tasks")) {
    // An ordered list of tasks: each is filed here at its place.
    int index = 0;
    for (const QVariant& element : value.toList()) {
      auto* task = dynamic_cast<WTTask*>(KeyPath::objectFromVariant(element));
      if (task) task->setProject(this, index++);
    }
    return value.canConvert<QVariantList>();
  }
  return WTObject::setValue(key, value);
}

QStringList WTProject::storedKeys() const {
  return WTObject::storedKeys() << QStringLiteral("client");
}

QList<WTObject*> WTProject::relatedObjects(const QString& relationship) const {
  if (relationship != QLatin1String("tasks")) return {};
  return QList<WTObject*>(tasks_.begin(), tasks_.end());
}

bool WTProject::isOrderedRelationship(const QString& relationship) const {
  return relationship == QLatin1String("tasks");
}

void WTProject::readRecord(const WTStoreRecord& record) {
  WTObject::readRecord(record);
}

void WTProject::writeRecord(WTStoreRecord& record) const {
  WTObject::writeRecord(record);
  record.clientUuid = client_ ? client_->uuid() : QString();
}
