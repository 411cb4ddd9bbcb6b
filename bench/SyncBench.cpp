// Merging a "head" reply of 10,000 changes into a store of 100,000 items: the reply parsed, the server's
// changes merged by uuid, saved, and the journal written, as the sync manager does when a poll brings
// them.
#include "LargeStore.h"
#include "RZSyncJSON.h"
#include "RZSyncManager.h"
#include "UserDefaults.h"
#include "WTObjectContext.h"

#include <benchmark/benchmark.h>

#include <QFile>
#include <QTemporaryDir>

#include <memory>

namespace {

using bench::kItems;
using bench::kTasks;
using bench::LargeStore;

// 4,000 new time entries, 5,000 changed items (renamed, moved to another task, new end) and 1,000
// deletions: the reply a device gets after a long day of another device's work.
QByteArray headReplyOf10000Changes() {
  QVariantMap inserted, updated;
  QVariantList deleted;
  const qint64 start = 1800000000;
  for (int i = 0; i < 4000; ++i) {
    inserted.insert(QStringLiteral("New%1@WTTime").arg(i),
                    QVariantMap{{QStringLiteral("task"), QStringLiteral("T%1@WTTask").arg(i % kTasks)},
                                {QStringLiteral("name"), QStringLiteral("From the other device %1").arg(i)},
                                {QStringLiteral("startDate"), start + i * 900},
                                {QStringLiteral("endDate"), start + i * 900 + 600}});
  }
  // Items come in kinds by i % 7 (time, time, time, flat, expense, note, to-do); the first three are
  // time entries.
  auto itemId = [](int i) {
    static const char* kinds[] = {"WTTime", "WTTime", "WTTime", "WTFlat", "WTExpense", "WTNote", "WTToDo"};
    return QStringLiteral("I%1@%2").arg(i).arg(QLatin1String(kinds[i % 7]));
  };
  for (int n = 0; n < 5000; ++n) {
    const int i = (n * 17) % kItems;
    updated.insert(itemId(i),
                   QVariantMap{{QStringLiteral("name"), QStringLiteral("Renamed %1").arg(i)},
                               {QStringLiteral("task"), QStringLiteral("T%1@WTTask").arg((i + 1) % kTasks)}});
  }
  for (int n = 0; n < 1000; ++n) deleted << itemId(kItems - 1 - n * 3);
  const QVariantMap result{
      {QStringLiteral("i"), inserted}, {QStringLiteral("u"), updated}, {QStringLiteral("x"), deleted}};
  return RZSyncJSON::write(QVariantMap{{QStringLiteral("action"), QStringLiteral("head")},
                                       {QStringLiteral("iteration"), 2},
                                       {QStringLiteral("result"), result}},
                           RZSyncJSON::Style::Compact);
}

// A round's store and the context that holds it.
struct MergeRound {
  QTemporaryDir dir;
  UserDefaults defaults{dir.filePath(QStringLiteral("Tessal.conf"))};
  WTObjectContext context{&defaults};
  std::unique_ptr<RZSyncManager> manager;  // made on the opened store, as the application makes it
};

void BM_MergeHeadOf10000ChangesInto100000Items(benchmark::State& state) {
  const QByteArray reply = headReplyOf10000Changes();
  std::unique_ptr<MergeRound> previous;
  for (auto _ : state) {
    // Every round starts from the untouched store: the merge changes it. Closing the last round's
    // 100,000 items is not part of this round's merge.
    state.PauseTiming();
    previous.reset();
    auto round = std::make_unique<MergeRound>();
    const QString path = round->dir.filePath(QStringLiteral("Tessal.sqlite"));
    QFile::copy(LargeStore::instance().path(), path);
    auto store = WTStore::open(path);
    if (!store || !round->context.attachStore(std::move(store.value()))) {
      state.SkipWithError("the store did not open");
      return;
    }
    round->context.count();  // opening the store is not what is measured
    round->manager = std::make_unique<RZSyncManager>(&round->context);
    state.ResumeTiming();

    const std::optional<QVariant> parsed = RZSyncJSON::parse(reply);
    round->manager->syncNetworkReceivedJSONObject(round->manager->syncNetwork(), *parsed);

    state.PauseTiming();
    if (round->manager->syncTrack()->iteration() != 2 || round->context.hasChanges()) {
      state.SkipWithError("the merge was not saved");
      return;
    }
    previous = std::move(round);
    state.ResumeTiming();
  }
  state.counters["changes"] = 10000;
}
BENCHMARK(BM_MergeHeadOf10000ChangesInto100000Items)->Unit(benchmark::kMillisecond)->Iterations(3);

}  // namespace
