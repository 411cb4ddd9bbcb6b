#pragma once

#include <QAbstractItemView>
#include <QObject>
#include <QPointer>
#include <QString>

#include <functional>

// Adds a row through a given inserter and starts editing it at once: after the insertion has been
// arranged and selected (on the next turn of the event loop), the table edits the new row's column
// named by tableColumnIdentifier.
class RZEditableArrayController : public QObject {
  Q_OBJECT
 public:
  explicit RZEditableArrayController(QObject* parent = nullptr);

  QAbstractItemView* tableView() const { return tableView_; }
  void setTableView(QAbstractItemView* view) { tableView_ = view; }
  QString tableColumnIdentifier() const { return tableColumnIdentifier_; }
  void setTableColumnIdentifier(const QString& identifier) { tableColumnIdentifier_ = identifier; }
  // Inserts and selects the new object; returns its row.
  void setInserter(std::function<int()> inserter) { inserter_ = std::move(inserter); }

  // Inserts; with a column identifier set, schedules editTableColumn for the next turn.
  void add();
  // Edits the identified column of the last selected row, if there is one.
  void editTableColumn();

 private:
  QPointer<QAbstractItemView> tableView_;
  QString tableColumnIdentifier_;
  std::function<int()> inserter_;
};
