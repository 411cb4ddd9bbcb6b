#include "ModelFixture.h"

// What a drag in the items outline and a to-do's box do to the records.
class WTMovesTest : public ModelTest {};

TEST_F(WTMovesTest, DraggedTasksGoInTurnToThePlaceBetweenRows) {
  WTProject* project = WTProject::insertNewObject(context.get());
  WTTask* a = makeTask(project, "a");
  WTTask* b = makeTask(project, "b");
  WTTask* c = makeTask(project, "c");
  WTTask* d = makeTask(project, "d");
  WTTask* elsewhere = makeTask();  // of no project
  struct Case {
    const char* what;
    QList<WTTask*> moved;
    int row;
    QList<WTTask*> after;
  };
  const Case cases[] = {
      {"to the top", {d}, 0, {d, a, b, c}},
      {"down: the place counts the moving task", {a}, 2, {b, a, c, d}},
      {"to the end, in their order", {a, b}, -1, {c, d, a, b}},
      {"up: each to the same place, so reversed", {c, d}, 0, {d, c, a, b}},
      {"onto its own place; a task not of the project stays out", {b, elsewhere}, 1, {a, b, c, d}},
  };
  const QList<WTTask*> start{a, b, c, d};
  for (const Case& test : cases) {
    for (int i = 0; i < start.size(); ++i) project->moveTask(start[i], i);
    project->moveTasks(test.moved, test.row);
    EXPECT_EQ(project->tasks(), test.after) << test.what;
  }
}

TEST_F(WTMovesTest, ATaskAdoptsItemsOntoADayOntoPendingOrKeepingTheirDates) {
  WTTask* design = makeTask();
  WTTask* build = makeTask();
  WTTime* time = makeTime(build, berlin(2024, 3, 11, 9, 15), berlin(2024, 3, 11, 10));
  auto* note = makeItem<WTNote>(build, berlin(2024, 3, 12, 9));
  auto* done = makeItem<WTToDo>(build, berlin(2024, 3, 9));
  done->setCompleted(true);

  // A day of another task: that task, that day.
  EXPECT_EQ(design->adoptItems({time}, berlin(2024, 3, 10)), QList<WTItem*>{time});
  EXPECT_EQ(time->task(), design);
  EXPECT_EQ(time->startDate(), berlin(2024, 3, 10, 9, 15));
  // "Pending" takes a to-do, opened again, and nothing else.
  EXPECT_EQ(design->adoptItems({done, note}, std::nullopt), QList<WTItem*>{done});
  EXPECT_FALSE(done->completed());
  EXPECT_EQ(done->task(), design);
  EXPECT_EQ(note->task(), build);
  // The task itself: the item keeps its date.
  EXPECT_EQ(design->adoptItems({note}), QList<WTItem*>{note});
  EXPECT_EQ(note->task(), design);
  EXPECT_EQ(note->startDate(), berlin(2024, 3, 12, 9));
}

TEST_F(WTMovesTest, ACompletedToDoIsDatedThenAndOpenedAgainKeepsThatDate) {
  auto* todo = makeItem<WTToDo>(makeTask(), berlin(2024, 3, 1));
  setNow(berlin(2024, 3, 14, 16, 30));
  todo->markCompleted(true);
  EXPECT_TRUE(todo->completed());
  EXPECT_EQ(todo->startDate(), berlin(2024, 3, 14, 16, 30));
  setNow(berlin(2024, 3, 15, 8));
  todo->markCompleted(true);  // already completed: still dated then
  EXPECT_EQ(todo->startDate(), berlin(2024, 3, 14, 16, 30));
  todo->markCompleted(false);
  EXPECT_FALSE(todo->completed());
  EXPECT_EQ(todo->startDate(), berlin(2024, 3, 14, 16, 30));
  // The stored flag alone, as sync and undo put it back, dates nothing.
  todo->setCompleted(true);
  EXPECT_EQ(todo->startDate(), berlin(2024, 3, 14, 16, 30));
}
