#pragma once

#include "RZSyncNetwork.h"
#include "Result.h"

#include <QJsonObject>
#include <QObject>
#include <QString>

#include <functional>
#include <memory>

class RZSyncErrorPresenter;
class RZSyncManager;
class UserDefaults;
class WTAlertPresenter;
class WTPasswordStore;
class WTIdleSource;
class WTLauncherEntry;
class WTSleepMonitor;
class WTStopwatchUpdater;
class WTTrackingAlertPresenter;
class WTObject;
class WTObjectContext;
namespace WTStoreBackup {
class Daily;
}

// Owns the one object context, its store file and the sync manager that keeps them in step with the
// account's server; saves half a second after every change, and decides what happens when the
// application quits. The context, the store and the sync manager are made on the first call of
// managedObjectContext(), not at launch.
class WTAppDelegate : public QObject, public RZSyncNetworkCredentialDelegate {
  Q_OBJECT
 public:
  // Neither is owned; both must outlive the delegate.
  WTAppDelegate(UserDefaults* defaults, WTAlertPresenter* presenter, QObject* parent = nullptr);
  ~WTAppDelegate() override;

  // $XDG_DATA_HOME/Tessal2 (the temporary folder's Tessal2 when there is no data location); not created.
  static QString applicationSupportFolder();
  static QString storePath();

  // The context, made with the store on first use. A store that cannot be opened is reported once;
  // the context then works without one, finds nothing and cannot save, and the file is left untouched.
  // For a damaged one the report names the newest good backup and offers to restore it
  // (WTAlertPresenter::offerRestore; WTStoreSetup::restoreBackup keeps the damaged file beside it).
  // A store file made here gets its first project (fillNewStore).
  WTObjectContext* managedObjectContext();
  // What a store file gets when it is made, by the desktop copy or by a command: "Default Project" with
  // "Default Task", for the first day's work. Not when this installation syncs (a "WTSyncUser" is set):
  // its projects come from the account, which would otherwise gain a first project from every device
  // set up. A store that exists is never filled, so the user's own emptying it sticks. Saves nothing.
  static void fillNewStore(WTObjectContext& context);
  bool hasContext() const { return context_ != nullptr; }
  // Made with the context, over the store's journal, with syncing switched on; null before that.
  RZSyncManager* syncManager() const { return syncManager_.get(); }
  // Where sync errors are shown (not owned); the log until set. Applies to a manager made later too.
  void setSyncErrorPresenter(RZSyncErrorPresenter* presenter);

  // The five-second ticker over the context (made with it if need be), started with the desktop's parts:
  // where idle time comes from, who asks about idle time and quitting, sleep and the launcher entry. Any
  // part may be null. Once only; later calls return the same ticker. The commands never make one.
  WTStopwatchUpdater* startStopwatchUpdater(WTIdleSource* idle, WTTrackingAlertPresenter* presenter,
                                            WTSleepMonitor* sleep, WTLauncherEntry* launcherEntry);
  WTStopwatchUpdater* stopwatchUpdater() const { return stopwatchUpdater_.get(); }

  // Saves when there are changes; a failure is shown (unless there is no store at all, which was
  // reported when opening) and the changes stay for the next attempt. Logs "Saved" either way.
  void saveAction();

  // A save for callers that run while the user may be typing (a sync merge): returns true at once when
  // nothing changed; otherwise commits an edit in progress through the commit-editing handler (which
  // must not end it) and saves. Logs "ERROR: ..." and fills `error` when it fails.
  bool saveChanges(Error* error = nullptr);
  // Carries out a change a command hands over while this process holds the store (a start or stop from
  // the shell while the window or `tessal sync` runs) and saves it at once; the answer is what that
  // command prints.
  QJsonObject carryOutRequest(const QJsonObject& request);

  // Who speaks to the user for the application (not owned).
  WTAlertPresenter* alertPresenter() const { return presenter_; }

  // Whether archived clients and projects are listed, and the filter that says so.
  bool displayArchived() const { return displayArchived_; }
  std::function<bool(const WTObject*)> archivedPredicate() const;
  void toggleArchived();

  // The sync account's password, kept in the desktop's secret service (made on first use). Nothing
  // here loads it from the keychain: the desktop does so once its window is up, a command before it
  // syncs (WTPasswordStore::load).
  WTPasswordStore* passwordStore();
  // Replaces the password store (a command's, which waits less for the keychain).
  void setPasswordStore(std::unique_ptr<WTPasswordStore> store);

  // The sync account: the user default "WTSyncUser" and the password store's password.
  QString syncNetworkRequestsUser(RZSyncNetwork* network) override;
  QString syncNetworkRequestsPassword(RZSyncNetwork* network) override;

  enum class TerminateReply { TerminateNow, TerminateCancel };
  // Asks about running timers (the ticker's quit prompt), commits editing, saves, and on a failed save
  // asks whether to quit anyway.
  TerminateReply applicationShouldTerminate();
  void applicationWillTerminate();
  // The desktop session is ending: nothing may be asked; running timers are saved running.
  void sessionWillEnd();

  // Runs before quitting and before each safe save that has something to save, to commit an edit in
  // progress without ending it; false refuses.
  void setCommitEditingHandler(std::function<bool()> handler) { commitEditing_ = std::move(handler); }

 signals:
  void archivedPredicateChanged();

 private:
  void managedObjectContextObjectsDidChange();

  UserDefaults* defaults_;
  WTAlertPresenter* presenter_;
  RZSyncErrorPresenter* syncErrorPresenter_ = nullptr;
  std::unique_ptr<WTObjectContext> context_;
  // After the context: the manager detaches its journal from the context when it goes.
  std::unique_ptr<RZSyncManager> syncManager_;
  // Before the context goes: it observes the context's records.
  std::unique_ptr<WTStopwatchUpdater> stopwatchUpdater_;
  std::function<bool()> commitEditing_;
  // The day's copy of the store, made after the first save of a day.
  std::unique_ptr<WTStoreBackup::Daily> dailyBackup_;
  std::unique_ptr<WTPasswordStore> passwordStore_;
  bool displayArchived_ = false;
};
