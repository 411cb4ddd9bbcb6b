#pragma once

#include <QDBusConnection>
#include <QString>

// The launcher's entry for Tessal (KDE's task manager, Ubuntu's and Dash to Dock's launchers), spoken to
// with the com.canonical.Unity.LauncherEntry "Update" signal. An entry carries a number, not text, so the
// running time cannot go there (it goes beside the tray icon and into the main window's title): the
// entry carries the number of running timers, shown while any runs.
class WTLauncherEntry {
 public:
  // `bus` is normally QDBusConnection::sessionBus(); a disconnected one makes update() do nothing.
  explicit WTLauncherEntry(const QDBusConnection& bus,
                           const QString& appUri = QStringLiteral("application://tessal.desktop"));

  // Sends one Update for the application: `runningTimers` as the count, shown when above zero, and no
  // progress. Returns whether it was sent.
  bool update(qint64 runningTimers);

  QString appUri() const { return appUri_; }
  static QString objectPath() { return QStringLiteral("/com/canonical/unity/launcherentry/tessal"); }

 private:
  QDBusConnection bus_;
  QString appUri_;
};
