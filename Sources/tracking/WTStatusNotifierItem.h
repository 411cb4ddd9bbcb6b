#pragma once

#include <QByteArray>
#include <QDBusArgument>
#include <QDBusConnection>
#include <QList>
#include <QMetaType>
#include <QObject>
#include <QPoint>
#include <QString>

class QDBusServiceWatcher;
class WTStatusNotifierItemAdaptor;

// An image as StatusNotifierItem hosts take it: (iiay), ARGB32 pixels in network byte order.
struct WTStatusNotifierIcon {
  int width = 0;
  int height = 0;
  QByteArray pixels;
};
using WTStatusNotifierIconList = QList<WTStatusNotifierIcon>;

// A tooltip: (sa(iiay)ss), icon name, icon images, title and text.
struct WTStatusNotifierToolTip {
  QString iconName;
  WTStatusNotifierIconList icons;
  QString title;
  QString text;
};

QDBusArgument& operator<<(QDBusArgument& argument, const WTStatusNotifierIcon& icon);
const QDBusArgument& operator>>(const QDBusArgument& argument, WTStatusNotifierIcon& icon);
QDBusArgument& operator<<(QDBusArgument& argument, const WTStatusNotifierToolTip& toolTip);
const QDBusArgument& operator>>(const QDBusArgument& argument, WTStatusNotifierToolTip& toolTip);

Q_DECLARE_METATYPE(WTStatusNotifierIcon)
Q_DECLARE_METATYPE(WTStatusNotifierToolTip)

// Tessal's item in a StatusNotifierItem tray (KDE, GNOME with the AppIndicator extension, the Ayatana
// indicators of Ubuntu, Xfce and MATE), spoken over D-Bus directly rather than through QSystemTrayIcon,
// since only this way the item can carry text beside its icon: the XAyatanaLabel extension, which those
// hosts show and KDE ignores.
//
// start() exports the item under "org.kde.StatusNotifierItem-<pid>-<n>" and asks the watcher to show it;
// a watcher that comes or goes later is followed. Nothing waits: registeredChanged tells the outcome.
// A click (Activate) is `activated`. The item speaks D-Bus only: its menu and its images are given to it
// (the interface serves the tray's QMenu as com.canonical.dbusmenu and draws the icons).
class WTStatusNotifierItem : public QObject {
  Q_OBJECT
 public:
  // `menu` (not owned) is exported at menuPath() with its own contents: the object that
  // answers com.canonical.dbusmenu. It must outlive the item.
  WTStatusNotifierItem(const QDBusConnection& bus, QObject* menu, QObject* parent = nullptr);
  ~WTStatusNotifierItem() override;

  static QString objectPath() { return QStringLiteral("/StatusNotifierItem"); }
  static QString menuPath() { return QStringLiteral("/MenuBar"); }
  static QString watcherService() { return QStringLiteral("org.kde.StatusNotifierWatcher"); }

  // Goes on the bus and registers with the watcher if there is one. False without a bus.
  bool start();
  // Whether a watcher has the item (and so a host shows it).
  bool isRegistered() const { return registered_; }
  // Whether the answer to a registration is still to come.
  bool isPending() const { return pending_; }
  QString serviceName() const { return serviceName_; }

  // The icon: a name in the desktop's icon theme, and our own drawing of it in the sizes trays draw at
  // for when the theme lacks it.
  void setIcon(const QString& themeName, const WTStatusNotifierIconList& images);
  // The text beside the icon, and the widest text it will carry, so that the host keeps its width.
  void setLabel(const QString& label, const QString& guide);
  void setToolTip(const QString& title, const QString& text);

  QString iconName() const { return iconName_; }
  WTStatusNotifierIconList iconPixmap() const { return iconPixmap_; }
  QString label() const { return label_; }
  QString labelGuide() const { return labelGuide_; }
  WTStatusNotifierToolTip toolTip() const;
  QString title() const { return QStringLiteral("Tessal"); }

 signals:
  // The watcher answered (true: it took the item), or came back, or went away (false).
  void registeredChanged(bool registered);
  // A click on the item, at the given global position (zero when the host does not tell).
  void activated(const QPoint& position);
  // A middle click.
  void secondaryActivated(const QPoint& position);
  // A host that draws no menu of its own asks for one.
  void contextMenuRequested(const QPoint& position);

 private:
  void requestName();
  void registerWithWatcher();
  void setRegistered(bool registered);

  QDBusConnection bus_;
  WTStatusNotifierItemAdaptor* adaptor_ = nullptr;
  QObject* menu_;
  QDBusServiceWatcher* watcher_ = nullptr;
  QString serviceName_;
  bool started_ = false;
  bool nameOwned_ = false;
  bool registered_ = false;
  bool pending_ = false;
  QString iconName_;
  WTStatusNotifierIconList iconPixmap_;
  QString label_;
  QString labelGuide_;
  QString toolTipTitle_;
  QString toolTipText_;
};
