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
  const std::tuple<const char*, QList<WTTask*>, int, QList<WTTask*>> cases[] = {
      {"to the top", {d}, 0, {d, a, b, c}},
      {"down: the place counts the moving task", {a}, 2, {b, a, c, d}},
      {"to the end, in their order", {a, b}, -1, {c, d, a, b}},
      {"up: each to the same place, so reversed", {c, d}, 0, {d, c, a, b}},
      {"onto its own place; a task not of the project stays out", {b, elsewhere}, 1, {a, b, c, d}},
  };
  const QList<WTTask*> start{a, b, c, d};
  for (const auto& [what, moved, row, after] : cases) {
    for (int i = 0; i < start.size(); ++i) project->moveTask(start[i], i);
    project->moveTasks(moved, row);
    EXPECT_EQ(project->tasks(), after) << what;
  }
}

// Onto a day: that task and day; onto "Pending": to-dos only, opened again; onto the task: dates kept.
TEST_F(WTMovesTest, ATaskAdoptsItemsOntoADayOntoPendingOrKeepingTheirDates) {
  WTTask* design = makeTask(nullptr, "design");
  WTTask* build = makeTask(nullptr, "build");
  WTTime* time = makeTime(build, berlin(2024, 3, 11, 9, 15), berlin(2024, 3, 11, 10));
  auto* note = makeItem<WTNote>(build, berlin(2024, 3, 12, 9));
  auto* done = makeItem<WTToDo>(build, berlin(2024, 3, 9));
  done->setCompleted(true);
  const auto where = [](WTItem* item) { return std::pair(item->task()->name(), item->startDate()); };
  EXPECT_EQ(design->adoptItems({time}, berlin(2024, 3, 10)), QList<WTItem*>{time});
  EXPECT_EQ(where(time), std::pair(QString("design"), std::optional(berlin(2024, 3, 10, 9, 15))));
  EXPECT_EQ(design->adoptItems({done, note}, std::nullopt), QList<WTItem*>{done});
  EXPECT_EQ(std::tuple(done->completed(), done->task(), note->task()), std::tuple(false, design, build));
  EXPECT_EQ(design->adoptItems({note}), QList<WTItem*>{note});
  EXPECT_EQ(where(note), std::pair(QString("design"), std::optional(berlin(2024, 3, 12, 9))));
}

// No move makes two entries of a task share a minute: the task adopts nothing then, and names the clash.
TEST_F(WTMovesTest, AMoveThatWouldBillAMinuteTwiceInATaskMovesNothing) {
  setNow(berlin(2024, 3, 14, 12));
  WTTask* design = makeTask(nullptr, "design");
  WTTask* build = makeTask(nullptr, "build");
  WTTime* kept = makeTime(design, berlin(2024, 3, 11, 9), berlin(2024, 3, 11, 10));
  WTTime* running = makeTime(design, berlin(2024, 3, 14, 9, 30), berlin(2024, 3, 14, 9, 30));
  running->setRunning(true);
  WTTime* early = makeTime(build, berlin(2024, 3, 12, 8), berlin(2024, 3, 12, 9));
  WTTime* late = makeTime(build, berlin(2024, 3, 13, 9, 30), berlin(2024, 3, 13, 10, 30));
  WTTime* inside = makeTime(build, berlin(2024, 3, 12, 9, 45), berlin(2024, 3, 12, 10));
  WTTime* lunch = makeTime(build, berlin(2024, 3, 14, 11, 30), berlin(2024, 3, 14, 11, 45));
  struct Row {
    const char* what;
    QList<WTItem*> items;
    std::optional<Date> day;  // none: the dates kept
    const WTTime* moving;
    const WTTime* other;
  };
  const Row rows[] = {
      {"onto the day of an entry it overlaps", {late}, berlin(2024, 3, 11), late, kept},
      {"only touching it", {early}, berlin(2024, 3, 11), nullptr, nullptr},
      {"its dates kept, at a time the task has free", {late, early}, std::nullopt, nullptr, nullptr},
      {"its dates kept, into what a running entry has run so far", {lunch}, std::nullopt, lunch, running},
      {"two that move meet each other", {inside, late}, berlin(2024, 3, 12), inside, late},
      {"a running entry onto the day of another", {running}, berlin(2024, 3, 11), running, kept},
      {"an entry of the task onto a free day of its own", {kept}, berlin(2024, 3, 13), nullptr, nullptr},
  };
  using Pair = std::pair<const WTTime*, const WTTime*>;
  for (const Row& row : rows) {
    const std::optional<WTTask::Clash> clash = design->clashOfAdopting(row.items, row.day);
    EXPECT_EQ(clash ? Pair(clash->moving, clash->other) : Pair(), Pair(row.moving, row.other)) << row.what;
  }
  // The other entry is named where it would be: the one that moves with it, on the new day.
  const WTTask::Clash clash = *design->clashOfAdopting({inside, late}, berlin(2024, 3, 12));
  EXPECT_EQ(std::pair(clash.otherStart, clash.otherEnd),
            std::pair(berlin(2024, 3, 12, 9, 30), berlin(2024, 3, 12, 10, 30)));
  EXPECT_TRUE(design->adoptItems({late}, berlin(2024, 3, 11)).isEmpty());
  EXPECT_TRUE(design->adoptItems({lunch}).isEmpty());
  EXPECT_EQ(std::tuple(late->task(), late->startDate(), lunch->task()),
            std::tuple(build, std::optional(berlin(2024, 3, 13, 9, 30)), build));
}

// Completing dates a to-do once; reopening it or the stored flag alone (sync, undo) keeps that date.
TEST_F(WTMovesTest, ACompletedToDoIsDatedThenAndOpenedAgainKeepsThatDate) {
  auto* todo = makeItem<WTToDo>(makeTask(), berlin(2024, 3, 1));
  setNow(berlin(2024, 3, 14, 16, 30));
  todo->markCompleted(true);
  EXPECT_TRUE(todo->completed());
  setNow(berlin(2024, 3, 15, 8));
  todo->markCompleted(true);
  EXPECT_EQ(todo->startDate(), berlin(2024, 3, 14, 16, 30));
  todo->markCompleted(false);
  EXPECT_FALSE(todo->completed());
  todo->setCompleted(true);
  EXPECT_EQ(todo->startDate(), berlin(2024, 3, 14, 16, 30));
}
