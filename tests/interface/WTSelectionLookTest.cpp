#include "UiFixture.h"
#include "WTItemsModel.h"
#include "WTItemsViewController.h"
#include "WTListView.h"
#include "WTNavigationController.h"
#include "WTObjectListModel.h"
#include "WTOutlineView.h"
#include "WTProjectsViewController.h"

namespace {

const QColor kHighlight(10, 90, 200);
const QColor kHighlightedText(255, 255, 0);

// Pixels of `rect` in `image` painted in the highlight, and in (roughly) the highlighted text colour.
struct Census {
  int highlight = 0;
  int text = 0;
};
Census census(const QImage& image, const QRect& rect) {
  Census counts;
  for (int y = rect.top(); y <= rect.bottom(); ++y) {
    for (int x = rect.left(); x <= rect.right(); ++x) {
      const QColor colour = image.pixelColor(x, y);
      if (colour == kHighlight) ++counts.highlight;
      if (colour.red() > 180 && colour.green() > 180 && colour.blue() < 120) ++counts.text;
    }
  }
  return counts;
}

void useDistinctHighlight(QWidget* widget) {
  QPalette palette = widget->palette();
  for (auto group : {QPalette::Active, QPalette::Inactive}) {
    palette.setColor(group, QPalette::Highlight, kHighlight);
    palette.setColor(group, QPalette::HighlightedText, kHighlightedText);
  }
  widget->setPalette(palette);
}

class WTSelectionLookTest : public UiTest {};

TEST_F(WTSelectionLookTest, SelectedRowsTakeThePalettesHighlightAndItsTextColour) {
  WTProject* project = makeProject("Website");
  WTTask* task = makeTask(project, "Design");
  WTTime* time = makeItem<WTTime>(task, "Sketches", at(2024, 3, 13));
  ShownOutline shown(context.get(), project, QSize(800, 400));
  WTItemsViewController& items = shown.controller;
  endTurn();
  WTOutlineView* outline = items.outlineView();
  useDistinctHighlight(outline);
  for (const WTObject* object : QList<const WTObject*>{task, time}) {
    items.expandContainerOfItem(time);
    const QModelIndex index = items.treeController()->indexOfObject(object);
    outline->selectionModel()->select(index, QItemSelectionModel::ClearAndSelect | QItemSelectionModel::Rows);
    outline->clearFocus();  // no hover, no editor: the plain selected row
    QApplication::processEvents();
    const QRect row = outline->visualRect(index).adjusted(0, 0, 0, -3);
    const Census counts = census(outline->viewport()->grab().toImage(), row);
    EXPECT_GT(counts.highlight, row.width() * row.height() / 2) << object->name().toStdString();
    EXPECT_GT(counts.text, 20) << object->name().toStdString();
  }
}

TEST_F(WTSelectionLookTest, SelectedListRowsTakeThePalettesHighlightAndItsTextColour) {
  makeProject("Website");
  WTNavigationController stack;
  WTProjectsViewController projects(context.get());
  TestHostWindow window;
  window.stack = &stack;
  window.setCentralWidget(stack.view());
  window.resize(800, 400);
  stack.pushViewController(&projects);
  window.show();
  ASSERT_TRUE(QTest::qWaitForWindowExposed(&window));
  endTurn();
  WTListView* list = projects.tableView();
  useDistinctHighlight(list);
  const QModelIndex index = projects.arrayController()->index(0, 0);
  ASSERT_TRUE(index.isValid());
  list->selectionModel()->select(index, QItemSelectionModel::ClearAndSelect | QItemSelectionModel::Rows);
  QApplication::processEvents();
  const QRect row = list->visualRect(index).adjusted(0, 0, 0, -3);
  const Census counts = census(list->viewport()->grab().toImage(), row);
  EXPECT_GT(counts.highlight, row.width() * row.height() / 2);
  EXPECT_GT(counts.text, 20);
  window.takeCentralWidget();
}

}  // namespace
