#pragma once

#include <QApplication>

#include <memory>

class QMainWindow;
class UserDefaults;
class WTAppDelegate;
class WTBudgetWatcher;
class WTDesktopNotifier;
class WTDialogAlertPresenter;
class WTIdleSource;
class WTLauncherEntry;
class WTMainWindowController;
class WTSleepMonitor;
class WTStatusBarController;
class WTTrackingAlertPresenter;

// The application object: registers the defaults of the user's settings, owns the delegate and the
// main window, and routes quitting through the delegate so that nothing unsaved is lost.
class WTApplication : public QApplication {
  Q_OBJECT
 public:
  WTApplication(int& argc, char** argv);
  ~WTApplication() override;

  // Registers the defaults that stand for keys the user never set.
  static void registerDefaults(UserDefaults& defaults);

  UserDefaults& userDefaults() { return *defaults_; }
  WTAppDelegate& delegate() { return *delegate_; }
  // Made and shown on first call.
  WTMainWindowController* mainWindowController();
  QMainWindow* mainWindow();

  // Launch: brings the main window forward, which opens the store through the delegate, and starts the
  // ticker with this desktop's idle time, sleep notices and launcher entry.
  void applicationDidFinishLaunching();
  // Re-open (another launch while running): brings the main window forward; always handled.
  bool applicationShouldHandleReopen(bool hasVisibleWindows);

  // Makes the window follow the tray: with one, closing the window leaves Tessal in the tray; without,
  // the toolbar's running-time button opens the tray's list. Both ways lead to the window and to Quit.
  static void linkStatusBar(WTStatusBarController& statusBar, WTMainWindowController& window);
  // Says when a running timer takes a task or project past 80 % or past its budget: through the
  // desktop's notifications, on the window's status line where they are not shown, until it is back
  // below that line.
  static void linkBudgetNotices(WTBudgetWatcher& watcher, WTDesktopNotifier& notifier,
                                WTMainWindowController& window);

 private:
  std::unique_ptr<UserDefaults> defaults_;
  std::unique_ptr<WTDialogAlertPresenter> presenter_;
  // The ticker's desktop parts; the delegate's ticker uses them, and goes first.
  std::unique_ptr<WTIdleSource> idleSource_;
  std::unique_ptr<WTTrackingAlertPresenter> trackingPresenter_;
  std::unique_ptr<WTSleepMonitor> sleepMonitor_;
  std::unique_ptr<WTLauncherEntry> launcherEntry_;
  std::unique_ptr<WTAppDelegate> delegate_;
  std::unique_ptr<WTMainWindowController> mainWindowController_;
  std::unique_ptr<WTStatusBarController> statusBarController_;
  std::unique_ptr<WTBudgetWatcher> budgetWatcher_;
  std::unique_ptr<WTDesktopNotifier> notifier_;
};
