#include "FakeDesktopServices.h"
#include "TrackingFixture.h"
#include "WTDBusMenu.h"
#include "WTIdleSource.h"
#include "WTLauncherEntry.h"
#include "WTSleepMonitor.h"
#include "WTStatusBarController.h"
#include "WTStatusBarPopup.h"
#include "WTStatusNotifierItem.h"
#include "WTTask.h"
#include "WTTime.h"

#include <QDBusConnectionInterface>
#include <QDBusPendingCall>
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
  FakeStatusNotifierWatcher watcher;
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
  ASSERT_TRUE(waitFor([&] { return listener.uris.size() >= 1; }));
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
  ASSERT_TRUE(waitFor([&] { return listener.uris.size() >= 2; }));
  EXPECT_EQ(shown(1), std::make_pair(2LL, true));

  task->toggleTimer();
  other->toggleTimer();
  settle();
  ASSERT_TRUE(waitFor([&] { return listener.uris.size() >= 3; }));
  EXPECT_EQ(shown(2), std::make_pair(0LL, false));
  waitFor([&] { return listener.uris.size() >= 4; }, 100);
  EXPECT_EQ(listener.uris.size(), 3);
  EXPECT_TRUE(updater->badgeLabel().isEmpty());
}

TEST_F(DesktopBusTest, TheTrayItemRegistersWithTheWatcherAndCarriesTheRunningTimeAsItsLabel) {
  QDBusConnection watcherBus = PrivateBus::instance().connect();
  watcher.moveToThread(&serviceThread);
  ASSERT_TRUE(watcherBus.registerObject(QStringLiteral("/StatusNotifierWatcher"), &watcher,
                                        QDBusConnection::ExportAllSlots));
  ASSERT_TRUE(watcherBus.registerService(QStringLiteral("org.kde.StatusNotifierWatcher")));
  WTTask* task = makeTask();
  startTimer(task, clockNow.addingSeconds(-30 * 60));
  updater->start();
  WTStatusBarController statusBar(context.get(), updater.get(), PrivateBus::instance().connect());
  statusBar.activateStatusMenu();
  ASSERT_TRUE(waitFor([&] { return statusBar.isShowingIcon(); })) << "the watcher never took the item";
  ASSERT_EQ(watcher.registered().size(), 1);
  const QString item = watcher.registered().front();
  EXPECT_TRUE(item.startsWith(QStringLiteral("org.kde.StatusNotifierItem-"))) << item.toStdString();

  // The host reads the item as AppIndicator hosts do, and hears its label change.
  QDBusConnection host = PrivateBus::instance().connect();
  auto call = [&](const QString& path, const QString& interface, const QString& method,
                  const QVariantList& args) {
    QDBusMessage message = QDBusMessage::createMethodCall(item, path, interface, method);
    message.setArguments(args);
    QDBusPendingCall pending = host.asyncCall(message);
    waitFor([&] { return pending.isFinished(); });
    return pending.reply();
  };
  auto property = [&](const QString& name) {
    const QDBusMessage reply =
        call(QStringLiteral("/StatusNotifierItem"), QStringLiteral("org.freedesktop.DBus.Properties"),
             QStringLiteral("Get"), {QStringLiteral("org.kde.StatusNotifierItem"), name});
    return reply.arguments().value(0).value<QDBusVariant>().variant();
  };
  LabelListener listener;
  ASSERT_TRUE(host.connect(item, QStringLiteral("/StatusNotifierItem"),
                           QStringLiteral("org.kde.StatusNotifierItem"), QStringLiteral("XAyatanaNewLabel"),
                           &listener, SLOT(newLabel(QString, QString))));
  EXPECT_EQ(property(QStringLiteral("XAyatanaLabel")).toString(), QStringLiteral("00:30"));
  EXPECT_EQ(property(QStringLiteral("XAyatanaLabelGuide")).toString(), QStringLiteral("00:00"));
  EXPECT_EQ(property(QStringLiteral("IconName")).toString(), QStringLiteral("tessal-stopwatch-running"));
  const auto icons = qdbus_cast<QList<WTStatusNotifierIcon>>(property(QStringLiteral("IconPixmap")));
  ASSERT_FALSE(icons.isEmpty());
  EXPECT_EQ(icons.front().pixels.size(), icons.front().width * icons.front().height * 4);

  advance(60);
  updater->update();
  ASSERT_TRUE(waitFor([&] { return !listener.labels.isEmpty(); }));
  EXPECT_EQ(listener.labels, QStringList({QStringLiteral("00:31")}));
  EXPECT_EQ(property(QStringLiteral("XAyatanaLabel")).toString(), QStringLiteral("00:31"));

  task->stopAllTimers();
  settle();
  ASSERT_TRUE(waitFor([&] { return listener.labels.size() >= 2; }));
  EXPECT_EQ(listener.labels.back(), QString());
  EXPECT_EQ(property(QStringLiteral("XAyatanaLabel")).toString(), QString());
  EXPECT_EQ(property(QStringLiteral("IconName")).toString(), QStringLiteral("tessal-stopwatch"));

  // Its menu is the tray menu, and a click on an entry is that entry's.
  const QDBusMessage layout = call(QStringLiteral("/MenuBar"), QStringLiteral("com.canonical.dbusmenu"),
                                   QStringLiteral("GetLayout"), {0, -1, QStringList()});
  ASSERT_EQ(layout.type(), QDBusMessage::ReplyMessage) << layout.errorMessage().toStdString();
  QStringList labels;
  for (const WTDBusMenuLayout& entry : qdbus_cast<WTDBusMenuLayout>(layout.arguments().value(1)).children)
    labels << entry.properties.value(QStringLiteral("label")).toString();
  EXPECT_EQ(labels, QStringList({"Show Tessal", "Recent Tasks", "", "Quit"}));
  QSignalSpy showRequested(&statusBar, &WTStatusBarController::showMainWindowRequested);
  call(QStringLiteral("/MenuBar"), QStringLiteral("com.canonical.dbusmenu"), QStringLiteral("Event"),
       {1, QStringLiteral("clicked"), QVariant::fromValue(QDBusVariant(QString())), 0u});
  EXPECT_TRUE(waitFor([&] { return showRequested.count() == 1; }));
  // A click on the item opens the list of tasks.
  call(QStringLiteral("/StatusNotifierItem"), QStringLiteral("org.kde.StatusNotifierItem"),
       QStringLiteral("Activate"), {600, 10});
  EXPECT_TRUE(waitFor([&] { return statusBar.popup()->isVisible(); }));

  // A tray that restarts (GNOME reloading its extensions) gets the item again.
  QSignalSpy trayChanged(&statusBar, &WTStatusBarController::trayAvailabilityChanged);
  ASSERT_TRUE(watcherBus.unregisterService(QStringLiteral("org.kde.StatusNotifierWatcher")));
  ASSERT_TRUE(waitFor([&] { return !statusBar.isShowingIcon(); }));
  ASSERT_TRUE(watcherBus.registerService(QStringLiteral("org.kde.StatusNotifierWatcher")));
  EXPECT_TRUE(waitFor([&] { return statusBar.isShowingIcon(); }));
  EXPECT_EQ(watcher.registered(), QStringList({item, item}));
  EXPECT_EQ(trayChanged.count(), 2);
}

}  // namespace
