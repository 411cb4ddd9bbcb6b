#include "MemoryKeychain.h"
#include "UserDefaults.h"
#include "WTPasswordStore.h"
#include "WTQtKeychain.h"

#include <gtest/gtest.h>

#include <QFile>
#include <QTemporaryDir>

#include <sys/stat.h>

#include <memory>

namespace {

const QString kPassword = QStringLiteral("correct horse battery");

class WTPasswordStoreTest : public ::testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(dir.isValid());
    defaults = std::make_unique<UserDefaults>(settingsPath());
  }

  QString settingsPath() const { return dir.filePath(QStringLiteral("config/Tessal/Tessal.conf")); }
  std::unique_ptr<WTPasswordStore> makeStore() {
    return std::make_unique<WTPasswordStore>(defaults.get(), std::make_unique<SharedKeychain>(keychain));
  }
  QByteArray fileBytes() const {
    QFile file(settingsPath());
    return file.open(QIODevice::ReadOnly) ? file.readAll() : QByteArray();
  }
  // The file's permission bits as the kernel has them, or -1 when there is no file.
  int fileMode() const {
    struct stat info {};
    if (::stat(QFile::encodeName(settingsPath()).constData(), &info) != 0) return -1;
    return int(info.st_mode & 07777);
  }

  QTemporaryDir dir;
  std::unique_ptr<UserDefaults> defaults;
  MemoryKeychain keychain;
};

TEST_F(WTPasswordStoreTest, AWorkingKeychainTakesThePasswordAndTheSettingsFileNeverSeesIt) {
  defaults->setValue(QStringLiteral("WTSyncUser"), QStringLiteral("ann@example.org"));
  auto store = makeStore();
  EXPECT_EQ(store->setPassword(kPassword), WTPasswordStore::Location::Keychain);
  EXPECT_EQ(keychain.entries.value(QStringLiteral("sync-password")), kPassword);
  EXPECT_FALSE(defaults->hasStoredValue(QStringLiteral("WTSyncPassword")));
  EXPECT_TRUE(fileBytes().contains("ann@example.org"));
  EXPECT_FALSE(fileBytes().contains("horse"));

  // Another start reads it back from the keychain.
  auto again = makeStore();
  EXPECT_EQ(again->password(), kPassword);
  EXPECT_EQ(again->location(), WTPasswordStore::Location::Keychain);
}

TEST_F(WTPasswordStoreTest, ThePasswordIsReadFromTheKeychainOnceThenFromMemory) {
  keychain.entries.insert(QStringLiteral("sync-password"), kPassword);
  auto store = makeStore();
  EXPECT_EQ(store->password(), kPassword);
  EXPECT_EQ(store->password(), kPassword);
  EXPECT_EQ(keychain.reads, 1);
  store->setPassword(QStringLiteral("new one"));
  EXPECT_EQ(store->password(), QStringLiteral("new one"));
  EXPECT_EQ(keychain.reads, 1);
}

TEST_F(WTPasswordStoreTest, WithoutAKeychainThePasswordGoesToASettingsFileOnlyItsOwnerCanRead) {
  keychain.available = false;
  ASSERT_EQ(fileMode(), -1);
  auto store = makeStore();
  EXPECT_EQ(store->setPassword(kPassword), WTPasswordStore::Location::SettingsFile);
  EXPECT_TRUE(fileBytes().contains("horse"));
  EXPECT_EQ(fileMode(), 0600);

  // Later writes of other settings keep the file private.
  defaults->setValue(QStringLiteral("WTShouldIdle"), true);
  defaults->setValue(QStringLiteral("WTSyncUser"), QStringLiteral("ann@example.org"));
  EXPECT_EQ(fileMode(), 0600);

  auto again = makeStore();
  EXPECT_EQ(again->password(), kPassword);
  EXPECT_EQ(again->location(), WTPasswordStore::Location::SettingsFile);
}

TEST_F(WTPasswordStoreTest, AnExistingSettingsFileOthersCouldReadIsClosedBeforeThePasswordGoesIn) {
  defaults->setValue(QStringLiteral("WTSyncUser"), QStringLiteral("ann@example.org"));
  ASSERT_TRUE(QFile::setPermissions(settingsPath(), QFileDevice::ReadOwner | QFileDevice::WriteOwner |
                                                        QFileDevice::ReadGroup | QFileDevice::ReadOther));
  ASSERT_EQ(fileMode(), 0644);
  keychain.available = false;
  makeStore()->setPassword(kPassword);
  EXPECT_EQ(fileMode(), 0600);
  EXPECT_TRUE(fileBytes().contains("horse"));
}

TEST_F(WTPasswordStoreTest, AKeychainThatComesBackTakesThePasswordOutOfTheFile) {
  keychain.available = false;
  auto store = makeStore();
  store->setPassword(kPassword);
  ASSERT_TRUE(fileBytes().contains("horse"));
  keychain.available = true;
  EXPECT_EQ(store->setPassword(QStringLiteral("battery staple")), WTPasswordStore::Location::Keychain);
  EXPECT_FALSE(fileBytes().contains("horse"));
  EXPECT_FALSE(fileBytes().contains("staple"));
  EXPECT_EQ(makeStore()->password(), QStringLiteral("battery staple"));
}

TEST_F(WTPasswordStoreTest, MigrateMovesAPasswordFromTheSettingsFileIntoTheKeychain) {
  defaults->setValue(QStringLiteral("WTSyncPassword"), kPassword);
  ASSERT_TRUE(fileBytes().contains("horse"));
  auto store = makeStore();
  EXPECT_TRUE(store->migrate());
  EXPECT_EQ(keychain.entries.value(QStringLiteral("sync-password")), kPassword);
  EXPECT_FALSE(defaults->hasStoredValue(QStringLiteral("WTSyncPassword")));
  EXPECT_FALSE(fileBytes().contains("horse"));
  EXPECT_EQ(store->password(), kPassword);
  EXPECT_EQ(store->location(), WTPasswordStore::Location::Keychain);
  // Nothing left to move the next time.
  EXPECT_FALSE(makeStore()->migrate());
  EXPECT_EQ(keychain.writes, 1);
}

TEST_F(WTPasswordStoreTest, MigrateLeavesThePasswordInAPrivateFileWhenTheKeychainRefusesIt) {
  defaults->setValue(QStringLiteral("WTSyncPassword"), kPassword);
  ASSERT_TRUE(QFile::setPermissions(settingsPath(), QFileDevice::ReadOwner | QFileDevice::WriteOwner |
                                                        QFileDevice::ReadGroup | QFileDevice::ReadOther));
  keychain.available = false;
  auto store = makeStore();
  EXPECT_FALSE(store->migrate());
  EXPECT_TRUE(fileBytes().contains("horse"));
  EXPECT_EQ(fileMode(), 0600);
  EXPECT_EQ(store->password(), kPassword);
  EXPECT_EQ(store->location(), WTPasswordStore::Location::SettingsFile);
}

TEST_F(WTPasswordStoreTest, ANewerPasswordInTheFileReplacesTheKeychainsOlderOne) {
  // The file holds a password only when the keychain could not take it, so the file's is the newer.
  keychain.entries.insert(QStringLiteral("sync-password"), QStringLiteral("old"));
  defaults->setValue(QStringLiteral("WTSyncPassword"), kPassword);
  EXPECT_TRUE(makeStore()->migrate());
  EXPECT_EQ(keychain.entries.value(QStringLiteral("sync-password")), kPassword);
  EXPECT_EQ(makeStore()->password(), kPassword);
}

TEST_F(WTPasswordStoreTest, RemovingThePasswordClearsKeychainAndFile) {
  auto store = makeStore();
  store->setPassword(kPassword);
  defaults->setValue(QStringLiteral("WTSyncPassword"), QStringLiteral("stale"));
  store->removePassword();
  EXPECT_TRUE(keychain.entries.isEmpty());
  EXPECT_FALSE(defaults->hasStoredValue(QStringLiteral("WTSyncPassword")));
  EXPECT_TRUE(store->password().isEmpty());
  EXPECT_TRUE(makeStore()->password().isEmpty());
  // An empty password is no password.
  store->setPassword(kPassword);
  EXPECT_EQ(store->setPassword(QString()), WTPasswordStore::Location::None);
  EXPECT_TRUE(keychain.entries.isEmpty());
}

// The real adapter on a machine without a session bus (the tests run without one): the desktop has no
// secret service, which must read as Unavailable (not "no such entry"), so the store falls back.
TEST_F(WTPasswordStoreTest, WithoutASessionBusTheSecretServiceIsUnavailableAndTheFileIsUsed) {
  ASSERT_TRUE(qEnvironmentVariableIsEmpty("DBUS_SESSION_BUS_ADDRESS"));
  WTQtKeychain secrets(QStringLiteral("Tessal test"), 10000);
  const Result<QString> read = secrets.readPassword(QStringLiteral("sync-password"));
  ASSERT_FALSE(read.ok());
  EXPECT_EQ(read.error().code, WTKeychain::Unavailable) << read.error().message.toStdString();
  EXPECT_FALSE(secrets.writePassword(QStringLiteral("sync-password"), kPassword).ok());

  WTPasswordStore store(defaults.get(), std::make_unique<WTQtKeychain>(QStringLiteral("Tessal test"), 10000));
  EXPECT_EQ(store.setPassword(kPassword), WTPasswordStore::Location::SettingsFile);
  EXPECT_EQ(fileMode(), 0600);
  WTPasswordStore again(defaults.get(), std::make_unique<WTQtKeychain>(QStringLiteral("Tessal test"), 10000));
  EXPECT_EQ(again.password(), kPassword);
}

}  // namespace
