#include "WTStatusNotifierItem.h"

#include <QCoreApplication>
#include <QDBusAbstractAdaptor>
#include <QDBusMetaType>
#include <QDBusObjectPath>
#include <QDBusPendingCallWatcher>
#include <QDBusPendingReply>
#include <QDBusServiceWatcher>

#include <atomic>

QDBusArgument& operator<<(QDBusArgument& argument, const WTStatusNotifierIcon& icon) {
  argument.beginStructure();
  argument << icon.width << icon.height << icon.pixels;
  argument.endStructure();
  return argument;
}

const QDBusArgument& operator>>(const QDBusArgument& argument, WTStatusNotifierIcon& icon) {
  argument.beginStructure();
  argument >> icon.width >> icon.height >> icon.pixels;
  argument.endStructure();
  return argument;
}

QDBusArgument& operator<<(QDBusArgument& argument, const WTStatusNotifierToolTip& toolTip) {
  argument.beginStructure();
  argument << toolTip.iconName << toolTip.icons << toolTip.title << toolTip.text;
  argument.endStructure();
  return argument;
}

const QDBusArgument& operator>>(const QDBusArgument& argument, WTStatusNotifierToolTip& toolTip) {
  argument.beginStructure();
  argument >> toolTip.iconName >> toolTip.icons >> toolTip.title >> toolTip.text;
  argument.endStructure();
  return argument;
}

// The org.kde.StatusNotifierItem interface over the item, with the Ayatana label extension.
class WTStatusNotifierItemAdaptor : public QDBusAbstractAdaptor {
  Q_OBJECT
  Q_CLASSINFO("D-Bus Interface", "org.kde.StatusNotifierItem")
  Q_PROPERTY(QString Category READ category)
  Q_PROPERTY(QString Id READ id)
  Q_PROPERTY(QString Title READ title)
  Q_PROPERTY(QString Status READ status)
  Q_PROPERTY(int WindowId READ windowId)
  Q_PROPERTY(QString IconThemePath READ empty)
  Q_PROPERTY(QString IconName READ iconName)
  Q_PROPERTY(QList<WTStatusNotifierIcon> IconPixmap READ iconPixmap)
  Q_PROPERTY(QString OverlayIconName READ empty)
  Q_PROPERTY(QList<WTStatusNotifierIcon> OverlayIconPixmap READ noIcon)
  Q_PROPERTY(QString AttentionIconName READ empty)
  Q_PROPERTY(QList<WTStatusNotifierIcon> AttentionIconPixmap READ noIcon)
  Q_PROPERTY(QString AttentionMovieName READ empty)
  Q_PROPERTY(WTStatusNotifierToolTip ToolTip READ toolTip)
  Q_PROPERTY(bool ItemIsMenu READ itemIsMenu)
  Q_PROPERTY(QDBusObjectPath Menu READ menu)
  Q_PROPERTY(QString XAyatanaLabel READ label)
  Q_PROPERTY(QString XAyatanaLabelGuide READ labelGuide)
  Q_PROPERTY(uint XAyatanaOrderingIndex READ orderingIndex)
 public:
  explicit WTStatusNotifierItemAdaptor(WTStatusNotifierItem* item)
      : QDBusAbstractAdaptor(item), item_(item) {}

  QString category() const { return QStringLiteral("ApplicationStatus"); }
  QString id() const { return QStringLiteral("tessal"); }
  QString title() const { return item_->title(); }
  QString status() const { return QStringLiteral("Active"); }
  int windowId() const { return 0; }
  QString empty() const { return {}; }
  QString iconName() const { return item_->iconName(); }
  QList<WTStatusNotifierIcon> iconPixmap() const { return item_->iconPixmap(); }
  QList<WTStatusNotifierIcon> noIcon() const { return {}; }
  WTStatusNotifierToolTip toolTip() const { return item_->toolTip(); }
  // A click is ours (the task list); the menu is for the other button.
  bool itemIsMenu() const { return false; }
  QDBusObjectPath menu() const { return QDBusObjectPath(WTStatusNotifierItem::menuPath()); }
  QString label() const { return item_->label(); }
  QString labelGuide() const { return item_->labelGuide(); }
  uint orderingIndex() const { return 0; }

 public slots:
  // Hosts wait for the reply to a click: it goes back first, and the window opens after.
  void Activate(int x, int y) { later(&WTStatusNotifierItem::activated, x, y); }
  void SecondaryActivate(int x, int y) { later(&WTStatusNotifierItem::secondaryActivated, x, y); }
  void ContextMenu(int x, int y) { later(&WTStatusNotifierItem::contextMenuRequested, x, y); }
  void Scroll(int delta, const QString& orientation) {
    Q_UNUSED(delta);
    Q_UNUSED(orientation);
  }

 signals:
  void NewTitle();
  void NewIcon();
  void NewAttentionIcon();
  void NewOverlayIcon();
  void NewToolTip();
  void NewStatus(const QString& status);
  void XAyatanaNewLabel(const QString& label, const QString& guide);

 private:
  void later(void (WTStatusNotifierItem::*signal)(const QPoint&), int x, int y) {
    QMetaObject::invokeMethod(
        item_, [item = item_, signal, x, y] { emit(item->*signal)(QPoint(x, y)); }, Qt::QueuedConnection);
  }

  WTStatusNotifierItem* item_;
};

WTStatusNotifierItem::WTStatusNotifierItem(const QDBusConnection& bus, QObject* menu, QObject* parent)
    : QObject(parent), bus_(bus), menu_(menu) {
  qDBusRegisterMetaType<WTStatusNotifierIcon>();
  qDBusRegisterMetaType<WTStatusNotifierIconList>();
  qDBusRegisterMetaType<WTStatusNotifierToolTip>();
  adaptor_ = new WTStatusNotifierItemAdaptor(this);
}

WTStatusNotifierItem::~WTStatusNotifierItem() {
  if (!started_ || !bus_.isConnected()) return;
  bus_.unregisterObject(objectPath());
  bus_.unregisterObject(menuPath());
  if (nameOwned_) {
    // Sent, not awaited: quitting never waits on the bus. The watcher drops the item with the name.
    QDBusMessage release = QDBusMessage::createMethodCall(
        QStringLiteral("org.freedesktop.DBus"), QStringLiteral("/org/freedesktop/DBus"),
        QStringLiteral("org.freedesktop.DBus"), QStringLiteral("ReleaseName"));
    release << serviceName_;
    bus_.send(release);
  }
}

bool WTStatusNotifierItem::start() {
  if (started_) return true;
  if (!bus_.isConnected()) return false;
  if (!bus_.registerObject(objectPath(), this, QDBusConnection::ExportAdaptors) ||
      !bus_.registerObject(menuPath(), menu_, QDBusConnection::ExportAllContents)) {
    bus_.unregisterObject(objectPath());
    return false;
  }
  started_ = true;
  // The name the protocol asks for; the number tells apart the items of one process (tests make several).
  static std::atomic<int> items{0};
  serviceName_ =
      QStringLiteral("org.kde.StatusNotifierItem-%1-%2").arg(QCoreApplication::applicationPid()).arg(++items);
  watcher_ = new QDBusServiceWatcher(watcherService(), bus_, QDBusServiceWatcher::WatchForOwnerChange, this);
  // A desktop's tray may start after us, or restart (GNOME reloads its extensions).
  connect(watcher_, &QDBusServiceWatcher::serviceRegistered, this,
          &WTStatusNotifierItem::registerWithWatcher);
  connect(watcher_, &QDBusServiceWatcher::serviceUnregistered, this, [this] { setRegistered(false); });
  requestName();
  return true;
}

void WTStatusNotifierItem::requestName() {
  pending_ = true;
  QDBusMessage request = QDBusMessage::createMethodCall(
      QStringLiteral("org.freedesktop.DBus"), QStringLiteral("/org/freedesktop/DBus"),
      QStringLiteral("org.freedesktop.DBus"), QStringLiteral("RequestName"));
  constexpr uint kDoNotQueue = 4;
  request << serviceName_ << kDoNotQueue;
  auto* call = new QDBusPendingCallWatcher(bus_.asyncCall(request), this);
  connect(call, &QDBusPendingCallWatcher::finished, this, [this](QDBusPendingCallWatcher* call) {
    call->deleteLater();
    constexpr uint kPrimaryOwner = 1;
    const QDBusPendingReply<uint> reply = *call;
    nameOwned_ = !reply.isError() && reply.value() == kPrimaryOwner;
    if (nameOwned_) {
      registerWithWatcher();
    } else {
      pending_ = false;
      setRegistered(false);
    }
  });
}

void WTStatusNotifierItem::registerWithWatcher() {
  if (!nameOwned_) return;
  pending_ = true;
  QDBusMessage request =
      QDBusMessage::createMethodCall(watcherService(), QStringLiteral("/StatusNotifierWatcher"),
                                     watcherService(), QStringLiteral("RegisterStatusNotifierItem"));
  request << serviceName_;
  // A watcher that is not there must not be started by the bus: the answer is "no tray".
  request.setAutoStartService(false);
  auto* call = new QDBusPendingCallWatcher(bus_.asyncCall(request), this);
  connect(call, &QDBusPendingCallWatcher::finished, this, [this](QDBusPendingCallWatcher* call) {
    call->deleteLater();
    pending_ = false;
    setRegistered(!call->isError());
  });
}

void WTStatusNotifierItem::setRegistered(bool registered) {
  registered_ = registered;
  emit registeredChanged(registered);
}

WTStatusNotifierToolTip WTStatusNotifierItem::toolTip() const {
  return WTStatusNotifierToolTip{iconName_, {}, toolTipTitle_, toolTipText_};
}

void WTStatusNotifierItem::setIcon(const QString& themeName, const WTStatusNotifierIconList& images) {
  iconName_ = themeName;
  iconPixmap_ = images;
  emit adaptor_->NewIcon();
}

void WTStatusNotifierItem::setLabel(const QString& label, const QString& guide) {
  if (label == label_ && guide == labelGuide_) return;
  label_ = label;
  labelGuide_ = guide;
  emit adaptor_->XAyatanaNewLabel(label_, labelGuide_);
}

void WTStatusNotifierItem::setToolTip(const QString& title, const QString& text) {
  if (title == toolTipTitle_ && text == toolTipText_) return;
  toolTipTitle_ = title;
  toolTipText_ = text;
  emit adaptor_->NewToolTip();
}

#include "WTStatusNotifierItem.moc"
