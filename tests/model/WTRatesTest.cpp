#include "KeyPath.h"
#include "ModelFixture.h"

#include <functional>

class WTRatesTest : public ModelTest {};

TEST_F(WTRatesTest, RatesAreInheritedDownwardWithTheirOwnFallbacks) {
  auto* client = WTClient::insertNewObject(context.get());
  auto* project = WTProject::insertNewObject(context.get());
  project->setClient(client);
  WTTask* task = makeTask(project);

  client->setRate(dec("120"));
  EXPECT_EQ(task->inheritedRate(), dec("120"));
  EXPECT_EQ(project->inheritedRate(), dec("120"));

  client->setRate(std::nullopt);
  EXPECT_EQ(client->inheritedRate(), dec("100"));
  EXPECT_EQ(task->inheritedRate(), dec("100"));

  project->setRate(dec("65"));
  EXPECT_EQ(task->inheritedRate(), dec("65"));
  task->setRate(dec("70.25"));
  EXPECT_EQ(task->inheritedRate(), dec("70.25"));

  // A broken chain: each level has its own literal.
  WTTask* orphanTask = makeTask();
  auto* orphanProject = WTProject::insertNewObject(context.get());
  EXPECT_EQ(orphanTask->inheritedRate(), dec("75"));
  EXPECT_EQ(orphanProject->inheritedRate(), dec("50"));
}

TEST_F(WTRatesTest, TheUserDefaultRateStandsWhereTheChainBreaksOff) {
  WTTask* orphanTask = makeTask();
  auto* orphanProject = WTProject::insertNewObject(context.get());
  auto* client = WTClient::insertNewObject(context.get());

  defaults->setValue(QStringLiteral("WTDefaultRate"), QStringLiteral("90"));
  EXPECT_EQ(orphanTask->inheritedRate(), dec("90"));
  EXPECT_EQ(orphanProject->inheritedRate(), dec("90"));
  EXPECT_EQ(client->inheritedRate(), dec("90"));

  defaults->setValue(QStringLiteral("WTDefaultRate"), 80.5);
  EXPECT_EQ(orphanTask->inheritedRate(), dec("80.5"));

  // A project under a client never reads the default itself: the client answers.
  orphanProject->setClient(client);
  client->setRate(dec("110"));
  EXPECT_EQ(orphanProject->inheritedRate(), dec("110"));
}

TEST_F(WTRatesTest, EachKindOfItemCostsByItsOwnRule) {
  auto* project = WTProject::insertNewObject(context.get());
  WTTask* task = makeTask(project);
  task->setRate(dec("80"));
  const Date nine = berlin(2026, 3, 2, 9, 0);

  WTTime* time = makeTime(task, nine, nine.addingSeconds(90 * 60));
  EXPECT_EQ(time->duration(), 90);
  EXPECT_EQ(time->cost(), dec("120"));

  auto* flat = makeItem<WTFlat>(task, nine);
  flat->setMinutes(30);
  task->setRate(dec("75"));
  EXPECT_EQ(flat->cost(), dec("37.5"));

  auto* expense = makeItem<WTExpense>(task, nine);
  expense->setExpense(dec("12.30"));
  EXPECT_TRUE(expense->cost().isIdenticalTo(dec("12.30")));
  task->setRate(dec("999"));
  EXPECT_TRUE(expense->cost().isIdenticalTo(dec("12.30")));

  auto* note = makeItem<WTNote>(task, nine);
  auto* todo = makeItem<WTToDo>(task, nine);
  EXPECT_EQ(note->duration(), 0);
  EXPECT_TRUE(note->cost().isZero());
  EXPECT_EQ(todo->duration(), 0);
  EXPECT_TRUE(todo->cost().isZero());

  // An item's own stored rate never counts.
  time->setRate(dec("1"));
  EXPECT_EQ(time->cost(), dec("999") * dec("1.5"));
}

TEST_F(WTRatesTest, CostsKeepFullDecimalPrecision) {
  WTTask* task = makeTask();
  task->setRate(dec("100"));
  const Date start = berlin(2026, 3, 2, 9, 0);
  WTTime* time = makeTime(task, start, start.addingSeconds(60));
  EXPECT_EQ(time->cost().toString(), QStringLiteral("1.6666666666666666666666666666666666667"));
  // Sums add the exact item costs, not a rounded total.
  makeTime(task, start, start.addingSeconds(60));
  EXPECT_EQ(task->cost().toString(), QStringLiteral("3.3333333333333333333333333333333333334"));
}

TEST_F(WTRatesTest, TimeEntriesCountMinuteBoundariesCrossed) {
  WTTask* task = makeTask();
  struct Case {
    Date start, end;
    int minutes;
  } cases[] = {
      {berlin(2026, 5, 4, 10, 0, 59), berlin(2026, 5, 4, 10, 1, 1), 1},
      {berlin(2026, 5, 4, 10, 0, 1), berlin(2026, 5, 4, 10, 0, 59), 0},
      {berlin(2026, 5, 4, 10, 0, 59), berlin(2026, 5, 4, 10, 1, 0), 1},
      {berlin(2026, 5, 4, 9, 15), berlin(2026, 5, 4, 10, 45), 90},
      // Across the spring-forward night: wall clock 01:30 to 03:30 is one real hour.
      {berlin(2026, 3, 29, 1, 30), berlin(2026, 3, 29, 3, 30), 60},
      // An end before the start gives a negative count, truncated toward zero.
      {berlin(2026, 5, 4, 10, 5), berlin(2026, 5, 4, 10, 0, 30), -5},
  };
  for (const Case& c : cases) {
    WTTime* time = makeTime(task, c.start, c.end);
    EXPECT_EQ(time->duration(), c.minutes) << c.start.secondsSince1970();
  }
}

TEST_F(WTRatesTest, ARunningEntryGrowsWithTheClock) {
  WTTask* task = makeTask();
  setNow(berlin(2026, 5, 4, 10, 0, 30));
  WTTime* time = task->toggleTimer();
  ASSERT_NE(time, nullptr);
  clockNow = berlin(2026, 5, 4, 10, 0, 59);
  EXPECT_EQ(time->duration(), 0);
  clockNow = berlin(2026, 5, 4, 10, 1, 0);
  EXPECT_EQ(time->duration(), 1);
  EXPECT_EQ(task->duration(), 1);
  EXPECT_EQ(task->runningDuration(), 1);
}

TEST_F(WTRatesTest, SumsRunUpFromItemsToClients) {
  auto* client = WTClient::insertNewObject(context.get());
  auto* projectA = WTProject::insertNewObject(context.get());
  auto* projectB = WTProject::insertNewObject(context.get());
  projectA->setClient(client);
  projectB->setClient(client);
  projectB->setRate(dec("60"));
  client->setRate(dec("120"));
  WTTask* a1 = makeTask(projectA);
  WTTask* b1 = makeTask(projectB);
  const Date start = berlin(2026, 1, 5, 8, 0);
  makeTime(a1, start, start.addingSeconds(30 * 60));  // 30 min at 120 = 60
  makeTime(b1, start, start.addingSeconds(90 * 60));  // 90 min at 60 = 90
  auto* expense = makeItem<WTExpense>(b1, start);
  expense->setExpense(dec("0.01"));

  EXPECT_EQ(projectA->duration(), 30);
  EXPECT_EQ(projectB->duration(), 90);
  EXPECT_EQ(client->duration(), 120);
  EXPECT_EQ(client->cost(), dec("150.01"));
  EXPECT_EQ(
      KeyPath::valueForKeyPath(KeyPath::variantFromObject(client), u"projects.@sum.duration").toLongLong(),
      120);

  auto* empty = WTClient::insertNewObject(context.get());
  EXPECT_EQ(empty->duration(), 0);
  EXPECT_TRUE(empty->cost().isZero());

  // A report's memo of task totals holds while it lives, nested ones included, and not a moment longer.
  auto* later = makeTime(a1, start.addingSeconds(3600), start.addingSeconds(3600 + 15 * 60));
  {
    const WTTask::TotalsMemo memo;
    EXPECT_EQ(client->cost(), dec("180.01"));
    {
      const WTTask::TotalsMemo inner;
      EXPECT_EQ(a1->duration(), 45);
    }
    EXPECT_EQ(a1->duration(), 45);
  }
  later->setEndDate(start.addingSeconds(3600 + 45 * 60));
  EXPECT_EQ(a1->duration(), 75);
  EXPECT_EQ(client->cost(), dec("240.01"));
}

// Whatever changes a total below a client, its observers from the entry up to the client hear of it: the
// header of a project once showed an old total after an entry's start was moved or a rate was undone.
TEST_F(WTRatesTest, TotalChangesReachObserversThreeLevelsUp) {
  struct Records {
    WTClient* client;
    WTProject* project;
    WTTask* task;
    WTFlat* flat;
    WTTime* time;  // 12:00 to 12:30
  };
  struct Case {
    const char* name;
    std::function<void(Records&)> prepare;
    std::function<void(Records&)> change;
    int duration;  // the client's, after the change
    const char* cost;
  };
  const auto undo = [this](Records&) { context->undoManager().undo(); };
  const auto startEarlier = [](Records& r) {
    r.time->setStartDate(r.time->startDate()->addingSeconds(-900));
  };
  const Case cases[] = {
      {"flat fee minutes", {}, [](Records& r) { r.flat->setMinutes(45); }, 75, "125"},
      {"entry start", {}, startEarlier, 75, "125"},
      {"entry start undone", startEarlier, undo, 60, "100"},
      {"task rate undone", [](Records& r) { r.task->setRate(dec("60")); }, undo, 60, "100"},
      {"project rate undone", [](Records& r) { r.project->setRate(dec("60")); }, undo, 60, "100"},
  };
  for (const Case& test : cases) {
    SCOPED_TRACE(test.name);
    Records r;
    r.client = WTClient::insertNewObject(context.get());
    r.project = WTProject::insertNewObject(context.get());
    r.project->setClient(r.client);
    r.task = makeTask(r.project);
    r.flat = makeItem<WTFlat>(r.task, berlin(2026, 2, 2, 12));
    r.flat->setMinutes(30);
    r.time = makeTime(r.task, berlin(2026, 2, 2, 12), berlin(2026, 2, 2, 12, 30));
    context->processPendingChanges();  // each turn is undone on its own
    if (test.prepare) test.prepare(r);
    context->processPendingChanges();

    KeyCounter clientDuration(*context, r.client, "duration"), clientCost(*context, r.client, "cost");
    KeyCounter projectDuration(*context, r.project, "duration"), projectCost(*context, r.project, "cost");
    KeyCounter taskDuration(*context, r.task, "duration"), taskCost(*context, r.task, "cost");
    KeyCounter entryDuration(*context, r.time, "duration");
    const int before = r.client->duration(), entryBefore = r.time->duration();
    test.change(r);
    EXPECT_TRUE(r.time->duration() == entryBefore || entryDuration.count >= 1);
    EXPECT_GE(clientCost.count, 1);
    EXPECT_GE(projectCost.count, 1);
    EXPECT_GE(taskCost.count, 1);
    if (r.client->duration() != before) {
      EXPECT_GE(clientDuration.count, 1);
      EXPECT_GE(projectDuration.count, 1);
      EXPECT_GE(taskDuration.count, 1);
    }
    EXPECT_EQ(r.client->duration(), test.duration);
    EXPECT_EQ(r.client->cost(), dec(test.cost));  // at the client's 100
  }
}

TEST_F(WTRatesTest, AnExpenseChangeAnnouncesCostButNotDuration) {
  auto* client = WTClient::insertNewObject(context.get());
  auto* project = WTProject::insertNewObject(context.get());
  project->setClient(client);
  WTTask* task = makeTask(project);
  auto* expense = makeItem<WTExpense>(task, berlin(2026, 2, 2, 12));

  KeyCounter clientDuration(*context, client, "duration"), clientCost(*context, client, "cost");
  KeyCounter taskDuration(*context, task, "duration");
  expense->setExpense(dec("19.99"));
  EXPECT_EQ(clientDuration.count, 0);
  EXPECT_EQ(taskDuration.count, 0);
  EXPECT_GE(clientCost.count, 1);
  EXPECT_EQ(client->cost(), dec("19.99"));
}

TEST_F(WTRatesTest, ARateChangeReachesTheTasksBelow) {
  auto* client = WTClient::insertNewObject(context.get());
  auto* project = WTProject::insertNewObject(context.get());
  project->setClient(client);
  WTTask* task = makeTask(project);

  KeyCounter taskRate(*context, task, "rate"), taskInherited(*context, task, "inheritedRate");
  KeyCounter taskCost(*context, task, "cost"), projectInherited(*context, project, "inheritedRate");
  KeyCounter clientCost(*context, client, "cost");
  client->setRate(dec("130"));
  EXPECT_GE(taskRate.count, 1);
  EXPECT_GE(taskInherited.count, 1);
  EXPECT_GE(taskCost.count, 1);
  EXPECT_GE(projectInherited.count, 1);
  EXPECT_GE(clientCost.count, 1);
}

TEST_F(WTRatesTest, ItemsJoiningOrLeavingATaskRefreshItsTotals) {
  auto* client = WTClient::insertNewObject(context.get());
  auto* project = WTProject::insertNewObject(context.get());
  project->setClient(client);
  WTTask* from = makeTask(project);
  WTTask* to = makeTask(project);
  const Date start = berlin(2026, 2, 2, 12);
  WTTime* time = makeTime(from, start, start.addingSeconds(600));

  KeyCounter fromDuration(*context, from, "duration"), toDuration(*context, to, "duration");
  KeyCounter fromChildren(*context, from, "children"), clientDuration(*context, client, "duration");
  time->setTask(to);
  EXPECT_GE(fromDuration.count, 1);
  EXPECT_GE(toDuration.count, 1);
  EXPECT_GE(fromChildren.count, 1);
  EXPECT_GE(clientDuration.count, 1);
  EXPECT_EQ(from->duration(), 0);
  EXPECT_EQ(to->duration(), 10);
}
