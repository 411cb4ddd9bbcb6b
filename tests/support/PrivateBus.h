#pragma once
// A dbus-daemon of the test binary's own, for tests of what Tessal says and hears on the desktop's buses.
#include <QCoreApplication>
#include <QDBusConnection>
#include <QElapsedTimer>
#include <QFile>
#include <QProcess>
#include <QStringList>
#include <QTemporaryDir>
#include <QThread>
#include <QUuid>

#include <gtest/gtest.h>

#include <functional>

// A private bus daemon for the binary: no test touches the developer's session or system bus. It has no
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

// Runs the event loop until `done` holds, for at most `ms` milliseconds; whether it holds.
inline bool waitForBus(const std::function<bool()>& done, int ms = 3000) {
  QElapsedTimer clock;
  clock.start();
  while (!done() && clock.elapsed() < ms) {
    QCoreApplication::processEvents(QEventLoop::AllEvents, 20);
    QThread::msleep(1);
  }
  return done();
}

// A test over the private bus, with a thread that serves the test's own services so that a caller
// blocking on a reply is still answered. `Base` is the suite's own fixture.
template <class Base>
class PrivateBusTest : public Base {
 protected:
  void SetUp() override {
    Base::SetUp();
    ASSERT_FALSE(PrivateBus::instance().address().isEmpty()) << "dbus-daemon did not start";
    serviceThread.start();
  }
  void TearDown() override {
    PrivateBus::instance().disconnectAll();
    serviceThread.quit();
    serviceThread.wait();
    Base::TearDown();
  }
  // Serves `service` at `path` under the well-known `name`, from the service thread.
  template <class Service>
  void serve(Service& service, const QString& name, const QString& path) {
    QDBusConnection bus = PrivateBus::instance().connect();
    ASSERT_TRUE(bus.isConnected());
    service.moveToThread(&serviceThread);
    ASSERT_TRUE(bus.registerObject(path, &service, QDBusConnection::ExportAllSlots));
    ASSERT_TRUE(bus.registerService(name));
  }

  QThread serviceThread;
};
