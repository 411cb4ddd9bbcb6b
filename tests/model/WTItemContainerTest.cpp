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
  EXPECT_FALSE(children[0]->date().has_value());
  EXPECT_EQ(children[0]->title(), "Pending");
  EXPECT_EQ(children[0]->items(), (QList<WTItem*>{newerOpen, olderOpen}));
  EXPECT_EQ(children[1]->date(), berlin(2026, 4, 2));
  EXPECT_EQ(children[1]->items(), (QList<WTItem*>{evening, done, morning}));
  EXPECT_EQ(children[2]->date(), berlin(2026, 3, 31));
  EXPECT_EQ(children[2]->items(), QList<WTItem*>{earlier});
  EXPECT_EQ(children[1]->duration(), 60 + 31);

  EXPECT_EQ(task->itemContainerForItem(olderOpen), children[0]);
  EXPECT_EQ(task->itemContainerForItem(done), children[1]);
  auto* elsewhere = makeItem<WTNote>(task, berlin(2026, 1, 1));
  EXPECT_EQ(task->itemContainerForItem(elsewhere), nullptr);  // not rebuilt yet

  WTTask* empty = makeTask();
  EXPECT_TRUE(empty->children().empty());

  // 29 March 2026 has 23 hours in Berlin; both ends of it belong to the same day.
  WTTask* spring = makeTask();
  makeTime(spring, berlin(2026, 3, 29, 0, 30), berlin(2026, 3, 29, 0, 45));
  makeTime(spring, berlin(2026, 3, 29, 23, 30), berlin(2026, 3, 29, 23, 45));
  makeTime(spring, berlin(2026, 3, 30, 0, 10), berlin(2026, 3, 30, 0, 20));
  ASSERT_EQ(spring->children().size(), 2u);
  EXPECT_EQ(spring->children()[1]->items().size(), 2);
  EXPECT_EQ(spring->children()[1]->date(), berlin(2026, 3, 29));
}

// Days and months are grouped by their dates, items without a date in one group after every day; any
// other key groups by its values in their general order, greatest first.
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

  const auto days = WTItemContainer::containersByKeyPath(QStringLiteral("startDate.midnight"), items);
  ASSERT_EQ(days.size(), 3u);
  EXPECT_EQ(days[0]->items(), QList<WTItem*>{second});
  EXPECT_EQ(days[1]->items(), (QList<WTItem*>{laterFirst, first}));
  EXPECT_EQ(days[2]->items(), (QList<WTItem*>{undatedFee, undatedExpense}));
  EXPECT_FALSE(days[2]->date().has_value());
  EXPECT_EQ(WTItemContainer::containersByKeyPath(QStringLiteral("startDate.beginOfMonth"), items).size(), 2u);

  second->setName(QStringLiteral("b"));
  first->setName(QStringLiteral("a"));
  laterFirst->setName(QStringLiteral("b"));
  const auto named =
      WTItemContainer::containersByKeyPath(QStringLiteral("name"), QList<WTItem*>{second, first, laterFirst});
  ASSERT_EQ(named.size(), 2u);
  EXPECT_EQ(named[0]->items(), (QList<WTItem*>{second, laterFirst}));  // newest first within a group
  EXPECT_EQ(named[1]->items(), QList<WTItem*>{first});
}

TEST_F(WTItemContainerTest, IdentityFindsTheSameDayGroupAgainButNeverPending) {
  WTTask* task = makeTask();
  makeItem<WTToDo>(task, berlin(2026, 4, 1, 9));
  makeItem<WTNote>(task, berlin(2026, 4, 2, 9));
  const auto children = task->children();
  ASSERT_EQ(children.size(), 2u);

  const QVariantMap dayId = children[1]->uuid();
  EXPECT_TRUE(WTItemContainer::isValidUUID(dayId));
  EXPECT_FALSE(WTItemContainer::isValidUUID(QStringLiteral("x")));
  auto again = WTItemContainer::objectWithUUID(dayId, context.get());
  ASSERT_NE(again, nullptr);
  EXPECT_NE(again, children[1]);  // rebuilt
  EXPECT_TRUE(again->isEqual(*children[1]));
  EXPECT_EQ(WTItemContainer::objectWithUUID(children[0]->uuid(), context.get()), nullptr);
  EXPECT_EQ(WTItemContainer::objectWithUUID(QVariantMap{{"date", QVariant::fromValue(berlin(2026, 4, 2))}},
                                            context.get()),
            nullptr);
}

TEST_F(WTItemContainerTest, AGroupObservesItsItemsOnlyWhileSomeoneListens) {
  WTTask* task = makeTask();
  WTTime* first = makeTime(task, berlin(2026, 4, 2, 9), berlin(2026, 4, 2, 10));
  WTTime* second = makeTime(task, berlin(2026, 4, 2, 11), berlin(2026, 4, 2, 12));
  WTItemContainer group({first}, first->startDate(), task);
  EXPECT_FALSE(group.isObserving());

  QStringList heard;
  auto connection =
      QObject::connect(&group, &WTItemContainer::valueChanged, [&](const QString& key) { heard << key; });
  EXPECT_TRUE(group.isObserving());
  first->setDuration(90);
  EXPECT_TRUE(heard.contains("duration"));

  // New items are observed in place of the old ones while the listener stays.
  group.setItems({second});
  heard.clear();
  first->setDuration(30);
  EXPECT_TRUE(heard.isEmpty());
  second->setDuration(30);
  EXPECT_TRUE(heard.contains("duration"));

  QObject::disconnect(connection);
  EXPECT_FALSE(group.isObserving());
  heard.clear();
  second->setDuration(45);
  EXPECT_TRUE(heard.isEmpty());
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
  EXPECT_EQ(months[0]->items().size(), 1);  // February: the expense, not the note
  EXPECT_EQ(months[1]->items().size(), 2);
  EXPECT_EQ(months[1]->duration(), 90);
  // A group's date is its last item's start, not the month start.
  EXPECT_EQ(months[1]->date(), berlin(2026, 1, 15, 9));
  EXPECT_EQ(months[1]->task(), a);
  EXPECT_EQ(a->dailyItems().size(), 1u);
}
