#include "LogCapture.h"
#include "TrackingFixture.h"
#include "WTRecentTasks.h"

#include <QSignalSpy>
#include <QTranslator>

namespace {

using Answer = WTTrackingAlertAnswer;

TEST_F(TrackingTest, TickTotalsRunningEntriesSetsTheBadgeAndSchedulesTheNextTick) {
  WTTask* task = makeTask();
  WTTask* other = makeTask(nullptr, QStringLiteral("Other"));
  startTimer(task, clockNow.addingSeconds(-45 * 60));
  startTimer(other, clockNow.addingSeconds(-30 * 60));
  makeTime(other, clockNow.addingSeconds(-5 * 3600), clockNow.addingSeconds(-4 * 3600));  // stopped
  QSignalSpy badge(updater.get(), &WTStopwatchUpdater::badgeDidChange);

  updater->start();

  EXPECT_EQ(ticker(), "1 ticks, 2 running, badge \"01:15\", ticking");
  EXPECT_EQ(updater->totalActiveDuration(), 75);
  EXPECT_EQ(updater->windowTitle(QStringLiteral("Tessal")), QStringLiteral("Tessal — 01:15"));
  ASSERT_EQ(badge.count(), 1);
  EXPECT_EQ(badge.at(0).at(0).toString(), QStringLiteral("01:15"));
  // A tick with nothing new keeps the badge and still reschedules.
  updater->update();
  EXPECT_EQ(ticker(), "2 ticks, 2 running, badge \"01:15\", ticking");
  EXPECT_EQ(badge.count(), 1);
}

TEST_F(TrackingTest, EachTickPeeksSoTotalsMoveOncePerMinuteBoundary) {
  WTTask* task = makeTask();
  WTTime* time = startTimer(task, berlin(2026, 3, 2, 11, 0, 0));
  updater->start();
  EXPECT_EQ(time->lastDuration(), std::optional<int>(60));
  settle();

  KeyCounter taskDuration(*context, task, QStringLiteral("duration"));
  advance(20);  // 12:00:50, same minute
  updater->update();
  EXPECT_EQ(taskDuration.count, 0);
  advance(15);  // 12:01:05
  updater->update();
  EXPECT_EQ(taskDuration.count, 1);
  EXPECT_EQ(updater->totalActiveDuration(), 61);
  EXPECT_EQ(updater->badgeLabel(), QStringLiteral("01:01"));
}

TEST_F(TrackingTest, ChangingTheRunningSetTicksAtOnceAndOtherChangesDoNot) {
  WTTask* task = makeTask();
  updater->start();
  settle();
  EXPECT_EQ(ticker(), "1 ticks, 0 running, badge \"\", ticking");
  task->setName(QStringLiteral("Renamed"));
  makeTime(task, clockNow.addingSeconds(-600), clockNow);
  settle();
  EXPECT_EQ(ticks, 1) << "no running entry came or went";

  WTTime* started = task->toggleTimer();
  EXPECT_EQ(runningNow(), QList<WTTime*>{started});
  EXPECT_EQ(ticker(), "2 ticks, 1 running, badge \"00:00\", ticking");
  QSignalSpy badge(updater.get(), &WTStopwatchUpdater::badgeDidChange);
  task->toggleTimer();
  settle();
  EXPECT_EQ(ticker(), "3 ticks, 0 running, badge \"\", ticking") << "the ticker runs on with nothing running";
  ASSERT_EQ(badge.count(), 1);
  EXPECT_TRUE(badge.at(0).at(0).toString().isEmpty());
  EXPECT_EQ(updater->windowTitle(QStringLiteral("Tessal")), QStringLiteral("Tessal"));
}

TEST_F(TrackingTest, RunningSetFollowsRestartsOfSavedEntriesDeletionAndUndo) {
  WTTask* task = makeTask();
  WTTime* time = startTimer(task, clockNow.addingSeconds(-120));
  ASSERT_TRUE(context->save().ok());
  updater->start();
  settle();

  // Stopped and started again between two saves: each change must still be seen.
  time->setRunning(false);
  EXPECT_TRUE(runningNow().isEmpty());
  time->setRunning(true);
  EXPECT_EQ(runningNow(), QList<WTTime*>{time});
  time->setRunning(false);
  EXPECT_TRUE(runningNow().isEmpty());

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
  WTTask* second = makeTask(nullptr, QStringLiteral("Second"));
  WTTime* undone = second->toggleTimer();
  settle();
  context->deleteObject(undone);
  ASSERT_TRUE(runningNow().isEmpty());
  context->undoManager().undo();
  EXPECT_EQ(runningNow(), QList<WTTime*>{undone});
}

// Whether a tick asks about idle time: only with the handling on, something running and the desktop's
// idle seconds at the threshold (the minutes setting, five when zero or less). Answered "No", the entry
// runs on with the idle time in it, and the next tick asks again.
struct IdleRow {
  const char* name;
  std::optional<bool> shouldIdle;  // unset: the registered default, off
  int minutes;
  qint64 idleSeconds;  // -1: the idle source failed
  bool running;
  bool asks;
};

class IdleQuestionTest : public TrackingTest, public ::testing::WithParamInterface<IdleRow> {};

TEST_P(IdleQuestionTest, AsksOnlyAtTheThresholdAndNoKeepsTheIdleTime) {
  const IdleRow& row = GetParam();
  if (row.shouldIdle) defaults->setValue(QStringLiteral("WTShouldIdle"), *row.shouldIdle);
  defaults->setValue(QStringLiteral("WTIdleTime"), row.minutes);
  WTTask* task = makeTask();
  WTTime* time = row.running ? startTimer(task, clockNow.addingSeconds(-3600)) : nullptr;
  idle.seconds = row.idleSeconds;
  presenter.answers = {Answer::Default};
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
  EXPECT_TRUE(time->running() && !time->endDate());
  EXPECT_EQ(task->times().size(), 1);
  EXPECT_EQ(updater->totalActiveDuration(), 60);
  advance(5);
  updater->update();
  EXPECT_EQ(presenter.shown.size(), 2u);
}

INSTANTIATE_TEST_SUITE_P(Rows, IdleQuestionTest,
                         ::testing::Values(IdleRow{"ZeroMeansFiveBelow", true, 0, 299, true, false},
                                           IdleRow{"ZeroMeansFiveAt", true, 0, 300, true, true},
                                           IdleRow{"NegativeMeansFiveBelow", true, -4, 299, true, false},
                                           IdleRow{"NegativeMeansFiveAt", true, -4, 300, true, true},
                                           IdleRow{"TwoBelow", true, 2, 119, true, false},
                                           IdleRow{"TwoAt", true, 2, 120, true, true},
                                           IdleRow{"TenBelow", true, 10, 599, true, false},
                                           IdleRow{"TenAt", true, 10, 600, true, true},
                                           IdleRow{"OffUntilTurnedOn", std::nullopt, 5, 100000, true, false},
                                           IdleRow{"TurnedOff", false, 5, 100000, true, false},
                                           IdleRow{"IdleSourceFailed", true, 5, -1, true, false},
                                           IdleRow{"NothingRuns", true, 5, 100000, false, false}),
                         [](const ::testing::TestParamInfo<IdleRow>& info) {
                           return std::string(info.param.name);
                         });

// A translation that shows the minutes gets the whole minutes of the idle time.
TEST_F(TrackingTest, TheIdleQuestionCanNameTheMinutes) {
  turnIdleHandlingOn(5);
  startTimer(makeTask(), clockNow.addingSeconds(-3600));
  idle.seconds = 659;
  class Translator final : public QTranslator {
   public:
    QString translate(const char*, const char* source, const char*, int) const override {
      return QLatin1String(source) == QLatin1String("Idle time") ? QStringLiteral("Untätig seit %ld Minuten")
                                                                 : QString();
    }
    bool isEmpty() const override { return false; }
  } translator;
  QCoreApplication::installTranslator(&translator);
  updater->start();
  QCoreApplication::removeTranslator(&translator);
  ASSERT_EQ(presenter.shown.size(), 1u);
  EXPECT_EQ(presenter.shown.back().messageText, QStringLiteral("Untätig seit 10 Minuten"));
}

TEST_F(TrackingTest, AnsweringYesStopsEntriesStartedBeforeTheIdleStartAndRestartsEachTaskOnce) {
  turnIdleHandlingOn(5);
  WTTask* twice = makeTask(nullptr, QStringLiteral("Two entries"));
  WTTask* once = makeTask(nullptr, QStringLiteral("One entry"));
  WTTask* late = makeTask(nullptr, QStringLiteral("Started while idle"));
  const Date asked = clockNow;
  WTTime* first = startTimer(twice, asked.addingSeconds(-7200));
  WTTime* second = startTimer(twice, asked.addingSeconds(-3600));
  WTTime* single = startTimer(once, asked.addingSeconds(-5400));
  WTTime* recent = startTimer(late, asked.addingSeconds(-600));
  WTTime* atIdleStart = startTimer(late, asked.addingSeconds(-1200));
  idle.seconds = 1200;
  const Date idleStart = asked.addingSeconds(-1200);
  presenter.answers = {Answer::Alternate};
  // The user takes two minutes to answer: the idle start was fixed before the question.
  presenter.whileOpen = [this] { advance(120); };
  updater->start();
  settle();

  ASSERT_EQ(presenter.shown.size(), 1u);
  EXPECT_EQ(presenter.shown.front().messageText, QStringLiteral("Idle time"));
  for (WTTime* stopped : {first, second, single})
    EXPECT_TRUE(!stopped->running() && stopped->endDate() == std::optional<Date>(idleStart));
  for (WTTime* untouched : {recent, atIdleStart}) EXPECT_TRUE(untouched->running() && !untouched->endDate());
  ASSERT_EQ(runningTimesOf(twice).size(), 1);
  ASSERT_EQ(runningTimesOf(once).size(), 1);
  EXPECT_EQ(runningTimesOf(late).size(), 2) << "no new entry for a task whose entries all started later";
  EXPECT_EQ(twice->times().size(), 3);
  EXPECT_EQ(runningTimesOf(twice).front()->startDate(), std::optional<Date>(asked.addingSeconds(120)));
  EXPECT_EQ(updater->times().size(), 4);
  EXPECT_FALSE(updater->times().contains(first));

  // Saved and read back, the record is the one the user chose.
  updater.reset();
  saveAndReopen();
  EXPECT_EQ(context->fetch<WTTime>([](const WTTime* time) { return time->running(); }).size(), 4);
}

TEST_F(TrackingTest, AnOpenIdleAlertIsNeverStackedAndTheTickerGoesOn) {
  turnIdleHandlingOn(1);
  WTTask* task = makeTask();
  startTimer(task, clockNow.addingSeconds(-3600));
  idle.seconds = 3000;
  int nestedTicks = 0;
  presenter.whileOpen = [&] {
    // While the question is open, the user starts another timer elsewhere and time passes.
    if (presenter.shown.size() > 1) return;
    makeTask(nullptr, QStringLiteral("Other"))->toggleTimer();
    settle();
    updater->update();
    nestedTicks = ticks;
  };
  presenter.answers = {Answer::Default, Answer::Default};
  updater->start();
  EXPECT_EQ(presenter.shown.size(), 1u);
  EXPECT_GE(nestedTicks, 2) << "ticks inside the open question still ran";
  EXPECT_EQ(updater->times().size(), 2);
  EXPECT_TRUE(updater->isTicking());

  // Closed, the next tick may ask again.
  updater->update();
  EXPECT_EQ(presenter.shown.size(), 2u);
}

TEST_F(TrackingTest, SleepStopsTheTickerAndWakingOffersTheTimeAsleepAsIdle) {
  turnIdleHandlingOn(5);
  WTTask* task = makeTask();
  WTTime* time = startTimer(task, clockNow.addingSeconds(-1800));
  updater->start();
  const int before = ticks;
  LogCapture log(QStringLiteral("tessal.tracking.debug=true"));

  updater->receiveSleepNote(QStringLiteral("PrepareForSleep(true)"));
  EXPECT_FALSE(updater->isTicking());
  EXPECT_EQ(ticks, before);
  EXPECT_TRUE(log.lines.contains(QStringLiteral("receiveSleepNote: PrepareForSleep(true)")));

  // Eight hours later the lid opens; the desktop's idle counter started again at the wake.
  const Date sleptAt = clockNow;
  advance(8 * 3600);
  idle.seconds = 2;
  presenter.answers = {Answer::Alternate};
  updater->receiveWakeNote(QStringLiteral("PrepareForSleep(false)"));
  EXPECT_TRUE(log.lines.contains(QStringLiteral("receiveSleepNote: PrepareForSleep(false)")));
  EXPECT_EQ(ticks, before + 1);
  EXPECT_TRUE(updater->isTicking());
  ASSERT_EQ(presenter.shown.size(), 1u);
  EXPECT_FALSE(time->running());
  EXPECT_EQ(time->endDate(), std::optional<Date>(sleptAt));

  // The night was offered once; awake and busy, nothing more is asked.
  advance(5);
  updater->update();
  EXPECT_EQ(presenter.shown.size(), 1u);
}

TEST_F(TrackingTest, AWakeNobodyAnnouncedIsFoundFromTheLateTick) {
  turnIdleHandlingOn(5);
  WTTask* task = makeTask();
  WTTime* time = startTimer(task, clockNow.addingSeconds(-1800));
  updater->start();
  idle.seconds = 0;

  // A tick a little late (a busy machine) is no sleep.
  advance(5 + 60);
  updater->update();
  EXPECT_TRUE(presenter.shown.empty());

  // A tick that comes two hours after it was due: the machine was paused in between.
  const Date lastAwake = clockNow;
  advance(2 * 3600);
  presenter.answers = {Answer::Alternate};
  updater->update();
  ASSERT_EQ(presenter.shown.size(), 1u);
  EXPECT_EQ(time->endDate(), std::optional<Date>(lastAwake)) << "cut where the machine was last seen awake";
  EXPECT_EQ(runningTimesOf(task).size(), 1);

  // An immediate tick (the running set changed) while a tick is pending finds the gap as well.
  advance(5);
  updater->update();
  ASSERT_EQ(presenter.shown.size(), 1u);
  advance(3 * 3600);
  makeTask(nullptr, QStringLiteral("Other"))->toggleTimer();
  settle();
  EXPECT_EQ(presenter.shown.size(), 2u);
}

TEST_F(TrackingTest, QuitPromptStopsAndSavesOrKeepsTimersRunningInTheStore) {
  countSaves();
  updater->start();
  updater->applicationWillTerminate();
  EXPECT_TRUE(presenter.shown.empty()) << "nothing runs: nothing to ask";
  EXPECT_EQ(saves, 0);

  WTTask* task = makeTask();
  WTTime* time = task->toggleTimer();  // started in the same turn as the quit
  presenter.answers = {Answer::Alternate};
  updater->applicationWillTerminate();
  ASSERT_EQ(presenter.shown.size(), 1u);
  EXPECT_EQ(
      presenter.said(0),
      "Running Timer | Would you like to stop the running timers before quitting? | Stop | Keep running");
  EXPECT_TRUE(time->running());
  EXPECT_EQ(saves, 0);

  const QString uuid = time->uuid();
  updater.reset();
  saveAndReopen();
  ASSERT_TRUE(stored(uuid));
  EXPECT_TRUE(stored(uuid)->running()) << "kept running across the quit";

  makeUpdater();
  countSaves();
  updater->start();
  advance(90);
  presenter.answers = {Answer::Default};
  updater->applicationWillTerminate();
  EXPECT_EQ(presenter.shown.size(), 2u);
  EXPECT_EQ(saves, 1);
  updater.reset();
  openContext();  // no save of our own: what the prompt saved is what is on disk
  ASSERT_TRUE(stored(uuid));
  EXPECT_TRUE(!stored(uuid)->running() && stored(uuid)->endDate() == std::optional<Date>(clockNow));
}

TEST_F(TrackingTest, SessionEndAsksNothingAndStoresTheTimersRunning) {
  countSaves();
  updater->start();
  updater->sessionWillEnd();
  EXPECT_EQ(saves, 0) << "nothing runs: nothing to keep";

  WTTime* time = makeTask()->toggleTimer();
  updater->sessionWillEnd();
  EXPECT_TRUE(presenter.shown.empty());
  EXPECT_EQ(saves, 1);
  const QString uuid = time->uuid();
  updater.reset();
  openContext();
  ASSERT_TRUE(stored(uuid));
  EXPECT_TRUE(stored(uuid)->running());
}

QStringList names(const QList<WTTask*>& list) {
  QStringList result;
  for (const WTTask* task : list) result << task->name();
  return result;
}

// The tray's list of tasks over the real model.
TEST_F(TrackingTest, TheListHoldsFiveTasksRunningFirstThenTheLatestTrackedAndFollowsTheStoreWhileShown) {
  makeTenTasks();
  WTRecentTasks top(context.get());
  EXPECT_EQ(names(top.tasks()), QStringList({"T4", "T1", "T9", "T8", "T7"}));

  // Not on screen: a change is noted, not announced, and the next look arranges afresh.
  int announced = 0;
  QObject::connect(&top, &WTRecentTasks::tasksDidChange, [&] { ++announced; });
  tasks[0]->toggleTimer();
  settle();
  EXPECT_EQ(announced, 0);
  EXPECT_EQ(names(top.tasks()).mid(0, 3), QStringList({"T4", "T1", "T0"}));

  top.setActive(true);
  tasks[4]->stopAllTimers();
  settle();
  EXPECT_EQ(announced, 1);
  EXPECT_EQ(names(top.tasks()), QStringList({"T1", "T0", "T4", "T9", "T8"}))
      << "a stopped task moves down to its latest end, which is now";
}

}  // namespace
