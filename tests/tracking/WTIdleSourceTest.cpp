// The desktop's idle counters: the X server's, and a Wayland compositor's over the idle-notify protocol.
#include "PrivateXServer.h"
#include "WTIdleSourceChain.h"
#include "WTWaylandIdleSource.h"
#include "WTX11IdleSource.h"

#include <gtest/gtest.h>

#include <QCoreApplication>
#include <QProcess>
#include <QTest>
#include <QThread>

#include <array>

namespace {

// Moves the pointer as a user would, through the server's test extension.
bool movePointer(const PrivateXServer& x, int px, int py) {
  x.xdotool({QStringLiteral("mousemove"), QString::number(px), QString::number(py)});
  return x.xdotool({QStringLiteral("getmouselocation")})
      .startsWith(QStringLiteral("x:%1 y:%2").arg(px).arg(py));
}

class Unknowing final : public WTIdleSource {
 public:
  qint64 idleSeconds() override {
    ++asked;
    return -1;
  }
  int asked = 0;
};

TEST(X11IdleSourceTest, TheServersCounterGrowsWithoutInputAndRestartsWithIt) {
  PrivateXServer x(QStringLiteral("320x240x24"));
  if (!x.running()) GTEST_SKIP() << "no Xvfb to start";
  WTX11IdleSource source(x.display().toLatin1());
  ASSERT_TRUE(source.isAvailable());
  ASSERT_TRUE(movePointer(x, 10, 10));
  QThread::msleep(2200);
  const qint64 idle = source.idleSeconds();
  EXPECT_GE(idle, 2);
  EXPECT_LT(idle, 60);
  ASSERT_TRUE(movePointer(x, 100, 100));
  EXPECT_EQ(source.idleSeconds(), 0);

  // In a chain, a source that does not know hands over to the next.
  auto* first = new Unknowing;
  WTIdleSourceChain chain;
  chain.append(std::unique_ptr<WTIdleSource>(first));
  chain.append(std::make_unique<WTX11IdleSource>(x.display().toLatin1()));
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
  const char* names[] = {"DISPLAY", "WAYLAND_DISPLAY", "XDG_SESSION_TYPE"};
  QByteArray saved[3];
  for (int i = 0; i < 3; ++i) saved[i] = qgetenv(names[i]);
  // Each variable as given, or unset when null.
  auto set = [&](const std::array<QByteArray, 3>& values) {
    for (int i = 0; i < 3; ++i) values[i].isNull() ? qunsetenv(names[i]) : qputenv(names[i], values[i]);
  };
  const std::pair<std::array<QByteArray, 3>, bool> cases[] = {
      {{":0", {}, {}}, true},         {{":0", {}, "x11"}, true},          {{":0", "wayland-0", {}}, false},
      {{":0", {}, "wayland"}, false}, {{QByteArray(), {}, "x11"}, false},
  };
  for (const auto& [values, x11] : cases) {
    set(values);
    EXPECT_EQ(WTX11IdleSource::sessionIsX11(), x11)
        << values[0].data() << "|" << values[1].data() << "|" << values[2].data();
  }
  set({saved[0], saved[1], saved[2]});
}

// The test compositor on a socket of its own in the test's runtime folder.
class Compositor {
 public:
  explicit Compositor(bool offerIdleNotify = true) {
    socket = QStringLiteral("tessal-idle-%1-%2").arg(QCoreApplication::applicationPid()).arg(++count);
    QStringList arguments{socket};
    if (!offerIdleNotify) arguments << QStringLiteral("--no-idle-notify");
    process.start(QStringLiteral(FAKE_IDLE_COMPOSITOR), arguments);
    ready = process.waitForReadyRead(10000) && process.readLine().trimmed() == "ready";
  }
  ~Compositor() {
    if (process.state() == QProcess::Running) {
      process.write("quit\n");
      process.waitForFinished(5000);
    }
  }
  void send(const char* command) {
    process.write(command);
    process.write("\n");
    process.waitForBytesWritten(5000);
  }
  // The requests the compositor reported, one a line.
  QStringList requests() {
    process.waitForReadyRead(200);
    output += QString::fromUtf8(process.readAllStandardOutput());
    return output.split(QLatin1Char('\n'), Qt::SkipEmptyParts);
  }

  static inline int count = 0;
  QString socket;
  QProcess process;
  QString output;
  bool ready = false;
};

TEST(WaylandIdleSourceTest, IdleTimeIsCountedFromTheCompositorsNoticeUntilTheUserIsBack) {
  Compositor compositor;
  ASSERT_TRUE(compositor.ready);
  WTWaylandIdleSource source(compositor.socket.toUtf8(), 3000);
  ASSERT_TRUE(source.isAvailable());
  EXPECT_EQ(compositor.requests(), QStringList{"notification 3000"});
  EXPECT_EQ(source.idleSeconds(), 0);

  // Told "idle" after three seconds without input: at least those three seconds, and growing.
  compositor.send("idle");
  ASSERT_TRUE(QTest::qWaitFor([&] { return source.idleSeconds() >= 3; }, 5000));
  EXPECT_LT(source.idleSeconds(), 5);
  QTest::qWait(1100);
  EXPECT_GE(source.idleSeconds(), 4);

  compositor.send("resume");
  EXPECT_TRUE(QTest::qWaitFor([&] { return source.idleSeconds() == 0; }, 5000));

  // The compositor going away leaves the source without an answer rather than a stale one.
  compositor.send("idle");
  ASSERT_TRUE(QTest::qWaitFor([&] { return source.idleSeconds() >= 3; }, 5000));
  compositor.send("quit");
  ASSERT_TRUE(compositor.process.waitForFinished(5000));
  EXPECT_TRUE(QTest::qWaitFor([&] { return source.idleSeconds() == -1; }, 5000));
}

TEST(WaylandIdleSourceTest, WithoutTheProtocolOrACompositorNothingIsKnown) {
  Compositor withoutProtocol(false);
  ASSERT_TRUE(withoutProtocol.ready);
  WTWaylandIdleSource source(withoutProtocol.socket.toUtf8());
  EXPECT_FALSE(source.isAvailable());
  EXPECT_EQ(source.idleSeconds(), -1);

  WTWaylandIdleSource nobody("tessal-no-such-compositor");
  EXPECT_FALSE(nobody.isAvailable());
  EXPECT_EQ(nobody.idleSeconds(), -1);
}

}  // namespace
