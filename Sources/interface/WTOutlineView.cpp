#include "WTOutlineView.h"

#include "WTEmptyHint.h"
#include "WTTableRowView.h"

#include <QDrag>
#include <QDragMoveEvent>
#include <QHeaderView>
#include <QKeyEvent>
#include <QMimeData>
#include <QPainter>
#include <QProxyStyle>
#include <QScrollBar>

namespace {

// The line between rows where dragged tasks would land; drops onto a row are shown by the row itself.
class WTOutlineStyle : public QProxyStyle {
 public:
  using QProxyStyle::QProxyStyle;
  void drawPrimitive(PrimitiveElement element, const QStyleOption* option, QPainter* painter,
                     const QWidget* widget) const override {
    if (element != PE_IndicatorItemViewItemDrop) {
      QProxyStyle::drawPrimitive(element, option, painter, widget);
      return;
    }
    if (option->rect.height() != 0) return;
    painter->save();
    painter->setRenderHint(QPainter::Antialiasing);
    const QColor color = option->palette.color(QPalette::Highlight);
    painter->setPen(QPen(color, 2.0));
    painter->setBrush(Qt::white);
    const QRectF line(option->rect);
    painter->drawLine(QPointF(line.left() + 14, line.top()), QPointF(line.right() - 4, line.top()));
    painter->drawEllipse(QPointF(line.left() + 10, line.top()), 3.5, 3.5);
    painter->restore();
  }
};

}  // namespace

WTOutlineView::WTOutlineView(QWidget* parent) : QTreeView(parent) {
  setStyle(new WTOutlineStyle);
  style()->setParent(this);
  setHeaderHidden(true);
  setIndentation(0);
  setRootIsDecorated(false);
  setUniformRowHeights(false);
  setAllColumnsShowFocus(true);
  setExpandsOnDoubleClick(false);
  setMouseTracking(true);
  setSelectionMode(QAbstractItemView::ExtendedSelection);
  setSelectionBehavior(QAbstractItemView::SelectRows);
  setEditTriggers(QAbstractItemView::DoubleClicked | QAbstractItemView::EditKeyPressed);
  setVerticalScrollMode(QAbstractItemView::ScrollPerPixel);
  setHorizontalScrollBarPolicy(Qt::ScrollBarAlwaysOff);
  setFrameShape(QFrame::NoFrame);
  setDragEnabled(true);
  setAcceptDrops(true);
  setDropIndicatorShown(true);
  setDragDropMode(QAbstractItemView::DragDrop);
  setDefaultDropAction(Qt::MoveAction);
  setAutoScroll(true);
  header()->setStretchLastSection(true);
  verticalScrollBar()->setSingleStep(12);
}

void WTOutlineView::setHoverIndex(const QModelIndex& index) {
  if (index == hoverIndex_) return;
  const QModelIndex old = hoverIndex_;
  hoverIndex_ = index;
  if (old.isValid()) viewport()->update(visualRect(old));
  if (index.isValid()) viewport()->update(visualRect(index));
}

void WTOutlineView::noteHeightOfRowChanged(const QModelIndex& index) {
  if (!index.isValid()) return;
  // A data change of one row drops that row's cached height only; the rows below move, nothing
  // animates, and an open editor follows its row.
  QTreeView::dataChanged(index, index);
  updateEditorGeometries();
}

void WTOutlineView::drawRow(QPainter* painter, const QStyleOptionViewItem& option,
                            const QModelIndex& index) const {
  QStyleOptionViewItem opt = option;
  opt.rect = QRect(0, option.rect.y(), viewport()->width(), option.rect.height());
  opt.state &= ~(QStyle::State_Selected | QStyle::State_MouseOver | QStyle::State_HasFocus);
  if (selectionModel() && selectionModel()->isSelected(index)) opt.state |= QStyle::State_Selected;
  if (index == hoverIndex_ && state() != QAbstractItemView::DraggingState)
    opt.state |= QStyle::State_MouseOver;
  if (currentIndex() == index && hasFocus()) opt.state |= QStyle::State_HasFocus;
  itemDelegateForIndex(index)->paint(painter, opt, index);
}

bool WTOutlineView::viewportEvent(QEvent* event) {
  if (event->type() == QEvent::Resize && viewport()->width() != laidOutWidth_) {
    // Notes wrap at the row's width: a new width measures the rows again.
    laidOutWidth_ = viewport()->width();
    scheduleDelayedItemsLayout();
  }
  return QTreeView::viewportEvent(event);
}

void WTOutlineView::mouseMoveEvent(QMouseEvent* event) {
  setHoverIndex(indexAt(event->position().toPoint()));
  QTreeView::mouseMoveEvent(event);
}

void WTOutlineView::leaveEvent(QEvent* event) {
  setHoverIndex(QModelIndex());
  QTreeView::leaveEvent(event);
}

void WTOutlineView::keyPressEvent(QKeyEvent* event) {
  const bool editing = state() == QAbstractItemView::EditingState;
  if (!editing && (event->key() == Qt::Key_Return || event->key() == Qt::Key_Enter) &&
      currentIndex().isValid()) {
    emit editRequested(currentIndex());
    return;
  }
  if (!editing && event->key() == Qt::Key_Space && event->modifiers() == Qt::NoModifier &&
      currentIndex().isValid()) {
    emit checkRequested(currentIndex());
    return;
  }
  QTreeView::keyPressEvent(event);
}

void WTOutlineView::setDropTarget(const QModelIndex& index) {
  if (index == dropTarget_) return;
  const QModelIndex old = dropTarget_;
  dropTarget_ = index;
  if (old.isValid()) viewport()->update(visualRect(old));
  if (index.isValid()) viewport()->update(visualRect(index));
}

void WTOutlineView::dragMoveEvent(QDragMoveEvent* event) {
  QTreeView::dragMoveEvent(event);
  const bool onItem = event->isAccepted() && dropIndicatorPosition() == QAbstractItemView::OnItem;
  setDropTarget(onItem ? indexAt(event->position().toPoint()) : QModelIndex());
}

void WTOutlineView::dragLeaveEvent(QDragLeaveEvent* event) {
  setDropTarget(QModelIndex());
  QTreeView::dragLeaveEvent(event);
}

void WTOutlineView::dropEvent(QDropEvent* event) {
  setDropTarget(QModelIndex());
  QTreeView::dropEvent(event);
}

void WTOutlineView::startDrag(Qt::DropActions supportedActions) {
  QModelIndexList rows;
  for (const QModelIndex& index : selectionModel()->selectedRows()) {
    if (model()->flags(index) & Qt::ItemIsDragEnabled) rows << index;
  }
  QMimeData* data = rows.isEmpty() ? nullptr : model()->mimeData(rows);
  if (!data) return;
  // A small label beside the pointer, so the rows under it (and where they would land) stay visible.
  QString title = rows.first().data(Qt::DisplayRole).toString();
  if (title.isEmpty()) title = tr("Untitled");
  if (rows.size() > 1) title = tr("%1 and %2 more").arg(title).arg(rows.size() - 1);
  const QFontMetrics metrics(font());
  const QSize size(std::min(metrics.horizontalAdvance(title) + 20, 320), metrics.height() + 10);
  const qreal ratio = devicePixelRatioF();
  QPixmap pixmap(size * ratio);
  pixmap.setDevicePixelRatio(ratio);
  pixmap.fill(Qt::transparent);
  {
    QPainter painter(&pixmap);
    painter.setRenderHint(QPainter::Antialiasing);
    QColor fill = palette().color(QPalette::Highlight);
    fill.setAlphaF(0.9f);
    painter.setBrush(fill);
    painter.setPen(Qt::NoPen);
    painter.drawRoundedRect(QRectF(QPointF(0, 0), QSizeF(size)), 6, 6);
    painter.setPen(palette().color(QPalette::HighlightedText));
    painter.drawText(QRect(QPoint(0, 0), size).adjusted(10, 0, -10, 0), Qt::AlignVCenter | Qt::AlignLeft,
                     metrics.elidedText(title, Qt::ElideRight, size.width() - 20));
  }
  auto* drag = new QDrag(this);
  drag->setMimeData(data);
  drag->setPixmap(pixmap);
  drag->setHotSpot(QPoint(-14, -10));
  drag->exec(supportedActions, defaultDropAction());
  setDropTarget(QModelIndex());
}

void WTOutlineView::paintEvent(QPaintEvent* event) {
  QTreeView::paintEvent(event);
  WTEmptyHint::paint(this, emptyHint_);
}
