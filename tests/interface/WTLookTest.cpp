#include "UiFixture.h"

namespace {

// A selected row is mostly the palette's highlight, its text in the highlighted text colour.
void expectHighlighted(QAbstractItemView* view, const QModelIndex& index) {
  const QColor highlight(10, 90, 200);
  QPalette palette = view->palette();
  for (auto group : {QPalette::Active, QPalette::Inactive}) {
    palette.setColor(group, QPalette::Highlight, highlight);
    palette.setColor(group, QPalette::HighlightedText, QColor(255, 255, 0));
  }
  view->setPalette(palette);
  view->selectionModel()->select(index, QItemSelectionModel::ClearAndSelect | QItemSelectionModel::Rows);
  view->clearFocus();  // no hover, no editor: the plain selected row
  QApplication::processEvents();
  const QImage image = view->viewport()->grab().toImage();
  const QRect row = view->visualRect(index).adjusted(0, 0, 0, -3);
  int highlighted = 0, text = 0;
  for (int y = row.top(); y <= row.bottom(); ++y) {
    for (int x = row.left(); x <= row.right(); ++x) {
      const QColor colour = image.pixelColor(x, y);
      highlighted += colour == highlight;
      text += colour.red() > 180 && colour.green() > 180 && colour.blue() < 120;
    }
  }
  EXPECT_GT(highlighted, row.width() * row.height() / 2);
  EXPECT_GT(text, 20);
}

// Pixels of the view's middle band that are clearly darker than its background: text.
int inkInMiddle(QAbstractItemView* view) {
  QApplication::processEvents();
  const QImage image = view->viewport()->grab().toImage();
  const int base = image.pixelColor(2, 2).lightness(), top = std::max(0, image.height() / 2 - 20);
  int ink = 0;
  for (int y = top; y < std::min(image.height(), top + 40); ++y)
    for (int x = 0; x < image.width(); ++x) ink += image.pixelColor(x, y).lightness() < base - 60;
  return ink;
}

class WTLookTest : public UiTest {};

TEST_F(WTLookTest, SelectedRowsTakeThePalettesHighlightAndItsTextColour) {
  WTProject* project = makeProject("Website");
  WTTask* task = makeTask(project, "Design");
  WTTime* time = makeItem<WTTime>(task, "Sketches", at(2024, 3, 13));
  ShownOutline shown(context.get(), project, QSize(800, 400));
  ShownProjects list(context.get(), QSize(800, 500));
  endTurn();
  for (const WTObject* object : QList<const WTObject*>{task, time}) {
    SCOPED_TRACE(object->name().toStdString());
    shown.controller.expandContainerOfItem(time);
    expectHighlighted(shown.outline(), shown.rowOf(object));
  }
  ASSERT_TRUE(list.controller.arrayController()->index(0, 0).isValid());
  expectHighlighted(list.controller.tableView(), list.controller.arrayController()->index(0, 0));
}

// An empty list says how to add the first row, and forgets it once there is one (the outline paints alike).
TEST_F(WTLookTest, AnEmptyListSaysHowToAddTheFirstRow) {
  WTClientsViewController clients(context.get());
  clients.view()->resize(600, 400);
  clients.view()->show();
  ASSERT_TRUE(QTest::qWaitForWindowExposed(clients.view()));
  EXPECT_EQ(clients.tableView()->emptyHint(), "No clients yet — press Ctrl+N");
  EXPECT_GT(inkInMiddle(clients.tableView()), 30);
  makeClient("Acme");
  endTurn();
  clients.arrayController()->rearrangeObjects();
  ASSERT_EQ(clients.tableView()->model()->rowCount(), 1);
  EXPECT_EQ(inkInMiddle(clients.tableView()), 0);
  ShownOutline shown(context.get(), makeProject("Website"));
  EXPECT_EQ(shown.outline()->emptyHint(), "No tasks yet — press Ctrl+N");
  EXPECT_GT(inkInMiddle(shown.outline()), 30);
}

}  // namespace
