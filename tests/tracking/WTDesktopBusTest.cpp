#include "FakeDesktopServices.h"
#include "TrackingFixture.h"
#include "WTIdleSource.h"
#include "WTLauncherEntry.h"
#include "WTSleepMonitor.h"

#include <QDBusConnectionInterface>
#include <QFile>
#include <QProcess>
#include <QSignalSpy>
#include <QThread>
#include <QUuid>

namespace {

// A private bus daemon for the suite: no test touches the developer's session or system bus. It has no
// activation directories, so a name nobody owns stays unanswered instead of starting a real service.
class PrivateBus {
 public:
  static PrivateBus& instance() {
    static PrivateBus bus;
    return bus;
  }
  QString address() const { return address_; }
  // A new connection of its own to the private bus.
  QDBusConnection connect() {
    const QString name = QStringLiteral("tracking-test-%1").arg(QUuid::createUuid().toString(QUuid::Id128));
    names_.append(name);
    return QDBusConnection::connectToBus(address_, name);
  }
  void disconnectAll() {
    for (const QString& name : std::as_const(names_)) QDBusConnection::disconnectFromBus(name);
    names_.clear();
  }

 private:
  PrivateBus() {
    const QString config = dir_.filePath(QStringLiteral("bus.conf"));
    QFile file(config);
    if (file.open(QIODevice::WriteOnly)) {
      file.write(
          QStringLiteral("<busconfig><type>session</type><listen>unix:dir=%1</listen>"
                         "<policy context=\"default\"><allow send_destination=\"*\" eavesdrop=\"true\"/>"
                         "<allow eavesdrop=\"true\"/><allow own=\"*\"/></policy></busconfig>")
              .arg(dir_.path())
              .toUtf8());
      file.close();
    }
    daemon_.start(QStringLiteral("dbus-daemon"),
                  {QStringLiteral("--config-file=") + config, QStringLiteral("--nofork"),
                   QStringLiteral("--print-address")});
    if (daemon_.waitForStarted(5000) && daemon_.waitForReadyRead(5000)) {
      address_ = QString::fromUtf8(daemon_.readLine()).trimmed();
    }
  }
  ~PrivateBus() {
    disconnectAll();
    daemon_.kill();
    daemon_.waitForFinished(2000);
  }
  QTemporaryDir dir_;
  QProcess daemon_;
  QString address_;
  QStringList names_;
};

// Services registered by the test under the desktop's real names, served from a thread of their own.
class DesktopBusTest : public TrackingTest {
 protected:
  void SetUp() override {
    TrackingTest::SetUp();
    ASSERT_FALSE(PrivateBus::instance().address().isEmpty()) << "dbus-daemon did not start";
    serviceThread.start();
  }
  void TearDown() override {
    PrivateBus::instance().disconnectAll();
    serviceThread.quit();
    serviceThread.wait();
    TrackingTest::TearDown();
  }

  template <class Service>
  void serve(Service& service, const QString& name, const QString& path) {
    QDBusConnection bus = PrivateBus::instance().connect();
    ASSERT_TRUE(bus.isConnected());
    service.moveToThread(&serviceThread);
    ASSERT_TRUE(bus.registerObject(path, &service, QDBusConnection::ExportAllSlots));
    ASSERT_TRUE(bus.registerService(name));
  }
  void serveMutter() {
    serve(mutter, QStringLiteral("org.gnome.Mutter.IdleMonitor"),
          QStringLiteral("/org/gnome/Mutter/IdleMonitor/Core"));
  }
  void serveScreenSaver() {
    serve(screenSaver, QStringLiteral("org.freedesktop.ScreenSaver"),
          QStringLiteral("/org/freedesktop/ScreenSaver"));
  }

  static bool waitFor(const std::function<bool()>& done, int ms = 3000) {
    QElapsedTimer clock;
    clock.start();
    while (!done() && clock.elapsed() < ms) {
      QCoreApplication::processEvents(QEventLoop::AllEvents, 20);
      QThread::msleep(1);
    }
    return done();
  }

  QThread serviceThread;
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

  screenSaver.mode = FakeMode::Error;
  EXPECT_EQ(source.idleSeconds(), -1);
  screenSaver.mode = FakeMode::Silent;
  EXPECT_EQ(source.idleSeconds(), -1);

  WTDBusIdleSource noBus(QDBusConnection(QStringLiteral("never-connected")));
  EXPECT_EQ(noBus.idleSeconds(), -1);
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
  ASSERT_TRUE(waitFor([&] { return heard.count() >= 1; }));
  waitFor([&] { return heard.count() >= 2; }, 100);
  EXPECT_EQ(heard.count(), 1);
  EXPECT_FALSE(updater->isTicking());

  advance(3 * 3600);
  idle.seconds = 1;
  ASSERT_TRUE(send(logind, false));
  ASSERT_TRUE(waitFor([&] { return ticks > before; }));
  EXPECT_TRUE(updater->isTicking());
  EXPECT_EQ(presenter.shown.size(), 1u) << "the three hours asleep are offered";

  WTSleepMonitor withoutBus{QDBusConnection(QStringLiteral("never-connected"))};
  EXPECT_FALSE(withoutBus.isListening());
}

TEST_F(DesktopBusTest, LauncherEntryIsUpdatedWhenTheBadgeAppearsAndWhenItGoes) {
  QDBusConnection client = PrivateBus::instance().connect();
  LauncherListener listener;
  ASSERT_TRUE(client.connect(QString(), QString(), QStringLiteral("com.canonical.Unity.LauncherEntry"),
                             QStringLiteral("Update"), &listener, SLOT(update(QString, QVariantMap))));
  WTLauncherEntry entry(PrivateBus::instance().connect());
  updater->setLauncherEntry(&entry);
  updater->start();
  WTTask* task = makeTask();
  task->toggleTimer();
  settle();
  ASSERT_TRUE(waitFor([&] { return listener.uris.size() >= 1; }));
  EXPECT_EQ(listener.uris.front(), QStringLiteral("application://tessal.desktop"));
  const QVariantMap shown = listener.properties.front();
  EXPECT_EQ(shown.value(QStringLiteral("count-visible")), QVariant(false));
  EXPECT_EQ(shown.value(QStringLiteral("progress-visible")), QVariant(false));

  advance(75 * 60);
  updater->update();  // the minutes move: the title changes, the launcher needs nothing new
  task->toggleTimer();
  settle();
  ASSERT_TRUE(waitFor([&] { return listener.uris.size() >= 2; }));
  EXPECT_EQ(listener.uris.size(), 2);
  EXPECT_TRUE(updater->badgeLabel().isEmpty());
}

}  // namespace
