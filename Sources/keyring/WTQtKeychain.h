#pragma once

#include "WTKeychain.h"

#include <QObject>

#include <memory>

namespace QKeychain {
class Job;
}

// The desktop's secret service (GNOME Keyring, KWallet, KeePassXC ...) through QtKeychain, whose jobs
// run on the event loop. A job that has not finished after the timeout is answered Unavailable; its
// late end is ignored. QtKeychain runs the jobs of the whole process one after another, so while a job
// that timed out is still out (a keyring prompt nobody answers), later calls are answered Unavailable at
// once instead of queueing behind it. Where there is no session bus nothing is asked: the answer is
// NoSession. Answers due when the keychain is destroyed are dropped. Main thread only.
class WTQtKeychain final : public WTKeychain {
 public:
  // Every entry is filed under `service`, the name the desktop's password manager shows.
  explicit WTQtKeychain(const QString& service = QStringLiteral("Tessal"), int timeoutMilliseconds = 30000);
  ~WTQtKeychain() override;

  QString service() const { return service_; }
  int timeoutMilliseconds() const { return timeoutMs_; }

  // Whether a session bus may be there to ask: an address in DBUS_SESSION_BUS_ADDRESS (a socket path
  // must exist), or the user's bus in $XDG_RUNTIME_DIR. Without one, D-Bus would try to start a bus
  // through the X display, and fail noisily on a server.
  static bool sessionBusReachable();

  void readPassword(const QString& key, ReadHandler done) override;
  void writePassword(const QString& key, const QString& password, DoneHandler done) override;
  void deletePassword(const QString& key, DoneHandler done) override;

 private:
  struct Outcome;
  // Starts `job` and answers `done` once: with the job's outcome, or with a timeout.
  void run(QKeychain::Job* job, std::function<void(const Outcome&)> done);

  QString service_;
  int timeoutMs_;
  // Receives the jobs' and the timers' signals: destroyed with the keychain, so no late answer arrives.
  std::unique_ptr<QObject> receiver_;
};
