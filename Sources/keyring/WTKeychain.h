#pragma once

#include "Result.h"

#include <QString>

#include <functional>

// Somewhere outside the settings file where secrets are kept: the desktop's secret service in the
// application (WTQtKeychain), something simpler in tests. Every call answers through its handler
// exactly once, on the calling thread, perhaps before it returns; nothing waits for the answer, since
// a keyring may sit on a prompt for as long as the user lets it.
class WTKeychain {
 public:
  // Error codes of the answers below.
  enum ErrorCode {
    EntryNotFound = 1,  // the keychain answered: nothing is stored under that key
    Unavailable = 2,  // it was asked and refused (locked, cancelled, access denied) or did not answer in time
    NoSession = 3,    // there is no session bus to ask (a server, an SSH login): nothing was asked
  };

  using ReadHandler = std::function<void(const Result<QString>&)>;
  using DoneHandler = std::function<void(const Result<void>&)>;

  virtual ~WTKeychain() = default;

  // The secret stored under `key`.
  virtual void readPassword(const QString& key, ReadHandler done) = 0;
  // Stores `password` under `key`, replacing what was there.
  virtual void writePassword(const QString& key, const QString& password, DoneHandler done) = 0;
  // Removes the secret under `key`; removing what is not there is no error.
  virtual void deletePassword(const QString& key, DoneHandler done) = 0;
};
