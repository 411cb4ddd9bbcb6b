#include "WTListView.h"

#include "RZColor.h"
#include "WTEmptyHint.h"

#include <QContextMenuEvent>
#include <QKeyEvent>
#include <QMouseEvent>

#include <algorithm>
#include <utility>

WTListView::WTListView(QWidget* parent) : QListView(parent) {
  setSelectionMode(QAbstractItemView::ExtendedSelection);
  setSelectionBehavior(QAbstractItemView::SelectRows);
  setEditTriggers(QAbstractItemView::EditKeyPressed | QAbstractItemView::DoubleClicked);
  setUniformItemSizes(true);
  setResizeMode(QListView::Adjust);
  setHorizontalScrollBarPolicy(Qt::ScrollBarAlwaysOff);
  setMouseTracking(true);
  setFrameShape(QFrame::NoFrame);
  setVerticalScrollMode(QAbstractItemView::ScrollPerPixel);
  // The rows paint their own grey; below the last one the list stays that grey too.
  QPalette grey = palette();
  grey.setColor(QPalette::Base, RZColor::calibratedWhite(0.9));
  setPalette(grey);
}

void WTListView::editRow(int row, bool scroll) {
  const QModelIndex index = model() ? model()->index(row, 0) : QModelIndex();
  if (!index.isValid()) return;
  setCurrentIndex(index);
  selectionModel()->select(index, QItemSelectionModel::ClearAndSelect | QItemSelectionModel::Rows);
  if (scroll) scrollTo(index);
  edit(index);
}

void WTListView::setModel(QAbstractItemModel* model) {
  if (this->model()) disconnect(this->model(), &QAbstractItemModel::rowsRemoved, this, nullptr);
  QListView::setModel(model);
  if (!model) return;
  // The selected rows deleted or archived away, the row that takes their place is selected: the keyboard
  // is where the list shows it, and Delete or Archive never acts on a row no one sees chosen.
  connect(model, &QAbstractItemModel::rowsRemoved, this, [this] {
    if (!std::exchange(selectedRowsGo_, false) || selectionModel()->hasSelection()) return;
    const QModelIndex current = currentIndex();
    if (current.isValid())
      selectionModel()->select(current, QItemSelectionModel::ClearAndSelect | QItemSelectionModel::Rows);
  });
}

void WTListView::rowsAboutToBeRemoved(const QModelIndex& parent, int start, int end) {
  const QModelIndexList selected = selectionModel() ? selectionModel()->selectedRows() : QModelIndexList();
  selectedRowsGo_ = !selected.isEmpty() &&
                    std::all_of(selected.begin(), selected.end(),
                                [&](const auto& row) { return row.row() >= start && row.row() <= end; });
  QListView::rowsAboutToBeRemoved(parent, start, end);
}

void WTListView::keyPressEvent(QKeyEvent* event) {
  const bool editing = state() == QAbstractItemView::EditingState;
  if (!editing && (event->key() == Qt::Key_Return || event->key() == Qt::Key_Enter) &&
      currentIndex().isValid()) {
    editRow(currentIndex().row(), false);
    return;
  }
  if (!editing && event->key() == Qt::Key_Right && event->modifiers() == Qt::NoModifier &&
      currentIndex().isValid()) {
    emit openRequested(currentIndex());
    return;
  }
  QListView::keyPressEvent(event);
}

void WTListView::mousePressEvent(QMouseEvent* event) {
  // A right click marks its row for the menu and leaves the selection alone.
  if (event->button() == Qt::RightButton) {
    event->accept();
    return;
  }
  QListView::mousePressEvent(event);
}

void WTListView::contextMenuEvent(QContextMenuEvent* event) {
  // From the keyboard, the menu is the current row's, under it.
  const bool keyboard = event->reason() == QContextMenuEvent::Keyboard;
  const QModelIndex index = keyboard ? currentIndex() : indexAt(event->pos());
  const QPoint global = keyboard && index.isValid() ? viewport()->mapToGlobal(visualRect(index).bottomLeft())
                                                    : event->globalPos();
  emit contextMenuRequestedForRow(index.isValid() ? index.row() : -1, global);
}

void WTListView::paintEvent(QPaintEvent* event) {
  QListView::paintEvent(event);
  WTEmptyHint::paint(this, emptyHint_);
}
