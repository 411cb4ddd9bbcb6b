#include "WTStoreSetup.h"

#include "MoneyFormat.h"
#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTTask.h"

#include <QDir>
#include <QStandardPaths>

namespace WTStoreSetup {

QString applicationSupportFolder() {
  QString base = QStandardPaths::writableLocation(QStandardPaths::GenericDataLocation);
  if (base.isEmpty()) base = QDir::tempPath();
  return base + QStringLiteral("/Tessal2");
}

QString storePath() {
  return applicationSupportFolder() + QStringLiteral("/Tessal.sqlite");
}

void registerDefaults(UserDefaults& defaults) {
  defaults.registerDefaults({{SettingsKeys::kInvoiceUnit, QStringLiteral("h")},
                             {SettingsKeys::kIdleTime, 5},
                             {SettingsKeys::kCurrency, MoneyFormat::localeCurrency()},
                             {SettingsKeys::kRoundingMinutes, 1},
                             {SettingsKeys::kRoundingMode, QStringLiteral("nearest")}});
}

void fillNewStore(WTObjectContext& context) {
  const UserDefaults* defaults = context.userDefaults();
  if (defaults && !defaults->stringForKey(SettingsKeys::kSyncUser).isEmpty()) return;
  auto* project = WTProject::insertNewObject(&context);
  project->setName(QStringLiteral("Default Project"));
  auto* task = WTTask::insertNewObject(&context);
  task->setName(QStringLiteral("Default Task"));
  task->setProject(project);
}

}  // namespace WTStoreSetup
