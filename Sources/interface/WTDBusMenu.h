#pragma once

#include <QDBusArgument>
#include <QDBusVariant>
#include <QList>
#include <QObject>
#include <QPointer>
#include <QStringList>
#include <QVariantMap>

class QAction;
class QMenu;

// One menu entry as com.canonical.dbusmenu lays it out: (ia{sv}av), the children wrapped in variants.
struct WTDBusMenuLayout {
  int id = 0;
  QVariantMap properties;
  QList<WTDBusMenuLayout> children;
};

// An entry's id and properties, (ia{sv}).
struct WTDBusMenuItem {
  int id = 0;
  QVariantMap properties;
};

// An entry's id and the names of properties it no longer has, (ias).
struct WTDBusMenuItemKeys {
  int id = 0;
  QStringList keys;
};

// A click or hover on an entry, as hosts send them in groups: (isvu).
struct WTDBusMenuEvent {
  int id = 0;
  QString eventId;
  QDBusVariant data;
  uint timestamp = 0;
};

QDBusArgument& operator<<(QDBusArgument& argument, const WTDBusMenuLayout& layout);
const QDBusArgument& operator>>(const QDBusArgument& argument, WTDBusMenuLayout& layout);
QDBusArgument& operator<<(QDBusArgument& argument, const WTDBusMenuItem& item);
const QDBusArgument& operator>>(const QDBusArgument& argument, WTDBusMenuItem& item);
QDBusArgument& operator<<(QDBusArgument& argument, const WTDBusMenuItemKeys& keys);
const QDBusArgument& operator>>(const QDBusArgument& argument, WTDBusMenuItemKeys& keys);
QDBusArgument& operator<<(QDBusArgument& argument, const WTDBusMenuEvent& event);
const QDBusArgument& operator>>(const QDBusArgument& argument, WTDBusMenuEvent& event);

Q_DECLARE_METATYPE(WTDBusMenuLayout)
Q_DECLARE_METATYPE(WTDBusMenuItem)
Q_DECLARE_METATYPE(WTDBusMenuItemKeys)
Q_DECLARE_METATYPE(WTDBusMenuEvent)

// The tray icon's menu for hosts that draw a StatusNotifierItem's menu themselves (KDE, GNOME's
// AppIndicator extension, the Ayatana indicators): a QMenu's actions served as com.canonical.dbusmenu.
// One flat level, since the tray menu has no submenus; entry n is the menu's n-th action, and a click on
// it triggers the action. The tray menu is made once, so the layout has one revision and is never updated.
// The object is registered as it is, so its slots, signals and properties are the interface's own names.
class WTDBusMenu : public QObject {
  Q_OBJECT
  Q_CLASSINFO("D-Bus Interface", "com.canonical.dbusmenu")
  Q_PROPERTY(uint Version READ version)
  Q_PROPERTY(QString TextDirection READ textDirection)
  Q_PROPERTY(QString Status READ status)
  Q_PROPERTY(QStringList IconThemePath READ iconThemePath)
 public:
  // `menu` is not owned.
  explicit WTDBusMenu(QMenu* menu, QObject* parent = nullptr);

  static void registerTypes();

  uint version() const { return 3; }
  QString textDirection() const;
  QString status() const { return QStringLiteral("normal"); }
  QStringList iconThemePath() const { return {}; }

 public slots:
  uint GetLayout(int parentId, int recursionDepth, const QStringList& propertyNames,
                 WTDBusMenuLayout& layout);
  QList<WTDBusMenuItem> GetGroupProperties(const QList<int>& ids, const QStringList& propertyNames);
  QDBusVariant GetProperty(int id, const QString& name);
  void Event(int id, const QString& eventId, const QDBusVariant& data, uint timestamp);
  QList<int> EventGroup(const QList<WTDBusMenuEvent>& events);
  bool AboutToShow(int id);
  QList<int> AboutToShowGroup(const QList<int>& ids, QList<int>& idErrors);

 signals:
  void ItemsPropertiesUpdated(const QList<WTDBusMenuItem>& updated, const QList<WTDBusMenuItemKeys>& removed);
  void LayoutUpdated(uint revision, int parent);
  void ItemActivationRequested(int id, uint timestamp);

 private:
  // The action behind an entry id; null for the root (0) and unknown ids.
  QAction* action(int id) const;
  QVariantMap properties(int id, const QStringList& names) const;
  // Whether a click on `id` was handled.
  bool handle(int id, const QString& eventId);

  QPointer<QMenu> menu_;
};
