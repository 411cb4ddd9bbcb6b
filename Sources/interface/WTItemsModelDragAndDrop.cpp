#include "WTItemsModel.h"

#include "RZDate.h"
#include "WTItem.h"
#include "WTItemContainer.h"
#include "WTItemsModelNode.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTTime.h"

#include <QDataStream>
#include <QIODevice>
#include <QLocale>
#include <QMimeData>

#include <algorithm>

// Drag and drop: a drag carries the uuids of its tasks and items; a drop hands them to the model's
// operations for the row it lands on.

const QString WTItemsModel::kObjectUUIDsType = QStringLiteral("WTObjectUUIDs");
const QString WTItemsModel::kContainsTasksType = QStringLiteral("WTContainsTasks");

QStringList WTItemsModel::mimeTypes() const {
  return {kObjectUUIDsType, kContainsTasksType};
}

QMimeData* WTItemsModel::mimeData(const QModelIndexList& indexes) const {
  // Outline order: by the path of rows from the top.
  auto path = [this](const QModelIndex& index) {
    QList<int> rows;
    for (QModelIndex at = index; at.isValid(); at = parent(at)) rows.prepend(at.row());
    return rows;
  };
  QList<QPair<QList<int>, const WTObject*>> rows;
  bool tasks = false;
  for (const QModelIndex& index : indexes) {
    const Node* node = index.isValid() ? nodeOf(index) : nullptr;
    if (!node || !node->object) continue;
    rows.append({path(index), node->object});
    tasks = tasks || node->kind == Node::Task;
  }
  if (rows.isEmpty()) return nullptr;
  std::sort(rows.begin(), rows.end(), [](const auto& a, const auto& b) { return a.first < b.first; });
  QStringList uuids;
  for (const auto& row : rows) {
    if (!uuids.contains(row.second->uuid())) uuids.append(row.second->uuid());
  }
  auto* data = new QMimeData;
  QByteArray archive;
  {
    QDataStream stream(&archive, QIODevice::WriteOnly);
    stream << uuids;
  }
  data->setData(kObjectUUIDsType, archive);
  QByteArray flag;
  {
    QDataStream stream(&flag, QIODevice::WriteOnly);
    stream << tasks;
  }
  data->setData(kContainsTasksType, flag);
  return data;
}

QStringList WTItemsModel::objectUUIDs(const QMimeData* data) {
  QStringList uuids;
  if (!data || !data->hasFormat(kObjectUUIDsType)) return uuids;
  QDataStream stream(data->data(kObjectUUIDsType));
  stream >> uuids;
  if (stream.status() != QDataStream::Ok) return {};
  return uuids;
}

bool WTItemsModel::containsTasks(const QMimeData* data) {
  if (!data || !data->hasFormat(kContainsTasksType)) return false;
  QDataStream stream(data->data(kContainsTasksType));
  bool flag = false;
  stream >> flag;
  return stream.status() == QDataStream::Ok && flag;
}

bool WTItemsModel::canDropMimeData(const QMimeData* data, Qt::DropAction, int row, int,
                                   const QModelIndex& parent) const {
  if (!project_ || !data) return false;
  const Node* target = parent.isValid() ? nodeOf(parent) : nullptr;
  // Tasks move only among the top-level rows; the items dragged with them are ignored.
  if (containsTasks(data)) return target == nullptr;
  if (!data->hasFormat(kObjectUUIDsType)) return false;
  if (!target || (target->kind != Node::Container && target->kind != Node::Task)) return false;
  // Items land on a row, never between rows.
  return row == -1;
}

namespace {

// The records of one kind among the uuids of a drag, in the drag's order; uuids of other kinds or of
// records gone since are passed over.
template <class T>
QList<T*> objectsOfDrag(WTObjectContext* context, const QStringList& uuids) {
  QList<T*> objects;
  for (const QString& uuid : uuids) {
    if (auto* object = dynamic_cast<T*>(context->objectWithUUID(uuid))) objects << object;
  }
  return objects;
}

}  // namespace

bool WTItemsModel::dropMimeData(const QMimeData* data, Qt::DropAction action, int row, int column,
                                const QModelIndex& parent) {
  if (!canDropMimeData(data, action, row, column, parent)) return false;
  const WTUndoManager::NamedStep step(context_->undoManager(), tr("Move"));
  const QStringList uuids = objectUUIDs(data);
  QList<WTObject*> moved;
  if (containsTasks(data)) {
    const QList<WTTask*> tasks = objectsOfDrag<WTTask>(context_, uuids);
    project_->moveTasks(tasks, row);
    moved = {tasks.begin(), tasks.end()};
  } else {
    const QList<WTItem*> items = objectsOfDrag<WTItem>(context_, uuids);
    const Node* target = nodeOf(parent);
    const bool keepsDates = target->kind == Node::Task;
    WTTask* task = keepsDates ? static_cast<WTTask*>(target->object) : target->container->task();
    const std::optional<Date> day = keepsDates ? std::nullopt : target->container->date();
    // Onto "Pending" (no day) only to-dos move: no time entry can clash there.
    if (const std::optional<WTTask::Clash> clash =
            keepsDates || day ? task->clashOfAdopting(items, day) : std::nullopt) {
      emit dropRefused(clashRefusal(*task, *clash));
      return false;
    }
    const QList<WTItem*> adopted = keepsDates ? task->adoptItems(items) : task->adoptItems(items, day);
    moved = {adopted.begin(), adopted.end()};
  }
  if (!moved.isEmpty()) emit recordsDropped(moved);
  return true;
}

Qt::DropActions WTItemsModel::supportedDropActions() const {
  return Qt::MoveAction;
}

Qt::DropActions WTItemsModel::supportedDragActions() const {
  return Qt::MoveAction;
}

QString WTItemsModel::clashRefusal(const WTTask& task, const WTTask::Clash& clash) {
  const auto clock = [](Date date) { return RZDate::stringWithPattern(date, QStringLiteral("HH:mm")); };
  return tr("The entry would share time with the entry %1–%2 of “%3” on %4.")
      .arg(clock(clash.otherStart), clash.other->running() ? tr("now") : clock(clash.otherEnd),
           task.name().isEmpty() ? tr("Untitled Task") : task.name(),
           QLocale().toString(clash.otherStart.toQDateTime().date(), QLocale::ShortFormat));
}
