#include "RZSyncTwins.h"

#include "RZSyncTrack.h"
#include "WTClient.h"
#include "WTItem.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTTime.h"

#include <QHash>

#include <algorithm>

namespace {

// `key` of `record` into the journal, in the section that already holds the record.
void journal(RZSyncTrack& track, const WTObject& record, const QString& key) {
  track.updateValues({{key, record.setValues().value(key)}}, record.uuid());
}

}  // namespace

bool RZSyncTwins::billApart(const WTObject& a, const WTObject& b) {
  for (const char* key : {"rate", "roundingMinutes", "roundingMode", "currency"}) {
    const QVariant mine = a.valueForKey(QLatin1String(key)), theirs = b.valueForKey(QLatin1String(key));
    if (!mine.isNull() && !theirs.isNull() && mine != theirs) return true;
  }
  return false;
}

RZSyncTwins::Outcome RZSyncTwins::fold(const QSet<QString>& arrived) {
  Outcome outcome;
  QSet<QString>& carried = outcome.carried;
  const RZSyncTrack::Entries& unsent = track_.entries(RZSyncTrack::Section::Inserted);
  if (arrived.isEmpty() || unsent.isEmpty()) return outcome;
  const auto madeHere = [&](const WTObject* record) {
    return unsent.contains(record->uuid()) && !arrived.contains(record->uuid());
  };
  // What `from` has set and `into` has not, or otherwise, goes over; its owner and `matched` (the name,
  // alike but for case) are the other's already.
  const auto carry = [&](const WTObject& from, WTObject& into, const QString& matched) {
    const WTKeyDescriptor* owner = from.keyTable().ownerKey();
    for (const QString& key : from.storedKeys()) {
      const QVariant value = from.valueForKey(key);
      if (key == QLatin1String("uuid") || key == matched || (owner && key == owner->name) || value.isNull() ||
          value == into.valueForKey(key) || !into.setValue(key, value))
        continue;
      journal(track_, into, key);
      carried.insert(into.uuid());
    }
  };
  const auto remove = [&](WTObject* record) {
    track_.forget(record->uuid());
    track_.deleteObjectWithId(record->uuid());
    context_.deleteObject(record);
  };
  QSet<WTProject*> reordered;
  // Each of `records` made here goes into the one that arrived with its name under the same owner.
  const auto foldNamed = [&]<class T>(const QList<T*>& records, auto ownerOf, auto moveChildren) {
    const auto key = [&](const T* record) {
      return std::pair<const WTObject*, QString>(ownerOf(record), record->name().toCaseFolded());
    };
    QHash<std::pair<const WTObject*, QString>, T*> arrivedNamed;
    for (T* record : records)
      if (arrived.contains(record->uuid())) arrivedNamed.insert(key(record), record);
    for (T* record : records) {
      T* twin = madeHere(record) ? arrivedNamed.value(key(record)) : nullptr;
      if (!twin) continue;
      if (billApart(*record, *twin)) {
        outcome.apart.insert(record->uuid());
        continue;
      }
      moveChildren(record, twin);
      carry(*record, *twin, QStringLiteral("name"));
      remove(record);
    }
  };
  // Files each of `children` under `into` by `file`, journaling the owner `key` of each.
  const auto refile = [&]<class Child, class Owner>(const QList<Child*>& children, Owner* into,
                                                    void (*file)(Child*, Owner*), const char* key) {
    for (Child* child : QList<Child*>(children)) {
      file(child, into);
      journal(track_, *child, QLatin1String(key));
    }
  };
  foldNamed(
      context_.fetch<WTClient>(), [](const WTClient*) -> const WTObject* { return nullptr; },
      [&](WTClient* from, WTClient* into) {
        refile(
            from->projects(), into, +[](WTProject* project, WTClient* client) { project->setClient(client); },
            "client");
      });
  foldNamed(
      context_.fetch<WTProject>(),
      [](const WTProject* project) -> const WTObject* { return project->client(); },
      [&](WTProject* from, WTProject* into) {
        refile(
            from->tasks(), into, +[](WTTask* task, WTProject* project) { task->setProject(project); },
            "project");
        reordered.insert(into);
      });
  foldNamed(
      context_.fetch<WTTask>(), [](const WTTask* task) -> const WTObject* { return task->project(); },
      [&](WTTask* from, WTTask* into) {
        refile(
            from->items(), into, +[](WTItem* item, WTTask* task) { item->setTask(task); }, "task");
      });
  // Their tasks' order, once the tasks that went have left it.
  for (WTProject* project : std::as_const(reordered)) journal(track_, *project, QStringLiteral("tasks"));

  // Through the few records that arrived and the few not sent, never every entry of the store.
  QHash<QString, WTTime*> importedThere;  // by importId
  for (const QString& uuid : arrived)
    if (auto* entry = dynamic_cast<WTTime*>(context_.objectWithUUID(uuid, false)))
      if (!entry->importId().isNull()) importedThere.insert(entry->importId(), entry);
  if (importedThere.isEmpty()) return outcome;
  QList<WTTime*> doubled;
  for (auto it = unsent.keyBegin(); it != unsent.keyEnd(); ++it) {
    auto* entry = dynamic_cast<WTTime*>(context_.objectWithUUID(*it, false));
    if (entry && madeHere(entry) && importedThere.contains(entry->importId())) doubled.append(entry);
  }
  std::sort(doubled.begin(), doubled.end(),
            [](const WTTime* a, const WTTime* b) { return a->uuid() < b->uuid(); });
  for (WTTime* entry : doubled) {
    carry(*entry, *importedThere.value(entry->importId()), QString());
    remove(entry);
  }
  return outcome;
}
