#include "ModelFixture.h"
#include "WTBudget.h"

#include <functional>
#include <map>

class WTRatesTest : public ModelTest {};

// A broken chain has a literal at each level until a default rate is set; a client answers for its projects.
TEST_F(WTRatesTest, RatesAreInheritedDownwardWithTheirOwnFallbacks) {
  const std::tuple<bool, const char*, const char*, const char*, QVariant, QStringList> rows[] = {
      // linked, rates of client, project and task, the default rate; inherited rates of task, project, client
      {true, "120", nullptr, nullptr, {}, {"120", "120", "120"}},
      {true, nullptr, nullptr, nullptr, {}, {"100", "100", "100"}},
      {true, nullptr, "65", nullptr, {}, {"65", "65", "100"}},
      {true, nullptr, "65", "70.25", {}, {"70.25", "65", "100"}},
      {false, nullptr, nullptr, nullptr, {}, {"75", "50", "100"}},
      {false, nullptr, nullptr, nullptr, "90", {"90", "90", "90"}},
      {true, "110", nullptr, nullptr, "90", {"110", "110", "110"}}};
  for (const auto& [linked, clientRate, projectRate, taskRate, defaultRate, expected] : rows) {
    SCOPED_TRACE(expected.join(' ').toStdString() + " default " + defaultRate.toString().toStdString());
    defaultRate.isNull() ? defaults->removeValue("WTDefaultRate")
                         : defaults->setValue("WTDefaultRate", defaultRate);
    auto* client = WTClient::insertNewObject(context.get());
    auto* project = WTProject::insertNewObject(context.get());
    WTTask* task = makeTask(linked ? project : nullptr);
    if (linked) project->setClient(client);
    for (const auto& [object, rate] :
         {std::pair<WTObject*, const char*>{client, clientRate}, {project, projectRate}, {task, taskRate}})
      if (rate) object->setValue("rate", QString::fromLatin1(rate));
    EXPECT_EQ((std::vector{task->inheritedRate(), project->inheritedRate(), client->inheritedRate()}),
              (std::vector{*Decimal::fromString(expected[0]), *Decimal::fromString(expected[1]),
                           *Decimal::fromString(expected[2])}));
  }
}

// Costs in full precision (an item's own rate never counts); a report's totals memo lives no longer than it.
TEST_F(WTRatesTest, ItemCostsAndSumsUpToClients) {
  auto* client = WTClient::insertNewObject(context.get());
  auto* projectA = WTProject::insertNewObject(context.get());
  auto* projectB = WTProject::insertNewObject(context.get());
  projectA->setClient(client);
  projectB->setClient(client);
  projectB->setRate(dec("75"));
  client->setRate(dec("120"));
  WTTask* a1 = makeTask(projectA);
  WTTask* b1 = makeTask(projectB);
  const Date start = berlin(2026, 1, 5, 8, 0);
  WTTime* time = makeTime(a1, start, start.addingSeconds(30 * 60));  // 30 min at 120 = 60
  time->setRate(dec("1"));
  auto* flat = makeItem<WTFlat>(b1, start);  // 30 min at 75 = 37.5
  flat->setMinutes(30);
  auto* expense = makeItem<WTExpense>(b1, start);
  expense->setExpense(dec("12.30"));
  for (WTItem* none : QList<WTItem*>{makeItem<WTNote>(a1, start), makeItem<WTToDo>(a1, start)})
    EXPECT_EQ(none->duration() + none->cost().toDouble(), 0);
  b1->setRate(dec("999"));  // the expense keeps its amount
  EXPECT_TRUE(expense->cost().isIdenticalTo(dec("12.30")));
  b1->setRate(std::nullopt);
  EXPECT_EQ((std::vector<qint64>{time->duration(), flat->duration(), projectA->duration(),
                                 projectB->duration(), client->duration()}),
            (std::vector<qint64>{30, 30, 30, 30, 60}));
  EXPECT_EQ((std::vector{time->cost(), flat->cost(), client->cost()}),
            (std::vector{dec("60"), dec("37.5"), dec("109.8")}));
  auto* empty = WTClient::insertNewObject(context.get());
  EXPECT_EQ(empty->duration() + empty->cost().toDouble(), 0);

  auto* later = makeTime(a1, start.addingSeconds(3600), start.addingSeconds(3600 + 15 * 60));
  {
    const WTTask::TotalsMemo memo;
    EXPECT_EQ(client->cost(), dec("139.8"));
    {
      const WTTask::TotalsMemo inner;
      EXPECT_EQ(a1->duration(), 45);
    }
    EXPECT_EQ(a1->duration(), 45);
  }
  later->setEndDate(start.addingSeconds(3600 + 45 * 60));
  EXPECT_EQ(a1->duration(), 75);
  EXPECT_EQ(client->cost(), dec("199.8"));

  WTTask* exact = makeTask();
  exact->setRate(dec("100"));
  EXPECT_EQ(makeTime(exact, start, start.addingSeconds(60))->cost().toString(),
            "1.6666666666666666666666666666666666667");
  makeTime(exact, start, start.addingSeconds(60));
  EXPECT_EQ(exact->cost().toString(), "3.3333333333333333333333333333333333334");
}

TEST_F(WTRatesTest, TimeEntriesCountMinuteBoundariesCrossed) {
  WTTask* task = makeTask();
  const std::tuple<Date, Date, int> cases[] = {
      {berlin(2026, 5, 4, 10, 0, 59), berlin(2026, 5, 4, 10, 1, 1), 1},
      {berlin(2026, 5, 4, 10, 0, 1), berlin(2026, 5, 4, 10, 0, 59), 0},
      {berlin(2026, 5, 4, 10, 0, 59), berlin(2026, 5, 4, 10, 1, 0), 1},
      {berlin(2026, 5, 4, 9, 15), berlin(2026, 5, 4, 10, 45), 90},
      // Across the spring-forward night: wall clock 01:30 to 03:30 is one real hour.
      {berlin(2026, 3, 29, 1, 30), berlin(2026, 3, 29, 3, 30), 60},
      // An end before the start gives a negative count, truncated toward zero.
      {berlin(2026, 5, 4, 10, 5), berlin(2026, 5, 4, 10, 0, 30), -5},
  };
  for (const auto& [start, end, minutes] : cases)
    EXPECT_EQ(makeTime(task, start, end)->duration(), minutes) << start.secondsSince1970();
}

// A project's header once showed an old total after an entry's start was moved or a rate was undone.
TEST_F(WTRatesTest, TotalChangesReachObserversThreeLevelsUp) {
  // A 30 minutes' fee, an entry 12:00 to 12:30 and an expense without amount, at the client's 100.
  // clang-format off
  struct Records { WTClient* client; WTProject* project; WTTask *task, *other; WTFlat* flat; WTTime* time; WTExpense* expense; };
  const auto undo = [this](Records&) { context->undoManager().undo(); };
  const auto startEarlier = [](Records& r) { r.time->setStartDate(r.time->startDate()->addingSeconds(-900)); };
  const char* const allTotals = "client.cost project.cost task.cost client.duration project.duration task.duration";
  // Rows: first, change, record.key announcements (!: never made), client and task minutes, client cost.
  struct Case { const char* name; std::function<void(Records&)> prepare, change; const char *announced, *after; };
  const Case cases[] = {
      {"flat fee minutes", {}, [](Records& r) { r.flat->setMinutes(45); }, allTotals, "75 75 125"},
      {"entry start", {}, startEarlier, allTotals, "75 75 125"},
      {"entry start undone", startEarlier, undo, "time.duration client.cost client.duration task.duration", "60 60 100"},
      {"task rate undone", [](Records& r) { r.task->setRate(dec("60")); }, undo, "client.cost project.cost task.cost", "60 60 100"},
      {"project rate undone", [](Records& r) { r.project->setRate(dec("60")); }, undo, "client.cost project.cost task.cost", "60 60 100"},
      {"expense", {}, [](Records& r) { r.expense->setExpense(dec("19.99")); }, "client.cost task.cost !client.duration !task.duration", "60 60 119.99"},
      {"client rate", {}, [](Records& r) { r.client->setRate(dec("130")); },
       "task.rate task.inheritedRate task.cost project.inheritedRate client.cost", "60 60 130"},
      {"entry to another task", {}, [](Records& r) { r.time->setTask(r.other); },
       "task.duration task.children other.duration client.duration", "60 30 100"},
  };
  // clang-format on
  for (const auto& [name, prepare, change, announced, after] : cases) {
    SCOPED_TRACE(name);
    Records r{};
    r.client = WTClient::insertNewObject(context.get());
    (r.project = WTProject::insertNewObject(context.get()))->setClient(r.client);
    r.task = makeTask(r.project);
    r.other = makeTask(r.project);
    (r.flat = makeItem<WTFlat>(r.task, berlin(2026, 2, 2, 12)))->setMinutes(30);
    r.time = makeTime(r.task, berlin(2026, 2, 2, 12), berlin(2026, 2, 2, 12, 30));
    r.expense = makeItem<WTExpense>(r.task, berlin(2026, 2, 2, 12));
    context->processPendingChanges();  // each turn is undone on its own
    if (prepare) prepare(r);
    context->processPendingChanges();
    const std::map<QString, WTObject*> records{
        {"client", r.client}, {"project", r.project}, {"task", r.task}, {"other", r.other}, {"time", r.time}};
    std::vector<std::pair<QString, std::unique_ptr<KeyCounter>>> counters;
    for (const QString& key : QString::fromLatin1(announced).split(' ')) {
      const QStringList parts = key.sliced(key.startsWith('!')).split('.');
      counters.emplace_back(key, std::make_unique<KeyCounter>(*context, records.at(parts[0]), parts[1]));
    }
    change(r);
    for (const auto& [key, counter] : counters)
      EXPECT_EQ(counter->count > 0, !key.startsWith('!')) << key.toStdString();
    EXPECT_EQ(QStringLiteral("%1 %2 %3")
                  .arg(r.client->duration())
                  .arg(r.task->duration())
                  .arg(r.client->cost().toDouble()),
              after);
  }
}

// The lines are 80 % (reached) and 100 % (passed); a step across both names the higher one, going down
// names none, and without a budget above zero nothing is measured.
TEST(WTBudgetTest, LevelsAndTheLineAStepCrosses) {
  using L = WTBudget::Level;
  const std::tuple<const char*, const char*, const char*, std::optional<L>, std::optional<L>> rows[] = {
      // billed before, after, budget; level after; line crossed
      {"0", "79.99", "100", L::Within, {}},
      {"79.99", "80", "100", L::Warning, L::Warning},
      {"80", "100", "100", L::Warning, {}},
      {"100", "100.01", "100", L::Over, L::Over},
      {"10", "150", "100", L::Over, L::Over},
      {"150", "10", "100", L::Within, {}},
      {"0.0007", "0.0008", "0.001", L::Warning, L::Warning},
      {"0", "5", "0", {}, {}},
      {"0", "5", "-1", {}, {}},
  };
  for (const auto& [before, after, budget, level, crossed] : rows) {
    SCOPED_TRACE(std::string(before) + " → " + after + " of " + budget);
    EXPECT_EQ(WTBudget::level(dec(after), dec(budget)), level);
    EXPECT_EQ(WTBudget::crossed(dec(before), dec(after), dec(budget)), crossed);
  }
  EXPECT_EQ(WTBudget::level(dec("1000"), std::nullopt), std::nullopt);
}
