// The tray icon in a real tray (Xvfb, trayer), the real desktop copy driven by pointer and keyboard.
#include "CommandLineInstallation.h"
#include "PrivateXServer.h"
#include "TestFiles.h"

#include <QStandardPaths>
#include <QTest>
#include <QThread>

#include <functional>
#include <optional>

namespace {

using namespace commandtest;

struct Geometry {
  int x = 0, y = 0, width = 0, height = 0;
};

bool iconSized(const Geometry& g) {
  return g.width <= 64 && g.height <= 64;
}

class TrayTest : public ::testing::Test {
 protected:
  void SetUp() override {
    for (const char* tool : {"Xvfb", "trayer", "xdotool"})
      if (QStandardPaths::findExecutable(tool).isEmpty()) GTEST_SKIP() << tool << " is not installed";
    ASSERT_TRUE(x.running()) << "Xvfb did not start";
  }
  void TearDown() override {
    for (QProcess* process : {tessal.get(), &tray}) {
      if (process) process->kill(), process->waitForFinished();
    }
  }
  void startTray() {
    tray.setProcessEnvironment(x.environment());
    tray.start("trayer", {"--edge", "top", "--align", "right", "--widthtype", "request", "--height", "28"});
    ASSERT_TRUE(tray.waitForStarted());
  }
  // The desktop copy writes to a file: a pipe nobody reads while the test polls would stop it once full.
  void launchTessal() {
    tessal = std::make_unique<QProcess>();
    tessal->setProcessEnvironment(here.environment({{"DISPLAY", x.display()}, {"QT_QPA_PLATFORM", "xcb"}}));
    tessal->setProcessChannelMode(QProcess::MergedChannels);
    tessal->setStandardOutputFile(here.path("tessal.log"));
    tessal->start(QString::fromUtf8(TESSAL_EXE), {});
    ASSERT_TRUE(tessal->waitForStarted());
  }
  // What the desktop copy said and whether it still runs, for a failure's message.
  std::string tessalState() const {
    const QString said = QString::fromUtf8(fileBytes(here.path("tessal.log")));
    return QStringLiteral("Tessal %1; it said: %2")
        .arg(tessal->state() == QProcess::Running ? "runs" : "ended", said)
        .toStdString();
  }
  // The first visible window of the copy matching `pattern` that `fits`, waited for up to `ms`.
  std::optional<Geometry> window(const QString& pattern, const std::function<bool(const Geometry&)>& fits,
                                 int ms = 20000) const {
    std::optional<Geometry> found;
    (void)QTest::qWaitFor(
        [&] {
          const QString ids = x.xdotool(
              {"search", "--onlyvisible", "--pid", QString::number(tessal->processId()), "--name", pattern});
          for (const QString& id : ids.split('\n', Qt::SkipEmptyParts)) {
            QMap<QString, int> shell;  // "X=…", "Y=…", "WIDTH=…", "HEIGHT=…", one a line
            for (const QString& line : x.xdotool({"getwindowgeometry", "--shell", id}).split('\n'))
              shell[line.section('=', 0, 0)] = line.section('=', 1).toInt();
            const Geometry geometry{shell["X"], shell["Y"], shell["WIDTH"], shell["HEIGHT"]};
            if (fits(geometry)) return found = geometry, true;
          }
          return false;
        },
        ms);
    return found;
  }

  Installation here;
  PrivateXServer x;
  QProcess tray;
  std::unique_ptr<QProcess> tessal;
};

}  // namespace

TEST_F(TrayTest, TheIconSitsInTheTrayAndItsListStopsTheRunningTimerFromTheKeyboard) {
  {
    std::unique_ptr<WTObjectContext> context = here.openStore();
    for (int n = 0; n < 10; ++n) {
      auto* task = WTTask::insertNewObject(context.get());
      task->setName(QStringLiteral("T%1").arg(n));
      if (n == 3) task->toggleTimer();
    }
    ASSERT_TRUE(context->save());
  }
  ASSERT_NO_FATAL_FAILURE(startTray());
  QThread::msleep(300);  // the tray claims its selection before Tessal looks for one
  ASSERT_NO_FATAL_FAILURE(launchTessal());
  // The icon: small, in the tray (the main window is called Tessal too).
  const std::optional<Geometry> icon = window("^Tessal$", iconSized);
  ASSERT_TRUE(icon) << "no icon in the tray; " << tessalState();
  // A click opens the list.
  x.xdotool({"mousemove", QString::number(icon->x + icon->width / 2),
             QString::number(icon->y + icon->height / 2), "click", "1"});
  const std::optional<Geometry> list = window("Recent Tasks", [](const Geometry&) { return true; });
  ASSERT_TRUE(list) << "the list did not open";
  // The running task's button has the focus: Space stops it, and the copy saves that.
  x.xdotool({"key", "space"});
  EXPECT_TRUE(QTest::qWaitFor([&] { return here.tessal({"status"}).code == 1; }, 5000))
      << "the timer still runs";
}

TEST_F(TrayTest, ATrayThatAppearsLaterGetsTheIconAtTheNextTick) {
  // No store yet: the desktop copy makes it, with the first project's task.
  ASSERT_NO_FATAL_FAILURE(launchTessal());
  ASSERT_TRUE(window("^Tessal", [](const Geometry& g) { return g.width > 64; }))
      << "the main window did not open; " << tessalState();
  EXPECT_FALSE(window("^Tessal$", iconSized, 0));
  // As when a desktop's tray extension loads after the applications of the session.
  ASSERT_NO_FATAL_FAILURE(startTray());
  EXPECT_TRUE(window("^Tessal$", iconSized, 12000))
      << "no icon within two ticks of the tray's arrival; " << tessalState();
}
