#include "WTIdleSourceChain.h"
#include "WTWaylandIdleSource.h"

#include <gtest/gtest.h>

#include <QCoreApplication>
#include <QProcess>
#include <QTest>

namespace {

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
