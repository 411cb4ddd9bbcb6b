// Interface speed: opening a large project into the items outline, a running timer's tick, and an open
// report of that project following a save.
#include "RZDate.h"
#include "UserDefaults.h"
#include "WTItemsModel.h"
#include "WTItemsViewController.h"
#include "WTNote.h"
#include "WTObjectContext.h"
#include "WTOutlineView.h"
#include "WTProject.h"
#include "WTReportWindowController.h"
#include "WTTask.h"
#include "WTTime.h"

#include <benchmark/benchmark.h>

#include <QtCore/qtestsupport_core.h>
#include <QApplication>
#include <QElapsedTimer>
#include <QMainWindow>
#include <QTemporaryDir>
#include <QTimer>

#include <algorithm>
#include <memory>

namespace {

// 20 tasks of 500 items each, spread over 250 days; every task and the first day of each expanded.
struct LargeProject {
  QTemporaryDir dir;
  UserDefaults defaults{dir.filePath("settings.conf")};
  WTObjectContext context{&defaults};
  WTProject* project = nullptr;
  WTTime* running = nullptr;

  LargeProject() {
    project = WTProject::insertNewObject(&context);
    project->setName("Large");
    const Date start = Date::fromSeconds(1'700'000'000);
    for (int t = 0; t < 20; ++t) {
      auto* task = WTTask::insertNewObject(&context);
      task->setName(QStringLiteral("Task %1").arg(t));
      task->setProject(project);
      for (int i = 0; i < 500; ++i) {
        WTItem* item = i % 5 == 0 ? static_cast<WTItem*>(WTNote::insertNewObject(&context))
                                  : static_cast<WTItem*>(WTTime::insertNewObject(&context));
        item->setTask(task);
        item->setName(QStringLiteral("Item %1").arg(i));
        item->setStartDate(start.addingSeconds(-(i / 2) * 86400.0 - i * 60.0));
        if (item->entity() == WTEntity::Time) static_cast<WTTime*>(item)->setDuration(45);
      }
    }
    running = WTTime::insertNewObject(&context);
    running->setTask(project->tasks()[0]);
    running->setRunning(true);
    context.processPendingChanges();
    context.undoManager().removeAllActions();
  }
};

void BM_OpenProjectOf10000ItemsIntoTheOutline(benchmark::State& state) {
  LargeProject data;
  WTItemsViewController controller(&data.context);
  QMainWindow window;
  window.setCentralWidget(controller.view());
  window.resize(1280, 800);
  window.show();
  // Expanded rows as a previous visit left them: every task, and each task's newest day.
  controller.setProject(data.project);
  controller.willDisplayView();
  WTItemsModel* model = controller.treeController();
  for (int t = 0; t < model->rowCount(); ++t) {
    const QModelIndex task = model->index(t, 0);
    controller.outlineView()->expand(task);
    controller.outlineView()->expand(model->index(0, 0, task));
  }
  QCoreApplication::processEvents();
  for (auto _ : state) {
    controller.willDisplayView();                     // model built, expansion restored
    controller.outlineView()->viewport()->repaint();  // the first screen painted
    benchmark::DoNotOptimize(model->rowCount());
  }
  state.counters["rows"] = model->rowCount();
  window.takeCentralWidget();
}
BENCHMARK(BM_OpenProjectOf10000ItemsIntoTheOutline)->Unit(benchmark::kMillisecond);

void BM_BuildOutlineModelOf10000Items(benchmark::State& state) {
  LargeProject data;
  WTItemsModel model(&data.context);
  for (auto _ : state) {
    model.setProject(data.project);
    benchmark::DoNotOptimize(model.rowCount());
  }
}
BENCHMARK(BM_BuildOutlineModelOf10000Items)->Unit(benchmark::kMillisecond);

// One minute boundary of a running entry in a large open outline: only its rows repaint.
void BM_RunningTimerTickInALargeOutline(benchmark::State& state) {
  LargeProject data;
  WTItemsModel model(&data.context);
  model.setProject(data.project);
  double offset = 0;
  Date::setClockForTesting([&] { return Date::fromSeconds(1'700'000'000 + offset); });
  for (auto _ : state) {
    offset += 60;
    data.running->peek();
    model.processChanges();
  }
  Date::setClockForTesting({});
}
BENCHMARK(BM_RunningTimerTickInALargeOutline)->Unit(benchmark::kMicrosecond);

// An open report of the large project at the level of every item, rendered again as after a save, until
// the view shows it; "longest_stall_ms" is the longest time the window's thread went without serving its
// event loop meanwhile (and in the two seconds after, while the view lays the report out): for that long
// nothing in the application moves, the timers' display included.
void BM_RefreshLargeOpenReport(benchmark::State& state) {
  LargeProject data;
  WTReportWindowController window(&data.context);
  window.resize(860, 900);
  window.show();
  window.setProjects({data.project});
  window.setMode(1);
  const auto settle = [&] {
    if (!QTest::qWaitFor([&] { return !window.isBuildingDocument(); }, 60000))
      state.SkipWithError("never shown");
  };
  settle();
  QElapsedTimer sinceTick;
  qint64 longestStall = 0;
  QTimer ticker;
  ticker.setInterval(1);
  QObject::connect(&ticker, &QTimer::timeout,
                   [&] { longestStall = std::max(longestStall, sinceTick.restart()); });
  for (auto _ : state) {
    sinceTick.start();
    ticker.start();
    window.refreshWebContent();
    settle();
    state.PauseTiming();
    QTest::qWait(2000);
    ticker.stop();
    state.ResumeTiming();
  }
  state.counters["longest_stall_ms"] = double(longestStall);
  state.counters["html_chars"] = double(window.html().size());
}
BENCHMARK(BM_RefreshLargeOpenReport)->Unit(benchmark::kMillisecond)->Iterations(3);

}  // namespace
