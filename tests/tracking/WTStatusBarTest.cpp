// The tray's list and popup over the real model and ticker, with real widgets (offscreen).
#include "RZLimitedArrayController.h"
#include "TrackingFixture.h"
#include "WTImages.h"
#include "WTStatusBarController.h"
#include "WTStatusBarPopup.h"
#include "WTTask.h"
#include "WTTime.h"

#include <gtest/gtest.h>

#include <QLabel>
#include <QSystemTrayIcon>
#include <QToolButton>

namespace {

class StatusBarTest : public TrackingTest {
 protected:
  // Ten tasks "T0".."T9"; Tn's last entry ended n hours after 1 March, so T9 ended last. T1 and T4 run.
  void makeTenTasks() {
    for (int n = 0; n < 10; ++n) {
      WTTask* task = makeTask(nullptr, QStringLiteral("T%1").arg(n));
      makeTime(task, berlin(2026, 3, 1, n), berlin(2026, 3, 1, n, 30));
      tasks.append(task);
    }
    startTimer(tasks[1], berlin(2026, 3, 2, 11));
    startTimer(tasks[4], berlin(2026, 3, 2, 11, 30));
    settle();
  }

  static QStringList names(const QList<WTTask*>& list) {
    QStringList result;
    for (const WTTask* task : list) result << task->name();
    return result;
  }

  // Each row of the popup as "TITLE:BUTTON", in order.
  static QStringList rowsOf(const WTStatusBarPopup& popup) {
    QStringList rows;
    for (const QWidget* row : popup.findChildren<QWidget*>(QStringLiteral("taskRow"))) {
      if (!row->isVisibleTo(&popup)) continue;
      const QString title = row->findChild<QLabel*>(QStringLiteral("taskTitle"))->text().section(u'\n', 0, 0);
      rows << title + ":" + row->findChild<QToolButton*>(QStringLiteral("timerButton"))->text();
    }
    return rows;
  }

  QList<WTTask*> tasks;
};

}  // namespace

TEST_F(StatusBarTest, TheListHoldsFiveTasksRunningFirstThenTheLatestTrackedAndFollowsTheStoreWhileShown) {
  makeTenTasks();
  RZLimitedArrayController top(context.get());
  EXPECT_EQ(names(top.arrangedObjects()), QStringList({"T4", "T1", "T9", "T8", "T7"}));

  // Not on screen: a change is noted, not announced, and the next look arranges afresh.
  int announced = 0;
  QObject::connect(&top, &RZLimitedArrayController::arrangedObjectsDidChange, [&] { ++announced; });
  tasks[0]->toggleTimer();
  settle();
  EXPECT_EQ(announced, 0);
  EXPECT_EQ(names(top.arrangedObjects()).mid(0, 3), QStringList({"T4", "T1", "T0"}));

  top.setActive(true);
  tasks[4]->stopAllTimers();
  settle();
  std::cerr << "T4 running " << tasks[4]->running() << " times " << tasks[4]->times().size() << " end " << (tasks[4]->maxTimeEndDate() ? tasks[4]->maxTimeEndDate()->toQDateTime().toString().toStdString() : "none") << "\n";
  EXPECT_EQ(announced, 1);
  EXPECT_EQ(names(top.arrangedObjects()), QStringList({"T1", "T0", "T4", "T9", "T8"}))
      << "a stopped task moves down to its latest end, which is now";
}

TEST_F(StatusBarTest, ThePopupStartsAndStopsTimersAndClosesWhenNoTaskIsLeft) {
  makeTenTasks();
  WTStatusBarController statusBar(context.get(), updater.get());
  WTStatusBarPopup& popup = *statusBar.popup();
  statusBar.statusBarClicked(QRect(600, 0, 24, 24));
  ASSERT_TRUE(popup.isVisible());
  EXPECT_EQ(rowsOf(popup), QStringList({"T4:Stop", "T1:Stop", "T9:Start", "T8:Start", "T7:Start"}));
  EXPECT_GE(popup.y(), 24) << "below the icon it opened from";

  // The button of T8's row starts T8's timer; the list follows with the popup still open.
  const QList<QToolButton*> buttons = popup.findChildren<QToolButton*>(QStringLiteral("timerButton"));
  QToolButton* startT8 = nullptr;
  for (QToolButton* button : buttons)
    if (button->isVisibleTo(&popup) && rowsOf(popup).size() == 5 &&
        button->parentWidget()->findChild<QLabel*>(QStringLiteral("taskTitle"))->text() == "T8")
      startT8 = button;
  ASSERT_NE(startT8, nullptr);
  startT8->click();
  settle();
  EXPECT_TRUE(tasks[8]->running());
  EXPECT_EQ(runningTimesOf(tasks[8]).size(), 1);
  EXPECT_TRUE(popup.isVisible());
  // Running tasks come first, the latest tracked of them first: T8 last ended after T4 and T1.
  EXPECT_EQ(rowsOf(popup), QStringList({"T8:Stop", "T4:Stop", "T1:Stop", "T9:Start", "T7:Start"}));

  // A second click on the icon while it is open does nothing; an empty list closes it.
  statusBar.statusBarClicked(QRect(0, 0, 24, 24));
  EXPECT_GE(popup.y(), 24);
  for (WTTask* task : tasks) context->deleteObject(task);
  settle();
  EXPECT_FALSE(popup.isVisible());
}

TEST_F(StatusBarTest, TheXEmbedIconAndThePopupCarryTheRunningTimeAfterEachTick) {
  WTTask* task = makeTask();
  WTStatusBarController statusBar(context.get(), updater.get());
  updater->start();
  settle();
  auto iconIs = [&](const char* name) {
    return statusBar.statusItem()->icon().cacheKey() == WTImages::icon(QLatin1String(name)).cacheKey();
  };
  EXPECT_EQ(statusBar.statusItem()->toolTip(), "Tessal");
  EXPECT_TRUE(iconIs("StopWatch"));
  startTimer(task, berlin(2026, 3, 2, 10, 45));  // 75 minutes before the fixture's now
  settle();
  EXPECT_EQ(statusBar.statusItem()->toolTip(), "Tessal — 01:15");
  EXPECT_TRUE(iconIs("StopWatchRunning"));

  // The list shows the running task's minutes and follows the ticks in place, the rows left as they are.
  makeTask(nullptr, QStringLiteral("Idle"));
  statusBar.statusBarClicked(QRect(600, 0, 24, 24));
  settle();
  auto labels = [&] {
    QList<const QLabel*> shown;
    for (const QLabel* label : statusBar.popup()->findChildren<QLabel*>(QStringLiteral("taskElapsed")))
      if (label->isVisibleTo(statusBar.popup())) shown << label;
    return shown;
  };
  auto elapsed = [&] {
    QStringList texts;
    for (const QLabel* label : labels()) texts << label->text();
    return texts;
  };
  EXPECT_EQ(elapsed(), QStringList({"01:15", ""}));
  const QList<const QLabel*> before = labels();
  advance(60);
  updater->update();
  settle();
  EXPECT_EQ(elapsed(), QStringList({"01:16", ""}));
  EXPECT_EQ(labels(), before);

  task->stopAllTimers();
  settle();
  EXPECT_EQ(statusBar.statusItem()->toolTip(), "Tessal");
  EXPECT_TRUE(iconIs("StopWatch"));
}
