#include "FakeDesktopServices.h"
#include "PrivateBus.h"
#include "TrackingFixture.h"
#include "WTIdleSource.h"
#include "WTLauncherEntry.h"
#include "WTSleepMonitor.h"
#include "WTTask.h"
#include "WTTime.h"

#include <QSignalSpy>
#include <QThread>

namespace {

// Services registered by the test under the desktop's real names, served from a thread of their own.
class DesktopBusTest : public PrivateBusTest<TrackingTest> {
 protected:
  void serveMutter() {
    serve(mutter, QStringLiteral("org.gnome.Mutter.IdleMonitor"),
          QStringLiteral("/org/gnome/Mutter/IdleMonitor/Core"));
  }
  void serveScreenSaver() {
    serve(screenSaver, QStringLiteral("org.freedesktop.ScreenSaver"),
          QStringLiteral("/org/freedesktop/ScreenSaver"));
  }

  FakeMutterIdleMonitor mutter;
  FakeScreenSaver screenSaver;
};

TEST_F(DesktopBusTest, IdleSecondsComeFromMutterFirstThenTheScreenSaver) {
  WTDBusIdleSource source(PrivateBus::instance().connect(), 100);
  EXPECT_EQ(source.idleSeconds(), -1) << "no desktop service answers";
  EXPECT_TRUE(source.lastSource().isEmpty());

  screenSaver.seconds = 42;
  serveScreenSaver();
  EXPECT_EQ(source.idleSeconds(), 42);
  EXPECT_EQ(source.lastSource(), QStringLiteral("org.freedesktop.ScreenSaver"));

  mutter.milliseconds = 61999;  // whole seconds, truncated
  serveMutter();
  EXPECT_EQ(source.idleSeconds(), 61);
  EXPECT_EQ(source.lastSource(), QStringLiteral("org.gnome.Mutter.IdleMonitor"));
  const int screenSaverCalls = screenSaver.calls;
  source.idleSeconds();
  EXPECT_EQ(screenSaver.calls, screenSaverCalls) << "the first answer wins";
}

TEST_F(DesktopBusTest, AServiceThatErrorsOrNeverAnswersMovesOnToTheNext) {
  serveMutter();
  serveScreenSaver();
  screenSaver.seconds = 7;
  WTDBusIdleSource source(PrivateBus::instance().connect(), 100);

  mutter.mode = FakeMode::Error;
  EXPECT_EQ(source.idleSeconds(), 7);

  mutter.mode = FakeMode::Silent;
  QElapsedTimer waited;
  waited.start();
  EXPECT_EQ(source.idleSeconds(), 7);
  EXPECT_LT(waited.elapsed(), 2000) << "a hung service costs the timeout, not the bus default";

  for (const FakeMode mode : {FakeMode::Error, FakeMode::Silent}) {
    screenSaver.mode = mode;
    EXPECT_EQ(source.idleSeconds(), -1);
  }
  EXPECT_EQ(WTDBusIdleSource(QDBusConnection(QStringLiteral("never-connected"))).idleSeconds(), -1);
}

TEST_F(DesktopBusTest, TheUpdaterAsksTheBusForIdleTime) {
  mutter.milliseconds = 20 * 60 * 1000;
  serveMutter();
  WTDBusIdleSource source(PrivateBus::instance().connect(), 200);
  WTStopwatchUpdater busUpdater(context.get(), defaults.get(), &source, &presenter);
  turnIdleHandlingOn(5);
  startTimer(makeTask(), clockNow.addingSeconds(-3600));
  busUpdater.start();
  ASSERT_EQ(presenter.shown.size(), 1u);
  EXPECT_EQ(mutter.calls, 1);
}

TEST_F(DesktopBusTest, LogindPrepareForSleepStopsTheTickerAndWakeTicksAtOnce) {
  // The test's bus plays the system bus; a test connection owns logind's name and sends its signal.
  QDBusConnection logind = PrivateBus::instance().connect();
  ASSERT_TRUE(logind.registerService(QStringLiteral("org.freedesktop.login1")));
  WTSleepMonitor monitor(PrivateBus::instance().connect());
  ASSERT_TRUE(monitor.isListening());
  updater->setSleepMonitor(&monitor);
  turnIdleHandlingOn(5);
  startTimer(makeTask(), clockNow.addingSeconds(-600));
  updater->start();
  const int before = ticks;

  auto send = [&](QDBusConnection& from, bool start) {
    QDBusMessage signal = QDBusMessage::createSignal(QStringLiteral("/org/freedesktop/login1"),
                                                     QStringLiteral("org.freedesktop.login1.Manager"),
                                                     QStringLiteral("PrepareForSleep"));
    signal << start;
    return from.send(signal);
  };

  // The same signal from someone who is not logind is not believed.
  QSignalSpy heard(&monitor, &WTSleepMonitor::willSleep);
  QDBusConnection impostor = PrivateBus::instance().connect();
  ASSERT_TRUE(send(impostor, true));
  ASSERT_TRUE(send(logind, true));
  ASSERT_TRUE(waitForBus([&] { return heard.count() >= 1; }));
  waitForBus([&] { return heard.count() >= 2; }, 100);
  EXPECT_EQ(heard.count(), 1);
  EXPECT_FALSE(updater->isTicking());

  advance(3 * 3600);
  idle.seconds = 1;
  ASSERT_TRUE(send(logind, false));
  ASSERT_TRUE(waitForBus([&] { return ticks > before; }));
  EXPECT_TRUE(updater->isTicking());
  EXPECT_EQ(presenter.shown.size(), 1u) << "the three hours asleep are offered";

  EXPECT_FALSE(WTSleepMonitor(QDBusConnection(QStringLiteral("never-connected"))).isListening());
}

TEST_F(DesktopBusTest, LauncherEntryCarriesTheNumberOfRunningTimersAndIsSentOnlyWhenItChanges) {
  QDBusConnection client = PrivateBus::instance().connect();
  LauncherListener listener;
  ASSERT_TRUE(client.connect(QString(), QString(), QStringLiteral("com.canonical.Unity.LauncherEntry"),
                             QStringLiteral("Update"), &listener, SLOT(update(QString, QVariantMap))));
  WTLauncherEntry entry(PrivateBus::instance().connect());
  updater->setLauncherEntry(&entry);
  updater->start();  // nothing runs: nothing to say
  WTTask* task = makeTask();
  task->toggleTimer();
  settle();
  ASSERT_TRUE(waitForBus([&] { return listener.uris.size() >= 1; }));
  EXPECT_EQ(listener.uris.front(), QStringLiteral("application://tessal.desktop"));
  auto shown = [&](qsizetype index) {
    const QVariantMap properties = listener.properties.value(index);
    return std::make_pair(properties.value(QStringLiteral("count")).toLongLong(),
                          properties.value(QStringLiteral("count-visible")).toBool());
  };
  EXPECT_EQ(shown(0), std::make_pair(1LL, true));
  EXPECT_EQ(listener.properties.front().value(QStringLiteral("progress-visible")), QVariant(false));

  advance(75 * 60);
  updater->update();  // the minutes move: the title changes, the launcher needs nothing new
  WTTask* other = makeTask();
  other->toggleTimer();
  settle();
  ASSERT_TRUE(waitForBus([&] { return listener.uris.size() >= 2; }));
  EXPECT_EQ(shown(1), std::make_pair(2LL, true));

  task->toggleTimer();
  other->toggleTimer();
  settle();
  ASSERT_TRUE(waitForBus([&] { return listener.uris.size() >= 3; }));
  EXPECT_EQ(shown(2), std::make_pair(0LL, false));
  waitForBus([&] { return listener.uris.size() >= 4; }, 100);
  EXPECT_EQ(listener.uris.size(), 3);
  EXPECT_TRUE(updater->badgeLabel().isEmpty());
}

}  // namespace
