#include "ModelFixture.h"

class WTTimerTest : public ModelTest {};

TEST_F(WTTimerTest, StartingATimerLeavesOthersRunningUnlessAskedToStopThem) {
  WTTask* a = makeTask();
  WTTask* b = makeTask();
  EXPECT_FALSE(a->running());  // no entries at all
  WTTime* first = a->toggleTimer();
  ASSERT_NE(first, nullptr);
  EXPECT_TRUE(first->running());
  EXPECT_FALSE(first->endDate().has_value());
  EXPECT_EQ(first->task(), a);
  WTTime* second = b->toggleTimer();
  EXPECT_TRUE(a->running());
  EXPECT_TRUE(b->running());

  defaults->setValue("WTStopsOtherTimes", true);
  WTTask* c = makeTask();
  WTTime* third = c->toggleTimer();
  EXPECT_FALSE(first->running());
  EXPECT_FALSE(second->running());
  EXPECT_TRUE(first->endDate().has_value());
  EXPECT_TRUE(third->running());

  EXPECT_EQ(c->toggleTimer(), nullptr);  // stops
  EXPECT_FALSE(c->running());
  EXPECT_TRUE(third->endDate().has_value());
}

TEST_F(WTTimerTest, StoppingKeepsAnEndDateThatIsAlreadySet) {
  WTTask* task = makeTask();
  setNow(berlin(2026, 7, 1, 12));
  WTTime* time = task->toggleTimer();
  // Idle handling may have set the end already.
  time->setRunning(false);
  EXPECT_EQ(time->endDate(), berlin(2026, 7, 1, 12));
  time->setRunning(true);
  const Date setEnd = berlin(2026, 7, 1, 12, 40);
  time->setEndDate(setEnd);
  clockNow = berlin(2026, 7, 1, 13);
  time->setRunning(false);
  EXPECT_EQ(time->endDate(), setEnd);
}

TEST_F(WTTimerTest, ANewEntryLastsNothingUntilToldOtherwise) {
  WTTask* task = makeTask();
  setNow(berlin(2026, 7, 1, 9, 15, 20));
  auto* time = WTTime::insertNewObject(context.get());
  time->setTask(task);
  EXPECT_EQ(time->startDate(), clockNow);
  EXPECT_EQ(time->endDate(), clockNow);
  EXPECT_EQ(time->duration(), 0);
  EXPECT_EQ(time->title(), "09:15");

  time->setDuration(90);
  EXPECT_EQ(time->endDate(), berlin(2026, 7, 1, 10, 45, 20));
  time->setDuration(0);
  EXPECT_EQ(time->endDate(), time->startDate());
}

TEST_F(WTTimerTest, MovingAnEntryToAnotherDayKeepsTimeOfDayAndLength) {
  WTTask* task = makeTask();
  WTTime* time = makeTime(task, berlin(2026, 7, 1, 9, 15, 40), berlin(2026, 7, 1, 10, 45, 40));
  time->setDate(berlin(2026, 7, 9, 17, 3, 3));
  EXPECT_EQ(time->startDate(), berlin(2026, 7, 9, 9, 15, 0));
  EXPECT_EQ(time->endDate(), berlin(2026, 7, 9, 10, 45, 0));

  // The length keeps its seconds even though the new start has none.
  WTTime* odd = makeTime(task, berlin(2026, 7, 1, 9, 0, 10), berlin(2026, 7, 1, 9, 30, 55));
  odd->setDate(berlin(2026, 10, 30));
  EXPECT_EQ(odd->startDate(), berlin(2026, 10, 30, 9, 0, 0));
  EXPECT_EQ(odd->endDate(), berlin(2026, 10, 30, 9, 30, 45));

  auto* note = makeItem<WTNote>(task, berlin(2026, 7, 1, 9, 0, 10));
  note->setDate(berlin(2026, 8, 1, 23, 59, 59));
  EXPECT_EQ(note->startDate(), berlin(2026, 8, 1, 23, 59, 59));
}

TEST_F(WTTimerTest, PeekTellsObserversOnlyWhenTheMinuteCountMoved) {
  auto* project = WTProject::insertNewObject(context.get());
  WTTask* task = makeTask(project);
  setNow(berlin(2026, 7, 1, 9, 0, 0));
  WTTime* time = task->toggleTimer();
  EXPECT_TRUE(time->peek());
  KeyCounter entry(*context, time, "duration"), projectDuration(*context, project, "duration");
  clockNow = berlin(2026, 7, 1, 9, 0, 59);
  EXPECT_FALSE(time->peek());
  EXPECT_EQ(entry.count, 0);
  EXPECT_EQ(projectDuration.count, 0);
  clockNow = berlin(2026, 7, 1, 9, 1, 0);
  EXPECT_TRUE(time->peek());
  EXPECT_GE(entry.count, 1);
  EXPECT_GE(projectDuration.count, 1);
  EXPECT_EQ(time->lastDuration(), 1);
}

TEST_F(WTTimerTest, RunningStateDrivesTheTaskImagesAndTitle) {
  WTTask* task = makeTask();
  KeyCounter image(*context, task, "timerButtonImage");
  EXPECT_EQ(task->timerButtonImage(), "play_32");
  EXPECT_EQ(task->tableImage(), "notepad_32");
  EXPECT_EQ(task->buttonTitle(), "Start");
  task->toggleTimer();
  EXPECT_EQ(task->timerButtonImage(), "stop_32");
  EXPECT_EQ(task->tableImage(), "notepad_clock_32");
  EXPECT_EQ(task->buttonTitle(), "Stop");
  EXPECT_GE(image.count, 1);
  EXPECT_EQ(task->maxTimeEndDate(), std::nullopt);
}

TEST_F(WTTimerTest, UndoingAStopRestartsTheTimer) {
  WTTask* task = makeTask();
  WTTime* time = task->toggleTimer();
  context->processPendingChanges();
  KeyCounter running(*context, task, "running");
  task->toggleTimer();
  context->processPendingChanges();
  context->undoManager().undo();
  EXPECT_TRUE(time->running());
  EXPECT_FALSE(time->endDate().has_value());
  EXPECT_TRUE(task->running());
  EXPECT_GE(running.count, 2);
}
