#pragma once

#include "Date.h"
#include "WTEntity.h"
#include "WTTableCellView.h"
#include "WTViewController.h"

#include <QDate>
#include <QHash>
#include <QPointer>
#include <QSet>

#include <optional>

class QLabel;
class QLineEdit;
class QToolButton;
class RZBackgroundView;
class WTDatePopover;
class WTItem;
class WTItemCellDelegate;
class WTItemsModel;
class WTObjectContext;
class WTOutlineView;
class WTProject;
class WTTask;
class WTTime;

// One project as an outline of its tasks, their day groups and items, pushed onto the projects stack
// when a project is opened. It adds items of every kind to a task, runs and stops timers, completes
// to-dos, moves items to another day (by dragging or with the date pop-over), reorders tasks, and
// remembers for each project which rows were expanded.
class QMenu;

class WTItemsViewController : public WTViewController {
  Q_OBJECT
 public:
  // `context` is not owned; its user defaults (when it has any) keep the expanded rows.
  explicit WTItemsViewController(WTObjectContext* context, QObject* parent = nullptr);
  ~WTItemsViewController() override;

  WTProject* project() const { return project_; }
  // Takes effect when the view is next displayed (willDisplayView).
  void setProject(WTProject* project);

  WTItemsModel* treeController() const { return treeController_; }
  WTOutlineView* outlineView();
  WTItemCellDelegate* cellDelegate();

  // Re-targets the expansion autosave to the project, reloads the outline and expands what was
  // expanded when the project was last shown.
  void willDisplayView() override;

  // Commands from the window.
  bool respondsTo(Command command) const override;
  // A new task in the project, its name edited at once.
  void addObject() override;
  // Deletes the selected tasks and items; a task holding items, or a running timer, is asked about
  // first (undo brings everything back).
  void removeSelectedObjects() override;
  // Archives or unarchives the project.
  void toggleArchive() override;
  // Opens a report window on the project.
  void report() override;
  // The project (the toolbar's archive label follows it).
  WTObject* selectedObject() const override;
  // Starts or stops the timer of the selected task, or of the selected item's task.
  void toggleTimer() override;

  // Row actions.
  // Inserts an item of `kind` into `task`, selects it and edits its text; none without a task.
  WTItem* addItem(WTEntity kind, WTTask* task);
  // The same for a time entry, which then runs at once.
  WTTime* addTimeItem(WTTask* task);
  // A stopped time entry ending now, selected with its duration being edited (the duration typed moves
  // its start back); none without a task.
  WTTime* addStoppedTimeItem(WTTask* task);
  // Starts (selecting and editing the new entry) or stops the task's timer.
  void toggleTimerOfTask(WTTask* task);
  void stopTimer(WTTime* time);
  // Starts editing the notes field of the row of `object`.
  void showNotes(WTObject* object);
  // Regroups the item's task now and opens the item's new group.
  void refreshChildren(WTItem* item);

  // Opens the date pop-over for `item` under `anchor` (global coordinates); ignored while it is open.
  void openDatePicker(WTItem* item, const QRect& anchor);
  // Books the item on the picked day (when it changed) and opens its new group; a day on which the entry
  // would share time with another of its task's is refused, and says so.
  void popoverWillClose();
  WTItem* currentItem() const { return currentItem_; }
  WTDatePopover* popover();

  // Brings the tree up to date, opens the item's task and group, selects the item and edits its text.
  void selectItem(WTItem* item);
  void expandContainerOfItem(WTItem* item);
  // Opens the rows above the given tasks and items of this project and selects them.
  void revealObjects(const QList<WTObject*>& objects);
  // Tells why a move (a drop, a new day, another task) did not happen, at `anchor` (global coordinates).
  void showMoveRefusal(const QString& reason, const QRect& anchor);
  // Whether moving the item onto `task` (onto `day`, or keeping its date) would make it share time with
  // another entry there; if so, says so under its row.
  bool moveRefused(const WTTask& task, WTItem* item, std::optional<Date> day);

  // Row heights: a task or group row takes its cell's height, an item row at least 30 points.
  qreal heightOfRow(const QModelIndex& index);
  // The prototype cell of the row's kind, set to the outline's width and to the row's notes.
  WTTableCellView& cellViewPrototypeForIndex(const QModelIndex& index);
  // Whether the row's notes are being edited.
  bool isRowBeingEdited(const QModelIndex& index) const;

  // The key the expanded rows are kept under: the project's uuid.
  QString autosaveName() const;
  QStringList expandedIdentities() const;

  // The project's rate as typed in the header; an empty field inherits.
  void projectRateAction();
  // The project's own rate in the field, as every rate is shown, in place of anything typed.
  void showStoredRate();
  QLineEdit* rateField() const { return rateField_; }
  // The menu of a task row (its rate among others); built anew for each task, owned by the caller.
  QMenu* taskMenu(WTTask* task);
  // The menu of an item row: what its checkbox and hover buttons do, and Delete; owned by the caller.
  QMenu* itemMenu(WTItem* item);
  // Completes the to-do of the row, or reopens it (the row's checkbox, Space); other rows are left.
  void toggleCompleted(const QModelIndex& index);

 signals:
  // The back button or its shortcut asked to go back to the projects.
  void backRequested();

 protected:
  QWidget* loadView() override;

 private:
  void partActivated(const QModelIndex& index, WTTableCellView::Part part, const QRect& rect);
  void saveExpandedItems();
  void restoreExpandedItems();
  // A row that goes while open (a day's group emptied) opens again when it comes back.
  void reopenRowsThatComeBack();
  // A timer started elsewhere (the tray, the timers window, a command, another device) shows its running
  // row, though a day's group that comes new is closed.
  void openRowsOfNewTimers();
  // The header (WTItemsViewHeader.cpp).
  void refreshHeader();
  // Shows `text` in `label`, shortened to the label's width (whole in its tip), and again on resizes.
  static void setElidedText(QLabel* label, const QString& text);
  // Puts the header's totals over the duration and cost columns of the rows below.
  void alignTotals();
  bool eventFilter(QObject* watched, QEvent* event) override;
  WTTask* taskOfIndex(const QModelIndex& index) const;

  WTObjectContext* context_;
  WTProject* project_ = nullptr;
  WTItemsModel* treeController_;
  QPointer<WTOutlineView> outlineView_;
  WTItemCellDelegate* delegate_ = nullptr;
  QPointer<WTDatePopover> popover_;
  WTItem* currentItem_ = nullptr;
  QDate shownDate_;  // the day the date picker opened on
  QHash<QString, WTTableCellView*> cellViewPrototypes_;
  bool autosaveExpandedItems_ = false;
  QSet<QString> goneOpen_;  // the identities of open rows that went, to open again if they come back
  RZBackgroundView* header_ = nullptr;
  QLabel* titleLabel_ = nullptr;
  QLabel* clientLabel_ = nullptr;
  QLabel* durationLabel_ = nullptr;
  QLabel* totalsLabel_ = nullptr;
  QLineEdit* rateField_ = nullptr;
  // Records changed by undo or redo in the present turn.
  QSet<WTObject*> restoredCandidates_;
};
