#pragma once

#include <QCoreApplication>
#include <QList>
#include <QString>

class WTObject;

// What deleting some rows takes with it: the rows' records and, below them, the items of a deleted
// task or project, among which may be running timers. The user is asked before items or a running
// timer go (an empty task goes without a word), and the step is named for the Edit menu's Undo.
class WTDeletion {
  Q_DECLARE_TR_FUNCTIONS(WTDeletion)
 public:
  // `objects` as selected; a record inside another selected one counts once, with its owner.
  explicit WTDeletion(const QList<WTObject*>& objects);

  // The records to delete, outermost only, in the given order.
  const QList<WTObject*>& objects() const { return objects_; }

  bool needsQuestion() const { return items_ > 0 || running_ > 0; }
  // "Delete “General” and its 14 items?", "Delete 2 tasks and their 14 items?", "Delete “Temp”?"
  QString question() const;
  // Said under the question when a timer is running in what goes; empty otherwise.
  QString detail() const;
  // "Delete “Temp”", "Delete 2 Tasks".
  QString undoName() const;

 private:
  QList<WTObject*> objects_;
  int items_ = 0;
  int tasks_ = 0;  // of the projects deleted
  int running_ = 0;
};
