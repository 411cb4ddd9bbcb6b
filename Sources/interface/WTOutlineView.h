#pragma once

#include <QPersistentModelIndex>
#include <QTreeView>

// The items outline's view: rows painted whole by the delegate (no branch column), a hover row for
// the hover bars, and the drop target remembered while something is dragged over it so the row can
// paint the drop highlight under its content.
class WTOutlineView : public QTreeView {
  Q_OBJECT
 public:
  // Shown in the middle while the view has no rows.
  void setEmptyHint(const QString& hint) {
    emptyHint_ = hint;
    viewport()->update();
  }
  QString emptyHint() const { return emptyHint_; }

  explicit WTOutlineView(QWidget* parent = nullptr);

  // Whether a field of a row is being edited.
  bool isEditing() const { return state() == QAbstractItemView::EditingState; }
  // Commits and closes the editor of the current row, if one is open.
  void endEditing() {
    if (QWidget* editor = indexWidget(currentIndex())) {
      commitData(editor);
      closeEditor(editor, QAbstractItemDelegate::NoHint);
    }
  }

  // The row under the mouse, or invalid.
  QModelIndex hoverIndex() const { return hoverIndex_; }
  void setHoverIndex(const QModelIndex& index);
  // The row a drop would land on (a drop onto a row, accepted), or invalid.
  QModelIndex dropTargetIndex() const { return dropTarget_; }
  // The row below `index` in the outline as shown, or invalid for the last row.
  QModelIndex rowBelow(const QModelIndex& index) const { return indexBelow(index); }

  // Relayouts one row whose height changed, without animation and without touching the others.
  void noteHeightOfRowChanged(const QModelIndex& index);

 signals:
  // Return on a row that is not being edited.
  void editRequested(const QModelIndex& index);
  // Space on a row that is not being edited: what the row's checkbox does, if it has one.
  void checkRequested(const QModelIndex& index);

 protected:
  void drawRow(QPainter* painter, const QStyleOptionViewItem& option,
               const QModelIndex& index) const override;
  void drawBranches(QPainter*, const QRect&, const QModelIndex&) const override {}
  bool viewportEvent(QEvent* event) override;
  void mouseMoveEvent(QMouseEvent* event) override;
  void leaveEvent(QEvent* event) override;
  void keyPressEvent(QKeyEvent* event) override;
  void dragMoveEvent(QDragMoveEvent* event) override;
  void dragLeaveEvent(QDragLeaveEvent* event) override;
  void dropEvent(QDropEvent* event) override;
  void startDrag(Qt::DropActions supportedActions) override;

 private:
  void setDropTarget(const QModelIndex& index);

  QPersistentModelIndex hoverIndex_;
  int laidOutWidth_ = -1;
  QPersistentModelIndex dropTarget_;

 protected:
  void paintEvent(QPaintEvent* event) override;

 private:
  QString emptyHint_;
};
