#include "WTApplication.h"

#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTAppDelegate.h"
#include "WTBudgetWatcher.h"
#include "WTDesktopNotifier.h"
#include "WTDialogAlertPresenter.h"
#include "WTDialogTrackingAlertPresenter.h"
#include "WTIdleSourceChain.h"
#include "WTImages.h"
#include "WTKeyboardContextMenu.h"
#include "WTLauncherEntry.h"
#include "WTMainWindowController.h"
#include "WTObject.h"
#include "WTPasswordStore.h"
#include "WTProject.h"
#include "WTSleepMonitor.h"
#include "WTStatusBarController.h"
#include "WTStopwatchUpdater.h"
#include "WTStoreSetup.h"
#include "WTTask.h"

#include <QDBusConnection>

WTApplication::WTApplication(int& argc, char** argv)
    : QApplication(argc, argv),
      defaults_(std::make_unique<UserDefaults>()),
      presenter_(std::make_unique<WTDialogAlertPresenter>()) {
  setApplicationName(QStringLiteral("Tessal"));
  setOrganizationName(QStringLiteral("Tessal"));
  setDesktopFileName(QStringLiteral("tessal"));
  setWindowIcon(WTImages::icon(QStringLiteral("tessal")));
  registerDefaults(*defaults_);
  installEventFilter(new WTKeyboardContextMenu(this));
  delegate_ = std::make_unique<WTAppDelegate>(defaults_.get(), presenter_.get());
  delegate_->setSyncErrorPresenter(presenter_.get());
  connect(this, &QCoreApplication::aboutToQuit, delegate_.get(), &WTAppDelegate::applicationWillTerminate);
  // Logging out asks nothing: running timers are saved as they are and go on running next time.
  connect(this, &QGuiApplication::commitDataRequest, delegate_.get(), &WTAppDelegate::sessionWillEnd);
}

WTApplication::~WTApplication() {
  budgetWatcher_.reset();
  statusBarController_.reset();
  mainWindowController_.reset();
  delegate_.reset();
}

void WTApplication::registerDefaults(UserDefaults& defaults) {
  WTStoreSetup::registerDefaults(defaults);
}

WTMainWindowController* WTApplication::mainWindowController() {
  if (!mainWindowController_) {
    mainWindowController_ = std::make_unique<WTMainWindowController>(*delegate_);
    presenter_->setParentWidget(mainWindowController_.get());
  }
  return mainWindowController_.get();
}

QMainWindow* WTApplication::mainWindow() {
  return mainWindowController();
}

void WTApplication::applicationDidFinishLaunching() {
  WTMainWindowController* window = mainWindowController();
  window->bringToFront();
  if (delegate_->stopwatchUpdater()) return;
  idleSource_ = makeDesktopIdleSource(QDBusConnection::sessionBus());
  trackingPresenter_ = std::make_unique<WTDialogTrackingAlertPresenter>(window);
  sleepMonitor_ = std::make_unique<WTSleepMonitor>(QDBusConnection::systemBus());
  launcherEntry_ = std::make_unique<WTLauncherEntry>(QDBusConnection::sessionBus());
  WTStopwatchUpdater* updater = delegate_->startStopwatchUpdater(idleSource_.get(), trackingPresenter_.get(),
                                                                 sleepMonitor_.get(), launcherEntry_.get());
  // The running time shows in the title, where every desktop's task switcher shows it too.
  auto showRunningTime = [window, updater] {
    window->setWindowTitle(updater->windowTitle(QStringLiteral("Tessal")));
    window->setRunningTime(updater->badgeLabel());
  };
  connect(updater, &WTStopwatchUpdater::badgeDidChange, window, showRunningTime);
  showRunningTime();

  statusBarController_ = std::make_unique<WTStatusBarController>(delegate_->managedObjectContext(), updater);
  linkStatusBar(*statusBarController_, *window);
  statusBarController_->activateStatusMenu();
  budgetWatcher_ = std::make_unique<WTBudgetWatcher>(updater);
  notifier_ = std::make_unique<WTDesktopNotifier>(QDBusConnection::sessionBus());
  linkBudgetNotices(*budgetWatcher_, *notifier_, *window);
  presenter_->setNoticeSink([notifier = notifier_.get()](const QString& summary, const QString& body) {
    notifier->notify(summary, body);
  });
  presenter_->setWithdrawal([window](const QString& summary) { window->withdrawNotice(summary); });
  // Only now, with the window and the store up, and only for an account: the keyring may prompt, and is
  // asked in the background. A password an earlier version kept in the settings file moves into it.
  delegate_->passwordStore()->load();
}

void WTApplication::linkStatusBar(WTStatusBarController& statusBar, WTMainWindowController& window) {
  connect(&statusBar, &WTStatusBarController::showMainWindowRequested, &window,
          &WTMainWindowController::bringToFront);
  connect(&statusBar, &WTStatusBarController::quitRequested, &window, &WTMainWindowController::quit);
  connect(&window, &WTMainWindowController::runningTimeButtonClicked, &statusBar,
          &WTStatusBarController::statusBarClicked);
  auto followTray = [&window](bool available) {
    window.setHidesOnClose(available);
    window.setRunningTimeButtonVisible(!available);
  };
  connect(&statusBar, &WTStatusBarController::trayAvailabilityChanged, &window, followTray);
  followTray(statusBar.isShowingIcon());
}

void WTApplication::linkBudgetNotices(WTBudgetWatcher& watcher, WTDesktopNotifier& notifier,
                                      WTMainWindowController& window) {
  const auto summary = [](const WTObject* object, WTBudget::Level level) {
    QString name = object->name().isEmpty() ? tr("Untitled") : object->name();
    // A task is named with its project: many projects have a "General".
    const WTProject* project =
        object->entity() == WTEntity::Task ? static_cast<const WTTask*>(object)->project() : nullptr;
    if (project) name = tr("%1 › %2").arg(project->name(), name);
    return level == WTBudget::Level::Over ? tr("“%1” is over its budget").arg(name)
                                          : tr("“%1” has used 80 % of its budget").arg(name);
  };
  connect(&watcher, &WTBudgetWatcher::budgetCrossed, &notifier,
          [&notifier, summary](WTObject* object, WTBudget::Level level) {
            notifier.notify(summary(object, level), WTBudget::standing(object));
          });
  // A warning stands no longer than what it says; back from over the budget, the 80 % line is said.
  connect(&watcher, &WTBudgetWatcher::budgetEased, &window,
          [&window, &notifier, summary](WTObject* object, WTBudget::Level level) {
            for (const WTBudget::Level line : {WTBudget::Level::Warning, WTBudget::Level::Over})
              if (level < line) window.withdrawNotice(summary(object, line));
            if (level == WTBudget::Level::Warning)
              notifier.notify(summary(object, level), WTBudget::standing(object));
          });
  // The figures of a warning standing on the status line follow the ticks; without one, nothing is
  // worked out (a running timer moves its budget every tick).
  connect(&watcher, &WTBudgetWatcher::budgetMoved, &window,
          [&window, summary](WTObject* object, WTBudget::Level level) {
            const QString said = summary(object, level);
            window.renewNotice(said, [&] { return tr("%1 — %2").arg(said, WTBudget::standing(object)); });
          });
  connect(&notifier, &WTDesktopNotifier::notShown, &window,
          [&window](const QString& summary, const QString& body) {
            window.showNotice(tr("%1 — %2").arg(summary, body));
          });
}

bool WTApplication::applicationShouldHandleReopen(bool) {
  mainWindowController()->bringToFront();
  return true;
}
