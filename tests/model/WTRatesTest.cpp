#include "ModelFixture.h"
#include "WTBudget.h"

#include "UserLocale.h"
#include "WTItemContainer.h"

#include <functional>
#include <map>
#include <utility>

class WTRatesTest : public ModelTest {};

// A broken chain has a literal at each level until a default rate is set; a client answers for its projects.
TEST_F(WTRatesTest, RatesAreInheritedDownwardWithTheirOwnFallbacks) {
  // clang-format off
  const std::tuple<bool, const char*, const char*, const char*, QVariant, QStringList> rows[] = {
      // linked, rates of client, project and task, the default rate; inherited rates of task, project, client
      {true, "120", nullptr, nullptr, {}, {"120", "120", "120"}},
      {true, nullptr, nullptr, nullptr, {}, {"100", "100", "100"}},
      {true, nullptr, "65", nullptr, {}, {"65", "65", "100"}},
      {true, nullptr, "65", "70.25", {}, {"70.25", "65", "100"}},
      {false, nullptr, nullptr, nullptr, {}, {"75", "50", "100"}},
      {false, nullptr, nullptr, nullptr, "90", {"90", "90", "90"}},
      {true, "110", nullptr, nullptr, "90", {"110", "110", "110"}}};
  // clang-format on
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
  auto* client = makeClient({});
  auto* projectA = makeProject({}, client);
  auto* projectB = makeProject({}, client);
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

// Each time entry is billed by the rule in force for its task, worked out anew on every read; the raw
// minutes stay. Entries of 0, 7, 46, 5 and 14 minutes, one running for 7, and a flat fee of 7 minutes.
TEST_F(WTRatesTest, RoundingRulesBillEachTimeEntryAndAreInheritedLikeRates) {
  // Rules as "minutes mode", either part alone, or "-" for none: preferences, client, project, task. A half
  // goes up to the nearest.
  // clang-format off
  const std::tuple<const char*, const char*, const char*, const char*, const char*> rows[] = {
      {"-", "-", "-", "-", "0 7 46 5 14 7 7"}, {"-", "15 up", "-", "-", "0 15 60 15 15 15 7"},
      {"-", "15 down", "-", "-", "0 0 45 0 0 0 7"}, {"-", "10 nearest", "-", "-", "0 10 50 10 10 10 7"},
      {"-", "15 up", "6", "-", "0 12 48 6 18 12 7"}, {"-", "15 up", "6 down", "30", "0 0 30 0 0 0 7"},
      {"15 up", "-", "-", "-", "0 15 60 15 15 15 7"}, {"15 up", "1", "-", "-", "0 7 46 5 14 7 7"},
      {"15 nearest", "-", "-", "up", "0 15 60 15 15 15 7"},
      {"15 up", "-", "-", "0 nearest", "0 0 45 0 15 0 7"}};
  // clang-format on
  setNow(berlin(2026, 3, 2, 12, 7));
  for (const auto& [preferences, clientRule, projectRule, taskRule, billed] : rows) {
    SCOPED_TRACE(std::string(preferences) + " / " + clientRule + " / " + projectRule + " / " + taskRule);
    auto* client = makeClient({});
    auto* project = makeProject({}, client);
    WTTask* task = makeTask(project);
    const Date start = berlin(2026, 3, 2, 9);
    QList<WTItem*> items;
    for (int minutes : {0, 7, 46, 5, 14}) items << makeTime(task, start, start.addingSeconds(minutes * 60.0));
    auto* running = makeItem<WTTime>(task, berlin(2026, 3, 2, 12));
    running->setRunning(true);
    auto* flat = makeItem<WTFlat>(task, start);
    flat->setMinutes(7);
    items << running << flat;
    // The rules come after the entries: nothing billed before is kept.
    const QStringList preference = QString::fromLatin1(preferences).split(' ');
    defaults->setValue("WTRoundingMinutes", preference[0] == "-" ? QVariant() : QVariant(preference[0]));
    defaults->setValue("WTRoundingMode",
                       preference.value(1).isEmpty() ? QVariant() : QVariant(preference[1]));
    for (const auto& [record, rule] :
         {std::pair<WTObject*, const char*>{client, clientRule}, {project, projectRule}, {task, taskRule}})
      for (const QString& part : QString::fromLatin1(rule).split(' '))
        EXPECT_TRUE(part == "-" ||
                    record->setValue(part[0].isDigit() ? "roundingMinutes" : "roundingMode", part));
    QStringList minutes;
    int sum = 0;
    for (const WTItem* item : items)
      minutes << QString::number(item->billedDuration()), sum += item->billedDuration();
    EXPECT_EQ(minutes.join(' '), billed);
    EXPECT_EQ((std::vector{task->billedDuration(), project->billedDuration(), client->billedDuration()}),
              (std::vector{sum, sum, sum}));
    EXPECT_EQ(task->duration(), 0 + 7 + 46 + 5 + 14 + 7 + 7);
  }

  // A task moved to another project takes that project's rule, and a rule changed later bills at once.
  auto* upToFifteen = WTProject::insertNewObject(context.get());
  auto* downToSix = WTProject::insertNewObject(context.get());
  upToFifteen->setRoundingMinutes(15);
  upToFifteen->setRoundingMode("up");
  downToSix->setRoundingMinutes(6);
  downToSix->setRoundingMode("down");
  WTTask* task = makeTask(upToFifteen);
  makeTime(task, berlin(2026, 3, 3, 9), berlin(2026, 3, 3, 9, 46));
  EXPECT_EQ(task->billedDuration(), 60);
  KeyCounter billed(*context, task, "billedDuration");
  task->setProject(downToSix);
  EXPECT_EQ(task->billedDuration(), 42);
  EXPECT_GT(std::exchange(billed.count, 0), 0);
  downToSix->setRoundingMinutes(20);
  EXPECT_EQ(task->billedDuration(), 40);
  EXPECT_GT(billed.count, 0);
}

// Each item's cost is rounded once to the minor unit of its client's currency (else the preferences'), so
// the lines of every level add up to the level above to the last place: items, day groups, tasks,
// projects, client. Flat fees and expenses are billed as typed.
TEST_F(WTRatesTest, BilledCostsRoundEachItemOnceAndAddUpAtEveryLevel) {
  const UserLocale user("en_US");
  auto* client = WTClient::insertNewObject(context.get());
  client->setRate(dec("100"));
  client->setRoundingMinutes(15);
  client->setRoundingMode("up");
  auto* projectA = makeProject({}, client);
  auto* projectB = makeProject({}, client);
  projectB->setRate(dec("70"));
  projectB->setRoundingMinutes(1);
  WTTask* a = makeTask(projectA);
  WTTask* b = makeTask(projectB);
  const Date monday = berlin(2026, 4, 6, 9), tuesday = berlin(2026, 4, 7, 9);
  QList<WTItem*> items = {makeTime(a, monday, monday.addingSeconds(7 * 60)),
                          makeTime(a, tuesday, tuesday.addingSeconds(46 * 60)),
                          makeItem<WTExpense>(a, monday),
                          makeItem<WTFlat>(a, tuesday),
                          makeTime(b, monday, monday.addingSeconds(60)),
                          makeTime(b, tuesday, tuesday.addingSeconds(20 * 60)),
                          makeItem<WTNote>(b, monday)};
  static_cast<WTExpense*>(items[2])->setExpense(dec("12.3456"));
  static_cast<WTFlat*>(items[3])->setMinutes(10);
  // The client's currency and the preferences'; billed per item, then the client's total.
  const std::tuple<const char*, const char*, const char*> rows[] = {
      {"", "", "USD 25.00 100.00 12.35 16.67 1.17 23.33 0.00 | 178.52"},  // the locale's
      {"KWD", "", "KWD 25.000 100.000 12.346 16.667 1.167 23.333 0.000 | 178.513"},
      {"JPY", "KWD", "JPY 25 100 12 17 1 23 0 | 178"},
      {"", "KWD", "KWD 25.000 100.000 12.346 16.667 1.167 23.333 0.000 | 178.513"},
      {"eur", "", "EUR 25.00 100.00 12.35 16.67 1.17 23.33 0.00 | 178.52"}};
  for (const auto& [currency, preference, expected] : rows) {
    SCOPED_TRACE(std::string(currency) + " / " + preference);
    client->setCurrency(QString::fromLatin1(currency));
    defaults->setValue("WTCurrency", *preference ? QVariant(preference) : QVariant());
    QStringList billed = {client->billingCurrency()};
    Decimal sum;
    for (const WTItem* item : items) {
      billed << item->billedCost().toString();
      sum += item->billedCost();
      EXPECT_EQ(item->billingCurrency(), client->billingCurrency());
    }
    EXPECT_EQ(billed.join(' ') + " | " + client->billedCost().toString(), expected);
    Decimal groups;
    for (const auto& group : WTItemContainer::containersByKeyPath("startDate.midnight", QList<WTTask*>{a, b}))
      groups += group->billedCost();
    EXPECT_EQ((std::vector{a->billedCost() + b->billedCost(), projectA->billedCost() + projectB->billedCost(),
                           client->billedCost(), groups}),
              (std::vector{sum, sum, sum, sum}));
  }
  // The exact cost stays beside it: 7 + 46 minutes at 100, 10 at 100, 21 at 70, and the expense.
  EXPECT_EQ(client->cost(), dec("141.8456"));
  EXPECT_EQ(a->billedDuration() + b->billedDuration(), 15 + 60 + 10 + 1 + 20);
  EXPECT_EQ(client->duration(), 7 + 46 + 10 + 1 + 20);
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

// A project's header once showed an old total after an entry's start was moved or a rate was undone: each
// total a change moves is announced, on every level up to the client.
TEST_F(WTRatesTest, TotalChangesReachObserversThreeLevelsUp) {
  // A 30 minutes' fee, an entry 12:00 to 12:30 and an expense without amount, at the client's 100.
  // clang-format off
  struct Records { WTClient* client; WTProject* project; WTTask *task, *other; WTFlat* flat; WTTime* time; WTExpense* expense; };
  const auto undo = [this](Records&) { context->undoManager().undo(); };
  const auto startEarlier = [](Records& r) { r.time->setStartDate(r.time->startDate()->addingSeconds(-900)); };
  // Rows: first, change, what else is announced (!: never), client and task minutes, client cost.
  struct Case { const char* name; std::function<void(Records&)> prepare, change; const char *announced, *after; };
  const Case cases[] = {
      {"flat fee minutes", {}, [](Records& r) { r.flat->setMinutes(45); }, "", "75 75 125"},
      {"entry start", {}, startEarlier, "", "75 75 125"},
      {"entry start undone", startEarlier, undo, "time.duration", "60 60 100"},
      {"task rate undone", [](Records& r) { r.task->setRate(dec("60")); }, undo, "", "60 60 100"},
      {"project rate undone", [](Records& r) { r.project->setRate(dec("60")); }, undo, "", "60 60 100"},
      {"expense", {}, [](Records& r) { r.expense->setExpense(dec("19.99")); }, "!client.duration !task.duration", "60 60 119.99"},
      {"client rate", {}, [](Records& r) { r.client->setRate(dec("130")); }, "task.rate", "60 60 130"},
      // A rule or a currency bills anew what is there: the raw totals stay.
      {"task rule", {}, [](Records& r) { r.task->setRoundingMinutes(45); }, "!task.duration !client.cost", "60 60 100"},
      {"task rule undone", [](Records& r) { r.task->setRoundingMinutes(45), r.task->setRoundingMode("down"); }, undo, "", "60 60 100"},
      {"project rule", [](Records& r) { r.project->setRoundingMinutes(20); },
       [](Records& r) { r.project->setRoundingMode("down"); }, "task.roundingRule", "60 60 100"},
      {"client rule", {}, [](Records& r) { r.client->setRoundingMinutes(20); }, "", "60 60 100"},
      {"client currency", {}, [](Records& r) { r.client->setCurrency("JPY"); }, "!task.billedDuration", "60 60 100"},
      {"preferred rule", {}, [this](Records&) { defaults->setValue("WTRoundingMinutes", 45); }, "", "60 60 100"},
      {"preferred currency", {}, [this](Records&) { defaults->setValue("WTCurrency", "KWD"); }, "", "60 60 100"},
      {"task out of its project", {}, [](Records& r) { r.task->setProject(nullptr); }, "", "0 60 0"},
      {"entry to another task", {}, [](Records& r) { r.time->setTask(r.other); }, "task.children", "60 30 100"},
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
    const auto valueOf = [&](const QString& key) {
      return records.at(key.section('.', 0, 0))->valueForKey(key.section('.', 1)).toString();
    };
    std::map<QString, std::pair<QString, std::unique_ptr<KeyCounter>>> totals;  // value before, announcements
    const auto watch = [&](const QString& key) {
      totals.try_emplace(
          key, valueOf(key),
          std::make_unique<KeyCounter>(*context, records.at(key.section('.', 0, 0)), key.section('.', 1)));
    };
    const QStringList listed = QString::fromLatin1(announced).split(' ', Qt::SkipEmptyParts);
    for (const QString& key : listed) watch(key.sliced(key.startsWith('!')));
    for (const char* record : {"client", "project", "task", "other"})  // an item's own totals go unannounced
      for (const char* total :
           {"cost", "duration", "billedCost", "billedDuration", "billingCurrency", "inheritedRate"})
        watch(QString::fromLatin1(record) + '.' + total);
    change(r);
    int moved = 0;
    for (const auto& [key, total] : totals) {
      const bool changed = valueOf(key) != total.first;
      moved += changed;
      if (listed.contains('!' + key)) {
        EXPECT_EQ(total.second->count, 0) << key.toStdString();
      } else if (changed || listed.contains(key)) {
        EXPECT_GT(total.second->count, 0) << key.toStdString() << " went from " << total.first.toStdString();
      }
    }
    EXPECT_GT(moved, 0) << "the change moves some total";
    EXPECT_EQ(QStringLiteral("%1 %2 %3")
                  .arg(r.client->duration())
                  .arg(r.task->duration())
                  .arg(r.client->cost().toDouble()),
              after);
  }
}

// The lines are 80 % (reached) and 100 % (passed); a step across both names the higher one, going down
// names none, and without a budget above zero nothing is measured. The whole percent shown is cut below
// the budget and raised past it, and exact (57 of 100 is 57 %).
TEST(WTBudgetTest, LevelsAndTheLineAStepCrosses) {
  using L = WTBudget::Level;
  using P = std::optional<std::int64_t>;
  // clang-format off
  const std::tuple<const char*, const char*, const char*, std::optional<L>, std::optional<L>, P> rows[] = {
      // billed before, after, budget; level after; line crossed; percent after
      {"0", "79.99", "100", L::Within, {}, 79}, {"79.99", "80", "100", L::Warning, L::Warning, 80},
      {"80", "100", "100", L::Warning, {}, 100}, {"100", "100.01", "100", L::Over, L::Over, 101},
      {"10", "150", "100", L::Over, L::Over, 150}, {"0", "57", "100", L::Within, {}, 57},
      {"0", "110", "100", L::Over, L::Over, 110}, {"0", "-5.5", "100", L::Within, {}, -6},
      {"150", "10", "100", L::Within, {}, 10}, {"0.0007", "0.0008", "0.001", L::Warning, L::Warning, 80},
      {"0", "5", "0", {}, {}, {}}, {"0", "5", "-1", {}, {}, {}}};
  // clang-format on
  for (const auto& [before, after, budget, level, crossed, percent] : rows) {
    SCOPED_TRACE(std::string(before) + " → " + after + " of " + budget);
    EXPECT_EQ(WTBudget::level(dec(after), dec(budget)), level);
    EXPECT_EQ(WTBudget::crossed(dec(before), dec(after), dec(budget)), crossed);
    EXPECT_EQ(WTBudget::percent(dec(after), dec(budget)), percent);
  }
  EXPECT_EQ(WTBudget::level(dec("1000"), std::nullopt), std::nullopt);
}
