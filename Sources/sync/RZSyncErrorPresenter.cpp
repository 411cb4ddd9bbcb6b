#include "RZSyncErrorPresenter.h"
#include "TessalLogging.h"

#include <QtDebug>

void RZSyncLogErrorPresenter::presentSyncError(const QString& message) {
  qCWarning(lcSync).noquote() << QStringLiteral("Sync Error: %1").arg(message);
}

void RZSyncLogErrorPresenter::presentNetworkError(const QString& message) {
  qCWarning(lcSync).noquote() << QStringLiteral("Sync failed: %1").arg(message);
}

void RZSyncLogErrorPresenter::presentMergeNotice(const QString&, const QString& message) {
  qCWarning(lcSync).noquote() << message;
}
