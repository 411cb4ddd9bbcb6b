#include "ModelFixture.h"
#include "WTItemContainer.h"

#include <QSignalSpy>

class WTTimerTest : public ModelTest {};

TEST_F(WTTimerTest, StartingATimerLeavesOthersRunningUnlessAskedToStopThem) {
  WTTask* a = makeTask();
  WTTask* b = makeTask();
  EXPECT_FALSE(a->running());  // no entries at all
  WTTime* first = a->toggleTimer();
  ASSERT_NE(first, nullptr);
  EXPECT_TRUE(first->running() && !first->endDate() && first->task() == a && !a->maxTimeEndDate());
  WTTime* second = b->toggleTimer();
  EXPECT_TRUE(a->running() && b->running());
  defaults->setValue("WTStopsOtherTimes", true);
  WTTask* c = makeTask();
  WTTime* third = c->toggleTimer();
  EXPECT_TRUE(!first->running() && !second->running() && first->endDate() && third->running());
  EXPECT_EQ(c->toggleTimer(), nullptr);  // stops
  EXPECT_TRUE(!c->running() && third->endDate());
}

// Stopping keeps an end that idle handling already set; undoing a stop restarts.
TEST_F(WTTimerTest, StoppingKeepsAnEndDateThatIsAlreadySetAndUndoRestarts) {
  WTTask* task = makeTask();
  setNow(berlin(2026, 7, 1, 12));
  WTTime* time = task->toggleTimer();
  time->setRunning(false);
  EXPECT_EQ(time->endDate(), berlin(2026, 7, 1, 12));
  time->setRunning(true);
  time->setEndDate(berlin(2026, 7, 1, 12, 40));
  clockNow = berlin(2026, 7, 1, 13);
  time->setRunning(false);
  EXPECT_EQ(time->endDate(), berlin(2026, 7, 1, 12, 40));

  WTTask* other = makeTask();
  WTTime* restarted = other->toggleTimer();
  context->processPendingChanges();
  KeyCounter running(*context, other, "running");
  other->toggleTimer();
  context->processPendingChanges();
  context->undoManager().undo();
  EXPECT_TRUE(restarted->running() && !restarted->endDate() && other->running());
  EXPECT_GE(running.count, 2);
}

// A new entry lasts nothing; moved to another day an entry keeps its time of day and length, a note its time.
TEST_F(WTTimerTest, NewEntriesAndEntriesMovedToAnotherDay) {
  WTTask* task = makeTask();
  setNow(berlin(2026, 7, 1, 9, 15, 20));
  auto* time = WTTime::insertNewObject(context.get());
  time->setTask(task);
  const auto span = [](const WTTime* item) { return std::pair(item->startDate(), item->endDate()); };
  EXPECT_EQ(span(time), std::pair(std::optional(clockNow), std::optional(clockNow)));
  EXPECT_EQ(std::pair(time->duration(), time->title()), std::pair(0, QString("09:15")));
  time->setDuration(90);
  EXPECT_EQ(time->endDate(), berlin(2026, 7, 1, 10, 45, 20));
  time->setDuration(0);
  EXPECT_EQ(time->endDate(), time->startDate());

  const std::tuple<Date, Date, Date, Date, Date> moves[] = {
      // start, end, new date, new start, new end
      {berlin(2026, 7, 1, 9, 15, 40), berlin(2026, 7, 1, 10, 45, 40), berlin(2026, 7, 9, 17, 3, 3),
       berlin(2026, 7, 9, 9, 15), berlin(2026, 7, 9, 10, 45)},
      {berlin(2026, 7, 1, 9, 0, 10), berlin(2026, 7, 1, 9, 30, 55), berlin(2026, 10, 30),
       berlin(2026, 10, 30, 9), berlin(2026, 10, 30, 9, 30, 45)}};
  for (const auto& [start, end, date, newStart, newEnd] : moves) {
    WTTime* moved = makeTime(task, start, end);
    moved->setDate(date);
    EXPECT_EQ(span(moved), std::pair(std::optional(newStart), std::optional(newEnd)));
  }
  auto* note = makeItem<WTNote>(task, berlin(2026, 7, 1, 9, 0, 10));
  note->setDate(berlin(2026, 8, 1, 23, 59, 59));
  EXPECT_EQ(note->startDate(), berlin(2026, 8, 1, 23, 59, 59));
}

// Peek tells the entry's, project's and day group's observers only when the minute count moved.
TEST_F(WTTimerTest, ARunningEntryGrowsWithTheClockAndPeekTellsOnlyWhenTheMinuteMoved) {
  auto* project = WTProject::insertNewObject(context.get());
  WTTask* task = makeTask(project);
  setNow(berlin(2026, 7, 1, 9, 0, 30));
  WTTime* time = task->toggleTimer();
  const auto children = task->children();
  ASSERT_EQ(children.size(), 1u);
  QSignalSpy group(children[0].get(), &WTItemContainer::valueChanged);
  EXPECT_TRUE(time->peek());  // first look
  group.clear();
  KeyCounter entry(*context, time, "duration"), projectDuration(*context, project, "duration");
  clockNow = berlin(2026, 7, 1, 9, 0, 59);
  EXPECT_FALSE(time->peek());
  EXPECT_EQ(time->duration() + entry.count + projectDuration.count + group.count(), 0);
  clockNow = berlin(2026, 7, 1, 9, 1, 0);
  EXPECT_EQ(QList({time->duration(), task->duration(), task->runningDuration()}), QList({1, 1, 1}));
  EXPECT_TRUE(time->peek());
  EXPECT_TRUE(entry.count >= 1 && projectDuration.count >= 1 && time->lastDuration() == 1);
  QStringList keys;
  for (const auto& args : group) keys << args[0].toString();
  EXPECT_TRUE(keys.contains("duration") && keys.contains("cost")) << keys.join(' ').toStdString();
  EXPECT_EQ(children[0]->duration(), 1);
}
