#include "WTImages.h"
#include "WTTableCellView.h"

#include <gtest/gtest.h>

#include <QtWidgets>

namespace {

using Part = WTTableCellView::Part;

// A task's add buttons answer only while shown; an entry's row has none.
TEST(WTTableCellViewTest, HoverButtonsAnswerOnlyWhileShown) {
  WTTableCellView task("WTTask"), time("WTTime");
  const QRectF row(0, 0, 800, 36);
  const QPointF addTime = task.partRect(Part::AddTime, row).center();
  EXPECT_EQ(task.partAt(addTime, row, true), Part::AddTime);
  EXPECT_NE(task.partAt(addTime, row, false), Part::AddTime);
  EXPECT_EQ(task.partAt(task.partRect(Part::TimerButton, row).center(), row, false), Part::TimerButton);
  EXPECT_TRUE(time.partRect(Part::AddTime, row).isEmpty());
  EXPECT_FALSE(time.partRect(Part::DateButton, row).isEmpty());
}

// Every image the windows name is drawn at the size and scale asked; a name of none gives nothing.
TEST(WTImagesTest, EveryNamedImageExists) {
  for (const char* name :
       {"StopWatch", "StopWatchRunning", "play_32", "stop_32", "notepad_32", "notepad_clock_32", "folder_32",
        "folder_32_dis", "admin_2_32", "admin_2_32_dis", "tessal"}) {
    const QImage image = WTImages::pixmap(name, QSize(32, 32), 2.0).toImage();
    ASSERT_TRUE(WTImages::contains(name) && image.size() == QSize(64, 64)) << name;
    bool drawn = false;
    for (int y = 0; y < image.height() && !drawn; ++y)
      for (int x = 0; x < image.width(); ++x) drawn = drawn || image.pixelColor(x, y).alpha() > 0;
    EXPECT_TRUE(drawn) << name;
  }
  EXPECT_FALSE(WTImages::contains("NSComputer"));
  EXPECT_TRUE(WTImages::pixmap("NSComputer", QSize(8, 8)).isNull());
}

}  // namespace
