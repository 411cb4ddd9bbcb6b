#pragma once

#include <QObject>
#include <QString>

#include <functional>
#include <memory>
#include <optional>
#include <vector>

class UserDefaults;
class WTKeychain;

// The sync account's password. It lives in the desktop's secret service under the service "Tessal"
// and the fixed key "sync-password" (one account per installation, so the entry stays the same when
// the user changes the account's e-mail address). Only where no secret service takes it does it go to
// the user default "WTSyncPassword", and the settings file is then readable by its owner alone (0600).
// Earlier versions kept it there in clear: load() moves it into the secret service.
//
// A keyring may prompt (a new or locked keyring) and wait for the user as long as it likes, so nothing
// here waits for it: the keychain is asked in the background, once, and only when there is an account;
// until it answers, password() answers with what is known (the settings file's password, if any). Main
// thread only.
class WTPasswordStore : public QObject {
  Q_OBJECT
 public:
  static constexpr const char* kKey = "sync-password";

  enum class Location { None, Keychain, SettingsFile };
  // What load() does with a password it finds in the settings file.
  enum class FilePassword { MoveToKeychain, Keep };

  // `defaults` is not owned and must outlive the store. Without a keychain the desktop's secret
  // service is used (WTQtKeychain).
  explicit WTPasswordStore(UserDefaults* defaults, std::unique_ptr<WTKeychain> keychain = nullptr,
                           QObject* parent = nullptr);
  ~WTPasswordStore() override;

  // What is known now, never waiting: the password stored or loaded last, else the settings file's.
  QString password() const;
  // Where that password is (None while there is none).
  Location location() const;

  // Asks the keychain once, and only when an account (the user default "WTSyncUser") is set. A
  // password in the settings file wins over the keychain's (it is there only because the keychain did
  // not take it, so it is the newer one); with MoveToKeychain it is moved into the keychain and removed
  // from the file once the keychain has confirmed it, unless an earlier move failed. Without one in the
  // file the keychain's is read. `done` runs when that is settled, perhaps before load() returns; a
  // second call answers once the first has.
  void load(std::function<void()> done = {}, FilePassword filePassword = FilePassword::MoveToKeychain);
  bool isLoaded() const { return loaded_; }

  // Stores `password` in the keychain and removes any copy from the settings file; where the keychain
  // fails, stores it in the settings file (made 0600 first). An empty password removes it. password()
  // answers with the new one at once; `done` tells where it went, once the keychain has answered (it
  // is not called when another password was stored meanwhile).
  void setPassword(const QString& password, std::function<void(Location)> done = {});
  // Removes the password from the keychain and the settings file.
  void removePassword();

  // Why the keychain last failed when it was asked (refused, cancelled, timed out); empty when it did
  // not fail, or when there was no session bus to ask.
  QString keychainError() const { return keychainError_; }

  // Makes the settings file (created if need be) readable and writable by its owner alone.
  bool restrictSettingsFile() const;

 signals:
  // The keychain answered load() or setPassword(): password() or location() may have changed.
  void passwordChanged();
  // The keychain did not take the password: it stays in the settings file. Sent once per failure.
  void keptInSettingsFile(const QString& reason);

 private:
  QString filePassword() const;
  bool hasAccount() const;
  void moveToKeychain(const QString& inFile);
  void finishLoading();
  // Keeps `password` in the settings file, closed to others, after the keychain failed with `error`.
  void keepInFile(const QString& password, int errorCode, const QString& error);

  UserDefaults* defaults_;
  std::unique_ptr<WTKeychain> keychain_;
  std::optional<QString> cached_;
  Location location_ = Location::None;
  QString keychainError_;
  bool loaded_ = false;
  bool loading_ = false;
  std::vector<std::function<void()>> waiting_;
};
