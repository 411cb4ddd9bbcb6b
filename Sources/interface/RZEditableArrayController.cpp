#include "RZEditableArrayController.h"

#include "RZViewAdditions.h"

#include <QAbstractItemView>
#include <QItemSelectionModel>
#include <QTimer>

#include <algorithm>

RZEditableArrayController::RZEditableArrayController(QObject* parent) : QObject(parent) {}

void RZEditableArrayController::add() {
  if (inserter_) inserter_();
  if (!tableColumnIdentifier_.isEmpty())
    QTimer::singleShot(0, this, &RZEditableArrayController::editTableColumn);
}

void RZEditableArrayController::editTableColumn() {
  if (!tableView_ || !tableView_->selectionModel()) return;
  const QModelIndexList rows = tableView_->selectionModel()->selectedRows();
  if (rows.isEmpty()) return;
  const auto last = std::max_element(
      rows.begin(), rows.end(), [](const QModelIndex& a, const QModelIndex& b) { return a.row() < b.row(); });
  RZViewAdditions::editColumnWithIdentifier(tableView_, tableColumnIdentifier_, last->row());
}
