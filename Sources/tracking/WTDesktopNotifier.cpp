#include "WTDesktopNotifier.h"

#include "TessalLogging.h"

#include <QDBusMessage>
#include <QDBusPendingCallWatcher>
#include <QDBusPendingReply>
#include <QStringList>
#include <QTimer>
#include <QVariantMap>

WTDesktopNotifier::WTDesktopNotifier(const QDBusConnection& bus, int timeoutMs, QObject* parent)
    : QObject(parent), bus_(bus), timeoutMs_(timeoutMs) {}

void WTDesktopNotifier::notify(const QString& summary, const QString& body) {
  if (!bus_.isConnected()) {
    // Later, like an answer from the bus: the caller never sees its notice come back inside its call.
    QTimer::singleShot(0, this, [this, summary, body] { emit notShown(summary, body); });
    return;
  }
  QDBusMessage call = QDBusMessage::createMethodCall(
      QStringLiteral("org.freedesktop.Notifications"), QStringLiteral("/org/freedesktop/Notifications"),
      QStringLiteral("org.freedesktop.Notifications"), QStringLiteral("Notify"));
  const int kServerDefaultExpiry = -1;
  call << QStringLiteral("Tessal") << uint(0) << QStringLiteral("tessal") << summary << body << QStringList()
       << QVariantMap() << kServerDefaultExpiry;
  auto* watcher = new QDBusPendingCallWatcher(bus_.asyncCall(call, timeoutMs_), this);
  connect(watcher, &QDBusPendingCallWatcher::finished, this,
          [this, summary, body](QDBusPendingCallWatcher* w) {
            w->deleteLater();
            const QDBusPendingReply<uint> reply = *w;
            if (reply.isError()) {
              qCDebug(lcTracking, "No notification: %s", qUtf8Printable(reply.error().message()));
              emit notShown(summary, body);
            } else {
              emit shown(summary, body);
            }
          });
}
