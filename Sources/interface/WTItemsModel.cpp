#include "WTItemsModel.h"

#include "Decimal.h"
#include "DurationText.h"
#include "MoneyFormat.h"
#include "RZDate.h"
#include "WTClient.h"
#include "WTExpense.h"
#include "WTFlat.h"
#include "WTItem.h"
#include "WTItemContainer.h"
#include "WTObjectContext.h"
#include "WTOrderedDiff.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTTime.h"
#include "WTToDo.h"

#include <unicode/dtptngen.h>
#include <unicode/locid.h>

#include <QDataStream>
#include <QIODevice>
#include <QMimeData>
#include <QRegularExpression>

#include <algorithm>
#include <cmath>
#include <limits>
#include <memory>
#include <string>

const QString WTItemsModel::kObjectUUIDsType = QStringLiteral("WTObjectUUIDs");
const QString WTItemsModel::kContainsTasksType = QStringLiteral("WTContainsTasks");

struct WTItemsModel::Node {
  enum Kind { Root, Task, Container, Item };
  Kind kind = Root;
  Node* parent = nullptr;
  int row = 0;
  WTObject* object = nullptr;  // tasks and items
  std::shared_ptr<WTItemContainer> container;
  std::vector<std::unique_ptr<Node>> children;

  void renumber(size_t from = 0) {
    for (size_t i = from; i < children.size(); ++i) children[i]->row = static_cast<int>(i);
  }
};

namespace {

using ContainerKey = qint64;
constexpr ContainerKey kPendingKey = std::numeric_limits<qint64>::min();

ContainerKey keyOfDay(std::optional<Date> day) {
  return day ? static_cast<ContainerKey>(std::llround(day->secondsSince1970() * 1000.0)) : kPendingKey;
}

bool isStructureKeyOfItem(const QString& key) {
  return key == QLatin1String("startDate") || key == QLatin1String("completed") ||
         key == QLatin1String("task");
}

bool isShownKeyOfItem(const QString& key) {
  static const QSet<QString> keys = {QStringLiteral("name"),      QStringLiteral("notes"),
                                     QStringLiteral("duration"),  QStringLiteral("cost"),
                                     QStringLiteral("running"),   QStringLiteral("endDate"),
                                     QStringLiteral("expense"),   QStringLiteral("minutes"),
                                     QStringLiteral("completed"), QStringLiteral("startDate")};
  return keys.contains(key);
}

bool isShownKeyOfTask(const QString& key) {
  static const QSet<QString> keys = {QStringLiteral("name"),
                                     QStringLiteral("notes"),
                                     QStringLiteral("duration"),
                                     QStringLiteral("cost"),
                                     QStringLiteral("running"),
                                     QStringLiteral("tableImage"),
                                     QStringLiteral("timerButtonImage")};
  return keys.contains(key);
}

QVariant pointerVariant(const WTObject* object) {
  return object ? QVariant::fromValue(reinterpret_cast<quintptr>(object)) : QVariant();
}

// "9:05", "09:05" or "9" on the day of `day`; none when the text is not a time of day.
std::optional<Date> timeOnDay(Date day, const QString& text) {
  static const QRegularExpression pattern(QStringLiteral("^\\s*(\\d{1,2})(?:[:.](\\d{2}))?\\s*$"));
  const QRegularExpressionMatch match = pattern.match(text);
  if (!match.hasMatch()) return std::nullopt;
  const int hour = match.captured(1).toInt();
  const int minute = match.captured(2).isEmpty() ? 0 : match.captured(2).toInt();
  if (hour > 23 || minute > 59) return std::nullopt;
  RZDate::DateComponents components;
  RZDate::assignFlags(day, RZDate::DayUnits, components);
  components.hour = hour;
  components.minute = minute;
  components.second = 0;
  return RZDate::dateFromComponents(components);
}

// A day group's heading: weekday, day, month and year in the order and words of the user's locale
// ("Tue 24 Nov 2026"), which a numeric short date ("11/24/26") leaves for the reader to work out.
QString dayTitle(Date day) {
  struct Cached {
    std::string locale;
    QString pattern;
  };
  static Cached cached;
  const icu::Locale& locale = icu::Locale::getDefault();
  if (cached.pattern.isEmpty() || cached.locale != locale.getName()) {
    UErrorCode status = U_ZERO_ERROR;
    std::unique_ptr<icu::DateTimePatternGenerator> generator(
        icu::DateTimePatternGenerator::createInstance(locale, status));
    if (U_FAILURE(status) || !generator) return RZDate::shortFormat(day);
    const icu::UnicodeString pattern = generator->getBestPattern(icu::UnicodeString(u"EEEdMMMy"), status);
    if (U_FAILURE(status)) return RZDate::shortFormat(day);
    cached.locale = locale.getName();
    cached.pattern = QString(reinterpret_cast<const QChar*>(pattern.getBuffer()), pattern.length());
  }
  return RZDate::stringWithPattern(day, cached.pattern);
}

}  // namespace

WTItemsModel::WTItemsModel(WTObjectContext* context, QObject* parent)
    : QAbstractItemModel(parent), context_(context), root_(std::make_unique<Node>()) {
  flushTimer_.setSingleShot(true);
  flushTimer_.setInterval(0);
  connect(&flushTimer_, &QTimer::timeout, this, &WTItemsModel::processChanges);
  connect(context_, &WTObjectContext::objectValueDidChange, this, &WTItemsModel::objectValueDidChange);
  connect(context_, &WTObjectContext::objectsDidChange, this, &WTItemsModel::objectsDidChange);
}

WTItemsModel::~WTItemsModel() = default;

void WTItemsModel::setProject(WTProject* project) {
  beginResetModel();
  project_ = project;
  root_ = std::make_unique<Node>();
  nodes_.clear();
  dirtyTasks_.clear();
  changed_.clear();
  tasksDirty_ = false;
  if (project_) {
    const QList<WTTask*>& tasks = project_->tasks();
    root_->children.reserve(tasks.size());
    for (WTTask* task : tasks) root_->children.push_back(makeTaskNode(task, root_.get()));
    root_->renumber();
  }
  endResetModel();
}

std::unique_ptr<WTItemsModel::Node> WTItemsModel::makeTaskNode(WTTask* task, Node* parent) {
  auto node = std::make_unique<Node>();
  node->kind = Node::Task;
  node->parent = parent;
  node->object = task;
  nodes_.insert(task, node.get());
  const WTItemContainerList& containers = task->children();
  node->children.reserve(containers.size());
  for (const auto& container : containers) node->children.push_back(makeContainerNode(container, node.get()));
  node->renumber();
  return node;
}

std::unique_ptr<WTItemsModel::Node> WTItemsModel::makeContainerNode(
    std::shared_ptr<WTItemContainer> container, Node* parent) {
  auto node = std::make_unique<Node>();
  node->kind = Node::Container;
  node->parent = parent;
  node->container = std::move(container);
  const QList<WTItem*>& items = node->container->items();
  node->children.reserve(items.size());
  for (WTItem* item : items) node->children.push_back(makeItemNode(item, node.get()));
  node->renumber();
  return node;
}

std::unique_ptr<WTItemsModel::Node> WTItemsModel::makeItemNode(WTItem* item, Node* parent) {
  auto node = std::make_unique<Node>();
  node->kind = Node::Item;
  node->parent = parent;
  node->object = item;
  nodes_.insert(item, node.get());
  return node;
}

void WTItemsModel::forget(Node* node) {
  if (node->object) {
    auto it = nodes_.find(node->object);
    if (it != nodes_.end() && it.value() == node) nodes_.erase(it);
  }
  for (const auto& child : node->children) forget(child.get());
}

WTItemsModel::Node* WTItemsModel::nodeOf(const QModelIndex& index) const {
  if (!index.isValid()) return root_.get();
  return static_cast<Node*>(index.internalPointer());
}

QModelIndex WTItemsModel::indexOfNode(const Node* node) const {
  if (!node || node == root_.get() || node->kind == Node::Root) return {};
  return createIndex(node->row, 0, const_cast<Node*>(node));
}

QModelIndex WTItemsModel::indexOfObject(const WTObject* object) const {
  return indexOfNode(nodes_.value(object));
}

QModelIndex WTItemsModel::indexOfContainer(const WTTask* task, std::optional<Date> day) const {
  const Node* taskNode = nodes_.value(task);
  if (!taskNode || taskNode->kind != Node::Task) return {};
  const ContainerKey key = keyOfDay(day);
  // Searched from the end, as the last matching group wins.
  for (auto it = taskNode->children.rbegin(); it != taskNode->children.rend(); ++it) {
    if (keyOfDay((*it)->container->date()) == key) return indexOfNode(it->get());
  }
  return {};
}

QModelIndex WTItemsModel::indexOfContainerOfItem(const WTItem* item) const {
  if (!item || !item->task()) return {};
  std::optional<Date> day = item->date();
  if (item->entity() == WTEntity::ToDo && !static_cast<const WTToDo*>(item)->completed()) day.reset();
  if (day) day = RZDate::midnight(*day);
  return indexOfContainer(item->task(), day);
}

WTObject* WTItemsModel::objectAt(const QModelIndex& index) const {
  return index.isValid() ? nodeOf(index)->object : nullptr;
}

std::shared_ptr<WTItemContainer> WTItemsModel::containerAt(const QModelIndex& index) const {
  return index.isValid() ? nodeOf(index)->container : nullptr;
}

bool WTItemsModel::isTaskIndex(const QModelIndex& index) const {
  return index.isValid() && nodeOf(index)->kind == Node::Task;
}

bool WTItemsModel::isContainerIndex(const QModelIndex& index) const {
  return index.isValid() && nodeOf(index)->kind == Node::Container;
}

bool WTItemsModel::isItemIndex(const QModelIndex& index) const {
  return index.isValid() && nodeOf(index)->kind == Node::Item;
}

QString WTItemsModel::kindAt(const QModelIndex& index) const {
  const Node* node = index.isValid() ? nodeOf(index) : nullptr;
  if (!node) return {};
  switch (node->kind) {
    case Node::Task:
      return QStringLiteral("WTTask");
    case Node::Container:
      return QStringLiteral("WTItemContainer");
    case Node::Item:
      return node->object->entityName();
    default:
      return {};
  }
}

QString WTItemsModel::persistentIdentity(const QModelIndex& index) const {
  const Node* node = index.isValid() ? nodeOf(index) : nullptr;
  if (!node) return {};
  if (node->object) return node->object->uuid();
  const std::optional<Date> day = node->container->date();
  const QString task = node->parent->object->uuid();
  return task + u'|' + (day ? QString::number(keyOfDay(day)) : QStringLiteral("Pending"));
}

QModelIndex WTItemsModel::indexForPersistentIdentity(const QString& identity) const {
  const qsizetype bar = identity.lastIndexOf(u'|');
  if (bar < 0) return indexOfObject(context_->objectWithUUID(identity));
  const auto* task = dynamic_cast<WTTask*>(context_->objectWithUUID(identity.left(bar)));
  const QString day = identity.mid(bar + 1);
  const Node* taskNode = nodes_.value(task);
  if (!taskNode) return {};
  bool ok = false;
  const ContainerKey key = day == QLatin1String("Pending") ? kPendingKey : day.toLongLong(&ok);
  if (day != QLatin1String("Pending") && !ok) return {};
  for (const auto& child : taskNode->children) {
    if (keyOfDay(child->container->date()) == key) return indexOfNode(child.get());
  }
  return {};
}

// Change tracking.

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
  if (key == QLatin1String("rate")) {
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
  QList<WTObject*> current;
  for (const auto& child : root->children) current.append(child->object);
  QList<WTObject*> target;
  for (WTTask* task : project_->tasks()) target.append(task);
  struct Ops {
    WTItemsModel* model;
    Node* root;
    QList<WTObject*>& current;
    void remove(int first, int last) {
      model->beginRemoveRows(QModelIndex(), first, last);
      for (int i = first; i <= last; ++i) model->forget(root->children[i].get());
      root->children.erase(root->children.begin() + first, root->children.begin() + last + 1);
      current.remove(first, last - first + 1);
      root->renumber(first);
      model->endRemoveRows();
    }
    void move(int from, int to) {
      model->beginMoveRows(QModelIndex(), from, from, QModelIndex(), to);
      std::unique_ptr<Node> node = std::move(root->children[from]);
      root->children.erase(root->children.begin() + from);
      root->children.insert(root->children.begin() + to, std::move(node));
      current.move(from, to);
      root->renumber(std::min(from, to));
      model->endMoveRows();
    }
    void insert(int at, WTObject* task) {
      model->beginInsertRows(QModelIndex(), at, at);
      root->children.insert(root->children.begin() + at,
                            model->makeTaskNode(static_cast<WTTask*>(task), root));
      current.insert(at, task);
      root->renumber(at);
      model->endInsertRows();
    }
  };
  applyOrderedDiff(current, target, Ops{this, root, current});
}

void WTItemsModel::syncTask(Node* taskNode) {
  auto* task = static_cast<WTTask*>(taskNode->object);
  const QModelIndex parent = indexOfNode(taskNode);
  QHash<ContainerKey, std::shared_ptr<WTItemContainer>> fresh;
  QList<ContainerKey> target;
  for (const auto& container : task->children()) {
    const ContainerKey key = keyOfDay(container->date());
    target.append(key);
    fresh.insert(key, container);
  }
  QList<ContainerKey> current;
  for (const auto& child : taskNode->children) current.append(keyOfDay(child->container->date()));
  struct Ops {
    WTItemsModel* model;
    Node* taskNode;
    QModelIndex parent;
    QList<ContainerKey>& current;
    QHash<ContainerKey, std::shared_ptr<WTItemContainer>>& fresh;
    void remove(int first, int last) {
      model->beginRemoveRows(parent, first, last);
      for (int i = first; i <= last; ++i) model->forget(taskNode->children[i].get());
      taskNode->children.erase(taskNode->children.begin() + first, taskNode->children.begin() + last + 1);
      current.remove(first, last - first + 1);
      taskNode->renumber(first);
      model->endRemoveRows();
    }
    void move(int from, int to) {
      model->beginMoveRows(parent, from, from, parent, to);
      std::unique_ptr<Node> node = std::move(taskNode->children[from]);
      taskNode->children.erase(taskNode->children.begin() + from);
      taskNode->children.insert(taskNode->children.begin() + to, std::move(node));
      current.move(from, to);
      taskNode->renumber(std::min(from, to));
      model->endMoveRows();
    }
    void insert(int at, ContainerKey key) {
      model->beginInsertRows(parent, at, at);
      // The new group comes with its items: they are part of the inserted row.
      taskNode->children.insert(taskNode->children.begin() + at,
                                model->makeContainerNode(fresh.take(key), taskNode));
      current.insert(at, key);
      taskNode->renumber(at);
      model->endInsertRows();
    }
  };
  applyOrderedDiff(current, target, Ops{this, taskNode, parent, current, fresh});
  // Groups that stayed take their rebuilt container and bring their items in line with it.
  for (const auto& child : taskNode->children) {
    auto it = fresh.find(keyOfDay(child->container->date()));
    if (it == fresh.end()) continue;  // inserted just now, already current
    child->container = it.value();
    syncContainerItems(child.get());
    const QModelIndex index = indexOfNode(child.get());
    emit dataChanged(index, index);
  }
}

void WTItemsModel::syncContainerItems(Node* containerNode) {
  const QModelIndex parent = indexOfNode(containerNode);
  QList<WTItem*> current;
  for (const auto& child : containerNode->children) current.append(static_cast<WTItem*>(child->object));
  const QList<WTItem*>& target = containerNode->container->items();
  if (current == target) return;
  struct Ops {
    WTItemsModel* model;
    Node* node;
    QModelIndex parent;
    QList<WTItem*>& current;
    void remove(int first, int last) {
      model->beginRemoveRows(parent, first, last);
      for (int i = first; i <= last; ++i) model->forget(node->children[i].get());
      node->children.erase(node->children.begin() + first, node->children.begin() + last + 1);
      current.remove(first, last - first + 1);
      node->renumber(first);
      model->endRemoveRows();
    }
    void move(int from, int to) {
      model->beginMoveRows(parent, from, from, parent, to);
      std::unique_ptr<Node> moved = std::move(node->children[from]);
      node->children.erase(node->children.begin() + from);
      node->children.insert(node->children.begin() + to, std::move(moved));
      current.move(from, to);
      node->renumber(std::min(from, to));
      model->endMoveRows();
    }
    void insert(int at, WTItem* item) {
      model->beginInsertRows(parent, at, at);
      // An item that moved here from another group leaves its old row first (already removed there,
      // or about to be: its node is replaced either way).
      node->children.insert(node->children.begin() + at, model->makeItemNode(item, node));
      current.insert(at, item);
      node->renumber(at);
      model->endInsertRows();
    }
  };
  applyOrderedDiff(current, target, Ops{this, containerNode, parent, current});
}

// QAbstractItemModel.

QModelIndex WTItemsModel::index(int row, int column, const QModelIndex& parent) const {
  if (column != 0 || row < 0) return {};
  const Node* node = nodeOf(parent);
  if (!node || row >= static_cast<int>(node->children.size())) return {};
  return createIndex(row, 0, node->children[row].get());
}

QModelIndex WTItemsModel::parent(const QModelIndex& child) const {
  if (!child.isValid()) return {};
  return indexOfNode(nodeOf(child)->parent);
}

int WTItemsModel::rowCount(const QModelIndex& parent) const {
  if (parent.isValid() && parent.column() != 0) return 0;
  return static_cast<int>(nodeOf(parent)->children.size());
}

int WTItemsModel::columnCount(const QModelIndex&) const {
  return 1;
}

bool WTItemsModel::hasChildren(const QModelIndex& parent) const {
  return rowCount(parent) > 0;
}

QVariant WTItemsModel::data(const QModelIndex& index, int role) const {
  if (!checkIndex(index, CheckIndexOption::IndexIsValid)) return {};
  const Node* node = nodeOf(index);
  if (role == KindRole) return kindAt(index);
  if (role == ObjectRole) return pointerVariant(node->object);

  if (node->kind == Node::Container) {
    const WTItemContainer& container = *node->container;
    switch (role) {
      case Qt::DisplayRole:
      case NameRole:
        return container.date() ? dayTitle(*container.date()) : container.title();
      case DurationTextRole:
        return DurationText::stringWithMinutes(container.duration());
      case CostTextRole:
        return MoneyFormat::format(container.cost());
      default:
        return {};
    }
  }

  if (node->kind == Node::Task) {
    const auto* task = static_cast<const WTTask*>(node->object);
    switch (role) {
      case Qt::DisplayRole:
      case Qt::EditRole:
      case NameRole:
        return task->name();
      case NotesRole:
        return task->notes();
      case DurationTextRole:
        return DurationText::stringWithMinutes(task->duration());
      case CostTextRole:
        return MoneyFormat::format(task->cost());
      case ImageRole:
        return task->tableImage();
      case TimerImageRole:
        return task->timerButtonImage();
      case RunningRole:
        return task->running();
      case Qt::ToolTipRole:
        return task->buttonTitle();
      default:
        return {};
    }
  }

  const auto* item = static_cast<const WTItem*>(node->object);
  const WTEntity entity = item->entity();
  switch (role) {
    case Qt::DisplayRole:
    case Qt::EditRole:
    case NameRole:
      return item->name();
    case NotesRole:
      return item->notes();
    case StartTimeEditRole:
      return entity == WTEntity::Time && item->startDate()
                 ? QVariant(RZDate::stringWithPattern(*item->startDate(), QStringLiteral("HH:mm")))
                 : QVariant();
    case EndTimeEditRole: {
      if (entity != WTEntity::Time) return {};
      const auto* time = static_cast<const WTTime*>(item);
      if (time->running() || !time->endDate()) return {};
      return RZDate::stringWithPattern(*time->endDate(), QStringLiteral("HH:mm"));
    }
    case LabelRole:
      switch (entity) {
        case WTEntity::Time:
          return item->title();
        case WTEntity::Flat:
          return tr("Flat");
        case WTEntity::Expense:
          return tr("Expense");
        case WTEntity::Note:
          return tr("Note");
        default:
          return {};
      }
    case DurationTextRole:
    case DurationEditRole:
    case SpentDurationEditRole:
      if (entity != WTEntity::Time && entity != WTEntity::Flat) return {};
      return DurationText::stringWithMinutes(item->duration());
    case CostTextRole:
      if (entity != WTEntity::Time && entity != WTEntity::Flat && entity != WTEntity::Expense) return {};
      return MoneyFormat::format(item->cost());
    case AmountEditRole:
      if (entity != WTEntity::Expense) return {};
      return TypedNumber::editableText(static_cast<const WTExpense*>(item)->expense().value_or(Decimal()));
    case RunningRole:
      return entity == WTEntity::Time && static_cast<const WTTime*>(item)->running();
    case TimerImageRole:
      return entity == WTEntity::Time && static_cast<const WTTime*>(item)->running()
                 ? QStringLiteral("stop_32")
                 : QVariant();
    case CompletedRole:
      if (entity != WTEntity::ToDo) return {};
      return static_cast<const WTToDo*>(item)->completed();
    case DateRole:
      return item->date() ? QVariant(item->date()->toQDateTime()) : QVariant();
    default:
      return {};
  }
}

QString WTItemsModel::refusalFor(int role, const QString& text) {
  QString refusal;
  if (role == DurationEditRole)
    DurationText::minutesFromTypedText(text, &refusal);
  else if (role == AmountEditRole)
    refusal = MoneyFormat::parse(text).refusal;
  return refusal;
}

bool WTItemsModel::setData(const QModelIndex& index, const QVariant& value, int role) {
  if (!checkIndex(index, CheckIndexOption::IndexIsValid)) return false;
  Node* node = nodeOf(index);
  if (!node->object) return false;
  WTObject* object = node->object;
  QString stepName = tr("Typing");
  if (role == CompletedRole) stepName = value.toBool() ? tr("Complete To-Do") : tr("Reopen To-Do");
  const WTUndoManager::NamedStep step(context_->undoManager(), stepName);
  switch (role) {
    case Qt::EditRole:
    case NameRole:
      if (object->name() == value.toString()) return false;
      object->setName(value.toString());
      return true;
    case NotesRole:
      if (object->notes() == value.toString()) return false;
      object->setNotes(value.toString());
      return true;
    case DurationEditRole: {
      const std::optional<int> typed = DurationText::minutesFromTypedText(value.toString());
      if (!typed) return false;
      const int minutes = *typed;
      if (object->entity() == WTEntity::Time) {
        auto* time = static_cast<WTTime*>(object);
        if (time->running()) return false;  // a running entry's length is the clock's
        time->setDuration(minutes);
        return true;
      }
      if (object->entity() == WTEntity::Flat) {
        static_cast<WTFlat*>(object)->setMinutes(minutes);
        return true;
      }
      return false;
    }
    case StartTimeEditRole: {
      if (object->entity() != WTEntity::Time) return false;
      auto* time = static_cast<WTTime*>(object);
      const std::optional<Date> start = time->startDate();
      const std::optional<Date> moved = start ? timeOnDay(*start, value.toString()) : std::nullopt;
      // Only the beginning moves: the end stays, so a start after it is refused.
      if (!moved || (!time->running() && time->endDate() && *moved > *time->endDate())) return false;
      if (*moved == *start) return false;
      time->setStartDate(moved);
      return true;
    }
    case EndTimeEditRole: {
      if (object->entity() != WTEntity::Time) return false;
      auto* time = static_cast<WTTime*>(object);
      const std::optional<Date> end = time->endDate();
      if (time->running() || !end) return false;
      const std::optional<Date> moved = timeOnDay(*end, value.toString());
      // Only the end moves: the start stays, so an end before it is refused.
      if (!moved || (time->startDate() && *moved < *time->startDate())) return false;
      if (*moved == RZDate::beginOfMinute(*end)) return false;
      time->setEndDate(moved);
      return true;
    }
    case SpentDurationEditRole: {
      if (object->entity() != WTEntity::Time) return false;
      auto* time = static_cast<WTTime*>(object);
      if (time->running()) return false;
      time->setDurationKeepingEnd(DurationText::minutesFromString(value.toString()));
      return true;
    }
    case AmountEditRole: {
      if (object->entity() != WTEntity::Expense) return false;
      const TypedNumber::Reading amount = MoneyFormat::parse(value.toString());
      if (!amount.taken()) return false;
      static_cast<WTExpense*>(object)->setExpense(amount.value);
      return true;
    }
    case CompletedRole:
      if (object->entity() != WTEntity::ToDo) return false;
      static_cast<WTToDo*>(object)->setCompleted(value.toBool());
      return true;
    default:
      return false;
  }
}

Qt::ItemFlags WTItemsModel::flags(const QModelIndex& index) const {
  if (!index.isValid()) return Qt::ItemIsDropEnabled;
  const Node* node = nodeOf(index);
  switch (node->kind) {
    case Node::Task:
      return Qt::ItemIsEnabled | Qt::ItemIsSelectable | Qt::ItemIsEditable | Qt::ItemIsDragEnabled |
             Qt::ItemIsDropEnabled;
    case Node::Container:
      // Groups are headers: never selected, but items can be dropped on them.
      return Qt::ItemIsEnabled | Qt::ItemIsDropEnabled;
    case Node::Item:
      return Qt::ItemIsEnabled | Qt::ItemIsSelectable | Qt::ItemIsEditable | Qt::ItemIsDragEnabled |
             Qt::ItemNeverHasChildren;
    default:
      return Qt::NoItemFlags;
  }
}

// Drag and drop.

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

bool WTItemsModel::dropMimeData(const QMimeData* data, Qt::DropAction action, int row, int column,
                                const QModelIndex& parent) {
  if (!canDropMimeData(data, action, row, column, parent)) return false;
  const WTUndoManager::NamedStep step(context_->undoManager(), tr("Move"));
  const QStringList uuids = objectUUIDs(data);
  if (containsTasks(data)) {
    QList<WTTask*> tasks = project_->tasks();
    for (const QString& uuid : uuids) {
      if (!uuid.endsWith(QLatin1String("@WTTask"))) continue;
      auto* task = dynamic_cast<WTTask*>(context_->objectWithUUID(uuid));
      const qsizetype from = tasks.indexOf(task);
      if (from < 0) continue;
      // Each dragged task goes to the drop's place in turn; a place past the removed one shifts by one.
      const qsizetype to = row < 0 ? tasks.size() : row;
      if (to == from) continue;
      tasks.move(from, to > from ? to - 1 : to);
    }
    for (int i = 0; i < tasks.size(); ++i) {
      if (project_->tasks().indexOf(tasks[i]) != i) project_->moveTask(tasks[i], i);
    }
    return true;
  }
  const Node* target = nodeOf(parent);
  QList<WTItem*> moved;
  for (const QString& uuid : uuids) {
    auto* item = dynamic_cast<WTItem*>(context_->objectWithUUID(uuid));
    if (!item) continue;
    if (target->kind == Node::Task) {
      item->setTask(static_cast<WTTask*>(target->object));
    } else if (target->container->date()) {
      item->setTask(target->container->task());
      item->setDate(target->container->date());
    } else if (item->entity() == WTEntity::ToDo) {
      // Onto "Pending": the to-do is open again.
      static_cast<WTToDo*>(item)->setCompleted(false);
      item->setTask(target->container->task());
    } else {
      continue;
    }
    moved << item;
  }
  if (!moved.isEmpty()) emit itemsDropped(moved);
  return true;
}

Qt::DropActions WTItemsModel::supportedDropActions() const {
  return Qt::MoveAction;
}

Qt::DropActions WTItemsModel::supportedDragActions() const {
  return Qt::MoveAction;
}
