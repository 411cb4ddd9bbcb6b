#pragma once

#include <QObject>
#include <QPointer>

#include <memory>

class QAction;
class QMenu;
class QSystemTrayIcon;
class RZLimitedArrayController;
class WTObjectContext;
class WTStatusBarPopup;
class WTStopwatchUpdater;

// Tessal in the desktop's tray: the "StopWatch" icon, the running time as its tooltip after every tick,
// and on a click the popup of the five most relevant tasks with their timer buttons. The icon's menu has
// "Show Tessal" and "Quit".
//
// The tray is the desktop's (a StatusNotifierItem host on KDE, or on GNOME with the AppIndicator extension;
// an XEmbed tray elsewhere). Where there is none yet, the icon appears with the first tick after a host
// does (extensions load late at login): the ticker's own wake-up asks, so there is no timer of its own.
class WTStatusBarController : public QObject {
  Q_OBJECT
 public:
  // Neither is owned; both must outlive the controller.
  WTStatusBarController(WTObjectContext* context, WTStopwatchUpdater* updater, QObject* parent = nullptr);
  ~WTStatusBarController() override;

  // Puts the icon into the tray when the desktop has one, now or later.
  void activateStatusMenu();
  // Whether the icon is in a tray; trayAvailabilityChanged tells when that changes.
  bool isShowingIcon() const;

  // Opens the popup beside `anchor` (global coordinates), or beside the icon for an empty rectangle. A
  // click while it is open does nothing.
  void statusBarClicked(const QRect& anchor = QRect());

  WTStatusBarPopup* popup() const { return popup_; }
  QSystemTrayIcon* statusItem() const { return statusItem_; }
  RZLimitedArrayController* topTasksArrayController() const { return topTasks_.get(); }

 signals:
  void showMainWindowRequested();
  void quitRequested();
  // The icon went into a tray (true), or the tray went away (false).
  void trayAvailabilityChanged(bool available);

 private:
  void stopwatchDidUpdate();
  void checkTray();

  WTStopwatchUpdater* updater_;
  std::unique_ptr<RZLimitedArrayController> topTasks_;
  WTStatusBarPopup* popup_ = nullptr;  // a window of its own, owned here
  QSystemTrayIcon* statusItem_ = nullptr;
  std::unique_ptr<QMenu> menu_;
  bool activated_ = false;
  bool showingIcon_ = false;
};
