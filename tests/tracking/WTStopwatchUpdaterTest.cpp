#include "TrackingFixture.h"
#include "WTBudgetWatcher.h"
#include "WTRecentTasks.h"

#include <QSignalSpy>

namespace {

using Answer = WTTrackingAlertAnswer;

TEST_F(TrackingTest, TickTotalsRunningEntriesAndMovesOncePerMinute) {
  WTTask* task = makeTask();
  WTTask* other = makeTask(nullptr, "Other");
  startTimer(task, clockNow.addingSeconds(-45 * 60));
  startTimer(other, berlin(2026, 3, 2, 11, 30, 0));
  makeTime(other, clockNow.addingSeconds(-5 * 3600), clockNow.addingSeconds(-4 * 3600));  // stopped
  updater->start();
  EXPECT_EQ(ticker(), "1 ticks, 2 running, badge \"01:15\", ticking");
  EXPECT_EQ(updater->windowTitle("Tessal"), "Tessal — 01:15");
  advance(35);  // 12:01:05
  updater->update();
  EXPECT_EQ(updater->totalActiveDuration(), 77);  // 45:35 + 31:05
  other->runningTimes().first()->setStartDate(
      clockNow.addingSeconds(-3600));  // shown at once, not a tick later
  settle();
  EXPECT_EQ(updater->totalActiveDuration(), 106);  // 45:35 + 60:00
}

// The running set follows starts, stops, restarts, deletion and undo; its changes tick at once.
TEST_F(TrackingTest, RunningSetFollowsStartsStopsRestartsDeletionAndUndo) {
  WTTask* task = makeTask();
  updater->start();
  settle();
  EXPECT_EQ(ticker(), "1 ticks, 0 running, badge \"\", ticking");
  WTTime* time = task->toggleTimer();
  EXPECT_EQ(runningNow(), QList<WTTime*>{time});
  EXPECT_EQ(ticker(), "2 ticks, 1 running, badge \"00:00\", ticking");
  QSignalSpy badge(updater.get(), &WTStopwatchUpdater::badgeDidChange);
  task->toggleTimer();
  settle();
  EXPECT_EQ(ticker(), "3 ticks, 0 running, badge \"\", ticking") << "the ticker runs on with nothing running";
  ASSERT_EQ(badge.count(), 1);
  EXPECT_TRUE(badge.at(0).at(0).toString().isEmpty());
  EXPECT_EQ(updater->windowTitle("Tessal"), "Tessal");

  // Stopped and started again between two saves: each change must still be seen.
  ASSERT_TRUE(context->save().ok());
  for (const bool running : {true, false, true, false}) {
    time->setRunning(running);
    EXPECT_EQ(runningNow().size(), running ? 1 : 0);
  }
  // A running entry that is deleted leaves the set, whether it was saved or not.
  WTTime* fresh = task->toggleTimer();
  ASSERT_EQ(runningNow(), QList<WTTime*>{fresh});
  context->deleteObject(fresh);
  EXPECT_TRUE(runningNow().isEmpty());
  ASSERT_TRUE(context->save().ok());
  context->deleteObject(time);
  time->setRunning(true);  // a deleted record's value changing does not bring it back
  EXPECT_TRUE(runningNow().isEmpty());
  // Undo brings a deleted running entry back into the set.
  WTTime* undone = makeTask(nullptr, "Second")->toggleTimer();
  settle();
  context->deleteObject(undone);
  ASSERT_TRUE(runningNow().isEmpty());
  context->undoManager().undo();
  EXPECT_EQ(runningNow(), QList<WTTime*>{undone});
}

// Asks only when on, running and idle past the threshold (five minutes when zero or less); No asks again.
struct IdleRow {
  std::optional<bool> shouldIdle;  // unset: the registered default, off
  int minutes;
  qint64 idleSeconds;  // -1: the idle source failed
  bool running, asks;
};

class IdleQuestionTest : public TrackingTest, public ::testing::WithParamInterface<IdleRow> {};

TEST_P(IdleQuestionTest, AsksOnlyAtTheThresholdAndNoKeepsTheIdleTime) {
  const IdleRow& row = GetParam();
  if (row.shouldIdle) defaults->setValue("WTShouldIdle", *row.shouldIdle);
  defaults->setValue("WTIdleTime", row.minutes);
  WTTask* task = makeTask();
  WTTime* time = row.running ? startTimer(task, clockNow.addingSeconds(-3600)) : nullptr;
  idle.seconds = row.idleSeconds;
  updater->start();
  settle();
  if (!row.asks) {
    EXPECT_TRUE(presenter.shown.empty());
    EXPECT_TRUE(row.running || idle.asked == 0) << "with nothing running the desktop is not even asked";
    return;
  }
  ASSERT_EQ(presenter.shown.size(), 1u);
  EXPECT_EQ(presenter.said(0),
            "Idle time | Would you like to substract the idle time and restart the timers? | No | Yes");
  EXPECT_TRUE(time->running() && !time->endDate() && task->times().size() == 1);
  EXPECT_EQ(updater->totalActiveDuration(), 60);
  advance(5);
  updater->update();
  EXPECT_EQ(presenter.shown.size(), 2u);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Rows, IdleQuestionTest, ::testing::Values(
    IdleRow{true, 0, 299, true, false}, IdleRow{true, 0, 300, true, true}, IdleRow{true, -4, 299, true, false},
    IdleRow{true, -4, 300, true, true}, IdleRow{true, 2, 119, true, false}, IdleRow{true, 2, 120, true, true},
    IdleRow{true, 10, 599, true, false}, IdleRow{true, 10, 600, true, true}, IdleRow{std::nullopt, 5, 100000, true, false},
    IdleRow{false, 5, 100000, true, false}, IdleRow{true, 5, -1, true, false}, IdleRow{true, 5, 100000, false, false}));
// clang-format on

TEST_F(TrackingTest, AnsweringYesStopsEntriesStartedBeforeTheIdleStartAndRestartsEachTaskOnce) {
  turnIdleHandlingOn(5);
  WTTask* twice = makeTask(nullptr, "Two entries");
  WTTask* once = makeTask(nullptr, "One entry");
  WTTask* late = makeTask(nullptr, "Started while idle");
  const Date asked = clockNow, idleStart = asked.addingSeconds(-1200);
  WTTime* stopped[] = {startTimer(twice, asked.addingSeconds(-7200)),
                       startTimer(twice, asked.addingSeconds(-3600)),
                       startTimer(once, asked.addingSeconds(-5400))};
  WTTime* untouched[] = {startTimer(late, asked.addingSeconds(-600)), startTimer(late, idleStart)};
  idle.seconds = 1200;
  presenter.answers = {Answer::Alternate};
  presenter.whileOpen = [this] { advance(120); };  // the idle start was fixed before the question
  updater->start();
  settle();
  ASSERT_EQ(presenter.shown.size(), 1u);
  for (WTTime* time : stopped)
    EXPECT_TRUE(!time->running() && time->endDate() == std::optional<Date>(idleStart));
  for (WTTime* time : untouched) EXPECT_TRUE(time->running() && !time->endDate());
  ASSERT_EQ(twice->runningTimes().size() + once->runningTimes().size(), 2);
  EXPECT_EQ(late->runningTimes().size(), 2) << "no new entry for a task whose entries all started later";
  EXPECT_EQ(twice->times().size(), 3);
  EXPECT_EQ(twice->runningTimes().front()->startDate(), std::optional<Date>(asked.addingSeconds(120)));
  EXPECT_EQ(updater->times().size(), 4);
  EXPECT_FALSE(updater->times().contains(stopped[0]));
}

TEST_F(TrackingTest, AnOpenIdleAlertIsNeverStackedAndTheTickerGoesOn) {
  turnIdleHandlingOn(1);
  startTimer(makeTask(), clockNow.addingSeconds(-3600));
  idle.seconds = 3000;
  int nestedTicks = 0;
  presenter.whileOpen = [&] {
    // While the question is open, the user starts another timer elsewhere and time passes.
    if (presenter.shown.size() > 1) return;
    makeTask(nullptr, "Other")->toggleTimer();
    settle();
    updater->update();
    nestedTicks = ticks;
  };
  updater->start();
  EXPECT_EQ(presenter.shown.size(), 1u);
  EXPECT_GE(nestedTicks, 2) << "ticks inside the open question still ran";
  EXPECT_TRUE(updater->times().size() == 2 && updater->isTicking());
  updater->update();  // closed, the next tick may ask again
  EXPECT_EQ(presenter.shown.size(), 2u);
}

// Time asleep, announced or found from a very late tick, is offered as idle once.
TEST_F(TrackingTest, SleepAndUnannouncedPausesOfferTheTimeAwayAsIdle) {
  turnIdleHandlingOn(5);
  WTTask* task = makeTask();
  WTTime* time = startTimer(task, clockNow.addingSeconds(-1800));
  updater->start();
  const int before = ticks;
  updater->receiveSleepNote("PrepareForSleep(true)");
  EXPECT_FALSE(updater->isTicking());
  EXPECT_EQ(ticks, before);
  // Eight hours later the lid opens; the desktop's idle counter started again at the wake.
  const Date sleptAt = clockNow;
  advance(8 * 3600);
  idle.seconds = 2;
  presenter.answers = {Answer::Alternate};
  updater->receiveWakeNote("PrepareForSleep(false)");
  EXPECT_TRUE(ticks == before + 1 && updater->isTicking());
  ASSERT_EQ(presenter.shown.size(), 1u);
  EXPECT_FALSE(time->running());
  EXPECT_EQ(time->endDate(), std::optional<Date>(sleptAt));

  idle.seconds = 0;
  advance(5 + 60);
  updater->update();
  EXPECT_EQ(presenter.shown.size(), 1u);
  const Date lastAwake = clockNow;
  WTTime* restarted = task->runningTimes().value(0);
  advance(2 * 3600);
  presenter.answers = {Answer::Alternate};
  updater->update();
  ASSERT_EQ(presenter.shown.size(), 2u);
  EXPECT_EQ(restarted->endDate(), std::optional<Date>(lastAwake))
      << "cut where the machine was last seen awake";
  EXPECT_EQ(task->runningTimes().size(), 1);
  advance(5);
  updater->update();
  EXPECT_EQ(presenter.shown.size(), 2u);
}

// Quitting asks and saves the choice; a session's end asks nothing and stores the timers running.
TEST_F(TrackingTest, QuitPromptAndSessionEndStoreTheTimersAsChosen) {
  int saves = 0;
  updater->setSaveCallback([&] { return ++saves, context->save().ok(); });
  updater->start();
  updater->applicationWillTerminate();
  updater->sessionWillEnd();
  EXPECT_TRUE(presenter.shown.empty() && saves == 0) << "nothing runs: nothing to ask or keep";
  WTTime* time = makeTask()->toggleTimer();  // started in the same turn as the quit
  presenter.answers = {Answer::Alternate};
  updater->applicationWillTerminate();
  ASSERT_EQ(presenter.shown.size(), 1u);
  EXPECT_EQ(
      presenter.said(0),
      "Running Timer | Would you like to stop the running timers before quitting? | Stop | Keep running");
  EXPECT_TRUE(time->running());
  EXPECT_EQ(saves, 0);
  updater->sessionWillEnd();
  EXPECT_EQ(presenter.shown.size(), 1u);
  EXPECT_EQ(saves, 1);
  advance(90);
  presenter.answers = {Answer::Default};
  updater->applicationWillTerminate();
  EXPECT_TRUE(presenter.shown.size() == 2 && saves == 2);
  EXPECT_TRUE(!time->running() && time->endDate() == std::optional<Date>(clockNow));
}

// The tray's five tasks, running first, then latest tracked; announced while shown, else rearranged later.
TEST_F(TrackingTest, TheListHoldsFiveTasksRunningFirstThenTheLatestTrackedAndFollowsTheStoreWhileShown) {
  makeTenTasks();
  WTRecentTasks top(context.get());
  auto names = [&] {
    QStringList result;
    for (const WTTask* task : top.tasks()) result << task->name();
    return result;
  };
  EXPECT_EQ(names(), QStringList({"T4", "T1", "T9", "T8", "T7"}));
  int announced = 0;
  QObject::connect(&top, &WTRecentTasks::tasksDidChange, [&] { ++announced; });
  tasks[0]->toggleTimer();
  settle();
  EXPECT_EQ(announced, 0);
  EXPECT_EQ(names().mid(0, 3), QStringList({"T4", "T1", "T0"}));
  top.setActive(true);
  tasks[4]->stopAllTimers();
  settle();
  EXPECT_EQ(announced, 1);
  EXPECT_EQ(names(), QStringList({"T1", "T0", "T4", "T9", "T8"}))
      << "a stopped task moves down to its latest end";
}

// A running timer's ticks say once when they take its task past 80 % and past the whole budget.
TEST_F(TrackingTest, TicksSayOnceWhenATimerTakesATaskPastItsBudgetLines) {
  auto* project = WTProject::insertNewObject(context.get());
  project->setRate(dec("60"));  // a minute bills 1.00
  WTTask* task = makeTask(project);
  task->setBudget(dec("100"));
  WTBudgetWatcher watcher(updater.get());
  QStringList said;
  QObject::connect(&watcher, &WTBudgetWatcher::budgetCrossed, [&](WTObject* object, WTBudget::Level level) {
    said.append(QStringLiteral("%1 %2").arg(object->entityName()).arg(int(level)));
  });
  QObject::connect(&watcher, &WTBudgetWatcher::budgetEased, [&](WTObject* object, WTBudget::Level level) {
    said.append(QStringLiteral("%1 down to %2").arg(object->entityName()).arg(int(level)));
  });
  QStringList moved;  // by the object's entity: the project has no budget
  QObject::connect(&watcher, &WTBudgetWatcher::budgetMoved,
                   [&](WTObject* object, WTBudget::Level) { moved.append(object->entityName()); });
  startTimer(task, clockNow.addingSeconds(-79 * 60));
  updater->start();
  settle();
  EXPECT_TRUE(said.isEmpty()) << "a timer just started has no tick before to compare with";
  for (int minute = 0; minute < 25; ++minute) {  // 80 at the first, 101 at the 22nd
    advance(60);
    updater->update();
  }
  EXPECT_EQ(said, (QStringList{"WTTask 1", "WTTask 2"}));
  EXPECT_EQ(moved, QStringList(23, "WTTask")) << "every other tick moves the figures";
  said.clear();
  task->setBudget(dec("110"));  // back under the whole: passing it again is said again
  updater->update();
  advance(7 * 60);  // 104 → 111
  updater->update();
  task->setBudget(dec("1000"));
  updater->update();
  EXPECT_EQ(said, (QStringList{"WTTask down to 1", "WTTask 2", "WTTask down to 0"}));
}

}  // namespace
