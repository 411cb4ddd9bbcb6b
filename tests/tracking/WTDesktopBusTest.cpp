#include "FakeDesktopServices.h"
#include "PrivateBus.h"
#include "TrackingFixture.h"
#include "WTDesktopNotifier.h"
#include "WTLauncherEntry.h"
#include "WTSleepMonitor.h"

#include <QSignalSpy>

namespace {

// Services registered by the test under the desktop's real names, served from a thread of their own.
class DesktopBusTest : public PrivateBusTest<TrackingTest> {
 protected:
  void serveMutter() { serve(mutter, "org.gnome.Mutter.IdleMonitor", "/org/gnome/Mutter/IdleMonitor/Core"); }
  void serveScreenSaver() {
    serve(screenSaver, "org.freedesktop.ScreenSaver", "/org/freedesktop/ScreenSaver");
  }
  FakeMutterIdleMonitor mutter;
  FakeScreenSaver screenSaver;
};

// Mutter first, then the screen saver; an erring or hung service costs its timeout and hands over.
TEST_F(DesktopBusTest, IdleSecondsComeFromTheFirstServiceThatAnswers) {
  WTDBusIdleSource source(PrivateBus::instance().connect(), 100);
  auto asked = [&] { return QStringLiteral("%1 %2").arg(source.idleSeconds()).arg(source.lastSource()); };
  EXPECT_EQ(asked(), "-1 ") << "no desktop service answers";
  screenSaver.seconds = 42;
  serveScreenSaver();
  EXPECT_EQ(asked(), "42 org.freedesktop.ScreenSaver");
  mutter.milliseconds = 61999;  // whole seconds, truncated
  serveMutter();
  EXPECT_EQ(asked(), "61 org.gnome.Mutter.IdleMonitor");

  screenSaver.seconds = 7;
  for (const FakeMode mode : {FakeMode::Error, FakeMode::Silent}) {
    mutter.mode = mode;
    QElapsedTimer waited;
    waited.start();
    EXPECT_EQ(source.idleSeconds(), 7);
    EXPECT_LT(waited.elapsed(), 2000) << "a hung service costs the timeout, not the bus default";
  }
  for (const FakeMode mode : {FakeMode::Error, FakeMode::Silent}) {
    screenSaver.mode = mode;
    EXPECT_EQ(source.idleSeconds(), -1);
  }
  EXPECT_EQ(WTDBusIdleSource(QDBusConnection("never-connected")).idleSeconds(), -1);
}

TEST_F(DesktopBusTest, LogindPrepareForSleepStopsTheTickerAndWakeTicksAtOnce) {
  // The test's bus plays the system bus; a test connection owns logind's name and sends its signal.
  QDBusConnection logind = PrivateBus::instance().connect();
  ASSERT_TRUE(logind.registerService("org.freedesktop.login1"));
  WTSleepMonitor monitor(PrivateBus::instance().connect());
  ASSERT_TRUE(monitor.isListening());
  updater->setSleepMonitor(&monitor);
  updater->start();
  const int before = ticks;

  auto send = [&](QDBusConnection& from, bool start) {
    return from.send(QDBusMessage::createSignal("/org/freedesktop/login1", "org.freedesktop.login1.Manager",
                                                "PrepareForSleep")
                     << start);
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

  ASSERT_TRUE(send(logind, false));
  ASSERT_TRUE(waitForBus([&] { return ticks > before; }));
  EXPECT_TRUE(updater->isTicking());

  EXPECT_FALSE(WTSleepMonitor(QDBusConnection("never-connected")).isListening());
}

TEST_F(DesktopBusTest, LauncherEntryCarriesTheNumberOfRunningTimers) {
  QDBusConnection client = PrivateBus::instance().connect();
  LauncherListener listener;
  ASSERT_TRUE(client.connect(QString(), QString(), "com.canonical.Unity.LauncherEntry", "Update", &listener,
                             SLOT(update(QString, QVariantMap))));
  WTLauncherEntry entry(PrivateBus::instance().connect());
  updater->setLauncherEntry(&entry);
  updater->start();  // nothing runs: nothing to say
  // Each Update heard: "URI count visible progress-visible".
  auto heard = [&](qsizetype count) {
    EXPECT_TRUE(waitForBus([&] { return listener.uris.size() >= count; }));
    const QVariantMap p = listener.properties.value(count - 1);
    return QStringLiteral("%1 %2 %3 %4")
        .arg(listener.uris.value(count - 1), p.value("count").toString(), p.value("count-visible").toString(),
             p.value("progress-visible").toString());
  };
  WTTask* task = makeTask();
  task->toggleTimer();
  settle();
  EXPECT_EQ(heard(1), "application://tessal.desktop 1 true false");
  WTTask* other = makeTask();
  other->toggleTimer();
  settle();
  EXPECT_EQ(heard(2), "application://tessal.desktop 2 true false");
  task->toggleTimer();
  other->toggleTimer();
  settle();
  EXPECT_EQ(heard(3), "application://tessal.desktop 0 false false");
}

// A notice goes to the notification service when one answers in time; otherwise it comes back, for the
// window, without the caller ever waiting.
TEST_F(DesktopBusTest, NoticesGoToTheNotificationServiceOrComeBack) {
  FakeNotifications service;
  serve(service, "org.freedesktop.Notifications", "/org/freedesktop/Notifications");
  const std::tuple<const char*, FakeMode, QDBusConnection, const char*> rows[] = {
      {"answers", FakeMode::Answer, PrivateBus::instance().connect(), "shown"},
      {"errs", FakeMode::Error, PrivateBus::instance().connect(), "not shown"},
      {"hangs", FakeMode::Silent, PrivateBus::instance().connect(), "not shown"},
      {"no bus", FakeMode::Answer, QDBusConnection("never-connected"), "not shown"},
  };
  for (const auto& [name, mode, bus, outcome] : rows) {
    SCOPED_TRACE(name);
    service.mode = mode;
    WTDesktopNotifier notifier(bus, 300);
    QStringList said;
    QObject::connect(&notifier, &WTDesktopNotifier::shown, [&](const QString& s) { said << "shown " + s; });
    QObject::connect(&notifier, &WTDesktopNotifier::notShown,
                     [&](const QString& s) { said << "not shown " + s; });
    QElapsedTimer waited;
    waited.start();
    notifier.notify(name, "Body");
    EXPECT_LT(waited.elapsed(), 100) << "nothing waits for the service";
    EXPECT_TRUE(said.isEmpty());
    EXPECT_TRUE(waitForBus([&] { return !said.isEmpty(); }, 2000));
    EXPECT_EQ(said, QStringList{QStringLiteral("%1 %2").arg(outcome, name)});
  }
  EXPECT_EQ(service.taken(), QStringList{"answers | Body"});
  service.mode = FakeMode::Answer;
  PrivateBus::instance().disconnectAll();  // the service is gone: the bus answers for it
  WTDesktopNotifier nobody(PrivateBus::instance().connect(), 2000);
  QSignalSpy back(&nobody, &WTDesktopNotifier::notShown);
  nobody.notify("Gone", "Body");
  EXPECT_TRUE(waitForBus([&] { return back.count() == 1; }, 1000)) << "well before the timeout";
}

}  // namespace
