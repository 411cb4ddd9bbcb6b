#include "WTLauncherEntry.h"

#include <QDBusMessage>
#include <QVariantMap>

WTLauncherEntry::WTLauncherEntry(const QDBusConnection& bus, const QString& appUri)
    : bus_(bus), appUri_(appUri) {}

bool WTLauncherEntry::update(qint64 runningTimers) {
  if (!bus_.isConnected()) return false;
  QDBusMessage signal = QDBusMessage::createSignal(
      objectPath(), QStringLiteral("com.canonical.Unity.LauncherEntry"), QStringLiteral("Update"));
  const QVariantMap properties{
      {QStringLiteral("count"), QVariant::fromValue<qint64>(runningTimers)},
      {QStringLiteral("count-visible"), runningTimers > 0},
      {QStringLiteral("progress"), 0.0},
      {QStringLiteral("progress-visible"), false},
  };
  signal << appUri_ << properties;
  return bus_.send(signal);
}
