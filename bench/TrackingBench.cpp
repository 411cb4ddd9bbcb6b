// One tick of the stopwatch updater with ten timers running in the 100,000-item store.
#include "LargeStore.h"
#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTIdleSource.h"
#include "WTObjectContext.h"
#include "WTStopwatchUpdater.h"
#include "WTTask.h"
#include "WTTime.h"

#include <benchmark/benchmark.h>

#include <QCoreApplication>
#include <QTemporaryDir>

#include <memory>

namespace {

using bench::LargeStore;

// The desktop's answer without the bus round trip: never idle, so no question is asked.
class NeverIdle final : public WTIdleSource {
 public:
  qint64 idleSeconds() override { return 0; }
};

struct TenTimers {
  TenTimers() {
    defaults = std::make_unique<UserDefaults>(dir.filePath(QStringLiteral("settings.conf")));
    defaults->setValue(SettingsKeys::kShouldIdle, true);
    context = std::make_unique<WTObjectContext>(defaults.get());
    auto store = WTStore::open(LargeStore::instance().path());
    if (store.ok()) (void)context->attachStore(std::move(store.value()));
    const QList<WTTask*> tasks = context->fetch<WTTask>();
    for (int i = 0; i < 10 && i < tasks.size(); ++i) tasks[i * (tasks.size() / 10)]->toggleTimer();
    QCoreApplication::processEvents();
    updater = std::make_unique<WTStopwatchUpdater>(context.get(), defaults.get(), &idle, nullptr);
    updater->start();
  }
  QTemporaryDir dir;
  std::unique_ptr<UserDefaults> defaults;
  std::unique_ptr<WTObjectContext> context;
  NeverIdle idle;
  std::unique_ptr<WTStopwatchUpdater> updater;
};

// Most ticks: no minute boundary crossed, nothing announced.
void BM_TickTenRunningIn100kStore(benchmark::State& state) {
  TenTimers fixture;
  for (auto _ : state) fixture.updater->update();
  state.counters["running"] = double(fixture.updater->times().size());
}
BENCHMARK(BM_TickTenRunningIn100kStore)->Unit(benchmark::kMicrosecond);

// The tick after a minute boundary: every entry announces its duration up to task, project and client.
void BM_TickTenRunningAtMinuteBoundary(benchmark::State& state) {
  TenTimers fixture;
  Date now = Date::now();
  Date::setClockForTesting([&now] { return now; });
  for (auto _ : state) {
    now = now.addingSeconds(60);
    fixture.updater->update();
  }
  Date::setClockForTesting({});
}
BENCHMARK(BM_TickTenRunningAtMinuteBoundary)->Unit(benchmark::kMicrosecond);

}  // namespace
