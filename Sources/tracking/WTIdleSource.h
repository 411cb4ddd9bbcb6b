#pragma once

#include <QDBusConnection>
#include <QString>

// How long the user has left keyboard and pointer alone.
class WTIdleSource {
 public:
  virtual ~WTIdleSource() = default;
  // Whole seconds since the last input, or -1 when the desktop does not say.
  virtual qint64 idleSeconds() = 0;
};

// Asks the session bus, in order, the first answer winning: Mutter's idle monitor (GNOME and other
// Mutter sessions, milliseconds), then the freedesktop screen saver (KDE and others, seconds). A missing
// service, an error reply, a reply of the wrong type or no reply within the timeout moves on to the next
// source; when none answers the result is -1.
class WTDBusIdleSource final : public WTIdleSource {
 public:
  // `bus` is normally QDBusConnection::sessionBus(); a disconnected one always gives -1. The calls block
  // the caller for at most `timeoutMs` each, so a hung desktop service cannot freeze the ticker for long.
  explicit WTDBusIdleSource(const QDBusConnection& bus, int timeoutMs = 250);

  qint64 idleSeconds() override;

  // Which source gave the last answer ("org.gnome.Mutter.IdleMonitor", "org.freedesktop.ScreenSaver"),
  // empty when none did.
  QString lastSource() const { return lastSource_; }

 private:
  qint64 mutterIdleSeconds();
  qint64 screenSaverIdleSeconds();

  QDBusConnection bus_;
  int timeoutMs_;
  QString lastSource_;
};
