#pragma once

#include "WTTableCellView.h"

#include <QPersistentModelIndex>
#include <QPointer>
#include <QStyledItemDelegate>

class QLineEdit;
class WTItemsViewController;
class WTNotesTextView;
class WTOutlineView;

// Paints every row of the items outline (tasks, groups, the five kinds of item) in the flat grey look
// with its hover bar, edits a row's name, duration, amount or notes in place, and reports clicks on a
// row's buttons to the controller (the editing, tips and clicks in WTItemCellInteraction.cpp).
class WTItemCellDelegate : public QStyledItemDelegate {
  Q_OBJECT
 public:
  // SpentDuration is the duration of time already spent: typing it moves the start, not the end.
  enum class Field { Name, Duration, Amount, Notes, Start, End, SpentDuration };

  WTItemCellDelegate(WTItemsViewController* controller, WTOutlineView* view);

  // Which field the next edit opens (the name unless told otherwise).
  void setEditField(Field field) { field_ = field; }

  // The row whose notes are being edited, and what they say now (not yet stored).
  bool isEditingNotes(const QModelIndex& index) const;
  QString notesEditingText() const;
  WTNotesTextView* notesEditor() const;

  void paint(QPainter* painter, const QStyleOptionViewItem& option, const QModelIndex& index) const override;
  QSize sizeHint(const QStyleOptionViewItem& option, const QModelIndex& index) const override;
  QWidget* createEditor(QWidget* parent, const QStyleOptionViewItem& option,
                        const QModelIndex& index) const override;
  void destroyEditor(QWidget* editor, const QModelIndex& index) const override;
  void setEditorData(QWidget* editor, const QModelIndex& index) const override;
  void setModelData(QWidget* editor, QAbstractItemModel* model, const QModelIndex& index) const override;
  void updateEditorGeometry(QWidget* editor, const QStyleOptionViewItem& option,
                            const QModelIndex& index) const override;

 signals:
  // A button of a row was clicked; `rect` is where it is in the viewport.
  void partActivated(const QModelIndex& index, WTTableCellView::Part part, const QRect& rect);
  // The row's height changed (its notes are being typed); the view relayouts it.
  void rowHeightChanged(const QModelIndex& index);

 protected:
  // Tab and Shift+Tab in an item's field move to its next or previous field before leaving the row: a
  // time entry's start, end, duration and name; another item's name, then its duration or amount.
  bool eventFilter(QObject* object, QEvent* event) override;
  bool editorEvent(QEvent* event, QAbstractItemModel* model, const QStyleOptionViewItem& option,
                   const QModelIndex& index) override;
  // Tool tips name the button under the mouse; the rest of a row has none.
  bool helpEvent(QHelpEvent* event, QAbstractItemView* view, const QStyleOptionViewItem& option,
                 const QModelIndex& index) override;

 private:
  void paintTask(QPainter& painter, const QStyleOptionViewItem& option, const QModelIndex& index,
                 const WTTableCellView& cell) const;
  void paintContainer(QPainter& painter, const QStyleOptionViewItem& option, const QModelIndex& index,
                      const WTTableCellView& cell) const;
  void paintItem(QPainter& painter, const QStyleOptionViewItem& option, const QModelIndex& index,
                 const WTTableCellView& cell) const;
  void paintNotes(QPainter& painter, const QRectF& row, const QModelIndex& index,
                  const WTTableCellView& cell) const;
  // Whether `line`, a duration, amount, start or end editor, holds text that would be refused; if so it
  // is marked and the reason shown.
  bool refuses(QLineEdit* line) const;
  // Whether an event of the outline is held back because the open field refuses its text.
  bool keepsRefusedEdit(const QEvent* event);
  void paintHoverBar(QPainter& painter, const QRectF& row, const WTTableCellView& cell,
                     const QModelIndex& index) const;

  WTItemsViewController* controller_;
  WTOutlineView* view_;
  // Compared with, never called, in eventFilter: the view sends events while it is destroyed.
  QWidget* viewport_;
  Field field_ = Field::Name;
  mutable Field openField_ = Field::Name;
  mutable QPersistentModelIndex notesIndex_;
  mutable QPointer<WTNotesTextView> notesEditor_;
  mutable QPersistentModelIndex lineEditorRow_;  // the row a one-line field is open in
  bool pressKept_ = false;
};
