#pragma once

#include "Result.h"

#include <QString>

// Somewhere outside the settings file where secrets are kept: the desktop's secret service in the
// application (WTQtKeychain), something simpler in tests. Calls block until the answer is in.
class WTKeychain {
 public:
  // Error codes of the answers below.
  enum ErrorCode {
    EntryNotFound = 1,  // the keychain answered: nothing is stored under that key
    Unavailable = 2,    // no keychain answered, or it refused (locked, access denied, timed out)
  };

  virtual ~WTKeychain() = default;

  // The secret stored under `key`.
  virtual Result<QString> readPassword(const QString& key) = 0;
  // Stores `password` under `key`, replacing what was there.
  virtual Result<void> writePassword(const QString& key, const QString& password) = 0;
  // Removes the secret under `key`; removing what is not there is no error.
  virtual Result<void> deletePassword(const QString& key) = 0;
};
