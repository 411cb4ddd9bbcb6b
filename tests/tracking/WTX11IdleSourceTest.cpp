#include "WTIdleSourceChain.h"
#include "WTX11IdleSource.h"

#include <gtest/gtest.h>

#include <QCoreApplication>
#include <QDir>
#include <QFile>
#include <QProcess>
#include <QStandardPaths>
#include <QThread>

namespace {

// A private X server for the length of one test, on a display number nobody uses.
class PrivateXServer {
 public:
  PrivateXServer() {
    if (QStandardPaths::findExecutable(QStringLiteral("Xvfb")).isEmpty()) return;
    for (int number = 300 + int(QCoreApplication::applicationPid() % 300); number < 1000; ++number) {
      if (QFile::exists(QStringLiteral("/tmp/.X11-unix/X%1").arg(number)) ||
          QFile::exists(QStringLiteral("/tmp/.X%1-lock").arg(number))) {
        continue;
      }
      display = QByteArray(":") + QByteArray::number(number);
      server.start(QStringLiteral("Xvfb"),
                   {QString::fromLatin1(display), QStringLiteral("-nolisten"), QStringLiteral("tcp"),
                    QStringLiteral("-screen"), QStringLiteral("0"), QStringLiteral("320x240x24")});
      server.waitForStarted(5000);
      break;
    }
    for (int i = 0; i < 100 && server.state() == QProcess::Running; ++i) {
      if (QFile::exists(QStringLiteral("/tmp/.X11-unix/X") + QString::fromLatin1(display.mid(1)))) return;
      QThread::msleep(50);
    }
    display.clear();
  }
  ~PrivateXServer() {
    server.terminate();
    server.waitForFinished(5000);
  }
  bool running() const { return !display.isEmpty(); }

  // Moves the pointer as a user would, through the server's test extension.
  bool movePointer(int x, int y) const {
    QProcess xdotool;
    QProcessEnvironment environment = QProcessEnvironment::systemEnvironment();
    environment.insert(QStringLiteral("DISPLAY"), QString::fromLatin1(display));
    xdotool.setProcessEnvironment(environment);
    xdotool.start(QStringLiteral("xdotool"),
                  {QStringLiteral("mousemove"), QString::number(x), QString::number(y)});
    return xdotool.waitForFinished(10000) && xdotool.exitCode() == 0;
  }

  QByteArray display;
  QProcess server;
};

class Unknowing final : public WTIdleSource {
 public:
  qint64 idleSeconds() override {
    ++asked;
    return -1;
  }
  int asked = 0;
};

TEST(X11IdleSourceTest, TheServersCounterGrowsWithoutInputAndRestartsWithIt) {
  PrivateXServer x;
  if (!x.running()) GTEST_SKIP() << "no Xvfb to start";
  WTX11IdleSource source(x.display);
  ASSERT_TRUE(source.isAvailable());
  ASSERT_TRUE(x.movePointer(10, 10));
  QThread::msleep(2200);
  const qint64 idle = source.idleSeconds();
  EXPECT_GE(idle, 2);
  EXPECT_LT(idle, 60);
  ASSERT_TRUE(x.movePointer(100, 100));
  EXPECT_EQ(source.idleSeconds(), 0);

  // In a chain, a source that does not know hands over to the next.
  auto* first = new Unknowing;
  WTIdleSourceChain chain;
  chain.append(std::unique_ptr<WTIdleSource>(first));
  chain.append(std::make_unique<WTX11IdleSource>(x.display));
  EXPECT_EQ(chain.idleSeconds(), 0);
  EXPECT_EQ(first->asked, 1);
}

TEST(X11IdleSourceTest, NoServerMeansNotKnown) {
  WTX11IdleSource source(":999");
  EXPECT_FALSE(source.isAvailable());
  EXPECT_EQ(source.idleSeconds(), -1);
  WTIdleSourceChain empty;
  EXPECT_EQ(empty.idleSeconds(), -1);
}

TEST(X11IdleSourceTest, OnlyAnX11SessionUsesTheServersCounter) {
  const QByteArray display = qgetenv("DISPLAY"), wayland = qgetenv("WAYLAND_DISPLAY"),
                   type = qgetenv("XDG_SESSION_TYPE");
  auto set = [](const char* name, const QByteArray& value) {
    if (value.isNull()) {
      qunsetenv(name);
    } else {
      qputenv(name, value);
    }
  };
  struct Case {
    QByteArray display, wayland, type;
    bool x11;
  } cases[] = {
      {":0", {}, {}, true},         {":0", {}, "x11", true}, {":0", "wayland-0", {}, false},
      {":0", {}, "wayland", false}, {{}, {}, "x11", false},
  };
  for (const Case& c : cases) {
    set("DISPLAY", c.display);
    set("WAYLAND_DISPLAY", c.wayland);
    set("XDG_SESSION_TYPE", c.type);
    EXPECT_EQ(WTX11IdleSource::sessionIsX11(), c.x11)
        << c.display.data() << "|" << c.wayland.data() << "|" << c.type.data();
  }
  set("DISPLAY", display);
  set("WAYLAND_DISPLAY", wayland);
  set("XDG_SESSION_TYPE", type);
}

}  // namespace
