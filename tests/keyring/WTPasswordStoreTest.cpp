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
const QString kKey = QStringLiteral("sync-password");

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
  keychain.readPassword(kKey, [&](const Result<QString>& read) { answer = read; });
  waitFor(answer);
  return answer.value_or(Result<QString>(Error{-1, QStringLiteral("no answer")}));
}

// The password read, or the error in its place.
QString textOf(const Result<QString>& read) {
  return read.ok() ? read.value() : QStringLiteral("error: ") + read.error().message;
}

Location storeNow(WTPasswordStore& store, const QString& password) {
  std::optional<Location> where;
  store.setPassword(password, [&](Location location) { where = location; });
  waitFor(where);
  return where.value_or(Location::None);
}

std::unique_ptr<WTQtKeychain> realKeychain(int timeoutMs) {
  return std::make_unique<WTQtKeychain>(QStringLiteral("Tessal test"), timeoutMs);
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

  QTemporaryDir dir;
  std::unique_ptr<UserDefaults> defaults;
  MemoryKeychain keychain;
};

// Where the password ends up from each state of account, keychain and settings file, after storing or
// loading it; and what the next start, with a working keychain, makes of that. "x" is the password, "-"
// none. A file password kept after the keychain failed is never offered to the keychain again: the
// keyring would prompt at every start.
TEST_F(WTPasswordStoreTest, ThePasswordGoesWhereTheKeychainStateAllows) {
  const struct {
    const char* name;
    bool account;
    const char *keychainBefore, *fileBefore;
    bool keptBefore, openFile, available;
    const char*
        actions;  // store x, store an empty one, remove it, load it, or "keep" it where it is (a command)
    Location where;
    const char *password, *keychainAfter, *fileAfter;
    int reads, writes, kept, restartWrites;
  } rows[] = {
      {"a working keychain takes it", true, "-", "-", false, false, true, "store", Location::Keychain, "x",
       "x", "-", 0, 1, 0, 0},
      {"without a keychain, a file only its owner reads", false, "-", "-", false, false, false, "store",
       Location::SettingsFile, "x", "-", "x", 0, 1, 1, 0},
      {"a file others could read is closed first", true, "-", "-", false, true, false, "store",
       Location::SettingsFile, "x", "-", "x", 0, 1, 1, 0},
      {"a keychain that comes back takes it out of the file", true, "-", "old", true, false, true, "store",
       Location::Keychain, "x", "x", "-", 0, 1, 0, 0},
      {"load moves the file's into the keychain", true, "-", "x", false, false, true, "load",
       Location::Keychain, "x", "x", "-", 0, 1, 0, 0},
      {"a newer one in the file replaces the keychain's", true, "old", "x", false, false, true, "load",
       Location::Keychain, "x", "x", "-", 0, 1, 0, 0},
      {"without an account load asks nothing", false, "-", "x", false, false, true, "load",
       Location::SettingsFile, "x", "-", "x", 0, 0, 0, 0},
      {"without an account the keychain is not read", false, "x", "-", false, false, true, "load",
       Location::None, "", "x", "-", 0, 0, 0, 0},
      {"a command uses it where it is", true, "-", "x", false, false, true, "keep", Location::SettingsFile,
       "x", "-", "x", 0, 0, 0, 1},
      {"a move the keychain refuses stays in a private file", true, "-", "x", false, true, false, "load",
       Location::SettingsFile, "x", "-", "x", 0, 1, 1, 0},
      {"removing clears keychain and file", true, "x", "old", true, false, true, "remove", Location::None, "",
       "-", "-", 0, 0, 0, 0},
      {"an empty password is no password", true, "-", "-", false, false, true, "store clear", Location::None,
       "", "-", "-", 0, 1, 0, 0},
      {"the keychain is read once", true, "x", "-", false, false, true, "load load store", Location::Keychain,
       "x", "x", "-", 1, 1, 0, 0},
  };
  const auto text = [](const char* value) {
    return value == std::string("x") ? kPassword : QString::fromUtf8(value);
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.name);
    QFile::remove(settingsPath());
    defaults = std::make_unique<UserDefaults>(settingsPath());
    keychain.entries.clear();
    keychain.reads = keychain.writes = 0;
    if (row.account) defaults->setValue(kUser, QStringLiteral("ann@example.org"));
    if (row.keychainBefore != std::string("-")) keychain.entries.insert(kKey, text(row.keychainBefore));
    if (row.fileBefore != std::string("-")) defaults->setValue(kInFile, text(row.fileBefore));
    if (row.keptBefore) defaults->setValue(SettingsKeys::kSyncPasswordKeptInFile, true);
    if (row.openFile) {
      ASSERT_TRUE(QFile::setPermissions(settingsPath(), QFileDevice::ReadOwner | QFileDevice::WriteOwner |
                                                            QFileDevice::ReadGroup | QFileDevice::ReadOther));
      ASSERT_EQ(fileMode(), 0644);
    }
    keychain.available = row.available;
    auto store = makeStore();
    QSignalSpy kept(store.get(), &WTPasswordStore::keptInSettingsFile);
    for (const QString& action : QString::fromLatin1(row.actions).split(' ')) {
      if (action == "store" || action == "clear") {
        storeNow(*store, action == "store" ? kPassword : QString());
      } else if (action == "remove") {
        store->removePassword();
      } else {
        loadNow(*store,
                action == "keep" ? WTPasswordStore::FilePassword::Keep : WTPasswordStore::FilePassword{});
      }
    }
    EXPECT_EQ(store->location(), row.where);
    EXPECT_EQ(store->password(), text(row.password));
    EXPECT_EQ(keychain.entries.value(kKey, "-"), text(row.keychainAfter));
    EXPECT_EQ(defaults->stringForKey(kInFile),
              row.fileAfter == std::string("-") ? QString() : text(row.fileAfter));
    EXPECT_EQ(fileBytes().contains("horse"), row.fileAfter == std::string("x"));
    EXPECT_EQ(keychain.reads, row.reads);
    EXPECT_EQ(keychain.writes, row.writes);
    EXPECT_EQ(kept.count(), row.kept);
    EXPECT_EQ(store->keychainError().isEmpty(), row.kept == 0);
    EXPECT_EQ(defaults->hasStoredValue(SettingsKeys::kSyncPasswordKeptInFile), row.kept > 0);
    // A file the store put the password in stays private, through later writes of other settings too.
    defaults->setValue(QStringLiteral("WTShouldIdle"), true);
    if (row.kept > 0) {
      EXPECT_EQ(fileMode(), 0600);
    }

    keychain.available = true;
    const int writes = keychain.writes;
    auto next = makeStore();
    QSignalSpy keptAgain(next.get(), &WTPasswordStore::keptInSettingsFile);
    loadNow(*next);
    EXPECT_EQ(next->password(), text(row.password)) << "after a restart";
    EXPECT_EQ(keychain.writes - writes, row.restartWrites) << "after a restart";
    EXPECT_EQ(keptAgain.count(), 0) << "after a restart";
  }
}

// Sets an environment variable (unsets it for a null value) until the end of the scope.
class ScopedEnvironment {
 public:
  ScopedEnvironment(const char* name, const QByteArray& value) : name_(name), previous_(qgetenv(name)) {
    set(value);
  }
  ~ScopedEnvironment() { set(previous_); }
  void set(const QByteArray& value) { value.isNull() ? void(qunsetenv(name_)) : void(qputenv(name_, value)); }

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
    const ScopedEnvironment bus("DBUS_SESSION_BUS_ADDRESS", address),
        runtime("XDG_RUNTIME_DIR", runtimeWithoutBus);
    WTQtKeychain secrets(QStringLiteral("Tessal test"), 10000);
    std::optional<Result<QString>> read;
    secrets.readPassword(kKey, [&](const Result<QString>& answer) { read = answer; });
    ASSERT_TRUE(read.has_value()) << "answered at once";
    EXPECT_EQ(read->error().code, WTKeychain::NoSession) << read->error().message.toStdString();

    WTPasswordStore store(defaults.get(), realKeychain(10000));
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
  const ScopedEnvironment bus("DBUS_SESSION_BUS_ADDRESS", address.toUtf8());
  FakeSecretService service;
  ASSERT_TRUE(service.start(address));
  WTQtKeychain secrets(QStringLiteral("Tessal test"), 10000);
  using Answer = FakeSecretService::Answer;
  using Prompt = FakeSecretService::Prompt;
  const struct Row {
    const char* name;
    FakeSecretService::Behaviour behaviour;
    int timeoutMs;
    Location where;
  } rows[] = {
      // clang-format off
      {"prompt answered in time", {Answer::Keyring, Prompt::Accepted, 300}, 10000, Location::Keychain},
      {"refuses", {Answer::Refuse}, 10000, Location::SettingsFile},
      {"prompt dismissed", {Answer::Keyring, Prompt::Dismissed}, 10000, Location::SettingsFile},
      {"prompt answered late", {Answer::Keyring, Prompt::Accepted, 1500}, 300, Location::SettingsFile},
      {"never answers", {Answer::Never}, 300, Location::SettingsFile},
      // clang-format on
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.name);
    service.setBehaviour(row.behaviour);
    defaults->setValue(kUser, QStringLiteral("ann@example.org"));
    defaults->removeValue(SettingsKeys::kSyncPasswordKeptInFile);
    defaults->setValue(kInFile, kPassword);
    WTPasswordStore store(defaults.get(), realKeychain(row.timeoutMs));
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
    if (row.where == Location::Keychain) {
      EXPECT_EQ(service.secret(kKey), kPassword.toUtf8());
    } else {
      EXPECT_EQ(fileMode(), 0600);
    }
    if (row.behaviour.prompt == Prompt::Accepted && row.where == Location::SettingsFile) {
      // The late answer still lands in the keyring; the store has moved on, and the file keeps its copy.
      waitUntil([&] { return service.secret(kKey) == kPassword.toUtf8(); });
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
  EXPECT_EQ(readNow(secrets).error().code, WTKeychain::EntryNotFound);

  // Through the store: into the keyring, never into the file, and read back by a store of its own.
  defaults->setValue(kUser, QStringLiteral("ann@example.org"));
  defaults->setValue(kInFile, kPassword);
  {
    WTPasswordStore store(defaults.get(), realKeychain(20000));
    loadNow(store);
    ASSERT_EQ(store.location(), Location::Keychain) << store.keychainError().toStdString();
  }
  EXPECT_FALSE(fileBytes().contains("horse"));
  EXPECT_EQ(textOf(readNow(secrets)), kPassword);

  WTPasswordStore store(defaults.get(), realKeychain(20000));
  loadNow(store);
  EXPECT_EQ(store.password(), kPassword);
  EXPECT_EQ(store.location(), Location::Keychain);
  EXPECT_EQ(storeNow(store, QStringLiteral("battery staple")), Location::Keychain);
  EXPECT_FALSE(fileBytes().contains("staple"));
  EXPECT_EQ(textOf(readNow(secrets)), QStringLiteral("battery staple"));

  store.removePassword();
  EXPECT_EQ(readNow(secrets).error().code, WTKeychain::EntryNotFound);
}

}  // namespace
