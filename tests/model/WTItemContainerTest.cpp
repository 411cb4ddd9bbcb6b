#include "ModelFixture.h"
#include "WTItemContainer.h"

class WTItemContainerTest : public ModelTest {};

TEST_F(WTItemContainerTest, ATaskGroupsPendingToDosThenDaysNewestFirst) {
  WTTask* task = makeTask();
  auto* olderOpen = makeItem<WTToDo>(task, berlin(2026, 4, 1, 9));
  auto* newerOpen = makeItem<WTToDo>(task, berlin(2026, 4, 3, 9));
  auto* done = makeItem<WTToDo>(task, berlin(2026, 4, 2, 16));
  done->setCompleted(true);
  WTTime* morning = makeTime(task, berlin(2026, 4, 2, 8), berlin(2026, 4, 2, 9));
  WTTime* evening = makeTime(task, berlin(2026, 4, 2, 23, 59), berlin(2026, 4, 3, 0, 30));
  WTTime* earlier = makeTime(task, berlin(2026, 3, 31, 0, 0), berlin(2026, 3, 31, 1));

  const auto& children = task->children();
  ASSERT_EQ(children.size(), 3u);
  EXPECT_EQ(children[0]->title(), "Pending");
  const std::vector<std::pair<std::optional<Date>, QList<WTItem*>>> expected = {
      {std::nullopt, {newerOpen, olderOpen}},
      {berlin(2026, 4, 2), {evening, done, morning}},
      {berlin(2026, 3, 31), {earlier}}};
  for (std::size_t i = 0; i < expected.size(); ++i)
    EXPECT_EQ(std::pair(children[i]->date(), children[i]->items()), expected[i]) << i;
  EXPECT_EQ(children[1]->duration(), 60 + 31);

  EXPECT_EQ(task->itemContainerForItem(olderOpen), children[0]);
  EXPECT_EQ(task->itemContainerForItem(done), children[1]);
  EXPECT_EQ(task->itemContainerForItem(makeItem<WTNote>(task, berlin(2026, 1, 1))),
            nullptr);  // not rebuilt yet
  EXPECT_TRUE(makeTask()->children().empty());
}

// Undated items group after every day; other keys group by their values, greatest first.
TEST_F(WTItemContainerTest, UndatedItemsGroupAfterEveryDayAndOtherKeysByTheirValues) {
  WTTask* task = makeTask();
  WTTime* second = makeTime(task, berlin(2026, 4, 2, 9), berlin(2026, 4, 2, 10));
  auto* undatedFee = makeItem<WTFlat>(task, berlin(2026, 4, 1));
  undatedFee->setStartDate(std::nullopt);
  WTTime* first = makeTime(task, berlin(2026, 4, 1, 9), berlin(2026, 4, 1, 10));
  auto* undatedExpense = makeItem<WTExpense>(task, berlin(2026, 4, 1));
  undatedExpense->setStartDate(std::nullopt);
  WTTime* laterFirst = makeTime(task, berlin(2026, 4, 1, 15), berlin(2026, 4, 1, 16));
  const QList<WTItem*> items{second, undatedFee, first, undatedExpense, laterFirst};

  const auto itemsOf = [](const auto& groups) {
    QList<QList<WTItem*>> result;
    for (const auto& group : groups) result.append(group->items());
    return result;
  };
  const auto days = WTItemContainer::containersByKeyPath(QStringLiteral("startDate.midnight"), items);
  EXPECT_EQ(itemsOf(days),
            (QList<QList<WTItem*>>{{second}, {laterFirst, first}, {undatedFee, undatedExpense}}));
  EXPECT_FALSE(days.back()->date().has_value());
  EXPECT_EQ(WTItemContainer::containersByKeyPath(QStringLiteral("startDate.beginOfMonth"), items).size(), 2u);

  second->setName(QStringLiteral("b"));
  first->setName(QStringLiteral("a"));
  laterFirst->setName(QStringLiteral("b"));
  const auto named =
      WTItemContainer::containersByKeyPath(QStringLiteral("name"), QList<WTItem*>{second, first, laterFirst});
  EXPECT_EQ(itemsOf(named), (QList<QList<WTItem*>>{{second, laterFirst}, {first}}));
}

TEST_F(WTItemContainerTest, ReportGroupsSpanTasksAndKeepOnlyBillableItems) {
  WTTask* a = makeTask();
  WTTask* b = makeTask();
  makeTime(a, berlin(2026, 1, 15, 9), berlin(2026, 1, 15, 10));
  auto* flat = makeItem<WTFlat>(b, berlin(2026, 1, 20, 9));
  flat->setMinutes(30);
  makeItem<WTExpense>(b, berlin(2026, 2, 1, 12))->setExpense(dec("3"));
  makeItem<WTNote>(a, berlin(2026, 2, 3, 12));

  const auto months = WTItemContainer::containersByKeyPath("startDate.beginOfMonth", QList<WTTask*>{a, b});
  ASSERT_EQ(months.size(), 2u);
  // February: the expense, not the note. A group's date is its last item's start, not the month start.
  EXPECT_EQ(QList({months[0]->items().size(), months[1]->items().size(), qsizetype(months[1]->duration()),
                   qsizetype(a->dailyItems().size())}),
            QList<qsizetype>({1, 2, 90, 1}));
  EXPECT_EQ(std::pair(months[1]->date(), months[1]->task()),
            std::pair(std::optional(berlin(2026, 1, 15, 9)), a));
}
