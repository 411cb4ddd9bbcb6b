#pragma once

#include <QDBusConnection>
#include <QDBusContext>
#include <QDBusMessage>
#include <QList>
#include <QMutex>
#include <QObject>
#include <QString>
#include <QStringList>
#include <QVariantMap>

#include <atomic>

// How a fake desktop service answers a call.
enum class FakeMode { Answer, Error, Silent };

// Mutter's idle monitor as GNOME serves it.
class FakeMutterIdleMonitor : public QObject, protected QDBusContext {
  Q_OBJECT
  Q_CLASSINFO("D-Bus Interface", "org.gnome.Mutter.IdleMonitor")
 public:
  std::atomic<qulonglong> milliseconds{0};
  std::atomic<FakeMode> mode{FakeMode::Answer};

 public slots:
  qulonglong GetIdletime() {
    if (mode == FakeMode::Error) sendErrorReply(QDBusError::Failed, QStringLiteral("no idle monitor"));
    if (mode == FakeMode::Silent) setDelayedReply(true);  // and never answer
    return milliseconds;
  }
};

// The freedesktop screen saver as KDE serves it.
class FakeScreenSaver : public QObject, protected QDBusContext {
  Q_OBJECT
  Q_CLASSINFO("D-Bus Interface", "org.freedesktop.ScreenSaver")
 public:
  std::atomic<uint> seconds{0};
  std::atomic<FakeMode> mode{FakeMode::Answer};

 public slots:
  uint GetSessionIdleTime() {
    if (mode == FakeMode::Error) sendErrorReply(QDBusError::NotSupported, QStringLiteral("not supported"));
    if (mode == FakeMode::Silent) setDelayedReply(true);
    return seconds;
  }
};

// Hears the launcher entry's Update signals.
class LauncherListener : public QObject {
  Q_OBJECT
 public:
  QList<QString> uris;
  QList<QVariantMap> properties;

 public slots:
  void update(const QString& uri, const QVariantMap& props) {
    uris.append(uri);
    properties.append(props);
  }
};

// The desktop's notification service; keeps "summary | body" of every notice it took.
class FakeNotifications : public QObject, protected QDBusContext {
  Q_OBJECT
  Q_CLASSINFO("D-Bus Interface", "org.freedesktop.Notifications")
 public:
  std::atomic<FakeMode> mode{FakeMode::Answer};
  QStringList taken() const {
    const QMutexLocker lock(&mutex_);
    return taken_;
  }

 public slots:
  uint Notify(const QString&, uint, const QString&, const QString& summary, const QString& body,
              const QStringList&, const QVariantMap&, int) {
    if (mode == FakeMode::Error) sendErrorReply(QDBusError::Failed, QStringLiteral("no notices"));
    if (mode == FakeMode::Silent) setDelayedReply(true);
    if (mode != FakeMode::Answer) return 0;
    const QMutexLocker lock(&mutex_);
    taken_.append(summary + " | " + body);
    return uint(taken_.size());
  }

 private:
  mutable QMutex mutex_;
  QStringList taken_;
};
