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

// A bus daemon of the binary's own, without activation: a name nobody owns stays unanswered.
class PrivateBus {
 public:
  static PrivateBus& instance() {
    static PrivateBus bus;
    return bus;
  }
  QString address() const { return address_; }
  // A new connection of its own to the private bus.
  QDBusConnection connect() {
    names_.append("tracking-test-" + QUuid::createUuid().toString(QUuid::Id128));
    return QDBusConnection::connectToBus(address_, names_.last());
  }
  void disconnectAll() {
    for (const QString& name : std::as_const(names_)) QDBusConnection::disconnectFromBus(name);
    names_.clear();
  }

 private:
  PrivateBus() {
    QFile config(dir_.filePath("bus.conf"));
    if (config.open(QIODevice::WriteOnly))
      config.write(
          QStringLiteral("<busconfig><type>session</type><listen>unix:dir=%1</listen>"
                         "<policy context=\"default\"><allow send_destination=\"*\" eavesdrop=\"true\"/>"
                         "<allow eavesdrop=\"true\"/><allow own=\"*\"/></policy></busconfig>")
              .arg(dir_.path())
              .toUtf8());
    config.close();
    daemon_.start("dbus-daemon", {"--config-file=" + config.fileName(), "--nofork", "--print-address"});
    if (daemon_.waitForStarted(5000) && daemon_.waitForReadyRead(5000))
      address_ = QString::fromUtf8(daemon_.readLine()).trimmed();
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

// A test over the private bus, serving its services from a thread of their own. `Base`: the fixture.
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
