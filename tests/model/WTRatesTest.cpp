#include "KeyPath.h"
#include "ModelFixture.h"

#include <functional>
#include <map>

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

  // A broken chain: each level has its own literal, until the user sets a default rate.
  WTTask* orphanTask = makeTask();
  auto* orphanProject = WTProject::insertNewObject(context.get());
  auto* orphanClient = WTClient::insertNewObject(context.get());
  EXPECT_EQ(orphanTask->inheritedRate(), dec("75"));
  EXPECT_EQ(orphanProject->inheritedRate(), dec("50"));
  defaults->setValue(QStringLiteral("WTDefaultRate"), QStringLiteral("90"));
  EXPECT_EQ(orphanTask->inheritedRate(), dec("90"));
  EXPECT_EQ(orphanProject->inheritedRate(), dec("90"));
  EXPECT_EQ(orphanClient->inheritedRate(), dec("90"));
  defaults->setValue(QStringLiteral("WTDefaultRate"), 80.5);
  EXPECT_EQ(orphanTask->inheritedRate(), dec("80.5"));
  // A project under a client never reads the default itself: the client answers.
  orphanProject->setClient(orphanClient);
  orphanClient->setRate(dec("110"));
  EXPECT_EQ(orphanProject->inheritedRate(), dec("110"));
}

TEST_F(WTRatesTest, EachKindOfItemCostsByItsOwnRuleInFullPrecision) {
  WTTask* task = makeTask(WTProject::insertNewObject(context.get()));
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
  task->setRate(dec("999"));
  EXPECT_TRUE(expense->cost().isIdenticalTo(dec("12.30")));
  for (WTItem* none : QList<WTItem*>{makeItem<WTNote>(task, nine), makeItem<WTToDo>(task, nine)}) {
    EXPECT_EQ(none->duration(), 0);
    EXPECT_TRUE(none->cost().isZero());
  }
  time->setRate(dec("1"));  // an item's own stored rate never counts
  EXPECT_EQ(time->cost(), dec("1498.5"));

  // Sums add the exact item costs, not a rounded total.
  WTTask* exact = makeTask();
  exact->setRate(dec("100"));
  WTTime* minute = makeTime(exact, nine, nine.addingSeconds(60));
  EXPECT_EQ(minute->cost().toString(), QStringLiteral("1.6666666666666666666666666666666666667"));
  makeTime(exact, nine, nine.addingSeconds(60));
  EXPECT_EQ(exact->cost().toString(), QStringLiteral("3.3333333333333333333333333333333333334"));
}

TEST_F(WTRatesTest, TimeEntriesCountMinuteBoundariesCrossed) {
  WTTask* task = makeTask();
  const struct {
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
  for (const auto& c : cases)
    EXPECT_EQ(makeTime(task, c.start, c.end)->duration(), c.minutes) << c.start.secondsSince1970();
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
  makeItem<WTExpense>(b1, start)->setExpense(dec("0.01"));
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

// Whatever changes a total below a client, its observers from the entry up to the client hear of it,
// and only of what changed: the header of a project once showed an old total after an entry's start was
// moved or a rate was undone.
TEST_F(WTRatesTest, TotalChangesReachObserversThreeLevelsUp) {
  struct Records {
    WTClient* client;
    WTProject* project;
    WTTask *task, *other;
    WTFlat* flat;        // 30 minutes
    WTTime* time;        // 12:00 to 12:30
    WTExpense* expense;  // no amount yet
  };
  const auto undo = [this](Records&) { context->undoManager().undo(); };
  const auto startEarlier = [](Records& r) {
    r.time->setStartDate(r.time->startDate()->addingSeconds(-900));
  };
  const char* const allTotals =
      "client.cost project.cost task.cost client.duration project.duration task.duration";
  const auto setTaskRate = [](Records& r) { r.task->setRate(dec("60")); };
  const auto setProjectRate = [](Records& r) { r.project->setRate(dec("60")); };
  // clang-format off
  const struct {
    const char* name;
    std::function<void(Records&)> prepare, change;
    const char* heard;   // record.key announcements each made at least once
    const char* silent;  // and those never made
    int clientDuration, taskDuration;
    const char* cost;  // the client's, at its 100
  } cases[] = {
      {"flat fee minutes", {}, [](Records& r) { r.flat->setMinutes(45); }, allTotals, "", 75, 75, "125"},
      {"entry start", {}, startEarlier, allTotals, "", 75, 75, "125"},
      {"entry start undone", startEarlier, undo, "time.duration client.cost client.duration task.duration",
       "", 60, 60, "100"},
      {"task rate undone", setTaskRate, undo, "client.cost project.cost task.cost", "", 60, 60, "100"},
      {"project rate undone", setProjectRate, undo, "client.cost project.cost task.cost", "", 60, 60, "100"},
      {"expense", {}, [](Records& r) { r.expense->setExpense(dec("19.99")); }, "client.cost task.cost",
       "client.duration task.duration", 60, 60, "119.99"},
      {"client rate", {}, [](Records& r) { r.client->setRate(dec("130")); },
       "task.rate task.inheritedRate task.cost project.inheritedRate client.cost", "", 60, 60, "130"},
      {"entry to another task", {}, [](Records& r) { r.time->setTask(r.other); },
       "task.duration task.children other.duration client.duration", "", 60, 30, "100"},
  };
  // clang-format on
  for (const auto& test : cases) {
    SCOPED_TRACE(test.name);
    Records r;
    r.client = WTClient::insertNewObject(context.get());
    r.project = WTProject::insertNewObject(context.get());
    r.project->setClient(r.client);
    r.task = makeTask(r.project);
    r.other = makeTask(r.project);
    r.flat = makeItem<WTFlat>(r.task, berlin(2026, 2, 2, 12));
    r.flat->setMinutes(30);
    r.time = makeTime(r.task, berlin(2026, 2, 2, 12), berlin(2026, 2, 2, 12, 30));
    r.expense = makeItem<WTExpense>(r.task, berlin(2026, 2, 2, 12));
    context->processPendingChanges();  // each turn is undone on its own
    if (test.prepare) test.prepare(r);
    context->processPendingChanges();
    const std::map<QString, WTObject*> records{
        {"client", r.client}, {"project", r.project}, {"task", r.task}, {"other", r.other}, {"time", r.time}};
    std::vector<std::tuple<QString, std::unique_ptr<KeyCounter>, bool>> counters;  // must it be heard?
    for (const auto& [names, heard] : {std::pair{test.heard, true}, std::pair{test.silent, false}}) {
      for (const QString& name : QString::fromLatin1(names).split(' ', Qt::SkipEmptyParts)) {
        const QStringList parts = name.split('.');
        counters.emplace_back(name, std::make_unique<KeyCounter>(*context, records.at(parts[0]), parts[1]),
                              heard);
      }
    }
    test.change(r);
    for (const auto& [name, counter, heard] : counters)
      EXPECT_EQ(counter->count > 0, heard) << name.toStdString();
    EXPECT_EQ(r.client->duration(), test.clientDuration);
    EXPECT_EQ(r.task->duration(), test.taskDuration);
    EXPECT_EQ(r.client->cost(), dec(test.cost));
  }
}
