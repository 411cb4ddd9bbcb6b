#include "WTStatusBarController.h"

#include "RZLimitedArrayController.h"
#include "WTImages.h"
#include "WTStatusBarPopup.h"
#include "WTStatusNotifierItem.h"
#include "WTStopwatchUpdater.h"

#include <QCursor>
#include <QMenu>
#include <QSystemTrayIcon>

namespace {

// The icon in the desktop's theme (the package installs both) and the same drawing in our resources.
struct TrayIcon {
  QString themeName;
  QString imageName;
};
const TrayIcon kIdleIcon{QStringLiteral("tessal-stopwatch"), QStringLiteral("StopWatch")};
const TrayIcon kRunningIcon{QStringLiteral("tessal-stopwatch-running"), QStringLiteral("StopWatchRunning")};

}  // namespace

WTStatusBarController::WTStatusBarController(WTObjectContext* context, WTStopwatchUpdater* updater,
                                             const QDBusConnection& bus, QObject* parent)
    : QObject(parent), updater_(updater), topTasks_(std::make_unique<RZLimitedArrayController>(context)) {
  popup_ = new WTStatusBarPopup(topTasks_.get());
  connect(popup_, &WTStatusBarPopup::showMainWindowRequested, this, &WTStatusBarController::showMainWindowRequested);

  menu_ = std::make_unique<QMenu>();
  menu_->addAction(tr("Show Tessal"), this, &WTStatusBarController::showMainWindowRequested);
  // Hosts that open the menu on any click (the Ayatana indicators) never send a click of the item itself.
  menu_->addAction(tr("Recent Tasks"), this, [this] { statusBarClicked(); });
  menu_->addSeparator();
  menu_->addAction(tr("Quit"), this, &WTStatusBarController::quitRequested);

  statusItem_ = new QSystemTrayIcon(WTImages::icon(kIdleIcon.imageName), this);
  statusItem_->setToolTip(QStringLiteral("Tessal"));
  statusItem_->setContextMenu(menu_.get());
  connect(statusItem_, &QSystemTrayIcon::activated, this, [this](QSystemTrayIcon::ActivationReason reason) {
    if (reason == QSystemTrayIcon::Trigger || reason == QSystemTrayIcon::DoubleClick) statusBarClicked();
  });

  notifierItem_ = new WTStatusNotifierItem(bus, menu_.get(), this);
  notifierItem_->setIcon(kIdleIcon.themeName, kIdleIcon.imageName);
  notifierItem_->setToolTip(QStringLiteral("Tessal"), QString());
  connect(notifierItem_, &WTStatusNotifierItem::registeredChanged, this, &WTStatusBarController::checkTray);
  connect(notifierItem_, &WTStatusNotifierItem::activated, this, [this](const QPoint& position) {
    statusBarClicked(position.isNull() ? QRect() : QRect(position, QSize(1, 1)));
  });
  connect(notifierItem_, &WTStatusNotifierItem::secondaryActivated, this,
          &WTStatusBarController::showMainWindowRequested);
  connect(notifierItem_, &WTStatusNotifierItem::contextMenuRequested, this,
          [this](const QPoint& position) { menu_->popup(position.isNull() ? QCursor::pos() : position); });
  if (!updater_) return;
  connect(updater_, &WTStopwatchUpdater::stopwatchDidUpdate, this,
          &WTStatusBarController::stopwatchDidUpdate);
  // The ticker may have ticked already: the icon shows what runs from the start, not from the next tick.
  showRunningTime();
}

WTStatusBarController::~WTStatusBarController() {
  delete popup_;
}

void WTStatusBarController::activateStatusMenu() {
  activated_ = true;
  notifierItem_->start();
  checkTray();
}

bool WTStatusBarController::isShowingIcon() const {
  return showingIcon_;
}

void WTStatusBarController::checkTray() {
  if (!activated_) return;
  // While the watcher has not answered yet, no XEmbed icon: it would be a second one a moment later.
  const bool xembed = !notifierItem_->isRegistered() && !notifierItem_->isPending() &&
                      QSystemTrayIcon::isSystemTrayAvailable();
  statusItem_->setVisible(xembed);
  const bool available = notifierItem_->isRegistered() || xembed;
  if (available == showingIcon_) return;
  showingIcon_ = available;
  emit trayAvailabilityChanged(available);
}

void WTStatusBarController::stopwatchDidUpdate() {
  checkTray();
  showRunningTime();
}

void WTStatusBarController::showRunningTime() {
  const QString total = updater_->badgeLabel();
  const TrayIcon& icon = updater_->times().isEmpty() ? kIdleIcon : kRunningIcon;
  notifierItem_->setIcon(icon.themeName, icon.imageName);
  const QIcon image = WTImages::icon(icon.imageName);
  if (statusItem_->icon().cacheKey() != image.cacheKey()) statusItem_->setIcon(image);
  // Beside the icon where the host shows a label; the guide (every digit a zero) keeps the width steady
  // while the minutes change.
  QString guide = total;
  for (QChar& c : guide)
    if (c.isDigit()) c = u'0';
  notifierItem_->setLabel(total, guide);
  notifierItem_->setToolTip(QStringLiteral("Tessal"), total);
  // XEmbed trays show no text beside an icon: there the running time is in the tooltip only.
  statusItem_->setToolTip(total.isEmpty() ? QStringLiteral("Tessal") : QStringLiteral("Tessal — %1").arg(total));
  popup_->updateElapsedTimes();
}

void WTStatusBarController::statusBarClicked(const QRect& anchor) {
  if (popup_->isVisible()) return;
  QRect place = anchor;
  if (place.isEmpty()) place = statusItem_->geometry();
  // Some hosts (StatusNotifierItem ones) tell nobody where the icon is: the pointer is where it was clicked.
  if (place.isEmpty()) place = QRect(QCursor::pos(), QSize(1, 1));
  popup_->popUp(place);
}
