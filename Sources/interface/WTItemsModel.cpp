#include "WTItemsModel.h"

#include "Decimal.h"
#include "DurationText.h"
#include "MoneyFormat.h"
#include "RZDate.h"
#include "WTBudgetBar.h"
#include "WTExpense.h"
#include "WTFlat.h"
#include "WTItem.h"
#include "WTItemContainer.h"
#include "WTItemsModelNode.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTTime.h"
#include "WTToDo.h"

#include <unicode/dtptngen.h>
#include <unicode/locid.h>

#include <QRegularExpression>

#include <memory>
#include <string>

// Presenting rows: the tree built from a project, the lookups the views use, and what each row shows
// and takes.

namespace {

QVariant pointerVariant(const WTObject* object) {
  return object ? QVariant::fromValue(reinterpret_cast<quintptr>(object)) : QVariant();
}

// "9:05", "09:05" or "9"; none when the text is not a time of day.
std::optional<QTime> typedTimeOfDay(const QString& text) {
  static const QRegularExpression pattern(QStringLiteral("^\\s*(\\d{1,2})(?:[:.](\\d{2}))?\\s*$"));
  const QRegularExpressionMatch match = pattern.match(text);
  if (!match.hasMatch()) return std::nullopt;
  const QTime time(match.captured(1).toInt(), match.captured(2).isEmpty() ? 0 : match.captured(2).toInt());
  if (!time.isValid()) return std::nullopt;
  return time;
}

// `time` on the clocks of the day of `day`; on the day they go forward, a time they skip comes out later.
Date timeOnDay(Date day, QTime time) {
  RZDate::DateComponents components;
  RZDate::assignFlags(day, RZDate::DayUnits, components);
  components.hour = time.hour();
  components.minute = time.minute();
  components.second = 0;
  return RZDate::dateFromComponents(components);
}

QString clock(Date date) {
  return RZDate::stringWithPattern(date, QStringLiteral("HH:mm"));
}

// Why `time` may not span from `start` to `end` (none: it runs), as the command line refuses an entry:
// a typed end after now bills time not yet spent, and time shared with another entry of the task bills
// the same minutes twice.
QString spanRefusal(const WTTime& time, Date start, std::optional<Date> end, bool endTyped) {
  if (endTyped && end && *end > Date::now())
    return WTItemsModel::tr("The entry would end after now (%1): it is for time already spent.")
        .arg(clock(*end));
  const WTTask* task = time.task();
  if (const WTTime* other = task ? task->timeOverlapping(start, end.value_or(Date::now()), &time) : nullptr)
    return WTItemsModel::tr("The entry would share time with the task's entry %1–%2.")
        .arg(clock(*other->startDate()),
             other->running() ? WTItemsModel::tr("now") : clock(other->endDate().value_or(Date())));
  return {};
}

// Where a start (or end) typed for `time` puts it on its day, or why it may not: `moved` is none when
// the text is refused, and also when there is no such end to move (a running entry's end).
struct MovedEnd {
  std::optional<Date> moved;
  QString refusal;
};
MovedEnd movedEnd(const WTTime& time, bool start, const QString& text) {
  const std::optional<Date> day = start ? time.startDate() : time.endDate();
  if (!day || (!start && time.running())) return {};
  const std::optional<QTime> typed = typedTimeOfDay(text);
  if (!typed)
    return {{},
            WTItemsModel::tr("“%1” is not a time of day; type one as 9:05 or 09:05.").arg(text.trimmed())};
  Date moved = timeOnDay(*day, *typed);
  // An end is the first such time from the start on, as on a wall clock: work past midnight ends the next
  // day, and an entry over midnight ends on the evening before it again. An entry of a day or more keeps
  // its end's day.
  if (const std::optional<Date> begin = time.startDate();
      !start && begin && time.endDate()->secondsSince1970() - begin->secondsSince1970() < 24 * 3600) {
    moved = timeOnDay(*begin, *typed);
    if (moved < *begin) moved = timeOnDay(RZDate::tomorrow(*begin), *typed);
  }
  if (const QString asTyped = typed->toString(u"HH:mm"); clock(moved) != asTyped)
    return {{}, WTItemsModel::tr("There is no %1 on that day: the clocks go forward then.").arg(asTyped)};
  if (start && !time.running() && time.endDate() && moved > *time.endDate())
    return {{}, WTItemsModel::tr("The start would come after the end (%1).").arg(clock(*time.endDate()))};
  // A running entry ends now: a later start would run its clock backwards, into negative time and money.
  if (start && time.running() && moved > Date::now())
    return {{}, WTItemsModel::tr("The start would come after now (%1).").arg(clock(Date::now()))};
  if (!start && time.startDate() && moved < *time.startDate())
    return {{}, WTItemsModel::tr("The end would come before the start (%1).").arg(clock(*time.startDate()))};
  const std::optional<Date> end = start ? (time.running() ? std::nullopt : time.endDate()) : moved;
  if (QString refusal = spanRefusal(time, start ? moved : *time.startDate(), end, !start); !refusal.isEmpty())
    return {{}, refusal};
  return {moved, {}};
}

// Why a duration typed for a stopped entry, which moves its end, may not be.
QString durationRefusal(const WTTime& time, int minutes) {
  if (time.running() || !time.startDate()) return {};
  return spanRefusal(time, *time.startDate(), time.startDate()->addingSeconds(minutes * 60.0), true);
}

// Why time already spent, typed for a new entry that ends where it ends (now), may not be so long.
QString spentRefusal(const WTTime& time, int minutes) {
  if (time.running() || !time.endDate()) return {};
  return spanRefusal(time, time.endDate()->addingSeconds(-60.0 * minutes), time.endDate(), false);
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
  const Node::GroupKey key = Node::keyOfDay(day);
  // Searched from the end, as the last matching group wins.
  for (auto it = taskNode->children.rbegin(); it != taskNode->children.rend(); ++it) {
    if (Node::keyOfDay((*it)->container->date()) == key) return indexOfNode(it->get());
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
  return task + u'|' + (day ? QString::number(Node::keyOfDay(day)) : QStringLiteral("Pending"));
}

QModelIndex WTItemsModel::indexForPersistentIdentity(const QString& identity) const {
  const qsizetype bar = identity.lastIndexOf(u'|');
  if (bar < 0) return indexOfObject(context_->objectWithUUID(identity));
  const auto* task = dynamic_cast<WTTask*>(context_->objectWithUUID(identity.left(bar)));
  const QString day = identity.mid(bar + 1);
  const Node* taskNode = nodes_.value(task);
  if (!taskNode) return {};
  bool ok = false;
  const Node::GroupKey key = day == QLatin1String("Pending") ? Node::kPendingKey : day.toLongLong(&ok);
  if (day != QLatin1String("Pending") && !ok) return {};
  for (const auto& child : taskNode->children) {
    if (Node::keyOfDay(child->container->date()) == key) return indexOfNode(child.get());
  }
  return {};
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
        return MoneyFormat::format(container.cost(), container.billingCurrency());
      case BilledTextRole:
        return billedText(std::pair(container.duration(), container.billedDuration()), container.cost(),
                          container.billedCost(), container.billingCurrency());
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
        return MoneyFormat::format(task->cost(), task->billingCurrency());
      case BilledTextRole:
        return billedText(std::pair(task->duration(), task->billedDuration()), task->cost(),
                          task->billedCost(), task->billingCurrency());
      case ImageRole:
        return task->tableImage();
      case TimerImageRole:
        return task->timerButtonImage();
      case RunningRole:
        return task->running();
      case Qt::ToolTipRole:
        return task->buttonTitle();
      case BudgetRole:
        return WTBudgetBar::variantOf(task);
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
      return MoneyFormat::format(item->cost(), item->billingCurrency());
    case BilledTextRole: {
      if (entity != WTEntity::Time && entity != WTEntity::Flat && entity != WTEntity::Expense) return {};
      std::optional<std::pair<int, int>> durations;
      if (entity != WTEntity::Expense) durations = std::pair(item->duration(), item->billedDuration());
      return billedText(durations, item->cost(), item->billedCost(), item->billingCurrency());
    }
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

QString WTItemsModel::billedText(std::optional<std::pair<int, int>> durations, const Decimal& cost,
                                 const Decimal& billed, const QString& currency) {
  QStringList parts;
  if (durations && durations->first != durations->second)
    parts.append(DurationText::stringWithMinutes(durations->second));
  const QString billedCost = MoneyFormat::format(billed, currency);
  if (billedCost != MoneyFormat::format(cost, currency) || !parts.isEmpty()) parts.append(billedCost);
  return parts.isEmpty() ? QString() : tr("billed %1").arg(parts.join(QStringLiteral(" · ")));
}

QString WTItemsModel::refusalFor(int role, const QString& text) {
  QString refusal;
  if (role == DurationEditRole || role == SpentDurationEditRole)
    DurationText::minutesFromTypedText(text, &refusal);
  return refusal;
}

QString WTItemsModel::refusalFor(const QModelIndex& index, int role, const QString& text) const {
  if (role != StartTimeEditRole && role != EndTimeEditRole && role != AmountEditRole &&
      role != DurationEditRole && role != SpentDurationEditRole)
    return refusalFor(role, text);
  const Node* node = checkIndex(index, CheckIndexOption::IndexIsValid) ? nodeOf(index) : nullptr;
  if (role == DurationEditRole || role == SpentDurationEditRole) {
    QString refusal;
    const std::optional<int> minutes = DurationText::minutesFromTypedText(text, &refusal);
    if (minutes && node && node->object && node->object->entity() == WTEntity::Time) {
      const auto& time = *static_cast<const WTTime*>(node->object);
      refusal = role == DurationEditRole ? durationRefusal(time, *minutes) : spentRefusal(time, *minutes);
    }
    return refusal;
  }
  if (role == AmountEditRole) {
    if (!node || !node->object || node->object->entity() != WTEntity::Expense) return {};
    return MoneyFormat::parseAmount(text, static_cast<const WTExpense*>(node->object)->billingCurrency())
        .refusal;
  }
  if (!node || !node->object || node->object->entity() != WTEntity::Time) return {};
  return movedEnd(*static_cast<const WTTime*>(node->object), role == StartTimeEditRole, text).refusal;
}

bool WTItemsModel::setData(const QModelIndex& index, const QVariant& value, int role) {
  if (!checkIndex(index, CheckIndexOption::IndexIsValid)) return false;
  Node* node = nodeOf(index);
  if (!node->object) return false;
  WTObject* object = node->object;
  // The Edit menu names the step by what it changed, not by the keys that changed it.
  static const QHash<int, const char*> kSteps = {{NotesRole, QT_TR_NOOP("Change Notes")},
                                                 {DurationEditRole, QT_TR_NOOP("Change Duration")},
                                                 {SpentDurationEditRole, QT_TR_NOOP("Change Duration")},
                                                 {StartTimeEditRole, QT_TR_NOOP("Change Start")},
                                                 {EndTimeEditRole, QT_TR_NOOP("Change End")},
                                                 {AmountEditRole, QT_TR_NOOP("Change Amount")}};
  QString stepName = tr(kSteps.value(
      role, object->entity() == WTEntity::Task ? QT_TR_NOOP("Rename") : QT_TR_NOOP("Change Description")));
  if (role == CompletedRole) stepName = value.toBool() ? tr("Complete To-Do") : tr("Reopen To-Do");
  const WTUndoManager::NamedStep step(context_->undoManager(), stepName);
  switch (role) {
    case Qt::EditRole:
    case NameRole: {
      // Spaces typed around a name are not part of it: the commands could not find it by what shows.
      const QString name = value.toString().trimmed();
      if (object->name() == name) return false;
      object->setName(name);
      return true;
    }
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
        // A running entry's length is the clock's.
        if (time->running() || !durationRefusal(*time, minutes).isEmpty()) return false;
        time->setDuration(minutes);
        return true;
      }
      if (object->entity() == WTEntity::Flat) {
        static_cast<WTFlat*>(object)->setMinutes(minutes);
        return true;
      }
      return false;
    }
    case StartTimeEditRole:
    case EndTimeEditRole: {
      if (object->entity() != WTEntity::Time) return false;
      auto* time = static_cast<WTTime*>(object);
      const bool start = role == StartTimeEditRole;
      // Only the one end moves and the other stays: what refusalFor refuses changes nothing.
      const std::optional<Date> moved = movedEnd(*time, start, value.toString()).moved;
      if (!moved || *moved == (start ? *time->startDate() : RZDate::beginOfMinute(*time->endDate())))
        return false;
      start ? time->setStartDate(moved) : time->setEndDate(moved);
      return true;
    }
    case SpentDurationEditRole: {
      if (object->entity() != WTEntity::Time) return false;
      auto* time = static_cast<WTTime*>(object);
      const std::optional<int> minutes = DurationText::minutesFromTypedText(value.toString());
      if (time->running() || !minutes || !spentRefusal(*time, *minutes).isEmpty()) return false;
      time->setDurationKeepingEnd(*minutes);
      return true;
    }
    case AmountEditRole: {
      if (object->entity() != WTEntity::Expense) return false;
      auto* expense = static_cast<WTExpense*>(object);
      const TypedNumber::Reading amount =
          MoneyFormat::parseAmount(value.toString(), expense->billingCurrency());
      if (!amount.taken()) return false;
      expense->setExpense(amount.value);
      return true;
    }
    case CompletedRole:
      if (object->entity() != WTEntity::ToDo) return false;
      static_cast<WTToDo*>(object)->markCompleted(value.toBool());
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
