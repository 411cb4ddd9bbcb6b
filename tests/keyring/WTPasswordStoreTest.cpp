#include "FakeSecretService.h"
#include "MemoryKeychain.h"
#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTPasswordStore.h"
#include "WTQtKeychain.h"

#include <gtest/gtest.h>

#include <QCoreApplication>
#include <QDeadlineTimer>
#include <QFile>
#include <QLibrary>
#include <QProcess>
#include <QSignalSpy>
#include <QStandardPaths>
#include <QTemporaryDir>

#include <sys/stat.h>

#include <memory>
#include <optional>

namespace {

using Location = WTPasswordStore::Location;
const QString kPassword = QStringLiteral("correct horse battery");
const QString kUser = QStringLiteral("WTSyncUser");
const QString kInFile = QStringLiteral("WTSyncPassword");

// Runs the event loop until `answered` holds, for at most 30 seconds.
template <class Answered>
void waitUntil(Answered answered) {
  const QDeadlineTimer deadline(30000);
  while (!answered() && !deadline.hasExpired())
    QCoreApplication::processEvents(QEventLoop::WaitForMoreEvents, 50);
  EXPECT_TRUE(answered()) << "no answer within 30 seconds";
}
template <class T>
void waitFor(const std::optional<T>& answer) {
  waitUntil([&] { return answer.has_value(); });
}

Result<QString> readNow(WTKeychain& keychain) {
  std::optional<Result<QString>> answer;
  keychain.readPassword(QStringLiteral("sync-password"), [&](const Result<QString>& read) { answer = read; });
  waitFor(answer);
  return answer.value_or(Result<QString>(Error{-1, QStringLiteral("no answer")}));
}

Location storeNow(WTPasswordStore& store, const QString& password) {
  std::optional<Location> where;
  store.setPassword(password, [&](Location location) { where = location; });
  waitFor(where);
  return where.value_or(Location::None);
}

void loadNow(WTPasswordStore& store, WTPasswordStore::FilePassword filePassword = {}) {
  std::optional<bool> done;
  store.load([&] { done = true; }, filePassword);
  waitFor(done);
}

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
  void makeFileReadableByOthers() const {
    ASSERT_TRUE(QFile::setPermissions(settingsPath(), QFileDevice::ReadOwner | QFileDevice::WriteOwner |
                                                          QFileDevice::ReadGroup | QFileDevice::ReadOther));
  }

  QTemporaryDir dir;
  std::unique_ptr<UserDefaults> defaults;
  MemoryKeychain keychain;
};

TEST_F(WTPasswordStoreTest, AWorkingKeychainTakesThePasswordAndTheSettingsFileNeverSeesIt) {
  defaults->setValue(kUser, QStringLiteral("ann@example.org"));
  auto store = makeStore();
  EXPECT_EQ(storeNow(*store, kPassword), Location::Keychain);
  EXPECT_EQ(store->password(), kPassword);
  EXPECT_EQ(keychain.entries.value(QStringLiteral("sync-password")), kPassword);
  EXPECT_FALSE(defaults->hasStoredValue(kInFile));
  EXPECT_TRUE(fileBytes().contains("ann@example.org"));
  EXPECT_FALSE(fileBytes().contains("horse"));

  // Another start reads it back from the keychain.
  auto again = makeStore();
  loadNow(*again);
  EXPECT_EQ(again->password(), kPassword);
  EXPECT_EQ(again->location(), Location::Keychain);
}

TEST_F(WTPasswordStoreTest, TheKeychainIsReadOnceAndOnlyForAnAccount) {
  keychain.entries.insert(QStringLiteral("sync-password"), kPassword);
  auto store = makeStore();
  loadNow(*store);
  EXPECT_EQ(keychain.reads, 0) << "no account, no keychain";
  EXPECT_TRUE(store->password().isEmpty());

  defaults->setValue(kUser, QStringLiteral("ann@example.org"));
  loadNow(*store);
  loadNow(*store);
  EXPECT_EQ(store->password(), kPassword);
  EXPECT_EQ(keychain.reads, 1);
  storeNow(*store, QStringLiteral("new one"));
  EXPECT_EQ(store->password(), QStringLiteral("new one"));
  EXPECT_EQ(keychain.reads, 1);
}

TEST_F(WTPasswordStoreTest, WithoutAKeychainThePasswordGoesToASettingsFileOnlyItsOwnerCanRead) {
  keychain.available = false;
  ASSERT_EQ(fileMode(), -1);
  auto store = makeStore();
  EXPECT_EQ(storeNow(*store, kPassword), Location::SettingsFile);
  EXPECT_TRUE(fileBytes().contains("horse"));
  EXPECT_EQ(fileMode(), 0600);

  // Later writes of other settings keep the file private.
  defaults->setValue(QStringLiteral("WTShouldIdle"), true);
  defaults->setValue(kUser, QStringLiteral("ann@example.org"));
  EXPECT_EQ(fileMode(), 0600);

  auto again = makeStore();
  EXPECT_EQ(again->password(), kPassword);
  EXPECT_EQ(again->location(), Location::SettingsFile);
}

TEST_F(WTPasswordStoreTest, AnExistingSettingsFileOthersCouldReadIsClosedBeforeThePasswordGoesIn) {
  defaults->setValue(kUser, QStringLiteral("ann@example.org"));
  makeFileReadableByOthers();
  ASSERT_EQ(fileMode(), 0644);
  keychain.available = false;
  storeNow(*makeStore(), kPassword);
  EXPECT_EQ(fileMode(), 0600);
  EXPECT_TRUE(fileBytes().contains("horse"));
}

TEST_F(WTPasswordStoreTest, AKeychainThatComesBackTakesThePasswordOutOfTheFile) {
  keychain.available = false;
  auto store = makeStore();
  storeNow(*store, kPassword);
  ASSERT_TRUE(fileBytes().contains("horse"));
  keychain.available = true;
  EXPECT_EQ(storeNow(*store, QStringLiteral("battery staple")), Location::Keychain);
  EXPECT_FALSE(fileBytes().contains("horse"));
  EXPECT_FALSE(fileBytes().contains("staple"));
  EXPECT_FALSE(defaults->hasStoredValue(SettingsKeys::kSyncPasswordKeptInFile));
  defaults->setValue(kUser, QStringLiteral("ann@example.org"));
  auto again = makeStore();
  loadNow(*again);
  EXPECT_EQ(again->password(), QStringLiteral("battery staple"));
}

TEST_F(WTPasswordStoreTest, LoadMovesAPasswordFromTheSettingsFileIntoTheKeychainForAnAccountOnly) {
  defaults->setValue(kInFile, kPassword);
  ASSERT_TRUE(fileBytes().contains("horse"));
  loadNow(*makeStore());
  EXPECT_EQ(keychain.writes, 0) << "no account, no keychain";
  defaults->setValue(kUser, QStringLiteral("ann@example.org"));
  // A command uses it where it is.
  auto command = makeStore();
  loadNow(*command, WTPasswordStore::FilePassword::Keep);
  EXPECT_EQ(command->location(), Location::SettingsFile);
  EXPECT_EQ(keychain.writes + keychain.reads, 0);

  auto store = makeStore();
  loadNow(*store);
  EXPECT_EQ(keychain.entries.value(QStringLiteral("sync-password")), kPassword);
  EXPECT_FALSE(defaults->hasStoredValue(kInFile));
  EXPECT_FALSE(fileBytes().contains("horse"));
  EXPECT_EQ(store->password(), kPassword);
  EXPECT_EQ(store->location(), Location::Keychain);
  // Nothing left to move the next time.
  loadNow(*makeStore());
  EXPECT_EQ(keychain.writes, 1);
}

TEST_F(WTPasswordStoreTest, AMoveTheKeychainRefusesLeavesThePasswordInAPrivateFileAndIsNotTriedAgain) {
  defaults->setValue(kUser, QStringLiteral("ann@example.org"));
  defaults->setValue(kInFile, kPassword);
  makeFileReadableByOthers();
  keychain.available = false;
  auto store = makeStore();
  QSignalSpy kept(store.get(), &WTPasswordStore::keptInSettingsFile);
  loadNow(*store);
  EXPECT_TRUE(fileBytes().contains("horse"));
  EXPECT_EQ(fileMode(), 0600);
  EXPECT_EQ(store->password(), kPassword);
  EXPECT_EQ(store->location(), Location::SettingsFile);
  EXPECT_EQ(kept.count(), 1);
  EXPECT_FALSE(store->keychainError().isEmpty());

  // The next start neither asks nor says anything again: the keyring would prompt at every start.
  keychain.available = true;
  auto next = makeStore();
  QSignalSpy keptAgain(next.get(), &WTPasswordStore::keptInSettingsFile);
  loadNow(*next);
  EXPECT_EQ(keychain.writes, 1);
  EXPECT_EQ(next->password(), kPassword);
  EXPECT_EQ(keptAgain.count(), 0);
}

TEST_F(WTPasswordStoreTest, ANewerPasswordInTheFileReplacesTheKeychainsOlderOne) {
  // The file holds a password only when the keychain could not take it, so the file's is the newer.
  defaults->setValue(kUser, QStringLiteral("ann@example.org"));
  keychain.entries.insert(QStringLiteral("sync-password"), QStringLiteral("old"));
  defaults->setValue(kInFile, kPassword);
  loadNow(*makeStore());
  EXPECT_EQ(keychain.entries.value(QStringLiteral("sync-password")), kPassword);
  auto again = makeStore();
  loadNow(*again);
  EXPECT_EQ(again->password(), kPassword);
}

TEST_F(WTPasswordStoreTest, RemovingThePasswordClearsKeychainAndFile) {
  defaults->setValue(kUser, QStringLiteral("ann@example.org"));
  auto store = makeStore();
  storeNow(*store, kPassword);
  defaults->setValue(kInFile, QStringLiteral("stale"));
  store->removePassword();
  EXPECT_TRUE(keychain.entries.isEmpty());
  EXPECT_FALSE(defaults->hasStoredValue(kInFile));
  EXPECT_TRUE(store->password().isEmpty());
  auto again = makeStore();
  loadNow(*again);
  EXPECT_TRUE(again->password().isEmpty());
  // An empty password is no password.
  storeNow(*store, kPassword);
  EXPECT_EQ(storeNow(*store, QString()), Location::None);
  EXPECT_TRUE(keychain.entries.isEmpty());
}

// Sets an environment variable (or removes it, for a null value) while it lives.
class ScopedEnvironment {
 public:
  ScopedEnvironment(const char* name, const QByteArray& value) : name_(name), previous_(qgetenv(name)) {
    if (value.isNull())
      qunsetenv(name);
    else
      qputenv(name, value);
  }
  ~ScopedEnvironment() {
    if (previous_.isNull())
      qunsetenv(name_);
    else
      qputenv(name_, previous_);
  }

 private:
  const char* name_;
  QByteArray previous_;
};

// The real adapter where there is no session bus (a server, an SSH login): nothing is asked, so
// neither D-Bus nor GLib tries to start a bus through a display, and the settings file is where the
// password lives, silently.
TEST_F(WTPasswordStoreTest, WithoutASessionBusTheRealKeychainAsksNothingAndTheFileIsUsedSilently) {
  const QByteArray deadSocket = "unix:path=" + QFile::encodeName(dir.path()) + "/no-bus";
  const QByteArray runtimeWithoutBus = QFile::encodeName(dir.path());
  for (const QByteArray& address : {deadSocket, QByteArray()}) {
    SCOPED_TRACE(address.toStdString());
    ScopedEnvironment bus("DBUS_SESSION_BUS_ADDRESS", address);
    ScopedEnvironment runtime("XDG_RUNTIME_DIR", runtimeWithoutBus);
    WTQtKeychain secrets(QStringLiteral("Tessal test"), 10000);
    std::optional<Result<QString>> read;
    secrets.readPassword(QStringLiteral("sync-password"),
                         [&](const Result<QString>& answer) { read = answer; });
    ASSERT_TRUE(read.has_value()) << "answered at once";
    EXPECT_EQ(read->error().code, WTKeychain::NoSession) << read->error().message.toStdString();

    WTPasswordStore store(defaults.get(),
                          std::make_unique<WTQtKeychain>(QStringLiteral("Tessal test"), 10000));
    QSignalSpy kept(&store, &WTPasswordStore::keptInSettingsFile);
    EXPECT_EQ(storeNow(store, kPassword), Location::SettingsFile);
    EXPECT_EQ(fileMode(), 0600);
    EXPECT_EQ(kept.count(), 0);
    EXPECT_TRUE(store.keychainError().isEmpty());
    EXPECT_FALSE(defaults->hasStoredValue(SettingsKeys::kSyncPasswordKeptInFile));
  }
}

// The real adapter against keyrings that misbehave, on a bus of this process's own. A row whose job
// the service never ends holds up every later job of QtKeychain in the process, so those rows come
// last.
TEST_F(WTPasswordStoreTest, AKeyringThatPromptsRefusesOrDoesNotAnswerNeverHoldsUpTheStore) {
  using fakesecrets::FakeSecretService;
  const QString address = PrivateBus::instance().address();
  ASSERT_FALSE(address.isEmpty()) << "dbus-daemon did not start";
  ScopedEnvironment bus("DBUS_SESSION_BUS_ADDRESS", address.toUtf8());
  FakeSecretService service;
  ASSERT_TRUE(service.start(address));
  WTQtKeychain secrets(QStringLiteral("Tessal test"), 10000);
  struct Row {
    const char* name;
    FakeSecretService::Behaviour behaviour;
    int timeoutMs;
    Location where;
  };
  const Row rows[] = {
      {"prompt answered in time",
       {FakeSecretService::Answer::Keyring, FakeSecretService::Prompt::Accepted, 300},
       10000,
       Location::Keychain},
      {"refuses", {FakeSecretService::Answer::Refuse}, 10000, Location::SettingsFile},
      {"prompt dismissed",
       {FakeSecretService::Answer::Keyring, FakeSecretService::Prompt::Dismissed},
       10000,
       Location::SettingsFile},
      {"prompt answered late",
       {FakeSecretService::Answer::Keyring, FakeSecretService::Prompt::Accepted, 1500},
       300,
       Location::SettingsFile},
      {"never answers", {FakeSecretService::Answer::Never}, 300, Location::SettingsFile},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.name);
    service.setBehaviour(row.behaviour);
    defaults->setValue(kUser, QStringLiteral("ann@example.org"));
    defaults->removeValue(SettingsKeys::kSyncPasswordKeptInFile);
    defaults->setValue(kInFile, kPassword);
    WTPasswordStore store(defaults.get(),
                          std::make_unique<WTQtKeychain>(QStringLiteral("Tessal test"), row.timeoutMs));
    QSignalSpy kept(&store, &WTPasswordStore::keptInSettingsFile);
    std::optional<bool> done;
    store.load([&] { done = true; });
    // Nothing waits for the keyring: the file's password is there at once.
    EXPECT_FALSE(done.has_value());
    EXPECT_EQ(store.password(), kPassword);
    waitFor(done);
    EXPECT_EQ(store.location(), row.where);
    EXPECT_EQ(store.password(), kPassword);
    EXPECT_EQ(fileBytes().contains("horse"), row.where == Location::SettingsFile);
    EXPECT_EQ(kept.count(), row.where == Location::SettingsFile ? 1 : 0);
    if (row.where == Location::SettingsFile) {
      EXPECT_EQ(fileMode(), 0600);
    } else {
      EXPECT_EQ(service.secret(QStringLiteral("sync-password")), kPassword.toUtf8());
    }
    if (row.behaviour.prompt == FakeSecretService::Prompt::Accepted && row.where == Location::SettingsFile) {
      // The late answer still lands in the keyring; the store has moved on, and the file keeps its copy.
      waitUntil([&] { return service.secret(QStringLiteral("sync-password")) == kPassword.toUtf8(); });
      waitUntil([&] { return readNow(secrets).ok(); });
      EXPECT_TRUE(fileBytes().contains("horse"));
    }
  }
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
  const Result<QString> none = readNow(secrets);
  ASSERT_FALSE(none.ok());
  EXPECT_EQ(none.error().code, WTKeychain::EntryNotFound) << none.error().message.toStdString();

  // Through the store: into the keyring, never into the file, and read back by a store of its own.
  defaults->setValue(kUser, QStringLiteral("ann@example.org"));
  defaults->setValue(kInFile, kPassword);
  {
    WTPasswordStore store(defaults.get(),
                          std::make_unique<WTQtKeychain>(QStringLiteral("Tessal test"), 20000));
    loadNow(store);
    ASSERT_EQ(store.location(), Location::Keychain) << store.keychainError().toStdString();
  }
  EXPECT_FALSE(fileBytes().contains("horse"));
  const Result<QString> moved = readNow(secrets);
  ASSERT_TRUE(moved.ok()) << moved.error().message.toStdString();
  EXPECT_EQ(moved.value(), kPassword);

  WTPasswordStore store(defaults.get(), std::make_unique<WTQtKeychain>(QStringLiteral("Tessal test"), 20000));
  loadNow(store);
  EXPECT_EQ(store.password(), kPassword);
  EXPECT_EQ(store.location(), Location::Keychain);
  EXPECT_EQ(storeNow(store, QStringLiteral("battery staple")), Location::Keychain);
  EXPECT_FALSE(fileBytes().contains("staple"));
  EXPECT_EQ(readNow(secrets).value(), QStringLiteral("battery staple"));

  store.removePassword();
  const Result<QString> removed = readNow(secrets);
  ASSERT_FALSE(removed.ok());
  EXPECT_EQ(removed.error().code, WTKeychain::EntryNotFound);
}

}  // namespace
