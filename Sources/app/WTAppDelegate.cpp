#include "WTAppDelegate.h"

#include "RZSyncManager.h"
#include "RZSyncTrack.h"
#include "SettingsKeys.h"
#include "TessalLogging.h"
#include "UserDefaults.h"
#include "WTAlertPresenter.h"
#include "WTKeychain.h"
#include "WTObject.h"
#include "WTObjectContext.h"
#include "WTPasswordStore.h"
#include "WTProject.h"
#include "WTStopwatchUpdater.h"
#include "WTStore.h"
#include "WTStoreBackup.h"
#include "WTStoreSetup.h"
#include "WTTask.h"
#include "WTTimerCommands.h"
#include "WTUndoManager.h"

#include <QDir>
#include <QFileInfo>
#include <QStandardPaths>
#include <QTimer>
#include <QtDebug>

WTAppDelegate::WTAppDelegate(UserDefaults* defaults, WTAlertPresenter* presenter, QObject* parent)
    : QObject(parent), defaults_(defaults), presenter_(presenter) {}

WTAppDelegate::~WTAppDelegate() {
  stopwatchUpdater_.reset();
  syncManager_.reset();
  if (WTObjectContext::defaultContext() == context_.get()) WTObjectContext::setDefaultContext(nullptr);
}

QString WTAppDelegate::applicationSupportFolder() {
  return WTStoreSetup::applicationSupportFolder();
}

QString WTAppDelegate::storePath() {
  return WTStoreSetup::storePath();
}

WTObjectContext* WTAppDelegate::managedObjectContext() {
  if (context_) return context_.get();
  const QString folder = applicationSupportFolder();
  if (!QFileInfo::exists(folder)) QDir().mkpath(folder);

  context_ = std::make_unique<WTObjectContext>(defaults_);
  WTObjectContext::setDefaultContext(context_.get());
  const bool storeIsNew = !QFileInfo::exists(storePath());
  bool fill = false;
  Result<std::unique_ptr<WTStore>> store =
      RZSyncTrack::openStore(storePath(), nullptr, WTStore::Check::WholeFileBeforeSaving);
  if (!store && (store.error().code == WTStore::Damaged || store.error().code == WTStore::NotAStore)) {
    // Never replaced unasked: the damaged file stays as it is unless the user takes a backup instead,
    // and then it is kept beside the restored one.
    const QString backup = WTStoreBackup::newestGoodCopy(storePath());
    if (backup.isEmpty()) {
      presenter_->presentError(store.error().message);
    } else if (presenter_->offerRestore(store.error().message, backup)) {
      const Result<QString> restored = WTStoreSetup::restoreBackup(backup, *defaults_);
      if (restored) store = RZSyncTrack::openStore(storePath(), nullptr, WTStore::Check::WholeFileBeforeSaving);
      if (!restored || !store)
        presenter_->presentError(restored ? store.error().message : restored.error().message);
    }
  } else if (!store) {
    presenter_->presentError(store.error().message);
  }
  if (store) {
    Result<void> loaded = context_->attachStore(std::move(store.value()));
    if (!loaded) presenter_->presentError(loaded.error().message);
    fill = loaded && storeIsNew;
  }
  connect(context_.get(), &WTObjectContext::objectsDidChange, this,
          &WTAppDelegate::managedObjectContextObjectsDidChange);
  if (context_->hasStore()) {
    dailyBackup_ = std::make_unique<WTStoreBackup::Daily>(storePath());
    connect(context_.get(), &WTObjectContext::didSave, this, [this] { dailyBackup_->storeDidSave(); });
  }

  syncManager_ = std::make_unique<RZSyncManager>(context_.get());
  syncManager_->syncNetwork()->setCredentialDelegate(this);
  if (syncErrorPresenter_) syncManager_->setErrorPresenter(syncErrorPresenter_);
  // A merge first saves what the user is typing, the way every safe save does.
  syncManager_->setSaveHandler([this]() -> Result<void> {
    Error error;
    if (saveChanges(&error)) return {};
    return error;
  });
  // Filled once the journal listens, so that the first project reaches the account like any other.
  if (fill) fillNewStore(*context_);
  syncManager_->enableSync();
  return context_.get();
}

void WTAppDelegate::fillNewStore(WTObjectContext& context) {
  // The first project is the program's, not a step of the user's: Undo must not take it away for good.
  context.undoManager().disableRegistration();
  WTStoreSetup::fillNewStore(context);
  context.undoManager().enableRegistration();
}

WTStopwatchUpdater* WTAppDelegate::startStopwatchUpdater(WTIdleSource* idle, WTTrackingAlertPresenter* presenter,
                                                         WTSleepMonitor* sleep, WTLauncherEntry* launcherEntry) {
  if (stopwatchUpdater_) return stopwatchUpdater_.get();
  WTObjectContext* context = managedObjectContext();
  stopwatchUpdater_ = std::make_unique<WTStopwatchUpdater>(context, defaults_, idle, presenter);
  if (sleep) stopwatchUpdater_->setSleepMonitor(sleep);
  stopwatchUpdater_->setLauncherEntry(launcherEntry);
  stopwatchUpdater_->setSaveCallback([this] { return saveChanges(); });
  stopwatchUpdater_->start();
  return stopwatchUpdater_.get();
}

void WTAppDelegate::managedObjectContextObjectsDidChange() {
  // One save per notice, not merged: a save that finds nothing to do does nothing.
  QTimer::singleShot(500, this, &WTAppDelegate::saveAction);
}

namespace {

// A file found damaged only once the records were up (by the check beside the loading) is not replaced
// under the open window: the message names the copy to put back after quitting.
QString withDamageAdvice(const Error& error) {
  if (error.code != WTStore::Damaged) return error.message;
  const QString copy = WTStoreBackup::newestGoodCopy(WTStoreSetup::storePath());
  if (copy.isEmpty()) return error.message;
  return error.message + u' ' +
         WTAppDelegate::tr(
             "The newest good backup is “%1”; quit Tessal and run “tessal restore” with it to "
             "put it back.")
             .arg(copy);
}

}  // namespace

void WTAppDelegate::saveAction() {
  if (!context_ || !context_->hasChanges()) return;
  const Result<void> saved = context_->save();
  if (!saved && context_->hasStore()) presenter_->presentError(withDamageAdvice(saved.error()));
  qCDebug(lcStore, "Saved");
}

bool WTAppDelegate::saveChanges(Error* error) {
  WTObjectContext* context = managedObjectContext();
  // Nothing to save: return before touching anything the user may be typing in. An edit in progress is
  // committed (not ended) only when a save happens anyway.
  if (!context->hasChanges()) return true;
  if (commitEditing_) commitEditing_();
  const Result<void> saved = context->save();
  if (saved) return true;
  qCWarning(lcStore, "ERROR: %s", qUtf8Printable(saved.error().message));
  if (error) *error = saved.error();
  return false;
}

QJsonObject WTAppDelegate::carryOutRequest(const QJsonObject& request) {
  // What the user was typing when a change came from the shell is a step of Edit › Undo of its own, and
  // so is the change: undoing a typo never starts or stops a timer again.
  WTUndoManager& undo = managedObjectContext()->undoManager();
  if (commitEditing_) commitEditing_();
  undo.closeGroup();
  WTCommandOutcome outcome = WTTimerCommands::answer(*managedObjectContext(), request);
  undo.closeGroup();
  Error error;
  if (!saveChanges(&error)) {
    outcome.status = 1;
    outcome.err += QStringLiteral("tessal: %1\n").arg(error.message);
  }
  return outcome.toJson();
}

std::function<bool(const WTObject*)> WTAppDelegate::archivedPredicate() const {
  if (displayArchived_) return [](const WTObject*) { return true; };
  return [](const WTObject* object) { return !object->archived(); };
}

void WTAppDelegate::toggleArchived() {
  displayArchived_ = !displayArchived_;
  emit archivedPredicateChanged();
}

void WTAppDelegate::setSyncErrorPresenter(RZSyncErrorPresenter* presenter) {
  syncErrorPresenter_ = presenter;
  if (syncManager_) syncManager_->setErrorPresenter(presenter);
}

QString WTAppDelegate::syncNetworkRequestsUser(RZSyncNetwork*) {
  return defaults_ ? defaults_->stringForKey(SettingsKeys::kSyncUser) : QString();
}

WTPasswordStore* WTAppDelegate::passwordStore() {
  if (!passwordStore_) passwordStore_ = std::make_unique<WTPasswordStore>(defaults_);
  return passwordStore_.get();
}

void WTAppDelegate::setPasswordStore(std::unique_ptr<WTPasswordStore> store) {
  passwordStore_ = std::move(store);
}

QString WTAppDelegate::syncNetworkRequestsPassword(RZSyncNetwork*) {
  return defaults_ ? passwordStore()->password() : QString();
}

WTAppDelegate::TerminateReply WTAppDelegate::applicationShouldTerminate() {
  if (!context_) return TerminateReply::TerminateNow;
  // Asked first, so that the answer (stopped entries, their end dates) is part of the last save.
  if (stopwatchUpdater_) stopwatchUpdater_->applicationWillTerminate();
  if (commitEditing_ && !commitEditing_()) return TerminateReply::TerminateCancel;
  if (!context_->hasChanges()) return TerminateReply::TerminateNow;
  const Result<void> saved = context_->save();
  if (saved) return TerminateReply::TerminateNow;
  if (presenter_->presentError(withDamageAdvice(saved.error()))) return TerminateReply::TerminateCancel;
  return presenter_->confirmQuitAnyway() ? TerminateReply::TerminateNow : TerminateReply::TerminateCancel;
}

void WTAppDelegate::applicationWillTerminate() {
  if (syncManager_) syncManager_->disableSync();
}

void WTAppDelegate::sessionWillEnd() {
  if (stopwatchUpdater_) stopwatchUpdater_->sessionWillEnd();
  saveChanges();
}
