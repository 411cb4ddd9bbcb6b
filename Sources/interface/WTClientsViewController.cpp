#include "WTClientsViewController.h"

#include "WTBillingDialog.h"
#include "WTClient.h"
#include "WTListView.h"
#include "WTObjectContext.h"
#include "WTObjectListModel.h"
#include "WTRateField.h"
#include "WTReportWindowController.h"

#include <QMenu>

WTClientsViewController::WTClientsViewController(WTObjectContext* context, QObject* parent)
    : WTObjectListViewController(context, WTEntity::Client, QStringLiteral("Client"), parent) {
  setObjectName(QStringLiteral("Clients"));
}

void WTClientsViewController::report() {
  if (auto* client = dynamic_cast<WTClient*>(selectedObject())) WTReportWindowController::showReport(context(), client);
}

void WTClientsViewController::addObject() {
  auto* client = WTClient::insertNewObject(context());
  context()->undoManager().setActionName(tr("New Client"));
  context()->processPendingChanges();
  arrayController()->rearrangeObjects();
  editNewObject(client, false);
}

void WTClientsViewController::addRowMenuItems(QMenu* menu) {
  menu->addAction(tr("Set Rate…"), this, [this] {
    if (WTObject* client = clickedObject()) WTRateDialog::editRate(client, tableView());
  });
  menu->addAction(WTBillingDialog::menuTitle(WTEntity::Client), this, [this] {
    if (WTObject* client = clickedObject()) WTBillingDialog::editBilling(client, tableView());
  });
  menu->addSeparator();
}
