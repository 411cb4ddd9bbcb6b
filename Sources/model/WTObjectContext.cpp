#include "WTObjectContext.h"

#include "MoneyFormat.h"
#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTClient.h"
#include "WTExpense.h"
#include "WTFlat.h"
#include "WTKeyDependencies.h"
#include "WTNote.h"
#include "WTProject.h"
#include "WTStore.h"
#include "WTTask.h"
#include "WTTime.h"
#include "WTToDo.h"

#include <QMetaMethod>
#include <QMetaObject>

#include <algorithm>
#include <limits>

namespace {

WTObjectContext* gDefaultContext = nullptr;

// The to-many key on the owner's side of each entity's to-one relationship.
QString inverseKey(WTEntity entity) {
  switch (entity) {
    case WTEntity::Client:
      return {};
    case WTEntity::Project:
      return QStringLiteral("projects");
    case WTEntity::Task:
      return QStringLiteral("tasks");
    default:
      return QStringLiteral("items");
  }
}

}  // namespace

WTObjectContext::WTObjectContext(UserDefaults* defaults, QObject* parent)
    : QObject(parent), defaults_(defaults) {
  undo_.setChangeHandler([this] { emit undoStateChanged(); });
  if (defaults_) {
    connect(defaults_, &UserDefaults::valueChanged, this, [this](const QString& key) {
      if (key == SettingsKeys::kDefaultRate) defaultRateDidChange();
      if (key == SettingsKeys::kCurrency || key == SettingsKeys::kRoundingMinutes ||
          key == SettingsKeys::kRoundingMode)
        billingDefaultDidChange(key);
    });
  }
}

const WTObjectContext::BillingDefaults& WTObjectContext::billingDefaults() const {
  if (billingDefaults_) return *billingDefaults_;
  BillingDefaults found;
  if (defaults_) {
    found.currency = defaults_->stringForKey(SettingsKeys::kCurrency).trimmed().toUpper();
    found.rule.minutes = int(std::clamp<qint64>(defaults_->integerForKey(SettingsKeys::kRoundingMinutes), 1,
                                                std::numeric_limits<int>::max()));
    found.rule.mode = WTRoundingRule::modeFromName(defaults_->stringForKey(SettingsKeys::kRoundingMode))
                          .value_or(WTRoundingRule::Mode::Nearest);
  }
  if (found.currency.isEmpty()) found.currency = MoneyFormat::localeCurrency();
  billingDefaults_ = std::move(found);
  return *billingDefaults_;
}

void WTObjectContext::billingDefaultDidChange(const QString& key) {
  billingDefaults_.reset();
  // Read where nothing above gives one: by every client, projects without one and tasks without a project.
  const QString announced =
      key == SettingsKeys::kCurrency ? QStringLiteral("billingCurrency") : QStringLiteral("roundingRule");
  std::vector<WTObject*> readers(objects_[int(WTEntity::Client)].begin(),
                                 objects_[int(WTEntity::Client)].end());
  for (WTObject* project : objects_[int(WTEntity::Project)]) {
    if (!static_cast<WTProject*>(project)->client()) readers.push_back(project);
  }
  for (WTObject* task : objects_[int(WTEntity::Task)]) {
    if (!static_cast<WTTask*>(task)->project()) readers.push_back(task);
  }
  for (WTObject* reader : readers) announce(reader, announced);
}

void WTObjectContext::defaultRateDidChange() {
  // Clients take the default; projects and tasks only when nothing above them gives a rate.
  const auto& clients = objects_[static_cast<int>(WTEntity::Client)];
  const auto& projects = objects_[static_cast<int>(WTEntity::Project)];
  const auto& tasks = objects_[static_cast<int>(WTEntity::Task)];
  const std::vector<WTObject*> readers = [&] {
    std::vector<WTObject*> found(clients.begin(), clients.end());
    for (WTObject* project : projects) {
      if (!static_cast<WTProject*>(project)->client()) found.push_back(project);
    }
    for (WTObject* task : tasks) {
      if (!static_cast<WTTask*>(task)->project()) found.push_back(task);
    }
    return found;
  }();
  for (WTObject* reader : readers) announce(reader, QStringLiteral("rate"));
}

WTObjectContext::~WTObjectContext() {
  if (gDefaultContext == this) gDefaultContext = nullptr;
  // Undo actions capture records; drop them before the records go. Nobody is told: this is going.
  undo_.setChangeHandler({});
  undo_.removeAllActions();
  // Records go first, while the observer tables they may still unregister from are alive.
  for (auto& list : objects_) list.clear();
  byUuid_.clear();
  owned_.clear();
  observers_.clear();
}

WTObjectContext* WTObjectContext::defaultContext() {
  return gDefaultContext;
}
void WTObjectContext::setDefaultContext(WTObjectContext* context) {
  gDefaultContext = context;
}

WTObjectContext* WTObjectContext::resolve(WTObjectContext* context) {
  WTObjectContext* resolved = context ? context : gDefaultContext;
  Q_ASSERT_X(resolved, "WTObjectContext", "no object context: the application delegate sets the default one");
  return resolved;
}

WTObject* WTObjectContext::makeObject(WTEntity entity) {
  switch (entity) {
    case WTEntity::Client:
      return new WTClient(this);
    case WTEntity::Project:
      return new WTProject(this);
    case WTEntity::Task:
      return new WTTask(this);
    case WTEntity::Time:
      return new WTTime(this);
    case WTEntity::Flat:
      return new WTFlat(this);
    case WTEntity::Expense:
      return new WTExpense(this);
    case WTEntity::Note:
      return new WTNote(this);
    case WTEntity::ToDo:
      return new WTToDo(this);
  }
  return nullptr;
}

void WTObjectContext::registerObject(WTObject* object, bool adoptOwnership) {
  if (adoptOwnership) owned_.emplace_back(object);
  auto& list = objects_[static_cast<int>(object->entity())];
  object->registryIndex_ = static_cast<int>(list.size());
  list.push_back(object);
  object->registered_ = true;
  if (!object->uuid_.isEmpty() && (itemsIndexed_ || !WTEntities::isItem(object->entity()))) {
    byUuid_.insert(object->uuid_, object);
  }
}

void WTObjectContext::indexItems() const {
  if (itemsIndexed_) return;
  qsizetype items = 0;
  for (WTEntity entity : WTEntities::kAll) {
    if (WTEntities::isItem(entity))
      items += static_cast<qsizetype>(objects_[static_cast<int>(entity)].size());
  }
  byUuid_.reserve(byUuid_.size() + items);
  for (WTEntity entity : WTEntities::kAll) {
    if (!WTEntities::isItem(entity)) continue;
    for (WTObject* object : objects_[static_cast<int>(entity)]) byUuid_.insert(object->uuid_, object);
  }
  itemsIndexed_ = true;
}

void WTObjectContext::unregisterObject(WTObject* object) {
  auto& list = objects_[static_cast<int>(object->entity())];
  const int index = object->registryIndex_;
  list[index] = list.back();
  list[index]->registryIndex_ = index;
  list.pop_back();
  object->registryIndex_ = -1;
  object->registered_ = false;
  auto it = byUuid_.find(object->uuid_);
  if (it != byUuid_.end() && it.value() == object) byUuid_.erase(it);
}

WTObject* WTObjectContext::insertNewObject(WTEntity entity) {
  return insertNewObject(entity, QString());
}

WTObject* WTObjectContext::insertNewObject(WTEntity entity, const QString& identity) {
  WTObject* object = makeObject(entity);
  object->uuid_ = identity;
  registerObject(object, true);
  inserted_.insert(object);
  turnInserted_.append(object);
  turnAnnounced_.insert(object);
  undo_.registerUndo([this, object] { removeFromGraph(object); });
  object->awakeFromInsert();
  scheduleProcessing();
  return object;
}

void WTObjectContext::reserveForInsertions(WTEntity entity, size_t records) {
  // Growing the sets one rehash at a time visits every record they hold again at each step.
  auto& list = objects_[static_cast<int>(entity)];
  list.reserve(list.size() + records);
  inserted_.reserve(inserted_.size() + records);
  turnAnnounced_.reserve(turnAnnounced_.size() + records);
  turnInserted_.reserve(turnInserted_.size() + qsizetype(records));
  owned_.reserve(owned_.size() + records);
}

void WTObjectContext::removeFromGraph(WTObject* object) {
  if (!object->registered_) return;
  unregisterObject(object);
  if (inserted_.erase(object) == 0 && object->persisted_) {
    deleted_.insert(object);
    updated_.erase(object);
  }
  turnDeleted_.append(object);
  undo_.registerUndo([this, object] { reinsertObject(object); });
  scheduleProcessing();
}

void WTObjectContext::reinsertObject(WTObject* object) {
  if (object->registered_) return;
  registerObject(object, false);
  if (object->persisted_) {
    deleted_.erase(object);
    if (!object->changedKeys_.isEmpty()) updated_.insert(object);
  } else {
    inserted_.insert(object);
  }
  turnInserted_.append(object);
  turnAnnounced_.insert(object);
  undo_.registerUndo([this, object] { removeFromGraph(object); });
  scheduleProcessing();
}

void WTObjectContext::deleteObject(WTObject* object) {
  if (!object || !object->registered_) return;
  switch (object->entity()) {
    case WTEntity::Client: {
      // Projects outlive their client.
      const QList<WTProject*> projects = static_cast<WTClient*>(object)->projects();
      for (WTProject* project : projects) project->setClient(nullptr);
      break;
    }
    case WTEntity::Project: {
      const QList<WTTask*> tasks = static_cast<WTProject*>(object)->tasks();
      for (WTTask* task : tasks) deleteObject(task);
      object->changeOwner(nullptr);
      break;
    }
    case WTEntity::Task: {
      const QList<WTItem*> items = static_cast<WTTask*>(object)->items();
      for (WTItem* item : items) deleteObject(item);
      object->changeOwner(nullptr);
      break;
    }
    default:
      object->changeOwner(nullptr);
      break;
  }
  removeFromGraph(object);
}

WTObject* WTObjectContext::objectWithUUID(const QVariant& uuid, bool forceInsert) {
  if (uuid.typeId() != QMetaType::QString) return nullptr;
  const QString identity = uuid.toString();
  const QString entityName = identity.section(u'@', -1);
  if (!WTEntities::isEntityName(entityName)) return nullptr;
  indexItems();
  WTObject* found = byUuid_.value(identity);
  if (found && !WTEntities::isKindOf(found->entity(), entityName)) found = nullptr;
  if (found || !forceInsert) return found;
  const std::optional<WTEntity> entity = WTEntities::fromName(entityName);
  if (!entity) return nullptr;  // an abstract entity cannot be made
  // Made under its identity at once: a random one first would be made, indexed and replaced for nothing.
  return insertNewObject(*entity, identity);
}

void WTObjectContext::uuidChanged(WTObject* object, const QString& oldUuid) {
  if (!object->registered_) return;
  // Items not yet in the map join it under the identity they have when it is first needed.
  if (!itemsIndexed_ && WTEntities::isItem(object->entity())) return;
  auto it = byUuid_.find(oldUuid);
  if (it != byUuid_.end() && it.value() == object) byUuid_.erase(it);
  byUuid_.insert(object->uuid_, object);
}

std::optional<QList<WTObject*>> WTObjectContext::fetchObjectsForEntityName(
    const QString& entityName, const QList<KeyPath::SortDescriptor>& sortDescriptors,
    const std::function<bool(const WTObject*)>& predicate) const {
  if (!WTEntities::isEntityName(entityName)) return std::nullopt;
  QList<WTObject*> result;
  for (WTEntity entity : WTEntities::kAll) {
    if (!WTEntities::isKindOf(entity, entityName)) continue;
    for (WTObject* object : objects_[static_cast<int>(entity)]) {
      if (!predicate || predicate(object)) result.append(object);
    }
  }
  if (sortDescriptors.isEmpty()) return result;
  QVariantList values;
  values.reserve(result.size());
  for (WTObject* object : result) values.append(KeyPath::variantFromObject(object));
  values = KeyPath::sorted(std::move(values), sortDescriptors);
  result.clear();
  for (const QVariant& value : values)
    result.append(static_cast<WTObject*>(KeyPath::objectFromVariant(value)));
  return result;
}

qsizetype WTObjectContext::count() const {
  qsizetype total = 0;
  for (const auto& list : objects_) total += static_cast<qsizetype>(list.size());
  return total;
}

void WTObjectContext::setChangeJournal(WTChangeJournal* journal) {
  journal_ = journal ? journal : &nullJournal_;
}

void WTObjectContext::storedValueChanged(WTObject* object, const QString& key, const QVariant& oldValue) {
  markChanged(object, key);
  // Identity is never undone: an undone insertion leaves the graph under the identity it was saved
  // with, so that the store can remove that row and the journal can name it to the other devices.
  if (key == QLatin1String("uuid") || !undo_.isRecording()) return;
  undo_.registerUndo([object, key, oldValue] { object->setStoredValue(key, oldValue); });
}

void WTObjectContext::ownerChanged(WTObject* object, WTObject* oldOwner, int oldIndex) {
  WTObject* newOwner = object->owner();
  const QString key = object->ownerKey();
  const QString inverse = inverseKey(object->entity());
  markChanged(object, key);
  if (oldOwner) markChanged(oldOwner, inverse);
  if (newOwner && newOwner != oldOwner) markChanged(newOwner, inverse);
  if (undo_.isRecording())
    undo_.registerUndo([object, oldOwner, oldIndex] { object->changeOwner(oldOwner, oldIndex); });

  announce(object, key);
  for (WTObject* owner : {oldOwner, newOwner == oldOwner ? nullptr : newOwner}) {
    if (!owner) continue;
    announce(owner, inverse);
    // A project's totals follow its tasks, raw and billed, and the client's the project's.
    if (owner->entity() == WTEntity::Project) static_cast<WTProject*>(owner)->durationDidChange();
    // A task's totals follow its items; the chain goes on up to project and client.
    if (owner->entity() != WTEntity::Task) continue;
    auto* task = static_cast<WTTask*>(owner);
    task->itemsDidChange();
    // A running entry that comes or goes starts or stops the task's (and project's) timer.
    if (object->entity() == WTEntity::Time && static_cast<WTTime*>(object)->running())
      task->runningDidChange();
  }
}

void WTObjectContext::markChanged(WTObject* object, const QString& key) {
  if (!object->changedKeys_.contains(key)) object->changedKeys_.append(key);
  if (object->registered_) {
    if (!inserted_.count(object)) updated_.insert(object);
    // Each turn announces what changed in it, whatever earlier turns since the last save announced.
    if (turnAnnounced_.insert(object).second) turnUpdated_.append(object);
  }
  scheduleProcessing();
}

bool WTObjectContext::hasChanges() const {
  return !inserted_.empty() || !updated_.empty() || !deleted_.empty();
}

void WTObjectContext::scheduleProcessing() {
  if (processingScheduled_) return;
  processingScheduled_ = true;
  QMetaObject::invokeMethod(
      this,
      [this] {
        if (processingScheduled_) processPendingChanges();
      },
      Qt::QueuedConnection);
}

void WTObjectContext::processPendingChanges() {
  processingScheduled_ = false;
  undo_.closeGroup();
  if (turnInserted_.isEmpty() && turnUpdated_.isEmpty() && turnDeleted_.isEmpty()) return;
  const QList<WTObject*> inserted = std::exchange(turnInserted_, {});
  const QList<WTObject*> updated = std::exchange(turnUpdated_, {});
  const QList<WTObject*> deleted = std::exchange(turnDeleted_, {});
  turnAnnounced_.clear();
  emit objectsDidChange(inserted, updated, deleted);
}

WTObjectContext::ObserverId WTObjectContext::addObserver(const WTObject* object, const QString& key,
                                                         Observer observer) {
  const ObserverId id = nextObserverId_++;
  observers_[object].push_back({id, key, std::move(observer)});
  observerOwners_.insert(id, object);
  return id;
}

void WTObjectContext::removeObserver(ObserverId id) {
  auto owner = observerOwners_.find(id);
  if (owner == observerOwners_.end()) return;
  auto entries = observers_.find(owner.value());
  observerOwners_.erase(owner);
  if (entries == observers_.end()) return;
  auto& list = entries.value();
  list.erase(std::remove_if(list.begin(), list.end(), [id](const ObserverEntry& e) { return e.id == id; }),
             list.end());
  if (list.empty()) observers_.erase(entries);
}

void WTObjectContext::announce(WTObject* object, const QString& key) {
  // Nobody to tell (a command, an import of many records): the dependent keys need not be found.
  static const QMetaMethod valueDidChange = QMetaMethod::fromSignal(&WTObjectContext::objectValueDidChange);
  if (observers_.isEmpty() && !isSignalConnected(valueDidChange)) return;
  std::vector<std::pair<WTObject*, QString>> seen;
  announceClosure(object, key, seen);
}

void WTObjectContext::announceClosure(WTObject* object, const QString& key,
                                      std::vector<std::pair<WTObject*, QString>>& seen) {
  for (const auto& [o, k] : seen) {
    if (o == object && k == key) return;
  }
  seen.emplace_back(object, key);
  notifyObservers(object, key);
  for (const QString& dependent : WTKeyDependencies::dependentKeys(object->entity(), key)) {
    announceClosure(object, dependent, seen);
  }
  for (const auto& related : WTKeyDependencies::relatedDependents(object->entity(), key)) {
    for (WTObject* other : object->relatedObjects(related.relationship)) {
      announceClosure(other, related.dependentKey, seen);
    }
  }
}

void WTObjectContext::notifyObservers(WTObject* object, const QString& key) {
  emit objectValueDidChange(object, key);
  auto it = observers_.constFind(object);
  if (it == observers_.constEnd()) return;
  // Copied: a callback may add or remove observers.
  const std::vector<ObserverEntry> entries = it.value();
  for (const ObserverEntry& entry : entries) {
    if (!observerOwners_.contains(entry.id)) continue;
    if (entry.key.isEmpty() || entry.key == key) entry.callback(object, key);
  }
}
