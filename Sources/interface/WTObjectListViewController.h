#pragma once

#include "WTEntity.h"
#include "WTTableCellView.h"
#include "WTViewController.h"

#include <QPointer>

#include <functional>

class QMenu;
class WTListCellDelegate;
class WTListView;
class WTObjectContext;
class WTObjectListModel;

// What the projects and clients lists share: a table over one entity's records, removing and
// archiving the selection or the right-clicked row, and the row menu whose item with tag 1 reads
// "Archive" or "Unarchive" for the clicked row.
class WTObjectListViewController : public WTViewController {
  Q_OBJECT
 public:
  // `context` is not owned. `identifier` names the rows' cell ("Project" or "Client").
  WTObjectListViewController(WTObjectContext* context, WTEntity entity, const QString& identifier,
                             QObject* parent = nullptr);
  ~WTObjectListViewController() override;

  WTObjectContext* context() const { return context_; }
  // The records shown (filter and order included).
  WTObjectListModel* arrayController() const { return arrayController_; }
  // The table; loads the view.
  WTListView* tableView();

  // Which records are listed (archived ones are hidden unless shown); refilters at once.
  void setArchivedPredicate(std::function<bool(const WTObject*)> predicate);

  // The selected records in list order.
  QList<WTObject*> selectedObjects() const;
  void selectObject(WTObject* object);

  bool respondsTo(Command command) const override;
  // The last of the selected records; none without a selection.
  WTObject* selectedObject() const override;
  // Deletes the selected records; a project holding items, or a running timer, is asked about first
  // (undo brings everything back).
  void removeSelectedObjects() override;
  // Flips `archived` of the right-clicked row's record while its menu is open, else of the last
  // selected record; nothing without either.
  void toggleArchive() override;

  // The row menu (made once): "Archive"/"Unarchive" (tag 1) and "Delete", plus subclass items.
  QMenu* rowMenu();
  // With a clicked row, titles the tag-1 item after that row's record; without one, changes nothing.
  void menuNeedsUpdate(QMenu* menu);
  // Runs the row menu for `row` (-1: none) at `global`, as a right click does.
  void showRowMenu(int row, const QPoint& global);

 protected:
  QWidget* loadView() override;
  // Starts editing the name of `object`, just added, when it is listed; returns whether it is. Escape
  // before a name is typed takes the addition back.
  bool editNewObject(WTObject* object, bool scroll);
  virtual void partActivated(const QModelIndex& index, WTTableCellView::Part part, const QRect& rect);
  virtual void addRowMenuItems(QMenu* menu);
  // The record the row menu acts on: the clicked row's.
  WTObject* clickedObject() const;

 private:
  WTObjectContext* context_;
  QString identifier_;
  WTObjectListModel* arrayController_;
  QPointer<WTListView> tableView_;
  WTListCellDelegate* delegate_ = nullptr;
  QPointer<QMenu> rowMenu_;
};
