#include "WTDeletion.h"

#include "WTEntity.h"
#include "WTItem.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTTime.h"

#include <QSet>

namespace {

bool isRunningTime(const WTObject* object) {
  return object->entity() == WTEntity::Time && static_cast<const WTTime*>(object)->running();
}

// The record's owner when it is among `selected`: it goes with that one.
bool goesWithOwner(const WTObject* object, const QSet<const WTObject*>& selected) {
  if (WTEntities::isItem(object->entity())) {
    const WTTask* task = static_cast<const WTItem*>(object)->task();
    return task && (selected.contains(task) || (task->project() && selected.contains(task->project())));
  }
  if (object->entity() == WTEntity::Task) {
    const WTProject* project = static_cast<const WTTask*>(object)->project();
    return project && selected.contains(project);
  }
  return false;
}

QList<WTItem*> itemsBelow(const WTObject* object) {
  if (object->entity() == WTEntity::Task) return static_cast<const WTTask*>(object)->items();
  QList<WTItem*> items;
  if (object->entity() == WTEntity::Project) {
    for (const WTTask* task : static_cast<const WTProject*>(object)->tasks()) items += task->items();
  }
  return items;
}

}  // namespace

WTDeletion::WTDeletion(const QList<WTObject*>& objects) {
  const QSet<const WTObject*> selected(objects.begin(), objects.end());
  QSet<const WTObject*> seen;
  for (WTObject* object : objects) {
    if (!object || goesWithOwner(object, selected) || seen.contains(object)) continue;
    seen.insert(object);
    objects_.append(object);
    if (isRunningTime(object)) ++running_;
    if (object->entity() == WTEntity::Project)
      tasks_ += int(static_cast<const WTProject*>(object)->tasks().size());
    for (const WTItem* item : itemsBelow(object)) {
      ++items_;
      if (isRunningTime(item)) ++running_;
    }
  }
}

namespace {

// The one record as the question names it: its name in quotes, else what it is.
QString nameInText(const WTObject* object) {
  if (!object->name().isEmpty()) return WTDeletion::tr("“%1”").arg(object->name());
  switch (object->entity()) {
    case WTEntity::Client:
      return WTDeletion::tr("this client");
    case WTEntity::Project:
      return WTDeletion::tr("this project");
    case WTEntity::Task:
      return WTDeletion::tr("this task");
    case WTEntity::Time:
      return WTDeletion::tr("this time entry");
    case WTEntity::Flat:
      return WTDeletion::tr("this flat fee");
    case WTEntity::Expense:
      return WTDeletion::tr("this expense");
    case WTEntity::ToDo:
      return WTDeletion::tr("this to-do");
    default:
      return WTDeletion::tr("this note");
  }
}

QString nameInTitle(const WTObject* object) {
  if (!object->name().isEmpty()) return WTDeletion::tr("“%1”").arg(object->name());
  switch (object->entity()) {
    case WTEntity::Client:
      return WTDeletion::tr("Client");
    case WTEntity::Project:
      return WTDeletion::tr("Project");
    case WTEntity::Task:
      return WTDeletion::tr("Task");
    case WTEntity::Time:
      return WTDeletion::tr("Time Entry");
    case WTEntity::Flat:
      return WTDeletion::tr("Flat Fee");
    case WTEntity::Expense:
      return WTDeletion::tr("Expense");
    case WTEntity::ToDo:
      return WTDeletion::tr("To-Do");
    default:
      return WTDeletion::tr("Note");
  }
}

// Several rows: what they all are, else plain "rows".
enum class Kind { Clients, Projects, Tasks, Items, Rows };

Kind kindOf(const QList<WTObject*>& objects) {
  auto kind = [](const WTObject* object) {
    switch (object->entity()) {
      case WTEntity::Client:
        return Kind::Clients;
      case WTEntity::Project:
        return Kind::Projects;
      case WTEntity::Task:
        return Kind::Tasks;
      default:
        return Kind::Items;
    }
  };
  const Kind first = kind(objects.first());
  for (const WTObject* object : objects) {
    if (kind(object) != first) return Kind::Rows;
  }
  return first;
}

}  // namespace

QString WTDeletion::question() const {
  if (objects_.isEmpty()) return {};
  const qsizetype count = objects_.size();
  QString what = nameInText(objects_.first());
  if (count > 1) {
    switch (kindOf(objects_)) {
      case Kind::Clients:
        what = tr("%1 clients").arg(count);
        break;
      case Kind::Projects:
        what = tr("%1 projects").arg(count);
        break;
      case Kind::Tasks:
        what = tr("%1 tasks").arg(count);
        break;
      case Kind::Items:
        what = tr("%1 items").arg(count);
        break;
      case Kind::Rows:
        what = tr("%1 rows").arg(count);
        break;
    }
  }
  if (items_ == 0) return tr("Delete %1?").arg(what);
  QString items = items_ == 1 ? tr("1 item") : tr("%1 items").arg(items_);
  // A project's items are its tasks': both are said, so that the number is not taken for tasks.
  if (tasks_ > 0)
    items = (tasks_ == 1 ? tr("1 task with %1") : tr("%1 tasks with %2").arg(tasks_)).arg(items);
  return count == 1 ? tr("Delete %1 and its %2?").arg(what, items)
                    : tr("Delete %1 and their %2?").arg(what, items);
}

QString WTDeletion::detail() const {
  if (running_ == 0) return {};
  if (objects_.size() == 1 && items_ == 0) return tr("Its timer is running.");
  if (objects_.size() == 1) {
    return running_ == 1 ? tr("A timer is running in it.") : tr("%1 timers are running in it.").arg(running_);
  }
  return running_ == 1 ? tr("A timer is running among them.")
                       : tr("%1 timers are running among them.").arg(running_);
}

QString WTDeletion::undoName() const {
  if (objects_.isEmpty()) return {};
  const qsizetype count = objects_.size();
  if (count == 1) return tr("Delete %1").arg(nameInTitle(objects_.first()));
  switch (kindOf(objects_)) {
    case Kind::Clients:
      return tr("Delete %1 Clients").arg(count);
    case Kind::Projects:
      return tr("Delete %1 Projects").arg(count);
    case Kind::Tasks:
      return tr("Delete %1 Tasks").arg(count);
    case Kind::Items:
      return tr("Delete %1 Items").arg(count);
    case Kind::Rows:
      break;
  }
  return tr("Delete %1 Rows").arg(count);
}
