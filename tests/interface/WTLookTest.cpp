#include "UiFixture.h"

namespace {

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

// A budget is a bar under a task's cost: the palette's highlight within it, amber from 80 %, red past it,
// the share and what is left in the cost's tip; a changed budget repaints the row.
TEST_F(WTLookTest, ABudgetBarUnderTheCostTakesItsColourFromTheShareBilled) {
  WTProject* project = makeProject("Website");
  project->setRate(Decimal(200));
  WTTask* task = makeTask(project, "Design");
  makeItem<WTTime>(task, "Sketches", at(2024, 3, 13));  // half an hour: 100.00
  ShownOutline shown(context.get(), project, QSize(800, 400));
  WTOutlineView* view = shown.outline();
  const QColor highlight(10, 90, 200);
  QPalette palette = view->palette();
  palette.setColor(QPalette::Highlight, highlight);
  view->setPalette(palette);
  endTurn();
  view->selectionModel()->clearSelection();
  const std::tuple<const char*, std::optional<QColor>, const char*> rows[] = {
      {"200", highlight, "50 % of the budget of 200.00 · 100.00 left"},
      {"125", QColor(0xe8, 0x9a, 0x00), "80 % of the budget of 125.00 · 25.00 left"},
      {"99.99", QColor(0xd0, 0x30, 0x30), "100 % of the budget of 99.99 · 0.01 over"},
      {nullptr, std::nullopt, ""},  // no bar: the row as it is beside it
  };
  for (const auto& [budget, colour, tip] : rows) {
    SCOPED_TRACE(budget ? budget : "none");
    QSignalSpy repainted(view->model(), &QAbstractItemModel::dataChanged);
    task->setBudget(budget ? std::optional(dec(budget)) : std::nullopt);
    endTurn();
    ASSERT_FALSE(repainted.isEmpty());
    EXPECT_EQ(repainted.first().at(0).value<QModelIndex>(), shown.rowOf(task));
    const QImage image = view->viewport()->grab().toImage();
    const QRect visual = view->visualRect(shown.rowOf(task));
    const QRectF bar = WTTableCellView("WTTask").partRect(
        WTTableCellView::Part::BudgetBar, QRectF(0, visual.y(), image.width(), visual.height()));
    const int y = int(bar.top()) + 1;
    EXPECT_EQ(image.pixelColor(int(bar.left()) + 8, y),
              colour.value_or(image.pixelColor(int(bar.left()) - 4, y)));
    EXPECT_EQ(tipAt(view, shown.centreOf(task, WTTableCellView::Part::Cost)), tip);
  }
}

// An empty list says how to add the first row, and forgets it once there is one; the outline says its own.
TEST_F(WTLookTest, AnEmptyListSaysHowToAddTheFirstRow) {
  Shown<WTClientsViewController> shown(context.get(), QSize(600, 400));
  WTClientsViewController& clients = shown.controller;
  EXPECT_EQ(clients.tableView()->emptyHint(), "No clients yet — press Ctrl+N");
  EXPECT_GT(inkInMiddle(clients.tableView()), 30);
  makeClient("Acme");
  endTurn();
  clients.arrayController()->rearrangeObjects();
  ASSERT_EQ(clients.tableView()->model()->rowCount(), 1);
  EXPECT_EQ(inkInMiddle(clients.tableView()), 0);
  EXPECT_EQ(ShownOutline(context.get(), makeProject("Website")).outline()->emptyHint(),
            "No tasks yet — press Ctrl+N");
}

}  // namespace
