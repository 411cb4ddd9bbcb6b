#pragma once

#include "WTTableCellView.h"

#include <QStyledItemDelegate>

// Paints the rows of the projects and clients lists (identifier "Project" or "Client") in the flat
// grey look, edits the name in place, and reports clicks on a row's buttons.
class WTListCellDelegate : public QStyledItemDelegate {
  Q_OBJECT
 public:
  explicit WTListCellDelegate(const QString& identifier, QObject* parent = nullptr);

  const WTTableCellView& cellView() const { return cell_; }

  void paint(QPainter* painter, const QStyleOptionViewItem& option, const QModelIndex& index) const override;
  QSize sizeHint(const QStyleOptionViewItem& option, const QModelIndex& index) const override;
  QWidget* createEditor(QWidget* parent, const QStyleOptionViewItem& option,
                        const QModelIndex& index) const override;
  void setEditorData(QWidget* editor, const QModelIndex& index) const override;
  void setModelData(QWidget* editor, QAbstractItemModel* model, const QModelIndex& index) const override;
  void updateEditorGeometry(QWidget* editor, const QStyleOptionViewItem& option,
                            const QModelIndex& index) const override;

 signals:
  // A button or the client chooser of a row was clicked; `rect` is the part's place in the viewport.
  void partActivated(const QModelIndex& index, WTTableCellView::Part part, const QRect& rect);

 protected:
  bool helpEvent(QHelpEvent* event, QAbstractItemView* view, const QStyleOptionViewItem& option,
                 const QModelIndex& index) override;
  bool editorEvent(QEvent* event, QAbstractItemModel* model, const QStyleOptionViewItem& option,
                   const QModelIndex& index) override;

 private:
  WTTableCellView cell_;
};
