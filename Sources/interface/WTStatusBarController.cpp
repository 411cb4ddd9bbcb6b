#include "WTStatusBarController.h"

#include "WTDBusMenu.h"
#include "WTImages.h"
#include "WTRecentTasks.h"
#include "WTStatusBarPopup.h"
#include "WTStatusNotifierItem.h"
#include "WTStopwatchUpdater.h"

#include <QCursor>
#include <QImage>
#include <QMenu>
#include <QSystemTrayIcon>
#include <QtEndian>

namespace {

// The icon in the desktop's theme (the package installs both) and the same drawing in our resources.
struct TrayIcon {
  QString themeName;
  QString imageName;
};
const TrayIcon kIdleIcon{QStringLiteral("tessal-stopwatch"), QStringLiteral("StopWatch")};
const TrayIcon kRunningIcon{QStringLiteral("tessal-stopwatch-running"), QStringLiteral("StopWatchRunning")};

// The sizes trays draw at, from a small panel to a large one; the host picks the nearest.
constexpr int kIconSizes[] = {16, 22, 24, 32, 48};

// Our drawing of an icon as StatusNotifierItem hosts take it.
WTStatusNotifierIconList notifierImages(const QString& imageName) {
  WTStatusNotifierIconList icons;
  for (int size : kIconSizes) {
    const QImage image =
        WTImages::pixmap(imageName, QSize(size, size)).toImage().convertToFormat(QImage::Format_ARGB32);
    if (image.isNull()) continue;
    WTStatusNotifierIcon icon{image.width(), image.height(), QByteArray()};
    icon.pixels.resize(qsizetype(image.width()) * image.height() * 4);
    auto* out = reinterpret_cast<quint32*>(icon.pixels.data());
    for (int y = 0; y < image.height(); ++y) {
      const auto* line = reinterpret_cast<const quint32*>(image.constScanLine(y));
      for (int x = 0; x < image.width(); ++x) *out++ = qToBigEndian(line[x]);
    }
    icons.append(icon);
  }
  return icons;
}

// Draws the item's icon only when it changes: a tick must not redraw five images.
void showNotifierIcon(WTStatusNotifierItem* item, const TrayIcon& icon) {
  if (item->iconName() == icon.themeName && !item->iconPixmap().isEmpty()) return;
  item->setIcon(icon.themeName, notifierImages(icon.imageName));
}

}  // namespace

WTStatusBarController::WTStatusBarController(WTObjectContext* context, WTStopwatchUpdater* updater,
                                             const QDBusConnection& bus, QObject* parent)
    : QObject(parent), updater_(updater), recentTasks_(std::make_unique<WTRecentTasks>(context)) {
  popup_ = new WTStatusBarPopup(recentTasks_.get());
  connect(popup_, &WTStatusBarPopup::showMainWindowRequested, this,
          &WTStatusBarController::showMainWindowRequested);

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

  dbusMenu_ = std::make_unique<WTDBusMenu>(menu_.get());
  notifierItem_ = new WTStatusNotifierItem(bus, dbusMenu_.get(), this);
  showNotifierIcon(notifierItem_, kIdleIcon);
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
  // The item leaves the bus before the menu it serves goes.
  delete notifierItem_;
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
  showNotifierIcon(notifierItem_, icon);
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
  statusItem_->setToolTip(total.isEmpty() ? QStringLiteral("Tessal")
                                          : QStringLiteral("Tessal — %1").arg(total));
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
