#pragma once

#include <QListView>

// The table of the projects and clients lists: one row per record, Return edits the name, Delete is
// left to the window's command, and a right click remembers the clicked row while its menu is open.
class WTListView : public QListView {
  Q_OBJECT
 public:
  // Shown in the middle while the view has no rows.
  void setEmptyHint(const QString& hint) {
    emptyHint_ = hint;
    viewport()->update();
  }
  QString emptyHint() const { return emptyHint_; }

  explicit WTListView(QWidget* parent = nullptr);

  // Whether a field of a row is being edited.
  bool isEditing() const { return state() == QAbstractItemView::EditingState; }
  // Commits and closes the editor of the current row, if one is open.
  void endEditing() {
    if (QWidget* editor = indexWidget(currentIndex())) {
      commitData(editor);
      closeEditor(editor, QAbstractItemDelegate::NoHint);
    }
  }

  // The row that was right-clicked while its context menu is open, else -1.
  int clickedRow() const { return clickedRow_; }
  void setClickedRow(int row) { clickedRow_ = row; }

  // Starts editing the name of `row` (scrolling to it when `scroll`).
  void editRow(int row, bool scroll);

  void setModel(QAbstractItemModel* model) override;

 signals:
  // A context menu was asked for at `row` (-1 for no row) at global position `global`.
  void contextMenuRequestedForRow(int row, const QPoint& global);
  // Keyboard request to open the current row (Right arrow).
  void openRequested(const QModelIndex& index);

 protected:
  void rowsAboutToBeRemoved(const QModelIndex& parent, int start, int end) override;
  void keyPressEvent(QKeyEvent* event) override;
  void mousePressEvent(QMouseEvent* event) override;
  void contextMenuEvent(QContextMenuEvent* event) override;

 private:
  int clickedRow_ = -1;
  bool selectedRowsGo_ = false;  // the rows being removed hold the whole selection

 protected:
  void paintEvent(QPaintEvent* event) override;

 private:
  QString emptyHint_;
};
