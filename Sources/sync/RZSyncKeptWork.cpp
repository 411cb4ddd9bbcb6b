#include "RZSyncKeptWork.h"

#include "RZSyncTrack.h"
#include "RZSyncTwins.h"
#include "WTClient.h"
#include "WTItem.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTTask.h"

#include <QRegularExpression>

#include <algorithm>

namespace {

// A new record with every stored value of `record` but its identity.
template <class T>
T* copyWithValues(const T& record, WTObjectContext& context) {
  T* copy = context.insertNewObject<T>();
  for (const QString& key : record.storedKeys())
    if (key != QLatin1String("uuid")) copy->setValue(key, record.valueForKey(key));
  return copy;
}

void journalInsertion(RZSyncTrack& track, const WTObject& record) {
  track.updateValues(record.setValues(), record.uuid(), RZSyncTrack::Section::Inserted);
}

// What a notice names of `records`: all but the tasks of a project among them.
QList<const WTObject*> outermost(const QList<const WTObject*>& records) {
  QList<const WTObject*> outer;
  for (const WTObject* record : records) {
    const auto* task = dynamic_cast<const WTTask*>(record);
    if (!task || !records.contains(task->project())) outer.append(record);
  }
  return outer;
}

// Their names, quoted, in order, each once.
QStringList quotedNames(const QList<const WTObject*>& records) {
  QStringList names;
  for (const WTObject* record : records)
    names.append(QStringLiteral("“%1”").arg(record->valueForKey(QStringLiteral("name")).toString()));
  names.removeDuplicates();
  names.sort();
  return names;
}

}  // namespace

bool RZSyncKeptWork::goes(const WTObject* record, const QList<WTObject*>& gone) const {
  return record && (gone.contains(record) || deletedThere_.contains(record->uuid()));
}

template <class T>
T* RZSyncKeptWork::namesake(const T& gone, const QList<T*>& candidates) const {
  // Deleted there and made again by the same name (in the same merge, or before): the work goes to it,
  // unless the two bill by terms of their own that differ.
  const QString name = gone.name().toCaseFolded();
  for (T* candidate : candidates)
    if (candidate != &gone && !made_.contains(candidate) && candidate->name().toCaseFolded() == name &&
        !RZSyncTwins::billApart(gone, *candidate))
      return candidate;
  return nullptr;
}

WTProject* RZSyncKeptWork::copyOf(WTProject* project, const QList<WTObject*>& gone) {
  WTObject*& copy = copies_[project->uuid()];
  if (copy) return static_cast<WTProject*>(copy);
  QList<WTProject*> alike;
  for (WTProject* other : project->client() ? project->client()->projects() : context_.fetch<WTProject>())
    if (other->client() == project->client() && !goes(other, gone)) alike.append(other);
  copy = namesake(*project, alike);
  if (!copy) made_.insert(copy = copyWithValues(*project, context_));
  return static_cast<WTProject*>(copy);
}

WTTask* RZSyncKeptWork::copyOf(WTTask* task, const QList<WTObject*>& gone) {
  WTObject*& copy = copies_[task->uuid()];
  if (copy) return static_cast<WTTask*>(copy);
  WTProject* project = goes(task->project(), gone) ? copyOf(task->project(), gone) : task->project();
  QList<WTTask*> alike;
  for (WTTask* other : project ? project->tasks() : QList<WTTask*>())
    if (!goes(other, gone)) alike.append(other);
  if ((copy = namesake(*task, alike))) return static_cast<WTTask*>(copy);
  auto* made = copyWithValues(*task, context_);
  made_.insert(copy = made);
  if (project != task->project()) {
    made->setProject(project);
  } else if (project) {
    journalOrder(*project);  // a project that stays has a new order
  }
  return made;
}

void RZSyncKeptWork::journalOrder(const WTProject& project) {
  const QString tasks = QStringLiteral("tasks");
  track_.updateValues({{tasks, project.setValues().value(tasks)}}, project.uuid());
}

void RZSyncKeptWork::keepFrom(QList<WTObject*>& gone) {
  QSet<WTObject*> keptHere;
  for (WTObject* record : gone.mid(1)) {
    auto* task = dynamic_cast<WTTask*>(record);
    auto* item = dynamic_cast<WTItem*>(record);
    if (!task && !item) continue;
    if (keptHere.contains(task ? static_cast<WTObject*>(task->project()) : item->task())) {
      keptHere.insert(record);  // it moves with its owner
      continue;
    }
    if (!track_.entries(RZSyncTrack::Section::Inserted).contains(record->uuid())) continue;
    if (task) task->setProject(copyOf(task->project(), gone));
    if (item) item->setTask(copyOf(item->task(), gone));
    keptHere.insert(record);
    journalInsertion(track_, *record);
  }
  if (keptHere.isEmpty()) return;
  gone.removeIf([&](WTObject* record) { return keptHere.contains(record); });
  kept_.unite(keptHere);
  for (WTObject* copy : std::as_const(made_)) journalInsertion(track_, *copy);
  // A project made again there that took tasks has a new order.
  for (WTObject* into : std::as_const(copies_))
    if (auto* project = dynamic_cast<WTProject*>(into); project && !made_.contains(project))
      journalOrder(*project);
}

QString RZSyncKeptWork::message() const {
  // The user's own records, not the copies made for them; named by the outermost records they went to.
  qsizetype added = 0;
  for (WTObject* record : kept_) added += !made_.contains(record);
  if (added == 0) return {};
  const QList<const WTObject*> went = outermost({copies_.cbegin(), copies_.cend()});
  const bool allNew = std::all_of(went.begin(), went.end(), [&](const WTObject* into) {
    return made_.contains(const_cast<WTObject*>(into));
  });
  const QString where = quotedNames(went).join(QStringLiteral(", "));
  if (!allNew) {
    return added == 1 ? tr("A record added here to %1 after it was deleted on another device, and made again "
                           "there, is kept in the new %1.")
                            .arg(where)
                      : tr("%n records added here to %1 after it was deleted on another device, and made "
                           "again there, are kept in the new %1.",
                           nullptr, int(added))
                            .arg(where);
  }
  return added == 1
             ? tr("A record added here to %1 after it was deleted on another device is kept, in a new %1.")
                   .arg(where)
             : tr("%n records added here to %1 after it was deleted on another device are kept, in a "
                  "new %1.",
                  nullptr, int(added))
                   .arg(where);
}

void RZSyncKeptWork::noteServerCopies(const QVariantMap& inserted) {
  // Named "original~iteration@Entity" by the server; no client makes a "~".
  static const QRegularExpression kCopy(QStringLiteral("~\\d+(\\.\\d+)?@WT(Project|Task)$"));
  for (auto uuid = inserted.keyBegin(); uuid != inserted.keyEnd(); ++uuid)
    if (kCopy.match(*uuid).hasMatch() && !context_.objectWithUUID(*uuid, false)) serverCopies_.append(*uuid);
}

QString RZSyncKeptWork::serverCopiesMessage() const {
  QList<const WTObject*> copies;
  for (const QString& uuid : serverCopies_)
    if (const WTObject* copy = context_.objectWithUUID(uuid, false)) copies.append(copy);
  const QStringList names = quotedNames(outermost(copies));
  if (names.isEmpty()) return {};
  return names.size() == 1
             ? tr("%1 was deleted on one device while another added work to it; the work is kept, in a new "
                  "%1.")
                   .arg(names[0])
             : tr("%1 were deleted on one device while another added work to them; the work is kept, in new "
                  "records of the same names.")
                   .arg(names.join(QStringLiteral(", ")));
}
