// The tray's list and popup over the real model and ticker, with real widgets (offscreen).
#include "FakeTrayHost.h"
#include "PrivateBus.h"
#include "TrackingFixture.h"
#include "WTDBusMenu.h"
#include "WTStatusBarController.h"
#include "WTStatusBarPopup.h"

#include <gtest/gtest.h>

#include <QtDBus>
#include <QtTest>
#include <QtWidgets>

namespace {

class StatusBarTest : public TrackingTest {
 protected:
  static QList<QWidget*> shownRows(const WTStatusBarPopup& popup) {
    QList<QWidget*> rows = popup.findChildren<QWidget*>("taskRow");
    rows.removeIf([&](const QWidget* row) { return !row->isVisibleTo(&popup); });
    return rows;
  }
  // Each row of the popup as "TITLE:BUTTON", and its elapsed time if shown, in order.
  static QStringList rowsOf(const WTStatusBarPopup& popup) {
    QStringList rows;
    for (const QWidget* row : shownRows(popup)) {
      const QString elapsed = row->findChild<QLabel*>("taskElapsed")->text();
      rows << row->findChild<QLabel*>("taskTitle")->text().section(u'\n', 0, 0) + ":" +
                  row->findChild<QToolButton*>("timerButton")->text() +
                  (elapsed.isEmpty() ? "" : " " + elapsed);
    }
    return rows;
  }
};

// A StatusNotifierItem tray on a private bus, its watcher served from the bus's service thread.
class TrayHostTest : public PrivateBusTest<StatusBarTest> {
 protected:
  FakeStatusNotifierWatcher watcher;
};

}  // namespace

// The popup starts and stops timers, its rows updated in place at each tick, and closes when no task is
// left; the icon's tip carries the running time.
TEST_F(StatusBarTest, ThePopupStartsAndStopsTimersAndTheXEmbedIconCarriesTheRunningTime) {
  makeTenTasks();
  WTStatusBarController statusBar(context.get(), updater.get());
  WTStatusBarPopup& popup = *statusBar.popup();
  auto shows = [&] { return statusBar.statusItem()->toolTip(); };
  updater->start();
  statusBar.statusBarClicked(QRect(600, 0, 24, 24));
  ASSERT_TRUE(popup.isVisible());
  ASSERT_EQ(rowsOf(popup),
            QStringList({"T4:Stop 00:30", "T1:Stop 01:00", "T9:Start", "T8:Start", "T7:Start"}));
  const QList<QWidget*> before = shownRows(popup);
  // Started, T8 stays under the pointer and keeps the keyboard while the popup is open; it comes first
  // when the popup opens again.
  QToolButton* clicked = before[3]->findChild<QToolButton*>("timerButton");
  clicked->setFocus();
  clicked->click();
  settle();
  EXPECT_EQ(tasks[8]->runningTimes().size(), 1);
  EXPECT_TRUE(popup.isVisible());
  EXPECT_EQ(rowsOf(popup),
            QStringList({"T4:Stop 00:30", "T1:Stop 01:00", "T9:Start", "T8:Stop 00:00", "T7:Start"}));
  EXPECT_EQ(shownRows(popup), before);
  EXPECT_TRUE(clicked->hasFocus());
  EXPECT_EQ(shows(), "Tessal — 01:30");
  popup.close();
  statusBar.statusBarClicked(QRect(600, 0, 24, 24));
  ASSERT_TRUE(popup.isVisible());
  EXPECT_EQ(rowsOf(popup),
            QStringList({"T8:Stop 00:00", "T4:Stop 00:30", "T1:Stop 01:00", "T9:Start", "T7:Start"}));
  const QList<QWidget*> reopened = shownRows(popup);
  advance(60);
  updater->update();
  settle();
  EXPECT_EQ(rowsOf(popup),
            QStringList({"T8:Stop 00:01", "T4:Stop 00:31", "T1:Stop 01:01", "T9:Start", "T7:Start"}));
  EXPECT_EQ(shownRows(popup), reopened);
  tasks[9]->setName(QString(120, u'L'));  // cut where it shows that it is, whole in the tip
  settle();
  const QLabel* title = shownRows(popup)[3]->findChild<QLabel*>("taskTitle");
  EXPECT_TRUE(title->text().contains(u'…') && title->toolTip().contains(QString(120, u'L')));
  statusBar.statusBarClicked(QRect(0, 0, 24, 24));
  for (WTTask* task : tasks) context->deleteObject(task);
  settle();
  EXPECT_FALSE(popup.isVisible());
  EXPECT_EQ(shows(), "Tessal");
}

// The tray item registers, labels and serves its menu on the bus, and comes back when the tray does.
TEST_F(TrayHostTest, TheTrayItemRegistersWithTheWatcherAndCarriesTheRunningTimeAsItsLabel) {
  QDBusConnection watcherBus = PrivateBus::instance().connect();
  watcher.moveToThread(&serviceThread);
  ASSERT_TRUE(watcherBus.registerObject("/StatusNotifierWatcher", &watcher, QDBusConnection::ExportAllSlots));
  ASSERT_TRUE(watcherBus.registerService("org.kde.StatusNotifierWatcher"));
  WTTask* task = makeTask();
  startTimer(task, clockNow.addingSeconds(-30 * 60));
  updater->start();
  WTStatusBarController statusBar(context.get(), updater.get(), PrivateBus::instance().connect());
  statusBar.activateStatusMenu();
  ASSERT_TRUE(waitForBus([&] { return statusBar.isShowingIcon(); })) << "the watcher never took the item";
  ASSERT_EQ(watcher.registered().size(), 1);
  const QString item = watcher.registered().front(), sni = "org.kde.StatusNotifierItem";
  EXPECT_TRUE(item.startsWith(sni + '-')) << item.toStdString();

  QDBusConnection host = PrivateBus::instance().connect();
  auto call = [&](const QString& path, const QString& interface, const QString& method,
                  const QVariantList& args) {
    QDBusMessage message = QDBusMessage::createMethodCall(item, path, interface, method);
    message.setArguments(args);
    QDBusPendingCall pending = host.asyncCall(message);
    waitForBus([&] { return pending.isFinished(); });
    return pending.reply();
  };
  auto property = [&](const QString& name) {
    const QDBusMessage reply =
        call("/StatusNotifierItem", "org.freedesktop.DBus.Properties", "Get", {sni, name});
    return reply.arguments().value(0).value<QDBusVariant>().variant();
  };
  auto shows = [&] {
    return QStringList{property("XAyatanaLabel").toString(), property("XAyatanaLabelGuide").toString(),
                       property("IconName").toString()};
  };
  LabelListener listener;
  ASSERT_TRUE(host.connect(item, "/StatusNotifierItem", sni, "XAyatanaNewLabel", &listener,
                           SLOT(newLabel(QString, QString))));
  EXPECT_EQ(shows(), QStringList({"00:30", "00:00", "tessal-stopwatch-running"}));
  advance(60);
  updater->update();
  ASSERT_TRUE(waitForBus([&] { return !listener.labels.isEmpty(); }));
  EXPECT_EQ(shows(), QStringList({"00:31", "00:00", "tessal-stopwatch-running"}));
  task->stopAllTimers();
  settle();
  ASSERT_TRUE(waitForBus([&] { return listener.labels.size() >= 2; }));
  EXPECT_EQ(listener.labels, QStringList({"00:31", ""}));
  EXPECT_EQ(shows(), QStringList({"", "", "tessal-stopwatch"}));

  const QDBusMessage layout = call("/MenuBar", "com.canonical.dbusmenu", "GetLayout", {0, -1, QStringList()});
  ASSERT_EQ(layout.type(), QDBusMessage::ReplyMessage) << layout.errorMessage().toStdString();
  QStringList labels;
  for (const WTDBusMenuLayout& entry : qdbus_cast<WTDBusMenuLayout>(layout.arguments().value(1)).children)
    labels << entry.properties.value("label").toString();
  EXPECT_EQ(labels, QStringList({"Show Tessal", "Recent Tasks", "", "Quit"}));
  QSignalSpy showRequested(&statusBar, &WTStatusBarController::showMainWindowRequested);
  call("/MenuBar", "com.canonical.dbusmenu", "Event",
       {1, "clicked", QVariant::fromValue(QDBusVariant(QString())), 0u});
  EXPECT_TRUE(waitForBus([&] { return showRequested.count() == 1; }));
  call("/StatusNotifierItem", sni, "Activate", {600, 10});
  EXPECT_TRUE(waitForBus([&] { return statusBar.popup()->isVisible(); }));

  QSignalSpy trayChanged(&statusBar, &WTStatusBarController::trayAvailabilityChanged);
  ASSERT_TRUE(watcherBus.unregisterService("org.kde.StatusNotifierWatcher"));
  ASSERT_TRUE(waitForBus([&] { return !statusBar.isShowingIcon(); }));
  ASSERT_TRUE(watcherBus.registerService("org.kde.StatusNotifierWatcher"));
  EXPECT_TRUE(waitForBus([&] { return statusBar.isShowingIcon(); }));
  EXPECT_EQ(watcher.registered(), QStringList({item, item}));
  EXPECT_EQ(trayChanged.count(), 2);
}
