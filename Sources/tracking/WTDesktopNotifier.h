#pragma once

#include <QDBusConnection>
#include <QObject>
#include <QString>

// Short notices through the desktop's notification service (org.freedesktop.Notifications). The call
// is asynchronous and bounded: nothing waits for the service, and a bus without one (no service, an
// error, no answer in time, no bus at all) hands the notice back through notShown, for the window to
// show it itself.
class WTDesktopNotifier : public QObject {
  Q_OBJECT
 public:
  static constexpr int kTimeoutMilliseconds = 3000;

  // `bus` is normally QDBusConnection::sessionBus().
  explicit WTDesktopNotifier(const QDBusConnection& bus, int timeoutMs = kTimeoutMilliseconds,
                             QObject* parent = nullptr);

  void notify(const QString& summary, const QString& body);

 signals:
  // The service took the notice.
  void shown(const QString& summary, const QString& body);
  // Nobody showed the notice.
  void notShown(const QString& summary, const QString& body);

 private:
  QDBusConnection bus_;
  int timeoutMs_;
};
