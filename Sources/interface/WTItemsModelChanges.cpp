#include "WTItemsModel.h"

#include "WTClient.h"
#include "WTItem.h"
#include "WTItemContainer.h"
#include "WTItemsModelNode.h"
#include "WTObjectContext.h"
#include "WTOrderedDiff.h"
#include "WTProject.h"
#include "WTTask.h"

#include <QHash>
#include <QList>
#include <QSet>

#include <algorithm>
#include <functional>
#include <memory>
#include <utility>

// Following the store: what the context announces is collected and, once per event-loop turn, applied
// to the tree as exact row removals, moves and insertions, then as repaints of the rows that show it.

namespace {

bool isStructureKeyOfItem(const QString& key) {
  return key == QLatin1String("startDate") || key == QLatin1String("completed") ||
         key == QLatin1String("task");
}

bool isShownKeyOfItem(const QString& key) {
  static const QSet<QString> keys = {
      QStringLiteral("name"),      QStringLiteral("notes"),      QStringLiteral("duration"),
      QStringLiteral("cost"),      QStringLiteral("running"),    QStringLiteral("endDate"),
      QStringLiteral("expense"),   QStringLiteral("minutes"),    QStringLiteral("completed"),
      QStringLiteral("startDate"), QStringLiteral("billedCost"), QStringLiteral("billedDuration")};
  return keys.contains(key);
}

bool isShownKeyOfTask(const QString& key) {
  static const QSet<QString> keys = {QStringLiteral("name"),
                                     QStringLiteral("notes"),
                                     QStringLiteral("duration"),
                                     QStringLiteral("cost"),
                                     QStringLiteral("running"),
                                     QStringLiteral("tableImage"),
                                     QStringLiteral("timerButtonImage"),
                                     QStringLiteral("budget"),
                                     QStringLiteral("billedCost"),
                                     QStringLiteral("billedDuration")};
  return keys.contains(key);
}

}  // namespace

// Carries out the steps of applyOrderedDiff on the children of `node` as announced row changes.
// `current` lists the children's keys and is kept in step; `make` builds the row of a key that comes in,
// with everything below it (part of the inserted row).
template <class Key>
struct WTItemsModel::ChildRows {
  WTItemsModel* model;
  Node* node;
  QModelIndex parent;
  QList<Key>& current;
  std::function<std::unique_ptr<Node>(const Key&)> make;

  void remove(int first, int last) {
    model->beginRemoveRows(parent, first, last);
    for (int i = first; i <= last; ++i) model->forget(node->children[i].get());
    node->children.erase(node->children.begin() + first, node->children.begin() + last + 1);
    current.remove(first, last - first + 1);
    node->renumber(first);
    model->endRemoveRows();
  }
  // Rows only ever move up here (applyOrderedDiff brings a later row forward), so `to` needs no
  // adjusting for beginMoveRows.
  void move(int from, int to) {
    model->beginMoveRows(parent, from, from, parent, to);
    std::unique_ptr<Node> moved = std::move(node->children[from]);
    node->children.erase(node->children.begin() + from);
    node->children.insert(node->children.begin() + to, std::move(moved));
    current.move(from, to);
    node->renumber(std::min(from, to));
    model->endMoveRows();
  }
  void insert(int at, const Key& key) {
    model->beginInsertRows(parent, at, at);
    node->children.insert(node->children.begin() + at, make(key));
    current.insert(at, key);
    node->renumber(at);
    model->endInsertRows();
  }
};

bool WTItemsModel::belongsHere(const WTObject* object) const {
  if (!project_ || !object) return false;
  if (nodes_.contains(object)) return true;
  if (object->entity() == WTEntity::Task) return static_cast<const WTTask*>(object)->project() == project_;
  if (WTEntities::isItem(object->entity())) {
    const WTTask* task = static_cast<const WTItem*>(object)->task();
    return task && task->project() == project_;
  }
  return false;
}

void WTItemsModel::schedule() {
  if (!flushTimer_.isActive()) flushTimer_.start();
}

void WTItemsModel::markTaskDirty(WTTask* task) {
  if (!task || !nodes_.contains(task)) return;
  dirtyTasks_.insert(task);
  schedule();
}

void WTItemsModel::markChanged(const WTObject* object) {
  changed_.insert(object);
  schedule();
}

void WTItemsModel::markSubtreeChanged(const Node* node) {
  if (node->object) changed_.insert(node->object);
  for (const auto& child : node->children) markSubtreeChanged(child.get());
  schedule();
}

void WTItemsModel::objectValueDidChange(WTObject* object, const QString& key) {
  if (!project_) return;
  // A rate reaches the cost of every row below the record it is set on: those rows are shown anew at
  // once, day groups included, since no cost of theirs announces itself.
  // A rounding rule and a currency are announced, like a rate, by the record they are set on or that
  // inherits them, not by each item below it.
  if (key == QLatin1String("rate") || key == QLatin1String("roundingRule") ||
      key == QLatin1String("billingCurrency")) {
    if (object == project_) {
      markSubtreeChanged(root_.get());
    } else if (project_->client() && object == project_->client()) {
      markSubtreeChanged(root_.get());
      emit projectChanged();
    } else if (const Node* node = nodes_.value(object); node && node->kind == Node::Task) {
      markSubtreeChanged(node);
    }
  }
  if (object == project_) {
    if (key == QLatin1String("tasks")) {
      tasksDirty_ = true;
      schedule();
    }
    emit projectChanged();
    return;
  }
  if (!belongsHere(object)) return;
  const WTEntity entity = object->entity();
  if (entity == WTEntity::Task) {
    auto* task = static_cast<WTTask*>(object);
    if (key == QLatin1String("project")) {
      tasksDirty_ = true;
      schedule();
    } else if (key == QLatin1String("items") || key == QLatin1String("children")) {
      markTaskDirty(task);
    }
    if (isShownKeyOfTask(key) && nodes_.contains(task)) markChanged(task);
    return;
  }
  if (!WTEntities::isItem(entity)) return;
  auto* item = static_cast<WTItem*>(object);
  if (isStructureKeyOfItem(key)) {
    // The item may leave one task's tree and join another's: both are brought up to date.
    if (const Node* node = nodes_.value(item))
      markTaskDirty(static_cast<WTTask*>(node->parent->parent->object));
    if (item->task() && item->task()->project() == project_) markTaskDirty(item->task());
  }
  if (isShownKeyOfItem(key) && nodes_.contains(item)) markChanged(item);
}

void WTItemsModel::objectsDidChange(const QList<WTObject*>& inserted, const QList<WTObject*>&,
                                    const QList<WTObject*>& deleted) {
  if (!project_) return;
  if (deleted.contains(project_)) {
    setProject(nullptr);
    emit projectDeleted();
    return;
  }
  for (const WTObject* object : inserted) {
    if (object->entity() == WTEntity::Task && static_cast<const WTTask*>(object)->project() == project_) {
      tasksDirty_ = true;
      schedule();
    } else if (WTEntities::isItem(object->entity())) {
      markTaskDirty(static_cast<const WTItem*>(object)->task());
    }
  }
}

bool WTItemsModel::hasPendingChanges() const {
  return tasksDirty_ || !dirtyTasks_.isEmpty() || !changed_.isEmpty();
}

void WTItemsModel::processChanges() {
  flushTimer_.stop();
  if (!project_) {
    dirtyTasks_.clear();
    changed_.clear();
    tasksDirty_ = false;
    return;
  }
  if (std::exchange(tasksDirty_, false)) syncTasks();
  const QSet<WTTask*> dirty = std::exchange(dirtyTasks_, {});
  for (WTTask* task : dirty) {
    if (Node* node = nodes_.value(task); node && node->kind == Node::Task) syncTask(node);
  }
  // One repaint per row: the changed rows and the groups above changed items.
  const QSet<const WTObject*> changed = std::exchange(changed_, {});
  QSet<const Node*> rows;
  for (const WTObject* object : changed) {
    const Node* node = nodes_.value(object);
    if (!node) continue;
    rows.insert(node);
    if (node->kind == Node::Item) rows.insert(node->parent);
  }
  for (const Node* node : rows) {
    const QModelIndex index = indexOfNode(node);
    emit dataChanged(index, index);
  }
}

void WTItemsModel::syncTasks() {
  Node* root = root_.get();
  QList<WTTask*> current;
  for (const auto& child : root->children) current.append(static_cast<WTTask*>(child->object));
  const QList<WTTask*> target = project_->tasks();
  applyOrderedDiff(current, target,
                   ChildRows<WTTask*>{this, root, QModelIndex(), current, [this, root](WTTask* const& task) {
                                        return makeTaskNode(task, root);
                                      }});
}

void WTItemsModel::syncTask(Node* taskNode) {
  auto* task = static_cast<WTTask*>(taskNode->object);
  QHash<Node::GroupKey, std::shared_ptr<WTItemContainer>> fresh;
  QList<Node::GroupKey> target;
  for (const auto& container : task->children()) {
    const Node::GroupKey key = Node::keyOfDay(container->date());
    target.append(key);
    fresh.insert(key, container);
  }
  QList<Node::GroupKey> current;
  for (const auto& child : taskNode->children) current.append(Node::keyOfDay(child->container->date()));
  applyOrderedDiff(current, target,
                   ChildRows<Node::GroupKey>{this, taskNode, indexOfNode(taskNode), current,
                                             [this, taskNode, &fresh](const Node::GroupKey& key) {
                                               return makeContainerNode(fresh.take(key), taskNode);
                                             }});
  // Groups that stayed take their rebuilt container and bring their items in line with it.
  for (const auto& child : taskNode->children) {
    auto it = fresh.find(Node::keyOfDay(child->container->date()));
    if (it == fresh.end()) continue;  // inserted just now, already current
    child->container = it.value();
    syncContainerItems(child.get());
    const QModelIndex index = indexOfNode(child.get());
    emit dataChanged(index, index);
  }
}

void WTItemsModel::syncContainerItems(Node* containerNode) {
  QList<WTItem*> current;
  for (const auto& child : containerNode->children) current.append(static_cast<WTItem*>(child->object));
  const QList<WTItem*>& target = containerNode->container->items();
  if (current == target) return;
  // An item that came from another group gets a node of its own here; its old row is removed there
  // (already, or when that group's turn comes).
  applyOrderedDiff(current, target,
                   ChildRows<WTItem*>{this, containerNode, indexOfNode(containerNode), current,
                                      [this, containerNode](WTItem* const& item) {
                                        return makeItemNode(item, containerNode);
                                      }});
}
