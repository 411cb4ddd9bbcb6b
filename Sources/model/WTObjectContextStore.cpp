#include "WTObjectContext.h"

#include "WTChangeJournal.h"
#include "WTProject.h"
#include "WTStore.h"
#include "WTTask.h"

#include <algorithm>
#include <optional>
#include <unordered_set>
#include <utility>
#include <vector>

// The context and its store file: saving the changes of a turn in one transaction (with the journal's rows
// of the records it saves) and loading the graph when a store is attached.

Result<void> WTObjectContext::save() {
  processPendingChanges();
  if (!hasChanges()) return {};
  if (!store_) return Error{1, tr("There is no data file to save to.")};

  // A record brought back (by undo or redo) after its deletion reached the other devices comes back as a
  // new record: they would drop anything sent under the old identity, and with it whatever is filed
  // under the record later. Renamed first, so that every record naming it is written with the new name.
  for (WTObject* object : inserted_) {
    if (journal_->isRetired(object->uuid_)) object->assignNewIdentity();
  }
  std::vector<WTObject*> written(inserted_.begin(), inserted_.end());
  written.insert(written.end(), updated_.begin(), updated_.end());
  // A row or a journal entry without identity could never be matched again: refuse before writing.
  for (const auto* set : {&inserted_, &updated_, &deleted_}) {
    for (WTObject* object : *set) {
      if (object->uuid_.isEmpty())
        return Error{2, tr("A %1 without identity cannot be saved.").arg(object->entityName())};
    }
  }
  // A project whose task order changed rewrites the positions of all its tasks.
  std::vector<WTObject*> rows = std::move(written);
  std::unordered_set<WTObject*> reordered;
  for (size_t i = 0, changed = rows.size(); i < changed; ++i) {
    WTObject* object = rows[i];
    if (object->entity() != WTEntity::Project || !object->changedKeys_.contains(QLatin1String("tasks")))
      continue;
    for (WTTask* task : static_cast<WTProject*>(object)->tasks()) {
      if (!inserted_.count(task) && !updated_.count(task) && reordered.insert(task).second)
        rows.push_back(task);
    }
  }
  // By identity, the key of the records and of the journal: new rows of a large save (an import) go
  // into the B-trees one after another instead of splitting pages all over them. Sorted by the first
  // characters, held beside each record, before whole identities are compared.
  {
    std::vector<std::pair<quint64, WTObject*>> byIdentity;
    byIdentity.reserve(rows.size());
    for (WTObject* object : rows) {
      quint64 prefix = 0;
      for (qsizetype i = 0; i < 4; ++i)
        prefix = prefix << 16 | (i < object->uuid_.size() ? object->uuid_.at(i).unicode() : 0u);
      byIdentity.emplace_back(prefix, object);
    }
    std::sort(byIdentity.begin(), byIdentity.end(), [](const auto& a, const auto& b) {
      return a.first != b.first ? a.first < b.first : a.second->uuid_ < b.second->uuid_;
    });
    for (size_t i = 0; i < rows.size(); ++i) rows[i] = byIdentity[i].second;
  }
  // One row at a time: a save of many records never holds all their rows at once.
  auto next = rows.begin();
  WTStoreRecord record;
  const WTStore::RecordSource records = [&]() -> const WTStoreRecord* {
    if (next == rows.end()) return nullptr;
    record = WTStoreRecord();
    (*next++)->writeRecord(record);
    return &record;
  };

  QStringList deletedUuids;
  if (!deleted_.empty()) indexItems();
  for (WTObject* object : deleted_) {
    // A record deleted and then made again under its identity (by the sync) is written, not removed.
    if (!byUuid_.contains(object->uuid_)) deletedUuids.append(object->uuid_);
  }

  // The journal hears of each record once its row is written, inside the same transaction, and writes
  // its own rows before the commit: a crash keeps both or neither. The journal that records nothing is not
  // worth the changed values of every record (a merge saves thousands with it).
  const bool journaled = journal_->recordsSaves();
  Result<void> result = store_->saveFrom(records, deletedUuids, [&](WTStore::JournalWriter& writer) {
    if (!journaled) return journal_->writeChanges(writer);
    // The journal writes its rows every so many reports: an import's save never holds them all.
    constexpr size_t kReportsPerWrite = 4096;
    size_t reported = 0;
    Result<void> written;
    const auto report = [&](WTObject* object) {
      if (object->hasUnsavedNewIdentity() && inserted_.count(object))
        written = journal_->insertNew(*object, writer);
      else
        object->willSave();
      if (written && ++reported % kReportsPerWrite == 0) written = journal_->writeChanges(writer);
    };
    for (auto it = rows.begin(); written && it != rows.end(); ++it)
      if (!reordered.count(*it)) report(*it);
    for (auto it = deleted_.begin(); written && it != deleted_.end(); ++it) report(*it);
    return written ? journal_->writeChanges(writer) : written;
  });
  journal_->saveEnded(result.ok());
  if (!result) return result;
  for (WTObject* object : rows) {
    object->persisted_ = true;
    object->unsavedNewIdentity_ = false;
    object->changedKeys_ = QStringList();
  }
  for (WTObject* object : deleted_) {
    object->persisted_ = false;
    object->changedKeys_ = QStringList();
  }
  inserted_.clear();
  updated_.clear();
  deleted_.clear();
  emit didSave();
  return {};
}

Result<void> WTObjectContext::attachStore(std::unique_ptr<WTStore> store) {
  return attachStore(std::move(store), WTStore::Records::All);
}

Result<void> WTObjectContext::attachStore(std::unique_ptr<WTStore> store, WTStore::Records which,
                                          const QStringList& keys) {
  Q_ASSERT(count() == 0 && !store_);
  struct Link {
    WTObject* object;
    QString ownerUuid;
    int position;
  };
  std::vector<Link> links, taskLinks;
  // Items are many and rarely looked up by identity: they join the identity map on first need, which
  // keeps a large store quick to open. Their owners are few and needed at once.
  itemsIndexed_ = false;
  undo_.disableRegistration();
  Result<void> loaded = store->loadAll(
      [&](WTStoreRecord&& record) {
        const std::optional<WTEntity> entity = WTEntities::fromName(record.entity);
        if (!entity) return;  // rows of entities this version does not know stay in the file untouched
        WTObject* object = makeObject(*entity);
        object->readRecord(record);
        object->persisted_ = true;
        registerObject(object, true);
        QString& ownerUuid = *entity == WTEntity::Project ? record.clientUuid
                             : *entity == WTEntity::Task  ? record.projectUuid
                                                          : record.taskUuid;
        if (ownerUuid.isEmpty()) return;
        (*entity == WTEntity::Task ? taskLinks : links)
            .push_back({object, std::move(ownerUuid), record.position});
      },
      which, keys);
  if (loaded) {
    // Tasks join their projects in stored order.
    std::stable_sort(taskLinks.begin(), taskLinks.end(),
                     [](const Link& a, const Link& b) { return a.position < b.position; });
    for (const auto* list : {&taskLinks, &links}) {
      for (const Link& link : *list) {
        if (WTObject* owner = byUuid_.value(link.ownerUuid)) link.object->relinkOwner(owner, -1);
      }
    }
    for (WTEntity entity : WTEntities::kAll) {
      for (WTObject* object : objects_[static_cast<int>(entity)]) object->awakeFromFetch();
    }
    store_ = std::move(store);
  } else {
    for (auto& list : objects_) list.clear();
    byUuid_.clear();
    owned_.clear();
  }
  undo_.enableRegistration();
  return loaded;
}
