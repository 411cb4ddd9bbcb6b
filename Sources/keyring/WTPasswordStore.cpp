#include "WTPasswordStore.h"

#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTQtKeychain.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QLoggingCategory>

namespace {

Q_LOGGING_CATEGORY(lcPasswords, "tessal.passwords")

const QString kKeyName = QString::fromLatin1(WTPasswordStore::kKey);
const QString kDefaultsKeyName = SettingsKeys::kSyncPassword;
const QString kKeptInFileKeyName = SettingsKeys::kSyncPasswordKeptInFile;
constexpr QFileDevice::Permissions kOwnerOnly = QFileDevice::ReadOwner | QFileDevice::WriteOwner;

}  // namespace

WTPasswordStore::WTPasswordStore(UserDefaults* defaults, std::unique_ptr<WTKeychain> keychain,
                                 QObject* parent)
    : QObject(parent),
      defaults_(defaults),
      keychain_(keychain ? std::move(keychain) : std::make_unique<WTQtKeychain>()) {}

WTPasswordStore::~WTPasswordStore() = default;

QString WTPasswordStore::filePassword() const {
  return defaults_ ? defaults_->stringForKey(kDefaultsKeyName) : QString();
}

bool WTPasswordStore::hasAccount() const {
  return defaults_ && !defaults_->stringForKey(SettingsKeys::kSyncUser).trimmed().isEmpty();
}

QString WTPasswordStore::password() const {
  return cached_ ? *cached_ : filePassword();
}

WTPasswordStore::Location WTPasswordStore::location() const {
  if (cached_) return location_;
  return filePassword().isEmpty() ? Location::None : Location::SettingsFile;
}

void WTPasswordStore::load(std::function<void()> done, FilePassword filePassword) {
  if (done) waiting_.push_back(std::move(done));
  if (loading_) return;
  if (loaded_ || !hasAccount()) return finishLoading();
  loading_ = true;
  if (defaults_->hasStoredValue(kDefaultsKeyName) && this->filePassword().isEmpty())
    defaults_->removeValue(kDefaultsKeyName);
  const QString inFile = this->filePassword();
  if (!inFile.isEmpty()) {
    cached_ = inFile;
    location_ = Location::SettingsFile;
    if (filePassword == FilePassword::Keep || defaults_->boolForKey(kKeptInFileKeyName))
      return finishLoading();
    return moveToKeychain(inFile);
  }
  keychain_->readPassword(kKeyName, [this](const Result<QString>& stored) {
    // A password stored meanwhile is newer than whatever the keychain had.
    if (!cached_) {
      cached_ = stored.ok() ? stored.value() : QString();
      location_ = cached_->isEmpty() ? Location::None : Location::Keychain;
    }
    if (!stored.ok() && stored.error().code == WTKeychain::Unavailable)
      keychainError_ = stored.error().message;
    finishLoading();
  });
}

void WTPasswordStore::moveToKeychain(const QString& inFile) {
  keychain_->writePassword(kKeyName, inFile, [this, inFile](const Result<void>& written) {
    // Only the password that was sent leaves the file: one stored meanwhile has its own write.
    if (filePassword() == inFile) {
      if (written.ok()) {
        defaults_->removeValue(kDefaultsKeyName);
        location_ = Location::Keychain;
      } else {
        keepInFile(inFile, written.error().code, written.error().message);
      }
    }
    finishLoading();
  });
}

void WTPasswordStore::finishLoading() {
  // Without an account nothing was asked, and a later load() may still ask.
  if (loading_) {
    loading_ = false;
    loaded_ = true;
    emit passwordChanged();
  }
  for (const std::function<void()>& done : std::exchange(waiting_, {})) done();
}

void WTPasswordStore::keepInFile(const QString& password, int errorCode, const QString& error) {
  location_ = Location::SettingsFile;
  if (!defaults_) {
    location_ = Location::None;
    return;
  }
  // Restricted before the password is written, and again after, in case the write made a new file.
  restrictSettingsFile();
  if (filePassword() != password) defaults_->setValue(kDefaultsKeyName, password);
  restrictSettingsFile();
  // With no session bus at all the file is simply where the password lives.
  if (errorCode == WTKeychain::NoSession) return;
  keychainError_ = error;
  defaults_->setValue(kKeptInFileKeyName, true);
  qCWarning(lcPasswords).noquote() << "The password stays in the settings file:" << error;
  emit keptInSettingsFile(error);
}

void WTPasswordStore::setPassword(const QString& password, std::function<void(Location)> done) {
  if (password.isEmpty()) {
    removePassword();
    if (done) done(Location::None);
    return;
  }
  cached_ = password;
  keychain_->writePassword(kKeyName, password, [this, password, done](const Result<void>& written) {
    // A later password has its own write on its way.
    if (cached_ != password) return;
    if (written.ok()) {
      keychainError_.clear();
      if (defaults_ && defaults_->hasStoredValue(kDefaultsKeyName)) defaults_->removeValue(kDefaultsKeyName);
      if (defaults_ && defaults_->hasStoredValue(kKeptInFileKeyName))
        defaults_->removeValue(kKeptInFileKeyName);
      location_ = Location::Keychain;
    } else {
      // An older entry there would otherwise be read before the file's newer password.
      keychain_->deletePassword(kKeyName, [](const Result<void>&) {});
      keepInFile(password, written.error().code, written.error().message);
    }
    emit passwordChanged();
    if (done) done(location_);
  });
}

void WTPasswordStore::removePassword() {
  keychain_->deletePassword(kKeyName, [](const Result<void>&) {});
  if (defaults_) {
    for (const QString& key : {kDefaultsKeyName, kKeptInFileKeyName})
      if (defaults_->hasStoredValue(key)) defaults_->removeValue(key);
  }
  cached_ = QString();
  location_ = Location::None;
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
