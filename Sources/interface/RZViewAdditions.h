#pragma once

#include <QString>

class QAbstractItemView;
class QDialog;
class QMenu;
class QWidget;

// Small additions to tables, sheets and buttons that the windows share.
namespace RZViewAdditions {

// Item role under which a model's horizontal header names a column (its identifier).
inline constexpr int kColumnIdentifierRole = 0x0100 + 0x3A7;

// The column whose header carries `identifier` (kColumnIdentifierRole), or -1.
int indexOfColumnWithIdentifier(const QAbstractItemView* view, const QString& identifier);
// Starts editing that column of `row` with its text selected; false when there is no such column or
// cell, or the cell cannot be edited.
bool editColumnWithIdentifier(QAbstractItemView* view, const QString& identifier, int row);

// Runs `sheet` window-modal over `window`, without blocking (a sheet).
void beginSheetModalForWindow(QDialog* sheet, QWidget* window);
// Ends the sheet with 1 (OK) or 0 (Cancel) once the field being edited lets go: a field whose text
// its validator does not accept keeps the sheet open. Returns whether the sheet ended.
bool endSheetWithOKButton(QDialog* sheet);
bool endSheetWithCancelButton(QDialog* sheet);

// Drops `menu` down under `sender`, as a pull-down button would.
void showMyMenu(QWidget* sender, QMenu* menu);

}  // namespace RZViewAdditions
