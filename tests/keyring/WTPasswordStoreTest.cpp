#include "FakeSecretService.h"
#include "MemoryKeychain.h"
#include "SettingsKeys.h"
#include "TestFiles.h"
#include "UserDefaults.h"
#include "WTPasswordStore.h"
#include "WTQtKeychain.h"

#include <gtest/gtest.h>

#include <QCoreApplication>
#include <QFile>
#include <QLibrary>
#include <QProcess>
#include <QSignalSpy>
#include <QStandardPaths>
#include <QTemporaryDir>

#include <sys/stat.h>

#include <functional>
#include <memory>
#include <optional>

namespace {

using Location = WTPasswordStore::Location;
const QString kPassword = QStringLiteral("correct horse battery");
const QString kUser = QStringLiteral("WTSyncUser");
const QString kInFile = QStringLiteral("WTSyncPassword");
const QString kKey = QStringLiteral("sync-password");

// Runs the event loop until `answered` holds, for at most 30 seconds.
void waitUntil(const std::function<bool()>& answered) {
  EXPECT_TRUE(waitForBus(answered, 30000)) << "no answer within 30 seconds";
}

Result<QString> readNow(WTKeychain& keychain) {
  std::optional<Result<QString>> answer;
  keychain.readPassword(kKey, [&](const Result<QString>& read) { answer = read; });
  waitUntil([&] { return answer.has_value(); });
  return answer.value_or(Result<QString>(Error{-1, QStringLiteral("no answer")}));
}

// The password read, or the error in its place.
const auto textOf = [](const Result<QString>& read) {
  return read.ok() ? read.value() : "error: " + read.error().message;
};

Location storeNow(WTPasswordStore& store, const QString& password) {
  std::optional<Location> where;
  store.setPassword(password, [&](Location location) { where = location; });
  waitUntil([&] { return where.has_value(); });
  return where.value_or(Location::None);
}

const auto realKeychain = [](int timeoutMs) {
  return std::make_unique<WTQtKeychain>("Tessal test", timeoutMs);
};

void loadNow(WTPasswordStore& store, WTPasswordStore::FilePassword filePassword = {}) {
  bool done = false;
  store.load([&] { done = true; }, filePassword);
  waitUntil([&] { return done; });
}

class WTPasswordStoreTest : public ::testing::Test {
 protected:
  // A bus or runtime folder a test sets is its own.
  void TearDown() override { qputenv("DBUS_SESSION_BUS_ADDRESS", bus), qputenv("XDG_RUNTIME_DIR", runtime); }
  QString settingsPath() const { return dir.filePath(QStringLiteral("config/Tessal/Tessal.conf")); }
  std::unique_ptr<WTPasswordStore> makeStore() {
    return std::make_unique<WTPasswordStore>(defaults.get(), std::make_unique<SharedKeychain>(keychain));
  }
  QByteArray fileBytes() const { return ::fileBytes(settingsPath()); }
  int fileMode() const {
    struct stat info {};
    return ::stat(QFile::encodeName(settingsPath()).constData(), &info) ? -1 : int(info.st_mode & 07777);
  }
  void accountWithPasswordInFile() {
    defaults->setValue(kUser, QStringLiteral("ann@example.org"));
    defaults->removeValue(SettingsKeys::kSyncPasswordKeptInFile);
    defaults->setValue(kInFile, kPassword);
  }

  QTemporaryDir dir;
  std::unique_ptr<UserDefaults> defaults = std::make_unique<UserDefaults>(settingsPath());
  MemoryKeychain keychain;
  const QByteArray bus = qgetenv("DBUS_SESSION_BUS_ADDRESS"), runtime = qgetenv("XDG_RUNTIME_DIR");
};

// A file password kept after the keychain failed is never offered again: the keyring would prompt at each
// start.
TEST_F(WTPasswordStoreTest, ThePasswordGoesWhereTheKeychainStateAllows) {
  // Before: account (y/n), keychain's and file's password (x, -), kept in file, file open to others,
  // keychain up. After: location, password, keychain's, file's, keychain reads and writes, times kept in
  // the file, and keychain writes at the next start.
  // clang-format off
  const struct { const char *name, *before, *actions, *after; } rows[] = {
      {"a working keychain takes it", "y - - n n y", "store", "K x x - 0 1 0 0"},
      {"without a keychain, a file only its owner reads", "n - - n n n", "store", "S x - x 0 1 1 0"},
      {"a file others could read is closed first", "y - - n y n", "store", "S x - x 0 1 1 0"},
      {"a keychain that comes back takes it out of the file", "y - old y n y", "store", "K x x - 0 1 0 0"},
      {"load moves the file's into the keychain", "y - x n n y", "load", "K x x - 0 1 0 0"},
      {"a newer one in the file replaces the keychain's", "y old x n n y", "load", "K x x - 0 1 0 0"},
      {"without an account load asks nothing", "n - x n n y", "load", "S x - x 0 0 0 0"},
      {"without an account the keychain is not read", "n x - n n y", "load", "N - x - 0 0 0 0"},
      {"a command uses it where it is", "y - x n n y", "keep", "S x - x 0 0 0 1"},
      {"a move the keychain refuses stays in a private file", "y - x n y n", "load", "S x - x 0 1 1 0"},
      {"removing clears keychain and file", "y x old y n y", "remove", "N - - - 0 0 0 0"},
      {"an empty password is no password", "y - - n n y", "store clear", "N - - - 0 1 0 0"},
      {"the keychain is read once", "y x - n n y", "load load store", "K x x - 1 1 0 0"},
  };
  // clang-format on
  const auto text = [](const QString& value) {
    return value == "x" ? kPassword : value == "-" ? QString() : value;
  };
  const auto token = [](const QString& value) {
    return value == kPassword ? "x" : value.isEmpty() ? "-" : value;
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.name);
    QFile::remove(settingsPath());
    defaults = std::make_unique<UserDefaults>(settingsPath());
    keychain = MemoryKeychain();
    const QStringList before = QString::fromLatin1(row.before).split(' ');
    if (before[0] == "y") defaults->setValue(kUser, QStringLiteral("ann@example.org"));
    if (before[1] != "-") keychain.entries.insert(kKey, text(before[1]));
    if (before[2] != "-") defaults->setValue(kInFile, text(before[2]));
    if (before[3] == "y") defaults->setValue(SettingsKeys::kSyncPasswordKeptInFile, true);
    if (before[4] == "y") {
      ASSERT_TRUE(QFile::setPermissions(settingsPath(), QFileDevice::ReadOwner | QFileDevice::WriteOwner |
                                                            QFileDevice::ReadGroup | QFileDevice::ReadOther));
      ASSERT_EQ(fileMode(), 0644);
    }
    keychain.available = before[5] == "y";
    auto store = makeStore();
    QSignalSpy kept(store.get(), &WTPasswordStore::keptInSettingsFile);
    for (const QString& action : QString::fromLatin1(row.actions).split(' ')) {
      if (action == "remove")
        store->removePassword();
      else if (action == "store" || action == "clear")
        storeNow(*store, action == "store" ? kPassword : QString());
      else
        loadNow(*store,
                action == "keep" ? WTPasswordStore::FilePassword::Keep : WTPasswordStore::FilePassword{});
    }
    const QString password = store->password(), inFile = defaults->stringForKey(kInFile),
                  inKeychain = keychain.entries.value(kKey);
    EXPECT_TRUE(fileBytes().contains("horse") == (inFile == kPassword) &&
                store->keychainError().isEmpty() == kept.isEmpty() &&
                defaults->hasStoredValue(SettingsKeys::kSyncPasswordKeptInFile) == !kept.isEmpty());
    // A file the store put the password in stays private, through later writes of other settings too.
    defaults->setValue(QStringLiteral("WTShouldIdle"), true);
    EXPECT_TRUE(kept.count() == 0 || fileMode() == 0600) << fileMode();

    keychain.available = true;
    const int reads = keychain.reads, writes = keychain.writes;
    auto next = makeStore();
    QSignalSpy keptAgain(next.get(), &WTPasswordStore::keptInSettingsFile);
    loadNow(*next);
    EXPECT_TRUE(next->password() == password && keptAgain.isEmpty()) << "after a restart";
    const QString where[] = {"N", "K", "S"};
    EXPECT_EQ(QStringList({where[int(store->location())], token(password), token(inKeychain), token(inFile),
                           QString::number(reads), QString::number(writes), QString::number(kept.count()),
                           QString::number(keychain.writes - writes)})
                  .join(' '),
              row.after);
  }
}

// Without a session bus (a server, SSH) nothing may start one through a display; the file is used silently.
TEST_F(WTPasswordStoreTest, WithoutASessionBusTheRealKeychainAsksNothingAndTheFileIsUsedSilently) {
  for (const QByteArray& address : {"unix:path=" + QFile::encodeName(dir.path()) + "/no-bus", QByteArray()}) {
    SCOPED_TRACE(address.toStdString());
    address.isNull() ? qunsetenv("DBUS_SESSION_BUS_ADDRESS") : qputenv("DBUS_SESSION_BUS_ADDRESS", address);
    qputenv("XDG_RUNTIME_DIR", QFile::encodeName(dir.path()));
    WTQtKeychain secrets(QStringLiteral("Tessal test"), 10000);
    std::optional<Result<QString>> read;
    secrets.readPassword(kKey, [&](const Result<QString>& answer) { read = answer; });
    ASSERT_TRUE(read.has_value()) << "answered at once";
    EXPECT_EQ(read->error().code, WTKeychain::NoSession) << read->error().message.toStdString();

    WTPasswordStore store(defaults.get(), realKeychain(10000));
    QSignalSpy kept(&store, &WTPasswordStore::keptInSettingsFile);
    EXPECT_EQ(storeNow(store, kPassword), Location::SettingsFile);
    EXPECT_EQ(fileMode(), 0600);
    EXPECT_TRUE(kept.isEmpty() && store.keychainError().isEmpty() &&
                !defaults->hasStoredValue(SettingsKeys::kSyncPasswordKeptInFile));
  }
}

// A job the service never ends holds up every later job of QtKeychain in the process: such rows come last.
TEST_F(WTPasswordStoreTest, AKeyringThatPromptsRefusesOrDoesNotAnswerNeverHoldsUpTheStore) {
  using fakesecrets::FakeSecretService;
  using Answer = FakeSecretService::Answer;
  using Prompt = FakeSecretService::Prompt;
  const QString address = PrivateBus::instance().address();
  ASSERT_FALSE(address.isEmpty()) << "dbus-daemon did not start";
  qputenv("DBUS_SESSION_BUS_ADDRESS", address.toUtf8());
  FakeSecretService service;
  ASSERT_TRUE(service.start(address));
  WTQtKeychain secrets(QStringLiteral("Tessal test"), 10000);
  const std::tuple<const char*, FakeSecretService::Behaviour, int, Location> rows[] = {
      {"prompt answered in time", {Answer::Keyring, Prompt::Accepted, 300}, 10000, Location::Keychain},
      {"refuses", {Answer::Refuse}, 10000, Location::SettingsFile},
      {"prompt dismissed", {Answer::Keyring, Prompt::Dismissed}, 10000, Location::SettingsFile},
      {"prompt answered late", {Answer::Keyring, Prompt::Accepted, 1500}, 300, Location::SettingsFile},
      {"never answers", {Answer::Never}, 300, Location::SettingsFile},
  };
  for (const auto& [name, behaviour, timeoutMs, where] : rows) {
    SCOPED_TRACE(name);
    service.setBehaviour(behaviour);
    accountWithPasswordInFile();
    WTPasswordStore store(defaults.get(), realKeychain(timeoutMs));
    QSignalSpy kept(&store, &WTPasswordStore::keptInSettingsFile);
    bool done = false;
    store.load([&] { done = true; });
    // Nothing waits for the keyring: the file's password is there at once.
    EXPECT_FALSE(done);
    EXPECT_EQ(store.password(), kPassword);
    waitUntil([&] { return done; });
    const bool inFile = where == Location::SettingsFile;
    EXPECT_EQ(
        std::tuple(store.location(), store.password(), fileBytes().contains("horse"), int(kept.count())),
        std::tuple(where, kPassword, inFile, inFile ? 1 : 0));
    EXPECT_TRUE(inFile ? fileMode() == 0600 : service.secret(kKey) == kPassword.toUtf8());
    if (behaviour.prompt == Prompt::Accepted && inFile) {
      // The late answer still lands in the keyring; the store has moved on, and the file keeps its copy.
      waitUntil([&] { return service.secret(kKey) == kPassword.toUtf8(); });
      waitUntil([&] { return readNow(secrets).ok(); });
      EXPECT_TRUE(fileBytes().contains("horse"));
    }
  }
}

// gnome-keyring on a bus of its own: the test runs itself again in that session.
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
    environment.insert("XDG_DATA_HOME", dir.filePath("keyring-data"));  // the keyring's files
    for (const char* display : {"DISPLAY", "WAYLAND_DISPLAY"}) environment.remove(display);
    child.setProcessEnvironment(environment);
    child.start(
        runSession,
        {"--", "sh", "-c",
         "printf %s throwaway | gnome-keyring-daemon --unlock --components=secrets >/dev/null || exit 3\n"
         "TESSAL_TEST_KEYRING_BUS=\"$DBUS_SESSION_BUS_ADDRESS\" exec \"$0\" "
         "--gtest_filter=WTPasswordStoreTest.APasswordMakesARoundTripThroughARealKeyring",
         QCoreApplication::applicationFilePath()});
    ASSERT_TRUE(child.waitForFinished(60000));
    const QString output = QString::fromLocal8Bit(child.readAll());
    // The child really ran the round trip, not a skip.
    EXPECT_TRUE(child.exitCode() == 0 && output.contains("[  PASSED  ] 1 test") &&
                !output.contains("SKIPPED"))
        << output.toStdString();
    return;
  }

  qputenv("DBUS_SESSION_BUS_ADDRESS", childBus);
  WTQtKeychain secrets(QStringLiteral("Tessal test"), 20000);
  EXPECT_EQ(readNow(secrets).error().code, WTKeychain::EntryNotFound);

  accountWithPasswordInFile();
  {
    WTPasswordStore store(defaults.get(), realKeychain(20000));
    loadNow(store);
    ASSERT_EQ(store.location(), Location::Keychain) << store.keychainError().toStdString();
  }
  EXPECT_FALSE(fileBytes().contains("horse"));
  EXPECT_EQ(textOf(readNow(secrets)), kPassword);

  WTPasswordStore store(defaults.get(), realKeychain(20000));
  loadNow(store);
  EXPECT_EQ(std::pair(store.password(), store.location()), std::pair(kPassword, Location::Keychain));
  EXPECT_EQ(storeNow(store, QStringLiteral("battery staple")), Location::Keychain);
  EXPECT_FALSE(fileBytes().contains("staple"));
  EXPECT_EQ(textOf(readNow(secrets)), QStringLiteral("battery staple"));

  store.removePassword();
  EXPECT_EQ(readNow(secrets).error().code, WTKeychain::EntryNotFound);
}

}  // namespace
