// Opening a large store, saving one change, the lists' totals and grouping a big task, against the floor of
// reading the same rows with plain sqlite3. Opening also checks the whole file (PRAGMA quick_check, about a
// third of the plain read on 100,000 items), which the floor does not.
#include "LargeStore.h"
#include "RZDate.h"
#include "WTClient.h"
#include "WTItem.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTStore.h"
#include "WTTask.h"

#include <benchmark/benchmark.h>
#include <sqlite3.h>

#include <QApplication>
#include <QTemporaryDir>

#include <memory>

namespace {

using bench::kItems;
using bench::kProjects;
using bench::kTasks;
using bench::LargeStore;

// Opened as the desktop copy opens its store.
std::unique_ptr<WTObjectContext> openContext() {
  auto context = std::make_unique<WTObjectContext>();
  auto store = WTStore::open(LargeStore::instance().path(), nullptr, WTStore::Check::WholeFileBeforeSaving);
  if (!store || !context->attachStore(std::move(store.value()))) return nullptr;
  return context;
}

// Every project's duration and cost, as the projects list shows them.
void totalEveryProject(WTObjectContext& context) {
  int minutes = 0;
  Decimal money;
  for (WTProject* project : context.fetch<WTProject>()) {
    minutes += project->duration();
    money += project->cost();
  }
  benchmark::DoNotOptimize(minutes);
  benchmark::DoNotOptimize(money);
}

void BM_PlainSqliteRead(benchmark::State& state) {
  const QByteArray path = LargeStore::instance().path().toUtf8();
  for (auto _ : state) {
    sqlite3* db = nullptr;
    sqlite3_open_v2(path.constData(), &db, SQLITE_OPEN_READONLY, nullptr);
    sqlite3_stmt* statement = nullptr;
    sqlite3_prepare_v2(db,
                       "SELECT * FROM "
                       "records",
                       -1, &statement, nullptr);
    std::int64_t bytes = 0;
    while (sqlite3_step(statement) == SQLITE_ROW) {
      const int columns = sqlite3_column_count(statement);
      for (int c = 0; c < columns; ++c) {
        if (sqlite3_column_type(statement, c) == SQLITE_TEXT) {
          bytes += sqlite3_column_bytes(statement, c);
          benchmark::DoNotOptimize(sqlite3_column_text(statement, c));
        } else {
          benchmark::DoNotOptimize(sqlite3_column_double(statement, c));
        }
      }
    }
    sqlite3_finalize(statement);
    sqlite3_close(db);
    benchmark::DoNotOptimize(bytes);
  }
}
BENCHMARK(BM_PlainSqliteRead)->Unit(benchmark::kMillisecond);

void BM_OpenStoreAndTotalEveryProject(benchmark::State& state) {
  std::unique_ptr<WTObjectContext> previous;
  for (auto _ : state) {
    // Closing the previous round's context is not part of opening this one.
    state.PauseTiming();
    previous.reset();
    state.ResumeTiming();
    auto context = openContext();
    totalEveryProject(*context);
    previous = std::move(context);
  }
}
BENCHMARK(BM_OpenStoreAndTotalEveryProject)->Unit(benchmark::kMillisecond);

// The two halves of the line above, to see where the time goes.
void BM_StoreReadOnly(benchmark::State& state) {
  for (auto _ : state) {
    auto store = WTStore::open(LargeStore::instance().path());
    qsizetype rows = 0;
    store.value()->loadAll([&](WTStoreRecord&&) { ++rows; });
    benchmark::DoNotOptimize(rows);
  }
}
BENCHMARK(BM_StoreReadOnly)->Unit(benchmark::kMillisecond);

void BM_TotalEveryProjectOnly(benchmark::State& state) {
  auto context = openContext();
  for (auto _ : state) {
    totalEveryProject(*context);
  }
}
BENCHMARK(BM_TotalEveryProjectOnly)->Unit(benchmark::kMillisecond);

void BM_SaveOneChangedItem(benchmark::State& state) {
  auto context = openContext();
  WTObject* item = context->objectWithUUID(QStringLiteral("I4242@WTTime"));
  int round = 0;
  for (auto _ : state) {
    item->setName(QStringLiteral("renamed %1").arg(++round));
    if (!context->save()) state.SkipWithError("save failed");
  }
}
BENCHMARK(BM_SaveOneChangedItem)->Unit(benchmark::kMillisecond);

// The totals the client, project and task lists show, raw and billed, over the 100,000 items with the 50
// projects under 10 clients: without rounding rules (0), and with a rule of 15 minutes up on every client
// (1), which must cost no more than a tenth more.
void BM_ListTotalsOf100000Items(benchmark::State& state) {
  auto context = openContext();
  QList<WTClient*> clients;
  for (int c = 0; c < 10; ++c) {
    clients << WTClient::insertNewObject(context.get());
    if (state.range(0) == 0) continue;
    clients.last()->setRoundingMinutes(15);
    clients.last()->setRoundingMode(QStringLiteral("up"));
  }
  const QList<WTProject*> projects = context->fetch<WTProject>();
  for (int p = 0; p < projects.size(); ++p) projects[p]->setClient(clients[p % clients.size()]);
  const QList<WTTask*> tasks = context->fetch<WTTask>();
  context->processPendingChanges();
  for (auto _ : state) {
    int minutes = 0;
    Decimal money;
    const auto add = [&](const auto* record) {
      minutes += record->duration() + record->billedDuration();
      money += record->cost() + record->billedCost();
    };
    for (const WTClient* client : clients) add(client);
    for (const WTProject* project : projects) add(project);
    for (const WTTask* task : tasks) add(task);
    benchmark::DoNotOptimize(minutes);
    benchmark::DoNotOptimize(money);
  }
}
BENCHMARK(BM_ListTotalsOf100000Items)->Arg(0)->Arg(1)->Unit(benchmark::kMillisecond);

void BM_GroupATaskOf5000Items(benchmark::State& state) {
  WTObjectContext context;
  auto* task = WTTask::insertNewObject(&context);
  const char* kinds[] = {"WTTime", "WTNote", "WTToDo", "WTFlat", "WTExpense"};
  for (int i = 0; i < 5000; ++i) {
    auto* item = static_cast<WTItem*>(
        context.insertNewObject(*WTEntities::fromName(QString::fromLatin1(kinds[i % 5]))));
    item->setTask(task);
    item->setStartDate(Date::fromSeconds(1700000000 + i * 2700.0));
  }
  context.processPendingChanges();
  for (auto _ : state) {
    task->updateChildren();
    benchmark::DoNotOptimize(task->cachedChildren().size());
  }
}
BENCHMARK(BM_GroupATaskOf5000Items)->Unit(benchmark::kMillisecond);

}  // namespace

int main(int argc, char** argv) {
  // The interface benchmarks paint real widgets: an application with a screen, offscreen unless told.
  if (!qEnvironmentVariableIsSet("QT_QPA_PLATFORM")) qputenv("QT_QPA_PLATFORM", "offscreen");
  QApplication app(argc, argv);
  RZDate::setDefaultTimeZone(QStringLiteral("Europe/Berlin"));
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
  benchmark::Shutdown();
  return 0;
}
