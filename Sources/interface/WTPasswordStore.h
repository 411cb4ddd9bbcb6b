#pragma once

#include <QString>

#include <memory>
#include <optional>

class UserDefaults;
class WTKeychain;

// The sync account's password. It lives in the desktop's secret service under the service "Tessal"
// and the fixed key "sync-password" (one account per installation, so the entry stays the same when
// the user changes the account's e-mail address). Only where no secret service answers does it go to
// the user default "WTSyncPassword", and the settings file is then readable by its owner alone (0600).
// Earlier versions kept it there in clear: migrate() moves it into the secret service.
//
// The password is read from the keychain once and then answered from memory, so the sync's polls
// never wait for the secret service. Main thread only.
class WTPasswordStore {
 public:
  static constexpr const char* kKey = "sync-password";
  static constexpr const char* kDefaultsKey = "WTSyncPassword";

  enum class Location { None, Keychain, SettingsFile };

  // `defaults` is not owned and must outlive the store. Without a keychain the desktop's secret
  // service is used (WTQtKeychain).
  explicit WTPasswordStore(UserDefaults* defaults, std::unique_ptr<WTKeychain> keychain = nullptr);
  ~WTPasswordStore();

  // The keychain's password, else the settings file's, else empty.
  QString password();
  // Stores `password` in the keychain and removes any copy from the settings file; where the keychain
  // fails, stores it in the settings file (made 0600 first). An empty password removes it. Returns
  // where it went.
  Location setPassword(const QString& password);
  // Removes the password from the keychain and the settings file.
  void removePassword();
  // Where the password was last read from or written to (None before the first read).
  Location location() const { return location_; }

  // Moves a password found in the settings file into the keychain, removing it from the file only
  // once the keychain has confirmed it. When the keychain fails, the password stays in the file and
  // the file is made 0600. Returns true when a password was moved. Run it once at start.
  bool migrate();

  // Makes the settings file (created if need be) readable and writable by its owner alone.
  bool restrictSettingsFile() const;

 private:
  QString filePassword() const;

  UserDefaults* defaults_;
  std::unique_ptr<WTKeychain> keychain_;
  std::optional<QString> cached_;
  Location location_ = Location::None;
};
