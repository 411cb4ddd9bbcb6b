#pragma once

#include <QString>

class QAbstractItemView;

// A short line in the middle of a list or outline that has no rows, telling a new user how to make
// the first one, in place of a blank pane.
namespace WTEmptyHint {

// "No clients yet — press Ctrl+N" for `things` = "clients", with the shortcut of the add command.
QString forAdding(const QString& noneYet);
// Paints `hint` on the view's viewport when its model has no rows; call from the view's paintEvent.
void paint(QAbstractItemView* view, const QString& hint);

}  // namespace WTEmptyHint
