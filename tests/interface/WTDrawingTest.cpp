#include "RZBackgroundView.h"
#include "WTImages.h"
#include "WTTableCellView.h"
#include "WTTableRowView.h"

#include <gtest/gtest.h>

#include <QtWidgets>

#include <array>

namespace {

using Part = WTTableCellView::Part;

// A row painted on red: its body, the pixel above the groove, and the groove's two lines.
std::array<QRgb, 4> paintRow(const WTTableRowView& row, bool selected) {
  QImage image(100, 20, QImage::Format_RGB32);
  image.fill(Qt::red);
  QPainter painter(&image);
  row.draw(painter, QRectF(0, 0, 100, 20), selected);
  EXPECT_EQ(image.pixel(0, 18), image.pixel(99, 18)) << "the groove runs the whole width";
  return {image.pixel(50, 5), image.pixel(50, 17), image.pixel(50, 18), image.pixel(50, 19)};
}

// The body takes the row's colours and reaches the groove, which is the same under every row.
TEST(WTTableRowViewTest, TheBodyTakesItsColoursAndTheGrooveRunsAlongTheBottom) {
  const QColor own(120, 130, 140), ownSelected(60, 70, 80);
  const WTTableRowView plain, header = WTTableRowView::initWithHeaderColors(),
                              custom = WTTableRowView::initWithBgColor(own, ownSelected);
  EXPECT_EQ(paintRow(custom, false)[0], own.rgb());
  EXPECT_EQ(paintRow(custom, true)[0], ownSelected.rgb());
  EXPECT_NE(paintRow(plain, true)[0], paintRow(plain, false)[0]);
  EXPECT_EQ(paintRow(header, true)[0], paintRow(header, false)[0]);
  EXPECT_NE(paintRow(header, false)[0], paintRow(plain, false)[0]);
  const auto groove = paintRow(plain, false);
  EXPECT_LT(qGray(groove[2]), qGray(groove[3]));
  for (const WTTableRowView* row : {&plain, &header, &custom}) {
    for (const bool selected : {false, true}) {
      const auto pixels = paintRow(*row, selected);
      EXPECT_TRUE(pixels[1] == pixels[0] && pixels[2] != pixels[0] && pixels[3] != pixels[0]);
      EXPECT_EQ(std::pair(pixels[2], pixels[3]), std::pair(groove[2], groove[3]));
    }
  }
  WTTableRowView bare;
  bare.setDrawsBackground(false);
  bare.setDrawsSeparator(false);
  const QRgb red = QColor(Qt::red).rgb();
  EXPECT_EQ(paintRow(bare, false), (std::array<QRgb, 4>{red, red, red, red}));
}

// The gradient runs from the top edge down over the whole view; hex colours take the last six digits of
// the text, after an optional "0x", and anything else is black.
TEST(RZBackgroundViewTest, PaintsItsGradientFromHexColours) {
  RZBackgroundView view;
  view.resize(40, 40);
  view.setIBGradientBeginHexColor("0xFfFfFf");
  view.setIBGradientEndHexColor("1000005");
  EXPECT_EQ(QList<QColor>({view.beginColor(), view.endColor()}), QList<QColor>({Qt::white, QColor(0, 0, 5)}));
  QImage image(view.size(), QImage::Format_RGB32);
  image.fill(Qt::red);
  QPainter painter(&image);
  view.drawBackground(painter, QRect(0, 20, 40, 20));
  EXPECT_EQ(image.pixelColor(20, 1), QColor(Qt::red)) << "only the part asked for";
  const int middle = image.pixelColor(20, 20).lightness();
  EXPECT_TRUE(middle > 80 && middle < 170) << middle << ": the gradient spans the whole view";
  EXPECT_LT(image.pixelColor(20, 38).lightness(), 25);
  for (const char* hex : {"", "not hex"}) {
    view.setIBGradientEndHexColor(hex);
    EXPECT_EQ(view.endColor(), QColor(Qt::black)) << hex;
  }
}

// A task's add buttons sit in order inside the bar and answer only while shown.
TEST(WTTableCellViewTest, HoverButtonsAnswerOnlyWhileShown) {
  WTTableCellView task("WTTask"), time("WTTime");
  const QRectF row(0, 0, 800, 36), bar = task.partRect(Part::HoverBar, row);
  const QPointF addTime = task.partRect(Part::AddTime, row).center();
  EXPECT_EQ(task.partAt(addTime, row, true), Part::AddTime);
  EXPECT_NE(task.partAt(addTime, row, false), Part::AddTime);
  qreal x = -1;
  for (auto part : {Part::AddTime, Part::AddFlat, Part::AddNote, Part::AddExpense, Part::AddToDo}) {
    const QRectF button = task.partRect(part, row);
    EXPECT_TRUE(!button.isEmpty() && bar.contains(button) && button.x() > x) << int(part);
    x = button.right();
  }
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
