#include "RZBackgroundView.h"
#include "RZColor.h"
#include "WTImages.h"
#include "WTPopUpButtonCell.h"
#include "WTTableCellView.h"
#include "WTTableRowView.h"

#include <gtest/gtest.h>

#include <QApplication>
#include <QPainter>

namespace {

// A row of 100 x 20 pixels painted on a red canvas (so untouched pixels show).
QImage paintRow(const WTTableRowView& row, bool selected) {
  QImage image(100, 20, QImage::Format_RGB32);
  image.fill(Qt::red);
  QPainter painter(&image);
  row.draw(painter, QRectF(0, 0, 100, 20), selected);
  return image;
}

int grey(const QImage& image, int x, int y) {
  const QColor colour = image.pixelColor(x, y);
  EXPECT_EQ(colour.red(), colour.green());
  EXPECT_EQ(colour.green(), colour.blue());
  return colour.red();
}

TEST(WTTableRowViewTest, FlatGreyTonesAndTheGroove) {
  struct Case {
    const char* what;
    WTTableRowView row;
    bool selected;
    int body;
  };
  WTTableRowView plain;
  WTTableRowView header = WTTableRowView::initWithHeaderColors();
  WTTableRowView custom =
      WTTableRowView::initWithBgColor(RZColor::calibratedWhite(0.5), RZColor::calibratedWhite(0.3));
  const Case cases[] = {
      {"background", plain, false, 230},  // white 0.9
      {"selected", plain, true, 214},     // white 0.84
      {"header", header, false, 166},     // white 0.65
      {"header selected", header, true, 166},
      {"own colours", custom, false, 128},
      {"own colours selected", custom, true, 77},
  };
  for (const Case& c : cases) {
    const QImage image = paintRow(c.row, c.selected);
    EXPECT_EQ(grey(image, 50, 5), c.body) << c.what;
    // The groove: white 0.8 then white 0.95 along the bottom, across the whole width.
    EXPECT_EQ(grey(image, 0, 18), 204) << c.what;
    EXPECT_EQ(grey(image, 99, 19), 242) << c.what;
    EXPECT_EQ(grey(image, 50, 17), c.body) << c.what;
  }
  WTTableRowView bare;
  bare.setDrawsBackground(false);
  bare.setDrawsSeparator(false);
  const QImage untouched = paintRow(bare, false);
  EXPECT_EQ(untouched.pixelColor(50, 5), QColor(Qt::red));
  EXPECT_EQ(untouched.pixelColor(50, 19), QColor(Qt::red));
}

TEST(WTPopUpButtonCellTest, TheTagChoosesColourAndSide) {
  EXPECT_EQ(WTPopUpButtonCell::colorForTag(1), RZColor::calibratedWhite(0.1));
  EXPECT_EQ(WTPopUpButtonCell::colorForTag(0), QColor(Qt::white));
  EXPECT_EQ(WTPopUpButtonCell::colorForTag(4), QColor(Qt::white));
  // Multiples of 3: against the right edge; others at 4 points from the left.
  EXPECT_DOUBLE_EQ(WTPopUpButtonCell::arrowX(3, 200, 50), 135);
  EXPECT_DOUBLE_EQ(WTPopUpButtonCell::arrowX(0, 200, 50), 135);
  EXPECT_DOUBLE_EQ(WTPopUpButtonCell::arrowX(1, 200, 50), 4);
  EXPECT_DOUBLE_EQ(WTPopUpButtonCell::titleRect(1, QRectF(10, 0, 200, 20), 50, 14).x(), 26);

  // Drawn: near-black arrows for tag 1 near the left edge, nothing at the right.
  QImage image(200, 20, QImage::Format_RGB32);
  image.fill(Qt::white);
  QPainter painter(&image);
  WTPopUpButtonCell::drawWithFrame(painter, QRectF(0, 0, 200, 20), "x", QApplication::font(), 1);
  painter.end();
  EXPECT_LT(image.pixelColor(7, 7).lightness(), 100);
  EXPECT_EQ(image.pixelColor(190, 7), QColor(Qt::white));
}

TEST(RZColorTest, HexRGB) {
  EXPECT_EQ(RZColor::colorFromHexRGB("FF8000"), QColor::fromRgbF(1.0f, 128 / 255.0f, 0.0f));
  EXPECT_EQ(RZColor::colorFromHexRGB("1FF8000"), RZColor::colorFromHexRGB("FF8000"));
  EXPECT_EQ(RZColor::colorFromHexRGB("0x0000ff"), QColor(0, 0, 255));
  EXPECT_EQ(RZColor::colorFromHexRGB(QString()), QColor(Qt::black));
  EXPECT_EQ(RZColor::colorFromHexRGB("not hex"), QColor(Qt::black));
  EXPECT_EQ(RZColor::colorFromHexRGB("FF8000").alpha(), 255);
}

TEST(RZBackgroundViewTest, ArchivedSettingsComeBack) {
  RZBackgroundView view;
  view.setIBGradientBeginHexColor("112233");
  view.setIBGradientEndHexColor("445566");
  view.setGradientAngle(90);
  view.setSolidColor(Qt::yellow);
  view.setIBTiledImageName("play_32");
  std::unique_ptr<RZBackgroundView> copy(RZBackgroundView::initWithCoder(view.encodeWithCoder()));
  EXPECT_EQ(copy->backgroundMode(), RZBackgroundView::Image);
  EXPECT_EQ(copy->scaleMode(), RZBackgroundView::Tiled);
  EXPECT_EQ(copy->beginColor(), QColor(0x11, 0x22, 0x33));
  EXPECT_EQ(copy->endColor(), QColor(0x44, 0x55, 0x66));
  EXPECT_EQ(copy->solidColor(), QColor(Qt::yellow));
  EXPECT_DOUBLE_EQ(copy->gradientAngle(), 90);
  EXPECT_EQ(copy->imageName(), "play_32");
  EXPECT_FALSE(copy->image().isNull());  // loaded again by its name
  // Defaults of a new view.
  RZBackgroundView fresh;
  EXPECT_EQ(fresh.backgroundMode(), RZBackgroundView::SolidColor);
  EXPECT_EQ(fresh.scaleMode(), RZBackgroundView::Stretched);
  EXPECT_DOUBLE_EQ(fresh.gradientAngle(), 270);
  EXPECT_EQ(fresh.imageName(), "NSComputer");
}

TEST(RZBackgroundViewTest, PaintsEachMode) {
  RZBackgroundView view;
  view.resize(40, 40);
  auto render = [&] {
    QImage image(view.size(), QImage::Format_RGB32);
    image.fill(Qt::red);
    QPainter painter(&image);
    view.drawBackground(painter, view.rect());
    return image;
  };
  view.setIBSolidHexColor("00FF00");
  EXPECT_EQ(render().pixelColor(20, 20), QColor(Qt::green));
  // 270 degrees: from the top (begin) down to the bottom (end).
  view.setIBGradientBeginHexColor("FFFFFF");
  view.setIBGradientEndHexColor("000000");
  const QImage gradient = render();
  EXPECT_GT(gradient.pixelColor(20, 1).lightness(), 230);
  EXPECT_LT(gradient.pixelColor(20, 38).lightness(), 25);
  // An image of no area draws nothing and keeps no tiles.
  view.setIBTiledImageName("no such image");
  EXPECT_EQ(render().pixelColor(20, 20), QColor(Qt::red));
  EXPECT_FALSE(view.hasTiledCache());
  view.setIBTiledImageName("stop_32");
  render();
  EXPECT_TRUE(view.hasTiledCache());
  // A larger view is tiled to its new corner, not only as far as the old tiles went.
  view.resize(80, 80);
  const QImage larger = render();
  EXPECT_EQ(larger.pixelColor(48, 48), larger.pixelColor(16, 16));
  EXPECT_NE(larger.pixelColor(48, 48), QColor(Qt::red));
}

TEST(WTTableCellViewTest, TheNotesFieldGrowsBetweenItsLimits) {
  WTTableCellView cell("WTNote");
  cell.setFrame(QRectF(0, 0, 500, 30));
  const qreal main = cell.initialFrame().height();
  EXPECT_EQ(cell.requestedHeight(false), main);
  // Edited but empty: the field shows at its smallest.
  const qreal editingEmpty = cell.requestedHeight(true);
  EXPECT_GE(editingEmpty, main + WTTableCellView::kMinimumNotesHeight + WTTableCellView::kNotesBottomMargin);
  cell.setNotes("short");
  EXPECT_EQ(cell.requestedHeight(false), editingEmpty);  // as high as one line of text
  EXPECT_GE(cell.notesFrame().height(), WTTableCellView::kMinimumNotesHeight);
  const qreal oneLine = cell.requestedHeight(false);
  EXPECT_GT(oneLine, main);
  cell.setNotes(QString("word ").repeated(60));
  const qreal wrapped = cell.requestedHeight(false);
  EXPECT_GT(wrapped, oneLine);
  // A narrower row wraps more.
  cell.setFrame(QRectF(0, 0, 300, 30));
  EXPECT_GT(cell.requestedHeight(false), wrapped);
  cell.setNotes(QString("line\n").repeated(500));
  EXPECT_EQ(cell.notesFrame().height(), WTTableCellView::kMaximumNotesHeight);
  // Groups have no notes field at all.
  WTTableCellView group("WTItemContainer");
  group.setNotes("ignored");
  EXPECT_EQ(group.requestedHeight(true), group.initialFrame().height());
}

TEST(WTTableCellViewTest, HoverButtonsAnswerOnlyWhileShown) {
  WTTableCellView task("WTTask");
  const QRectF row(0, 0, 800, 36);
  const QRectF addTime = task.partRect(WTTableCellView::Part::AddTime, row);
  ASSERT_FALSE(addTime.isEmpty());
  EXPECT_EQ(task.partAt(addTime.center(), row, true), WTTableCellView::Part::AddTime);
  EXPECT_NE(task.partAt(addTime.center(), row, false), WTTableCellView::Part::AddTime);
  // The five add buttons sit side by side, in the kinds' order, inside the bar.
  const QRectF bar = task.partRect(WTTableCellView::Part::HoverBar, row);
  qreal x = -1;
  for (auto part :
       {WTTableCellView::Part::AddTime, WTTableCellView::Part::AddFlat, WTTableCellView::Part::AddNote,
        WTTableCellView::Part::AddExpense, WTTableCellView::Part::AddToDo}) {
    const QRectF button = task.partRect(part, row);
    EXPECT_TRUE(bar.contains(button));
    EXPECT_GT(button.x(), x);
    x = button.right();
  }
  EXPECT_EQ(task.partAt(task.partRect(WTTableCellView::Part::TimerButton, row).center(), row, false),
            WTTableCellView::Part::TimerButton);
  // Items have the date and notes buttons instead, and no add buttons.
  WTTableCellView time("WTTime");
  EXPECT_TRUE(time.partRect(WTTableCellView::Part::AddTime, row).isEmpty());
  EXPECT_FALSE(time.partRect(WTTableCellView::Part::DateButton, row).isEmpty());
}

TEST(WTImagesTest, EveryNamedImageExists) {
  for (const char* name :
       {"StopWatch", "StopWatchRunning", "play_32", "stop_32", "notepad_32", "notepad_clock_32", "folder_32",
        "folder_32_dis", "admin_2_32", "admin_2_32_dis", "tessal"}) {
    EXPECT_TRUE(WTImages::contains(name)) << name;
    const QPixmap pixmap = WTImages::pixmap(name, QSize(32, 32), 2.0);
    ASSERT_FALSE(pixmap.isNull()) << name;
    EXPECT_EQ(pixmap.size(), QSize(64, 64)) << name;
    // Something is drawn: not every pixel is transparent.
    const QImage image = pixmap.toImage();
    bool drawn = false;
    for (int y = 0; y < image.height() && !drawn; ++y) {
      for (int x = 0; x < image.width() && !drawn; ++x) drawn = image.pixelColor(x, y).alpha() > 0;
    }
    EXPECT_TRUE(drawn) << name;
  }
  EXPECT_FALSE(WTImages::contains("NSComputer"));
  EXPECT_TRUE(WTImages::pixmap("NSComputer", QSize(8, 8)).isNull());
}

}  // namespace
