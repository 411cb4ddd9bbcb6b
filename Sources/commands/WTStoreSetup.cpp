#include "WTStoreSetup.h"

#include "RZSyncReplacedStore.h"
#include "RZSyncTrack.h"
#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTStore.h"
#include "WTStoreBackup.h"
#include "WTTask.h"

#include <QDir>
#include <QFileInfo>
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

Result<QString> restoreBackup(const QString& backup, UserDefaults& defaults,
                              const std::function<Result<void>()>& mayReplace) {
  const QString store = storePath();
  if (QFileInfo::exists(store) &&
      QFileInfo(backup).canonicalFilePath() == QFileInfo(store).canonicalFilePath())
    return Error{WTStore::OpenFailed, QStringLiteral("“%1” is the data file itself").arg(backup)};
  const Result<QString> aside = WTStoreBackup::restore(backup, store, mayReplace);
  if (!aside) return aside;
  Result<std::unique_ptr<WTStore>> opened = RZSyncTrack::openStore(store);
  WTObjectContext context(&defaults);
  Result<void> done = opened ? context.attachStore(std::move(opened.value())) : Result<void>(opened.error());
  if (done) done = journalReplacedStore(context);
  if (!done) {
    return Error{WTStore::WriteFailed,
                 QStringLiteral("the backup is restored, but its records will not sync: %1")
                     .arg(done.error().message)};
  }
  return aside;
}

// No currency: where none is chosen, whoever bills takes the locale's when asked, and asking ICU for it
// at every command's start would cost a timer's start a few percent.
void registerDefaults(UserDefaults& defaults) {
  defaults.registerDefaults({{SettingsKeys::kInvoiceUnit, QStringLiteral("h")},
                             {SettingsKeys::kIdleTime, 5},
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
