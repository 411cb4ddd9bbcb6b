#include "WTClientsViewController.h"

#include "WTClient.h"
#include "WTObjectContext.h"
#include "WTObjectListModel.h"

WTClientsViewController::WTClientsViewController(WTObjectContext* context, QObject* parent)
    : WTObjectListViewController(context, WTEntity::Client, QStringLiteral("Client"), parent) {
  setObjectName(QStringLiteral("Clients"));
}

void WTClientsViewController::addObject() {
  auto* client = WTClient::insertNewObject(context());
  context()->processPendingChanges();
  arrayController()->rearrangeObjects();
  editObject(client, false);
}
