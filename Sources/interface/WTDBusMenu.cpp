#include "WTDBusMenu.h"

#include <QAction>
#include <QDBusMetaType>
#include <QGuiApplication>
#include <QMenu>

namespace {

constexpr uint kRevision = 1;

// Menus mark the mnemonic with "_" and double it for a plain one; Qt uses "&".
QString menuLabel(const QString& text) {
  QString label;
  label.reserve(text.size());
  for (qsizetype i = 0; i < text.size(); ++i) {
    const QChar c = text.at(i);
    if (c == u'_') {
      label += QStringLiteral("__");
    } else if (c == u'&') {
      if (i + 1 < text.size() && text.at(i + 1) == u'&') {
        label += u'&';
        ++i;
      } else {
        label += u'_';
      }
    } else {
      label += c;
    }
  }
  return label;
}

}  // namespace

QDBusArgument& operator<<(QDBusArgument& argument, const WTDBusMenuLayout& layout) {
  argument.beginStructure();
  argument << layout.id << layout.properties;
  argument.beginArray(qMetaTypeId<QDBusVariant>());
  for (const WTDBusMenuLayout& child : layout.children) argument << QDBusVariant(QVariant::fromValue(child));
  argument.endArray();
  argument.endStructure();
  return argument;
}

const QDBusArgument& operator>>(const QDBusArgument& argument, WTDBusMenuLayout& layout) {
  argument.beginStructure();
  argument >> layout.id >> layout.properties;
  layout.children.clear();
  argument.beginArray();
  while (!argument.atEnd()) {
    QDBusVariant child;
    argument >> child;
    layout.children.append(qdbus_cast<WTDBusMenuLayout>(child.variant()));
  }
  argument.endArray();
  argument.endStructure();
  return argument;
}

QDBusArgument& operator<<(QDBusArgument& argument, const WTDBusMenuItem& item) {
  argument.beginStructure();
  argument << item.id << item.properties;
  argument.endStructure();
  return argument;
}

const QDBusArgument& operator>>(const QDBusArgument& argument, WTDBusMenuItem& item) {
  argument.beginStructure();
  argument >> item.id >> item.properties;
  argument.endStructure();
  return argument;
}

QDBusArgument& operator<<(QDBusArgument& argument, const WTDBusMenuItemKeys& keys) {
  argument.beginStructure();
  argument << keys.id << keys.keys;
  argument.endStructure();
  return argument;
}

const QDBusArgument& operator>>(const QDBusArgument& argument, WTDBusMenuItemKeys& keys) {
  argument.beginStructure();
  argument >> keys.id >> keys.keys;
  argument.endStructure();
  return argument;
}

QDBusArgument& operator<<(QDBusArgument& argument, const WTDBusMenuEvent& event) {
  argument.beginStructure();
  argument << event.id << event.eventId << event.data << event.timestamp;
  argument.endStructure();
  return argument;
}

const QDBusArgument& operator>>(const QDBusArgument& argument, WTDBusMenuEvent& event) {
  argument.beginStructure();
  argument >> event.id >> event.eventId >> event.data >> event.timestamp;
  argument.endStructure();
  return argument;
}

WTDBusMenu::WTDBusMenu(QMenu* menu, QObject* parent) : QObject(parent), menu_(menu) {
  registerTypes();
}

void WTDBusMenu::registerTypes() {
  static const bool registered = [] {
    qDBusRegisterMetaType<WTDBusMenuLayout>();
    qDBusRegisterMetaType<WTDBusMenuItem>();
    qDBusRegisterMetaType<QList<WTDBusMenuItem>>();
    qDBusRegisterMetaType<WTDBusMenuItemKeys>();
    qDBusRegisterMetaType<QList<WTDBusMenuItemKeys>>();
    qDBusRegisterMetaType<WTDBusMenuEvent>();
    qDBusRegisterMetaType<QList<WTDBusMenuEvent>>();
    return true;
  }();
  Q_UNUSED(registered);
}

QString WTDBusMenu::textDirection() const {
  return QGuiApplication::layoutDirection() == Qt::RightToLeft ? QStringLiteral("rtl")
                                                               : QStringLiteral("ltr");
}

QAction* WTDBusMenu::action(int id) const {
  if (!menu_ || id <= 0) return nullptr;
  const QList<QAction*> actions = menu_->actions();
  return id <= actions.size() ? actions.at(id - 1) : nullptr;
}

QVariantMap WTDBusMenu::properties(int id, const QStringList& names) const {
  QVariantMap result;
  if (id == 0) {
    result.insert(QStringLiteral("children-display"), QStringLiteral("submenu"));
  } else if (const QAction* entry = action(id)) {
    // Only values that differ from the protocol's defaults are sent.
    if (entry->isSeparator()) {
      result.insert(QStringLiteral("type"), QStringLiteral("separator"));
    } else {
      result.insert(QStringLiteral("label"), menuLabel(entry->text()));
      if (!entry->isEnabled()) result.insert(QStringLiteral("enabled"), false);
    }
    if (!entry->isVisible()) result.insert(QStringLiteral("visible"), false);
  }
  if (names.isEmpty()) return result;
  for (auto it = result.begin(); it != result.end();)
    it = names.contains(it.key()) ? std::next(it) : result.erase(it);
  return result;
}

uint WTDBusMenu::GetLayout(int parentId, int recursionDepth, const QStringList& propertyNames,
                           WTDBusMenuLayout& layout) {
  layout = WTDBusMenuLayout{parentId, properties(parentId, propertyNames), {}};
  if (parentId == 0 && recursionDepth != 0 && menu_) {
    for (int id = 1; id <= menu_->actions().size(); ++id)
      layout.children.append(WTDBusMenuLayout{id, properties(id, propertyNames), {}});
  }
  return kRevision;
}

QList<WTDBusMenuItem> WTDBusMenu::GetGroupProperties(const QList<int>& ids,
                                                     const QStringList& propertyNames) {
  QList<WTDBusMenuItem> result;
  for (int id : ids) {
    if (id == 0 || action(id)) result.append(WTDBusMenuItem{id, properties(id, propertyNames)});
  }
  return result;
}

QDBusVariant WTDBusMenu::GetProperty(int id, const QString& name) {
  return QDBusVariant(properties(id, {}).value(name));
}

bool WTDBusMenu::handle(int id, const QString& eventId) {
  if (id == 0) return true;  // the menu opening or closing
  QAction* entry = action(id);
  if (!entry) return false;
  // Hosts call from the bus while their own menu closes: the action runs once that call has returned.
  if (eventId == QLatin1String("clicked") && entry->isEnabled() && !entry->isSeparator())
    QMetaObject::invokeMethod(entry, &QAction::trigger, Qt::QueuedConnection);
  return true;
}

void WTDBusMenu::Event(int id, const QString& eventId, const QDBusVariant& data, uint timestamp) {
  Q_UNUSED(data);
  Q_UNUSED(timestamp);
  handle(id, eventId);
}

QList<int> WTDBusMenu::EventGroup(const QList<WTDBusMenuEvent>& events) {
  QList<int> idErrors;
  for (const WTDBusMenuEvent& event : events) {
    if (!handle(event.id, event.eventId)) idErrors.append(event.id);
  }
  return idErrors;
}

bool WTDBusMenu::AboutToShow(int id) {
  Q_UNUSED(id);
  return false;
}

QList<int> WTDBusMenu::AboutToShowGroup(const QList<int>& ids, QList<int>& idErrors) {
  idErrors.clear();
  for (int id : ids) {
    if (id != 0 && !action(id)) idErrors.append(id);
  }
  return {};
}
