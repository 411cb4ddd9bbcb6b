#pragma once

#include <QDBusConnection>
#include <QObject>
#include <QRect>

#include <memory>

class QMenu;
class QSystemTrayIcon;
class WTDBusMenu;
class WTRecentTasks;
class WTObjectContext;
class WTStatusBarPopup;
class WTStatusNotifierItem;
class WTStopwatchUpdater;

// Tessal in the desktop's tray: the "StopWatch" icon (its running variant while a timer runs), the running
// time beside it and in its tooltip after every tick, and on a click the popup of the five most relevant
// tasks with their timer buttons. The icon's menu has "Show Tessal", "Recent Tasks" and "Quit".
//
// Where the desktop has a StatusNotifierItem watcher (KDE; GNOME with the AppIndicator extension; the
// Ayatana indicators of Ubuntu, Xfce and MATE) the item is our own WTStatusNotifierItem, which carries the
// running time as its label; QSystemTrayIcon cannot. Elsewhere it is a QSystemTrayIcon in an XEmbed tray,
// the running time in its tooltip only. Never both: the QSystemTrayIcon would speak StatusNotifierItem
// itself where a watcher is. Where there is no tray yet, the icon appears with the first tick after a
// host does (extensions load late at login): the ticker's own wake-up asks, so there is no timer of its
// own.
class WTStatusBarController : public QObject {
  Q_OBJECT
 public:
  // Neither is owned; both must outlive the controller. `bus` is where the StatusNotifierItem goes.
  WTStatusBarController(WTObjectContext* context, WTStopwatchUpdater* updater,
                        const QDBusConnection& bus = QDBusConnection::sessionBus(),
                        QObject* parent = nullptr);
  ~WTStatusBarController() override;

  // Puts the icon into the tray when the desktop has one, now or later.
  void activateStatusMenu();
  // Whether the icon is in a tray; trayAvailabilityChanged tells when that changes.
  bool isShowingIcon() const;

  // Opens the popup beside `anchor` (global coordinates), or beside the icon for an empty rectangle. A
  // click while it is open does nothing.
  void statusBarClicked(const QRect& anchor = QRect());

  WTStatusBarPopup* popup() const { return popup_; }
  // The XEmbed icon, shown only where no StatusNotifierItem watcher took the item.
  QSystemTrayIcon* statusItem() const { return statusItem_; }
  WTStatusNotifierItem* notifierItem() const { return notifierItem_; }
  WTRecentTasks* recentTasks() const { return recentTasks_.get(); }

 signals:
  void showMainWindowRequested();
  void quitRequested();
  // The icon went into a tray (true), or the tray went away (false).
  void trayAvailabilityChanged(bool available);

 private:
  void stopwatchDidUpdate();
  void showRunningTime();
  void checkTray();

  WTStopwatchUpdater* updater_;
  std::unique_ptr<WTRecentTasks> recentTasks_;
  WTStatusBarPopup* popup_ = nullptr;  // a window of its own, owned here
  QSystemTrayIcon* statusItem_ = nullptr;
  WTStatusNotifierItem* notifierItem_ = nullptr;
  std::unique_ptr<QMenu> menu_;
  std::unique_ptr<WTDBusMenu> dbusMenu_;  // menu_ for StatusNotifierItem hosts
  bool activated_ = false;
  bool showingIcon_ = false;
};
