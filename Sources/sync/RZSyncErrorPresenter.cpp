#include "RZSyncErrorPresenter.h"

#include <QtDebug>

void RZSyncLogErrorPresenter::presentSyncError(const QString& message) {
  qWarning().noquote() << QStringLiteral("Sync Error: %1").arg(message);
}

void RZSyncLogErrorPresenter::presentNetworkError(const QString& message) {
  qWarning().noquote() << QStringLiteral("Sync failed: %1").arg(message);
}
