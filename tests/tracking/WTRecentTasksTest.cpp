// The tray's list of tasks over the real model.
#include "TrackingFixture.h"
#include "WTRecentTasks.h"
#include "WTTask.h"

#include <gtest/gtest.h>

namespace {

class RecentTasksTest : public TrackingTest {};

QStringList names(const QList<WTTask*>& list) {
  QStringList result;
  for (const WTTask* task : list) result << task->name();
  return result;
}

}  // namespace

TEST_F(RecentTasksTest, TheListHoldsFiveTasksRunningFirstThenTheLatestTrackedAndFollowsTheStoreWhileShown) {
  makeTenTasks();
  WTRecentTasks top(context.get());
  EXPECT_EQ(names(top.tasks()), QStringList({"T4", "T1", "T9", "T8", "T7"}));

  // Not on screen: a change is noted, not announced, and the next look arranges afresh.
  int announced = 0;
  QObject::connect(&top, &WTRecentTasks::tasksDidChange, [&] { ++announced; });
  tasks[0]->toggleTimer();
  settle();
  EXPECT_EQ(announced, 0);
  EXPECT_EQ(names(top.tasks()).mid(0, 3), QStringList({"T4", "T1", "T0"}));

  top.setActive(true);
  tasks[4]->stopAllTimers();
  settle();
  EXPECT_EQ(announced, 1);
  EXPECT_EQ(names(top.tasks()), QStringList({"T1", "T0", "T4", "T9", "T8"}))
      << "a stopped task moves down to its latest end, which is now";
}
