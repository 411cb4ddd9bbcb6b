#include "WTStatusBarController.h"

#include "RZLimitedArrayController.h"
#include "WTImages.h"
#include "WTStatusBarPopup.h"
#include "WTStopwatchUpdater.h"

#include <QCursor>
#include <QMenu>
#include <QSystemTrayIcon>

WTStatusBarController::WTStatusBarController(WTObjectContext* context, WTStopwatchUpdater* updater,
                                             QObject* parent)
    : QObject(parent), updater_(updater), topTasks_(std::make_unique<RZLimitedArrayController>(context)) {
  popup_ = new WTStatusBarPopup(topTasks_.get());
  connect(popup_, &WTStatusBarPopup::showMainWindowRequested, this, &WTStatusBarController::showMainWindowRequested);

  statusItem_ = new QSystemTrayIcon(WTImages::icon(QStringLiteral("StopWatch")), this);
  statusItem_->setToolTip(QStringLiteral("Tessal"));
  menu_ = std::make_unique<QMenu>();
  menu_->addAction(tr("Show Tessal"), this, &WTStatusBarController::showMainWindowRequested);
  menu_->addSeparator();
  menu_->addAction(tr("Quit"), this, &WTStatusBarController::quitRequested);
  statusItem_->setContextMenu(menu_.get());
  connect(statusItem_, &QSystemTrayIcon::activated, this, [this](QSystemTrayIcon::ActivationReason reason) {
    if (reason == QSystemTrayIcon::Trigger || reason == QSystemTrayIcon::DoubleClick) statusBarClicked();
  });
  if (updater_) connect(updater_, &WTStopwatchUpdater::stopwatchDidUpdate, this, &WTStatusBarController::stopwatchDidUpdate);
}

WTStatusBarController::~WTStatusBarController() {
  delete popup_;
}

void WTStatusBarController::activateStatusMenu() {
  activated_ = true;
  checkTray();
}

bool WTStatusBarController::isShowingIcon() const {
  return showingIcon_;
}

void WTStatusBarController::checkTray() {
  if (!activated_) return;
  const bool available = QSystemTrayIcon::isSystemTrayAvailable();
  if (available == showingIcon_) return;
  showingIcon_ = available;
  statusItem_->setVisible(available);
  emit trayAvailabilityChanged(available);
}

void WTStatusBarController::stopwatchDidUpdate() {
  checkTray();
  // Trays show no text beside an icon (only KDE's shows a title, and only in its own lists): the running
  // time goes where every host shows it, the tooltip.
  const QString total = updater_->badgeLabel();
  statusItem_->setToolTip(total.isEmpty() ? QStringLiteral("Tessal") : QStringLiteral("Tessal — %1").arg(total));
}

void WTStatusBarController::statusBarClicked(const QRect& anchor) {
  if (popup_->isVisible()) return;
  QRect place = anchor;
  if (place.isEmpty()) place = statusItem_->geometry();
  // Some hosts (StatusNotifierItem ones) tell nobody where the icon is: the pointer is where it was clicked.
  if (place.isEmpty()) place = QRect(QCursor::pos(), QSize(1, 1));
  popup_->popUp(place);
}
