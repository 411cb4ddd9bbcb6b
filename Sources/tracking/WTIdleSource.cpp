#include "WTIdleSource.h"

#include <QDBusMessage>
#include <QDBusReply>

WTDBusIdleSource::WTDBusIdleSource(const QDBusConnection& bus, int timeoutMs)
    : bus_(bus), timeoutMs_(timeoutMs) {}

qint64 WTDBusIdleSource::idleSeconds() {
  lastSource_.clear();
  if (!bus_.isConnected()) return -1;
  qint64 seconds = mutterIdleSeconds();
  if (seconds >= 0) {
    lastSource_ = QStringLiteral("org.gnome.Mutter.IdleMonitor");
    return seconds;
  }
  seconds = screenSaverIdleSeconds();
  if (seconds >= 0) {
    lastSource_ = QStringLiteral("org.freedesktop.ScreenSaver");
    return seconds;
  }
  return -1;
}

qint64 WTDBusIdleSource::mutterIdleSeconds() {
  const QDBusMessage call = QDBusMessage::createMethodCall(
      QStringLiteral("org.gnome.Mutter.IdleMonitor"), QStringLiteral("/org/gnome/Mutter/IdleMonitor/Core"),
      QStringLiteral("org.gnome.Mutter.IdleMonitor"), QStringLiteral("GetIdletime"));
  const QDBusReply<qulonglong> reply = bus_.call(call, QDBus::Block, timeoutMs_);
  if (!reply.isValid()) return -1;
  // Milliseconds, unsigned; a value beyond any real uptime is as good as no answer.
  const qulonglong ms = reply.value();
  if (ms > qulonglong(std::numeric_limits<qint64>::max())) return -1;
  return qint64(ms / 1000);
}

qint64 WTDBusIdleSource::screenSaverIdleSeconds() {
  const QDBusMessage call = QDBusMessage::createMethodCall(
      QStringLiteral("org.freedesktop.ScreenSaver"), QStringLiteral("/org/freedesktop/ScreenSaver"),
      QStringLiteral("org.freedesktop.ScreenSaver"), QStringLiteral("GetSessionIdleTime"));
  const QDBusReply<uint> reply = bus_.call(call, QDBus::Block, timeoutMs_);
  if (!reply.isValid()) return -1;
  return qint64(reply.value());
}
