#include "UiFixture.h"
#include "WTClient.h"
#include "WTClientsViewController.h"
#include "WTItemsModel.h"
#include "WTItemsViewController.h"
#include "WTListView.h"
#include "WTObjectListModel.h"
#include "WTOutlineView.h"

#include <QApplication>

namespace {

// Pixels of the view's middle band that are clearly darker than its background: text.
int inkInMiddle(QAbstractItemView* view) {
  QApplication::processEvents();
  const QImage image = view->viewport()->grab().toImage();
  const QColor base = image.pixelColor(2, 2);
  int ink = 0;
  const int top = image.height() / 2 - 20;
  for (int y = std::max(0, top); y < std::min(image.height(), top + 40); ++y) {
    for (int x = 0; x < image.width(); ++x) {
      if (image.pixelColor(x, y).lightness() < base.lightness() - 60) ++ink;
    }
  }
  return ink;
}

class WTEmptyHintTest : public UiTest {};

TEST_F(WTEmptyHintTest, AnEmptyListSaysHowToAddTheFirstRowAndForgetsItOnceThereIsOne) {
  WTClientsViewController clients(context.get());
  clients.view()->resize(600, 400);
  clients.view()->show();
  ASSERT_TRUE(QTest::qWaitForWindowExposed(clients.view()));
  WTListView* list = clients.tableView();
  EXPECT_EQ(list->emptyHint(), "No clients yet — press Ctrl+N");
  EXPECT_GT(inkInMiddle(list), 30);
  WTClient* client = WTClient::insertNewObject(context.get());
  client->setName("Acme");
  endTurn();
  clients.arrayController()->rearrangeObjects();
  ASSERT_EQ(list->model()->rowCount(), 1);
  EXPECT_EQ(inkInMiddle(list), 0);
}

TEST_F(WTEmptyHintTest, AProjectWithoutTasksSaysHowToAddOne) {
  WTProject* project = makeProject("Website");
  ShownOutline shown(context.get(), project, QSize(800, 400));
  WTItemsViewController& items = shown.controller;
  endTurn();
  WTOutlineView* outline = items.outlineView();
  EXPECT_EQ(outline->emptyHint(), "No tasks yet — press Ctrl+N");
  EXPECT_GT(inkInMiddle(outline), 30);
  makeTask(project, "Design");
  endTurn();
  items.treeController()->processChanges();
  EXPECT_EQ(inkInMiddle(outline), 0);
}

}  // namespace
