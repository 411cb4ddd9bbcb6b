#include "WTPasswordStore.h"

#include "UserDefaults.h"
#include "WTQtKeychain.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QLoggingCategory>

namespace {

Q_LOGGING_CATEGORY(lcPasswords, "tessal.passwords")

const QString kKeyName = QString::fromLatin1(WTPasswordStore::kKey);
const QString kDefaultsKeyName = QString::fromLatin1(WTPasswordStore::kDefaultsKey);
constexpr QFileDevice::Permissions kOwnerOnly = QFileDevice::ReadOwner | QFileDevice::WriteOwner;

}  // namespace

WTPasswordStore::WTPasswordStore(UserDefaults* defaults, std::unique_ptr<WTKeychain> keychain)
    : defaults_(defaults), keychain_(keychain ? std::move(keychain) : std::make_unique<WTQtKeychain>()) {}

WTPasswordStore::~WTPasswordStore() = default;

QString WTPasswordStore::filePassword() const {
  return defaults_ ? defaults_->stringForKey(kDefaultsKeyName) : QString();
}

QString WTPasswordStore::password() {
  if (cached_) return *cached_;
  const Result<QString> stored = keychain_->readPassword(kKeyName);
  if (stored.ok() && !stored.value().isEmpty()) {
    cached_ = stored.value();
    location_ = Location::Keychain;
    return *cached_;
  }
  if (!stored.ok() && stored.error().code != WTKeychain::EntryNotFound)
    qCInfo(lcPasswords).noquote() << "No secret service:" << stored.error().message;
  cached_ = filePassword();
  location_ = cached_->isEmpty() ? Location::None : Location::SettingsFile;
  return *cached_;
}

WTPasswordStore::Location WTPasswordStore::setPassword(const QString& password) {
  if (password.isEmpty()) {
    removePassword();
    return Location::None;
  }
  const Result<void> written = keychain_->writePassword(kKeyName, password);
  if (written.ok()) {
    if (defaults_ && defaults_->hasStoredValue(kDefaultsKeyName)) defaults_->removeValue(kDefaultsKeyName);
    cached_ = password;
    location_ = Location::Keychain;
    return location_;
  }
  qCWarning(lcPasswords).noquote() << "The password is kept in the settings file: no secret service took it:"
                                   << written.error().message;
  // An older entry there would otherwise be read before the file's newer password.
  keychain_->deletePassword(kKeyName);
  cached_ = password;
  if (!defaults_) {
    location_ = Location::None;
    return location_;
  }
  // Restricted before the password is written, and again after, in case the write made a new file.
  restrictSettingsFile();
  defaults_->setValue(kDefaultsKeyName, password);
  restrictSettingsFile();
  location_ = Location::SettingsFile;
  return location_;
}

void WTPasswordStore::removePassword() {
  const Result<void> removed = keychain_->deletePassword(kKeyName);
  if (!removed.ok()) qCInfo(lcPasswords).noquote() << "No secret service:" << removed.error().message;
  if (defaults_ && defaults_->hasStoredValue(kDefaultsKeyName)) defaults_->removeValue(kDefaultsKeyName);
  cached_ = QString();
  location_ = Location::None;
}

bool WTPasswordStore::migrate() {
  if (!defaults_ || !defaults_->hasStoredValue(kDefaultsKeyName)) return false;
  const QString inFile = filePassword();
  if (inFile.isEmpty()) {
    defaults_->removeValue(kDefaultsKeyName);
    return false;
  }
  const Result<void> written = keychain_->writePassword(kKeyName, inFile);
  if (!written.ok()) {
    qCInfo(lcPasswords).noquote() << "The password stays in the settings file: no secret service took it:"
                                  << written.error().message;
    restrictSettingsFile();
    cached_ = inFile;
    location_ = Location::SettingsFile;
    return false;
  }
  defaults_->removeValue(kDefaultsKeyName);
  cached_ = inFile;
  location_ = Location::Keychain;
  return true;
}

bool WTPasswordStore::restrictSettingsFile() const {
  if (!defaults_) return false;
  const QString path = defaults_->fileName();
  QDir().mkpath(QFileInfo(path).absolutePath());
  QFile file(path);
  // Created with the owner's bits only, so the file is never readable by others, not even briefly.
  if (!file.exists() && !file.open(QIODevice::WriteOnly, kOwnerOnly)) return false;
  file.close();
  return QFile::setPermissions(path, kOwnerOnly);
}
