#include "WTSingleInstance.h"

#include <gtest/gtest.h>

#include <QFile>
#include <QSignalSpy>
#include <QTemporaryDir>
#include <QTest>

#include <atomic>
#include <thread>

namespace {

TEST(WTSingleInstanceTest, ASecondCopyBringsTheFirstForwardAndLeaves) {
  QTemporaryDir dir;
  const QString path = dir.filePath("tessal.socket");
  WTSingleInstance first(path);
  ASSERT_TRUE(first.start());
  EXPECT_TRUE(first.isListening());
  QSignalSpy reopened(&first, &WTSingleInstance::reopenRequested);

  // The second copy runs elsewhere (its own thread here) while the first keeps serving events.
  auto startSecondCopy = [&](bool bringForward) {
    std::atomic<int> started{-1};
    std::thread second([&] {
      WTSingleInstance copy(path);
      started = copy.start(bringForward) ? 1 : 0;
    });
    const bool finished = QTest::qWaitFor([&] { return started != -1; }, 5000);
    second.join();
    EXPECT_TRUE(finished);
    return started.load();
  };
  EXPECT_EQ(startSecondCopy(true), 0);
  EXPECT_EQ(reopened.count(), 1);
  // A command-line run only learns that a copy is running; the window stays where it is.
  EXPECT_EQ(startSecondCopy(false), 0);
  EXPECT_EQ(reopened.count(), 1);
}

// A copy too busy to answer (its event loop held up by a long save) keeps its store: a second copy
// that took over its socket would open the same store twice.
TEST(WTSingleInstanceTest, ACopyThatIsTooBusyToAnswerStillCounts) {
  QTemporaryDir dir;
  const QString path = dir.filePath("tessal.socket");
  WTSingleInstance busy(path);
  ASSERT_TRUE(busy.start());
  WTSingleInstance second(path);  // asks from this thread, so the first cannot answer meanwhile
  EXPECT_FALSE(second.start(false) || second.isListening());
  EXPECT_TRUE(busy.isListening() && QFile::exists(path));
}

TEST(WTSingleInstanceTest, ASocketLeftByACopyThatDiedIsTakenOver) {
  QTemporaryDir dir;
  const QString path = dir.filePath("tessal.socket");
  ASSERT_TRUE(QFile(path).open(QIODevice::WriteOnly));
  WTSingleInstance instance(path);
  EXPECT_TRUE(instance.start() && instance.isListening());
  // Nobody else listens: asking a copy to come forward reaches nobody.
  WTSingleInstance other(dir.filePath("other.socket"));
  EXPECT_FALSE(other.notifyRunningInstance(200));
}

}  // namespace
