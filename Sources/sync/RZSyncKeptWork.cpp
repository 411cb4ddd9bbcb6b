#include "RZSyncKeptWork.h"

#include "RZSyncTrack.h"
#include "WTItem.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTTask.h"

#include <QRegularExpression>

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

}  // namespace

WTProject* RZSyncKeptWork::copyOf(WTProject* project) {
  WTObject*& copy = copies_[project->uuid()];
  if (!copy) copy = copyWithValues(*project, context_);
  return static_cast<WTProject*>(copy);
}

WTTask* RZSyncKeptWork::copyOf(WTTask* task, const QList<WTObject*>& gone) {
  WTObject*& copy = copies_[task->uuid()];
  if (copy) return static_cast<WTTask*>(copy);
  auto* made = copyWithValues(*task, context_);
  copy = made;
  if (gone.contains(task->project())) {
    made->setProject(copyOf(task->project()));
  } else if (WTProject* project = task->project()) {
    // A project that stays has a new order.
    const QString tasks = QStringLiteral("tasks");
    track_.updateValues({{tasks, project->setValues().value(tasks)}}, project->uuid());
  }
  return made;
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
    if (task) task->setProject(copyOf(task->project()));
    if (item) item->setTask(copyOf(item->task(), gone));
    keptHere.insert(record);
    journalInsertion(track_, *record);
  }
  if (keptHere.isEmpty()) return;
  gone.removeIf([&](WTObject* record) { return keptHere.contains(record); });
  kept_.unite(keptHere);
  for (WTObject* copy : std::as_const(copies_)) journalInsertion(track_, *copy);
}

QString RZSyncKeptWork::message() const {
  // The user's own records, not the copies made for them; named by the outermost copies.
  const QList<WTObject*> made = copies_.values();
  qsizetype added = 0;
  for (WTObject* record : kept_) added += !made.contains(record);
  if (added == 0) return {};
  QStringList names;
  for (WTObject* copy : made) {
    auto* task = dynamic_cast<WTTask*>(copy);
    if (!task || !made.contains(task->project()))
      names.append(QStringLiteral("“%1”").arg(copy->valueForKey(QStringLiteral("name")).toString()));
  }
  names.sort();
  const QString where = names.join(QStringLiteral(", "));
  return added == 1 ? tr("A record added here to %1 after it was deleted on another device is kept, in a new %1.")
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
  QStringList names;
  for (const QString& uuid : serverCopies_) {
    const WTObject* copy = context_.objectWithUUID(uuid, false);
    const auto* task = dynamic_cast<const WTTask*>(copy);
    if (!copy || (task && task->project() && serverCopies_.contains(task->project()->uuid()))) continue;
    names.append(QStringLiteral("“%1”").arg(copy->valueForKey(QStringLiteral("name")).toString()));
  }
  names.removeDuplicates();
  names.sort();
  if (names.isEmpty()) return {};
  return names.size() == 1
             ? tr("%1 was deleted on one device while another added work to it; the work is kept, in a new "
                  "%1.")
                   .arg(names[0])
             : tr("%1 were deleted on one device while another added work to them; the work is kept, in new "
                  "records of the same names.")
                   .arg(names.join(QStringLiteral(", ")));
}
