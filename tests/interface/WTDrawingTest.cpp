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

QRgb at(const QImage& image, int x, int y) {
  return image.pixel(x, y);
}

// The body takes the row's colours, selected or not (a header looks the same either way); the groove's
// two lines run along the bottom across the whole width in tones of their own.
TEST(WTTableRowViewTest, TheBodyTakesItsColoursAndTheGrooveRunsAlongTheBottom) {
  const QColor own = RZColor::calibratedWhite(0.5), ownSelected = RZColor::calibratedWhite(0.3);
  const WTTableRowView plain, header = WTTableRowView::initWithHeaderColors(),
                              custom = WTTableRowView::initWithBgColor(own, ownSelected);
  EXPECT_EQ(at(paintRow(custom, false), 50, 5), own.rgb());
  EXPECT_EQ(at(paintRow(custom, true), 50, 5), ownSelected.rgb());
  EXPECT_NE(at(paintRow(plain, true), 50, 5), at(paintRow(plain, false), 50, 5));
  EXPECT_EQ(at(paintRow(header, true), 50, 5), at(paintRow(header, false), 50, 5));
  EXPECT_NE(at(paintRow(header, false), 50, 5), at(paintRow(plain, false), 50, 5));
  const QImage groove = paintRow(plain, false);
  EXPECT_EQ(at(groove, 0, 18), at(groove, 99, 18));
  EXPECT_EQ(at(groove, 0, 19), at(groove, 99, 19));
  EXPECT_LT(qGray(at(groove, 0, 18)), qGray(at(groove, 0, 19)));  // a dark line above a light one
  for (const WTTableRowView* row : {&plain, &header, &custom}) {
    for (const bool selected : {false, true}) {
      const QImage image = paintRow(*row, selected);
      EXPECT_EQ(at(image, 50, 17), at(image, 50, 5));  // the body reaches down to the groove
      EXPECT_NE(at(image, 50, 18), at(image, 50, 5));
      EXPECT_NE(at(image, 50, 19), at(image, 50, 5));
      EXPECT_EQ(at(image, 50, 18), at(groove, 50, 18));
      EXPECT_EQ(at(image, 50, 19), at(groove, 50, 19));
    }
  }
  WTTableRowView bare;
  bare.setDrawsBackground(false);
  bare.setDrawsSeparator(false);
  const QImage untouched = paintRow(bare, false);
  EXPECT_EQ(at(untouched, 50, 5), QColor(Qt::red).rgb());
  EXPECT_EQ(at(untouched, 50, 19), QColor(Qt::red).rgb());
}

// An odd tag draws dark (on a light row), an even one white; a tag that is a multiple of 3 puts the
// arrows against the right edge, the others at the left.
TEST(WTPopUpButtonCellTest, TheTagChoosesColourAndSide) {
  const struct {
    int tag;
    bool dark;
    bool right;
  } rows[] = {{1, true, false}, {3, true, true}, {0, false, true}, {4, false, false}};
  for (const auto& row : rows) {
    QImage image(200, 20, QImage::Format_RGB32);
    image.fill(row.dark ? Qt::white : Qt::black);
    QPainter painter(&image);
    WTPopUpButtonCell::drawWithFrame(painter, QRectF(0, 0, 200, 20), "x", QApplication::font(), row.tag);
    painter.end();
    const QColor background(row.dark ? Qt::white : Qt::black);
    int leftmost = image.width(), extreme = background.lightness();
    for (int y = 0; y < image.height(); ++y) {
      for (int x = 0; x < image.width(); ++x) {
        const QColor colour = image.pixelColor(x, y);
        if (colour == background) continue;
        leftmost = std::min(leftmost, x);
        extreme = row.dark ? std::min(extreme, colour.lightness()) : std::max(extreme, colour.lightness());
      }
    }
    EXPECT_TRUE(row.right ? leftmost > 100 : leftmost < 10) << row.tag << " from " << leftmost;
    EXPECT_TRUE(row.dark ? extreme < 100 : extreme > 155) << row.tag << ": " << extreme;
  }
}

TEST(RZColorTest, HexRGB) {
  const std::pair<const char*, QColor> rows[] = {
      {"FF8000", QColor::fromRgbF(1.0f, 128 / 255.0f, 0.0f)},
      {"1FF8000", QColor::fromRgbF(1.0f, 128 / 255.0f, 0.0f)},
      {"0x0000ff", QColor(0, 0, 255)},
      {"", QColor(Qt::black)},
      {"not hex", QColor(Qt::black)},
  };
  for (const auto& [hex, colour] : rows) EXPECT_EQ(RZColor::colorFromHexRGB(hex), colour) << hex;
  EXPECT_EQ(RZColor::colorFromHexRGB(QString()), QColor(Qt::black));
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
  cell.setFrame(QRectF(0, 0, 300, 30));
  EXPECT_GT(cell.requestedHeight(false), wrapped);
  cell.setNotes(QString("line\n").repeated(500));
  EXPECT_EQ(cell.notesFrame().height(), WTTableCellView::kMaximumNotesHeight);
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
  WTTableCellView time("WTTime");
  EXPECT_TRUE(time.partRect(WTTableCellView::Part::AddTime, row).isEmpty());
  EXPECT_FALSE(time.partRect(WTTableCellView::Part::DateButton, row).isEmpty());
}

// Every image the windows name is drawn at the size and scale asked; a name of none gives nothing.
TEST(WTImagesTest, EveryNamedImageExists) {
  for (const char* name :
       {"StopWatch", "StopWatchRunning", "play_32", "stop_32", "notepad_32", "notepad_clock_32", "folder_32",
        "folder_32_dis", "admin_2_32", "admin_2_32_dis", "tessal"}) {
    EXPECT_TRUE(WTImages::contains(name)) << name;
    const QImage image = WTImages::pixmap(name, QSize(32, 32), 2.0).toImage();
    ASSERT_EQ(image.size(), QSize(64, 64)) << name;
    bool drawn = false;
    for (int y = 0; y < image.height(); ++y)
      for (int x = 0; x < image.width(); ++x) drawn = drawn || image.pixelColor(x, y).alpha() > 0;
    EXPECT_TRUE(drawn) << name;
  }
  EXPECT_FALSE(WTImages::contains("NSComputer"));
  EXPECT_TRUE(WTImages::pixmap("NSComputer", QSize(8, 8)).isNull());
}

}  // namespace
