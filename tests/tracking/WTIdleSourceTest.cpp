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

namespace {

class Unknowing final : public WTIdleSource {
 public:
  qint64 idleSeconds() override { return ++asked, -1; }
  int asked = 0;
};

// A Wayland session's X server is XWayland, whose counter does not see the user's input.
TEST(X11IdleSourceTest, OnlyAnX11SessionUsesTheServersCounter) {
  const char* names[] = {"DISPLAY", "WAYLAND_DISPLAY", "XDG_SESSION_TYPE"};
  // Each variable as given, or unset when null.
  auto set = [&](const std::array<QByteArray, 3>& values) {
    for (int i = 0; i < 3; ++i) values[i].isNull() ? qunsetenv(names[i]) : qputenv(names[i], values[i]);
  };
  const std::array<QByteArray, 3> saved = {qgetenv(names[0]), qgetenv(names[1]), qgetenv(names[2])};
  const std::pair<std::array<QByteArray, 3>, bool> cases[] = {
      {{":0", {}, {}}, true},         {{":0", {}, "x11"}, true},          {{":0", "wayland-0", {}}, false},
      {{":0", {}, "wayland"}, false}, {{QByteArray(), {}, "x11"}, false},
  };
  for (const auto& [values, x11] : cases) {
    set(values);
    EXPECT_EQ(WTX11IdleSource::sessionIsX11(), x11)
        << values[0].data() << "|" << values[1].data() << "|" << values[2].data();
  }
  set(saved);
}

// The counter grows without input and restarts with it; a chain moves past a source that does not know.
TEST(X11IdleSourceTest, TheServersCounterGrowsWithoutInputAndRestartsWithIt) {
  EXPECT_FALSE(WTX11IdleSource(":999").isAvailable());
  EXPECT_EQ(WTX11IdleSource(":999").idleSeconds() + WTIdleSourceChain().idleSeconds(), -2);
  PrivateXServer x("320x240x24");
  if (!x.running()) GTEST_SKIP() << "no Xvfb to start";
  WTX11IdleSource source(x.display().toLatin1());
  ASSERT_TRUE(source.isAvailable());
  // Moves the pointer as a user would, through the server's test extension.
  auto move = [&](int px, int py) {
    x.xdotool({"mousemove", QString::number(px), QString::number(py)});
    return x.xdotool({"getmouselocation"}).startsWith(QStringLiteral("x:%1 y:%2").arg(px).arg(py));
  };
  ASSERT_TRUE(move(10, 10));
  QThread::msleep(2200);
  const qint64 idle = source.idleSeconds();
  EXPECT_TRUE(idle >= 2 && idle < 60) << idle;
  ASSERT_TRUE(move(100, 100));
  EXPECT_EQ(source.idleSeconds(), 0);
  auto* first = new Unknowing;
  WTIdleSourceChain chain;
  chain.append(std::unique_ptr<WTIdleSource>(first));
  chain.append(std::make_unique<WTX11IdleSource>(x.display().toLatin1()));
  EXPECT_EQ(chain.idleSeconds(), 0);
  EXPECT_EQ(first->asked, 1);
}

// The test compositor on a socket of its own in the test's runtime folder.
class Compositor {
 public:
  explicit Compositor(bool offerIdleNotify = true) {
    socket = QStringLiteral("tessal-idle-%1-%2").arg(QCoreApplication::applicationPid()).arg(++count);
    process.start(FAKE_IDLE_COMPOSITOR,
                  offerIdleNotify ? QStringList{socket} : QStringList{socket, "--no-idle-notify"});
    ready = process.waitForReadyRead(10000) && process.readLine().trimmed() == "ready";
  }
  ~Compositor() {
    if (process.state() == QProcess::Running) send("quit"), process.waitForFinished(5000);
  }
  void send(const char* command) {
    process.write(QByteArray(command) + "\n");
    process.waitForBytesWritten(5000);
  }
  static inline int count = 0;
  QString socket;
  QProcess process;
  bool ready = false;
};

TEST(WaylandIdleSourceTest, IdleTimeIsCountedFromTheCompositorsNoticeUntilTheUserIsBack) {
  Compositor compositor;
  ASSERT_TRUE(compositor.ready);
  WTWaylandIdleSource source(compositor.socket.toUtf8(), 3000);
  ASSERT_TRUE(source.isAvailable());
  compositor.process.waitForReadyRead(200);
  EXPECT_EQ(compositor.process.readAllStandardOutput(), "notification 3000\n");
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
  // Without the protocol, or without a compositor, nothing is known.
  Compositor withoutProtocol(false);
  ASSERT_TRUE(withoutProtocol.ready);
  for (const QByteArray& socket :
       {withoutProtocol.socket.toUtf8(), QByteArray("tessal-no-such-compositor")}) {
    WTWaylandIdleSource none(socket);
    EXPECT_TRUE(!none.isAvailable() && none.idleSeconds() == -1) << socket.data();
  }
}

}  // namespace
