#pragma once

#include <QDBusConnection>
#include <QString>

// The launcher's entry for Tessal (KDE's task manager, Ubuntu's and Dash to Dock's launchers), spoken to
// with the com.canonical.Unity.LauncherEntry "Update" signal. The running time cannot be shown as a
// count, so the entry only ever says that no count and no progress are to be shown; the running time
// itself goes into the main window's title.
class WTLauncherEntry {
 public:
  // `bus` is normally QDBusConnection::sessionBus(); a disconnected one makes update() do nothing.
  explicit WTLauncherEntry(const QDBusConnection& bus,
                           const QString& appUri = QStringLiteral("application://tessal.desktop"));

  // Sends one Update for the application: count and progress hidden. Returns whether it was sent.
  bool update();

  QString appUri() const { return appUri_; }
  static QString objectPath() { return QStringLiteral("/com/canonical/unity/launcherentry/tessal"); }

 private:
  QDBusConnection bus_;
  QString appUri_;
};
