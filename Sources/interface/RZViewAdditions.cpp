#include "RZViewAdditions.h"

#include <QAbstractItemView>
#include <QApplication>
#include <QDialog>
#include <QLineEdit>
#include <QMenu>

namespace {

// A field refuses to let go while its validator rejects what it holds.
bool firstResponderResigns(QDialog* sheet) {
  auto* field = qobject_cast<QLineEdit*>(sheet->focusWidget());
  if (field && !field->hasAcceptableInput()) return false;
  if (QWidget* focus = sheet->focusWidget()) focus->clearFocus();  // commits what was typed
  return true;
}

}  // namespace

namespace RZViewAdditions {

int indexOfColumnWithIdentifier(const QAbstractItemView* view, const QString& identifier) {
  const QAbstractItemModel* model = view ? view->model() : nullptr;
  if (!model) return -1;
  for (int column = 0; column < model->columnCount(); ++column) {
    if (model->headerData(column, Qt::Horizontal, kColumnIdentifierRole).toString() == identifier)
      return column;
  }
  return -1;
}

bool editColumnWithIdentifier(QAbstractItemView* view, const QString& identifier, int row) {
  const int column = indexOfColumnWithIdentifier(view, identifier);
  if (column < 0) return false;
  const QModelIndex index = view->model()->index(row, column);
  if (!index.isValid() || !(view->model()->flags(index) & Qt::ItemIsEditable)) return false;
  view->setCurrentIndex(index);
  view->edit(index);
  if (auto* field = qobject_cast<QLineEdit*>(view->indexWidget(index))) field->selectAll();
  return view->indexWidget(index) != nullptr;
}

void beginSheetModalForWindow(QDialog* sheet, QWidget* window) {
  if (window && sheet->parentWidget() != window) sheet->setParent(window, sheet->windowFlags() | Qt::Sheet);
  sheet->setWindowModality(Qt::WindowModal);
  sheet->open();
}

bool endSheetWithOKButton(QDialog* sheet) {
  if (!firstResponderResigns(sheet)) return false;
  sheet->done(1);
  return true;
}

bool endSheetWithCancelButton(QDialog* sheet) {
  if (!firstResponderResigns(sheet)) return false;
  sheet->done(0);
  return true;
}

void showMyMenu(QWidget* sender, QMenu* menu) {
  if (!sender || !menu) return;
  menu->popup(sender->mapToGlobal(QPoint(0, sender->height())));
}

}  // namespace RZViewAdditions
