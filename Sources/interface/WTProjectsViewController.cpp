#include "WTProjectsViewController.h"

#include "WTBillingDialog.h"
#include "WTClient.h"
#include "WTItemsViewController.h"
#include "WTListView.h"
#include "WTObjectContext.h"
#include "WTObjectListModel.h"
#include "WTProject.h"
#include "WTReportWindowController.h"
#include "WTTask.h"

#include <QAction>
#include <QActionGroup>
#include <QMenu>

WTProjectsViewController::WTProjectsViewController(WTObjectContext* context, QObject* parent)
    : WTObjectListViewController(context, WTEntity::Project, QStringLiteral("Project"), parent),
      clientsModel_(new WTObjectListModel(context, WTEntity::Client, this)) {
  setObjectName(QStringLiteral("Projects"));
}

WTProjectsViewController::~WTProjectsViewController() = default;

void WTProjectsViewController::setArchivedPredicate(std::function<bool(const WTObject*)> predicate) {
  clientsModel_->setFilterPredicate(predicate);
  WTObjectListViewController::setArchivedPredicate(std::move(predicate));
}

void WTProjectsViewController::report() {
  if (auto* project = dynamic_cast<WTProject*>(selectedObject())) {
    WTReportWindowController::showReport(context(), QList<WTProject*>{project});
  }
}

void WTProjectsViewController::addObject() {
  auto* project = WTProject::insertNewObject(context());
  auto* task = WTTask::insertNewObject(context());
  task->setName(tr("General"));
  task->setProject(project);
  context()->undoManager().setActionName(tr("New Project"));
  context()->processPendingChanges();
  arrayController()->rearrangeObjects();
  editNewObject(project, true);
}

void WTProjectsViewController::openProject(WTProject* project) {
  if (!project) return;
  if (!itemsViewController_) itemsViewController_ = new WTItemsViewController(context(), this);
  itemsViewController_->setProject(project);
  pushViewController(itemsViewController_);
}

void WTProjectsViewController::openClients() {
  if (WTNavigationHost* host = navigationHost()) host->showClients();
}

QMenu* WTProjectsViewController::clientMenu(WTProject* project) {
  auto* menu = new QMenu(tableView());
  menu->setObjectName(QStringLiteral("clientMenu"));
  menu->setAttribute(Qt::WA_DeleteOnClose);
  fillClientMenu(menu, project);
  return menu;
}

void WTProjectsViewController::fillClientMenu(QMenu* menu, WTProject* project) {
  auto* group = new QActionGroup(menu);
  auto add = [&](const QString& title, WTClient* client) {
    QAction* action = menu->addAction(title);
    action->setCheckable(true);
    action->setChecked(project->client() == client);
    group->addAction(action);
    QPointer<WTObjectListModel> model = arrayController();
    connect(action, &QAction::triggered, this, [this, project, client] {
      const QModelIndex index = arrayController()->indexOfObject(project);
      if (index.isValid()) {
        arrayController()->setData(index, WTObjectListModel::variantFromObject(client),
                                   WTObjectListModel::ClientRole);
      } else {
        project->setClient(client);
      }
    });
  };
  add(tr("No Client"), nullptr);
  menu->addSeparator();
  for (WTObject* client : clientsModel_->arrangedObjects()) {
    add(client->name().isEmpty() ? tr("Untitled") : client->name(), static_cast<WTClient*>(client));
  }
  // A client that is archived (and so not listed) still shows as the project's choice.
  if (project->client() && !clientsModel_->arrangedObjects().contains(project->client())) {
    add(project->client()->name(), project->client());
  }
  menu->addSeparator();
  menu->addAction(tr("Edit Clients…"), this, &WTProjectsViewController::openClients);
}

void WTProjectsViewController::partActivated(const QModelIndex& index, WTTableCellView::Part part,
                                             const QRect& rect) {
  auto* project = static_cast<WTProject*>(arrayController()->objectAt(index.row()));
  if (!project) return;
  if (part == WTTableCellView::Part::OpenButton) {
    openProject(project);
  } else if (part == WTTableCellView::Part::Subtitle) {
    clientMenu(project)->popup(tableView()->viewport()->mapToGlobal(rect.bottomLeft()));
  }
}

void WTProjectsViewController::addRowMenuItems(QMenu* menu) {
  menu->addAction(tr("Open"), this, [this] {
    if (WTObject* project = clickedObject()) openProject(static_cast<WTProject*>(project));
  });
  menu->addAction(WTBillingDialog::menuTitle(WTEntity::Project), this, [this] {
    if (WTObject* project = clickedObject()) WTBillingDialog::editBilling(project, tableView());
  });
  // The chooser under the project's name, for the keyboard too.
  QMenu* client = menu->addMenu(tr("Client"));
  connect(client, &QMenu::aboutToShow, this, [this, client] {
    client->clear();
    if (WTObject* project = clickedObject()) fillClientMenu(client, static_cast<WTProject*>(project));
  });
  menu->addSeparator();
}
