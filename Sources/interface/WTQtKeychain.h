#pragma once

#include "WTKeychain.h"

// The desktop's secret service (GNOME Keyring, KWallet, KeePassXC ...) through QtKeychain. Each call
// runs QtKeychain's job in a local event loop and gives up after the timeout, so a service that never
// answers costs that long once and is then reported Unavailable. Main thread only.
class WTQtKeychain final : public WTKeychain {
 public:
  // Every entry is filed under `service`, the name the desktop's password manager shows.
  explicit WTQtKeychain(const QString& service = QStringLiteral("Tessal"), int timeoutMilliseconds = 30000);

  QString service() const { return service_; }
  int timeoutMilliseconds() const { return timeoutMs_; }

  Result<QString> readPassword(const QString& key) override;
  Result<void> writePassword(const QString& key, const QString& password) override;
  Result<void> deletePassword(const QString& key) override;

 private:
  QString service_;
  int timeoutMs_;
};
