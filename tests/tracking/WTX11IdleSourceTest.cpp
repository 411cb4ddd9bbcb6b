#include "WTIdleSourceChain.h"
#include "WTX11IdleSource.h"

#include "PrivateXServer.h"

#include <gtest/gtest.h>

#include <QThread>

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
