#include "MemoryKeychain.h"
#include "UserDefaults.h"
#include "WTPasswordStore.h"
#include "WTQtKeychain.h"

#include <gtest/gtest.h>

#include <QCoreApplication>
#include <QFile>
#include <QLibrary>
#include <QProcess>
#include <QStandardPaths>
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

// Points the session bus somewhere nobody listens while it lives: without an address, GLib and libdbus
// would start a bus of their own, or on a desktop find the developer's, keyring and all.
class DeadSessionBus {
 public:
  explicit DeadSessionBus(const QString& folder) : previous_(qgetenv("DBUS_SESSION_BUS_ADDRESS")) {
    qputenv("DBUS_SESSION_BUS_ADDRESS", "unix:path=" + QFile::encodeName(folder) + "/no-bus");
  }
  ~DeadSessionBus() {
    if (previous_.isEmpty())
      qunsetenv("DBUS_SESSION_BUS_ADDRESS");
    else
      qputenv("DBUS_SESSION_BUS_ADDRESS", previous_);
  }

 private:
  QByteArray previous_;
};

// The real adapter where no secret service answers: that must read as Unavailable (not "no such
// entry"), so the store falls back to the file.
TEST_F(WTPasswordStoreTest, WithoutASecretServiceTheRealKeychainIsUnavailableAndTheFileIsUsed) {
  DeadSessionBus bus(dir.path());
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

// A real keyring: gnome-keyring on a session bus of its own, made for this test and gone after it. The
// test runs itself again inside that session (the test main keeps every test off the session bus, so
// the child is handed the address under another name).
TEST_F(WTPasswordStoreTest, APasswordMakesARoundTripThroughARealKeyring) {
  const QByteArray childBus = qgetenv("TESSAL_TEST_KEYRING_BUS");
  if (childBus.isEmpty()) {
    const QString runSession = QStandardPaths::findExecutable(QStringLiteral("dbus-run-session"));
    const QString keyring = QStandardPaths::findExecutable(QStringLiteral("gnome-keyring-daemon"));
    if (runSession.isEmpty() || keyring.isEmpty() || !QLibrary(QStringLiteral("secret-1"), 0).load())
      GTEST_SKIP() << "needs dbus-run-session, gnome-keyring-daemon and libsecret";
    QProcess child;
    child.setProcessChannelMode(QProcess::MergedChannels);
    QProcessEnvironment environment = QProcessEnvironment::systemEnvironment();
    // The keyring's files go to this test's folder.
    environment.insert(QStringLiteral("XDG_DATA_HOME"), dir.filePath(QStringLiteral("keyring-data")));
    environment.remove(QStringLiteral("DISPLAY"));
    environment.remove(QStringLiteral("WAYLAND_DISPLAY"));
    child.setProcessEnvironment(environment);
    const QString script = QStringLiteral(
        "printf %s throwaway | gnome-keyring-daemon --unlock --components=secrets >/dev/null || exit 3\n"
        "TESSAL_TEST_KEYRING_BUS=\"$DBUS_SESSION_BUS_ADDRESS\" exec \"$0\" "
        "--gtest_filter=WTPasswordStoreTest.APasswordMakesARoundTripThroughARealKeyring");
    child.start(runSession, {QStringLiteral("--"), QStringLiteral("sh"), QStringLiteral("-c"), script,
                             QCoreApplication::applicationFilePath()});
    ASSERT_TRUE(child.waitForFinished(60000));
    const QString output = QString::fromLocal8Bit(child.readAll());
    ASSERT_EQ(child.exitCode(), 0) << output.toStdString();
    // The child really ran the round trip, not a skip.
    EXPECT_TRUE(output.contains(QStringLiteral("[  PASSED  ] 1 test"))) << output.toStdString();
    EXPECT_FALSE(output.contains(QStringLiteral("SKIPPED"))) << output.toStdString();
    return;
  }

  qputenv("DBUS_SESSION_BUS_ADDRESS", childBus);
  WTQtKeychain secrets(QStringLiteral("Tessal test"), 20000);
  const Result<QString> none = secrets.readPassword(QStringLiteral("sync-password"));
  ASSERT_FALSE(none.ok());
  EXPECT_EQ(none.error().code, WTKeychain::EntryNotFound) << none.error().message.toStdString();

  // Through the store: into the keyring, never into the file, and read back by a store of its own.
  defaults->setValue(QStringLiteral("WTSyncPassword"), kPassword);
  {
    WTPasswordStore store(defaults.get(),
                          std::make_unique<WTQtKeychain>(QStringLiteral("Tessal test"), 20000));
    ASSERT_TRUE(store.migrate());
  }
  EXPECT_FALSE(fileBytes().contains("horse"));
  const Result<QString> moved = secrets.readPassword(QStringLiteral("sync-password"));
  ASSERT_TRUE(moved.ok()) << moved.error().message.toStdString();
  EXPECT_EQ(moved.value(), kPassword);

  WTPasswordStore store(defaults.get(), std::make_unique<WTQtKeychain>(QStringLiteral("Tessal test"), 20000));
  EXPECT_EQ(store.password(), kPassword);
  EXPECT_EQ(store.location(), WTPasswordStore::Location::Keychain);
  EXPECT_EQ(store.setPassword(QStringLiteral("battery staple")), WTPasswordStore::Location::Keychain);
  EXPECT_FALSE(fileBytes().contains("staple"));
  EXPECT_EQ(secrets.readPassword(QStringLiteral("sync-password")).value(), QStringLiteral("battery staple"));

  store.removePassword();
  const Result<QString> removed = secrets.readPassword(QStringLiteral("sync-password"));
  ASSERT_FALSE(removed.ok());
  EXPECT_EQ(removed.error().code, WTKeychain::EntryNotFound);
}

}  // namespace
