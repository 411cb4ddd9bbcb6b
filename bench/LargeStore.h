#pragma once

// The store the benchmarks share: one SQLite file of 100,000 items under 500 tasks in 50 projects, made
// once per run; and the same shape at any size. Items are "I<n>@<kind>", tasks "T<n>@WTTask" and
// projects "P<n>@WTProject".
#include "Date.h"
#include "Decimal.h"
#include "WTStore.h"

#include <QTemporaryDir>

#include <vector>

namespace bench {

constexpr int kProjects = 50;
constexpr int kTasks = 500;
constexpr int kItems = 100000;

// Writes a store of `items` items under 500 tasks ("Task N") in 50 projects ("Project N") to `path`.
inline void writeStore(const QString& path, int items) {
  auto store = WTStore::open(path);
  std::vector<WTStoreRecord> records;
  records.reserve(kProjects + kTasks + items);
  const char* kinds[] = {"WTTime", "WTTime", "WTTime", "WTFlat", "WTExpense", "WTNote", "WTToDo"};
  const double start = 1700000000;
  for (int p = 0; p < kProjects; ++p) {
    WTStoreRecord project;
    project.uuid = QStringLiteral("P%1@WTProject").arg(p);
    project.entity = QStringLiteral("WTProject");
    project.name = QStringLiteral("Project %1").arg(p);
    if (p % 3 == 0) project.rate = Decimal::fromString(u"85.50");
    records.push_back(project);
  }
  for (int t = 0; t < kTasks; ++t) {
    WTStoreRecord task;
    task.uuid = QStringLiteral("T%1@WTTask").arg(t);
    task.entity = QStringLiteral("WTTask");
    task.name = QStringLiteral("Task %1").arg(t);
    task.projectUuid = QStringLiteral("P%1@WTProject").arg(t % kProjects);
    task.position = t / kProjects;
    records.push_back(task);
  }
  for (int i = 0; i < items; ++i) {
    WTStoreRecord item;
    const char* kind = kinds[i % 7];
    item.uuid = QStringLiteral("I%1@%2").arg(i).arg(QLatin1String(kind));
    item.entity = QLatin1String(kind);
    item.name = QStringLiteral("Item number %1").arg(i);
    item.taskUuid = QStringLiteral("T%1@WTTask").arg(i % kTasks);
    item.startDate = Date::fromSeconds(start + i * 1800.0);
    if (item.entity == QLatin1String("WTTime")) item.endDate = item.startDate->addingSeconds(60.0 * (i % 240));
    if (item.entity == QLatin1String("WTFlat")) item.minutes = 15 + i % 100;
    if (item.entity == QLatin1String("WTExpense")) item.expense = Decimal::fromString(u"12.30");
    records.push_back(item);
  }
  store.value()->save(records, {});
}

// One store file of 100,000 items under 500 tasks in 50 projects, made once per run.
class LargeStore {
 public:
  static LargeStore& instance() {
    static LargeStore store;
    return store;
  }
  QString path() const { return dir_.filePath(QStringLiteral("Tessal.sqlite")); }

 private:
  LargeStore() { writeStore(path(), kItems); }
  QTemporaryDir dir_;
};

}  // namespace bench
