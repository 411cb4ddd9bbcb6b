#pragma once

#include "WTObjectListViewController.h"

class WTItemsViewController;
class WTProject;

// Root of the projects stack: the projects with their client, duration and cost. A new project
// always gets a task "General" and its name is edited at once; opening a project pushes its items
// outline.
class WTProjectsViewController : public WTObjectListViewController {
  Q_OBJECT
 public:
  explicit WTProjectsViewController(WTObjectContext* context, QObject* parent = nullptr);
  ~WTProjectsViewController() override;

  // Hides archived rows, and archived clients in each row's client chooser alike.
  void setArchivedPredicate(std::function<bool(const WTObject*)> predicate);

  // Inserts a project with a task "General"; when the list shows it, scrolls to it and edits its name.
  void addObject() override;
  // Opens a report window on the selected project.
  void report() override;
  // Pushes the (one, reused) items outline for `project`.
  void openProject(WTProject* project);
  // Shows the clients stack.
  void openClients();
  // Made on the first open.
  WTItemsViewController* itemsViewController() const { return itemsViewController_; }

  // The chooser's menu for `project`: "No Client", then every listed client, the current one checked.
  QMenu* clientMenu(WTProject* project);

 protected:
  void partActivated(const QModelIndex& index, WTTableCellView::Part part, const QRect& rect) override;
  void addRowMenuItems(QMenu* menu) override;

 private:
  void fillClientMenu(QMenu* menu, WTProject* project);

  WTObjectListModel* clientsModel_;
  WTItemsViewController* itemsViewController_ = nullptr;
};
