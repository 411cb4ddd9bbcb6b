// The `tessal` executable's window-less commands, run as a user's shell would run them: a separate
// process with its own data and settings folders.
#include "CommandLineInstallation.h"
#include "FakeSecretService.h"
#include "PrivateBus.h"
#include "SyncTestSupport.h"
#include "WTSingleInstance.h"

#include <gtest/gtest.h>

#include <QTest>

namespace {

using commandtest::Installation;
using commandtest::Outcome;

TEST(WTCommandLine, TemplatePrintsExactlyWhatTheEngineProduced) {
  Installation here;
  const QString templateFile = here.file(
      "report.txt",
      "{% for p in projects %}{{ p.name | uppercase }}: {{ p.minutes | digiclock }}\n{% /for %}{{ nobody }}");
  const QString vars = here.file("vars.json", R"({"projects": [{"name": "Atlas", "minutes": 95}]})");
  const Outcome rendered = here.tessal({"template", templateFile, "--vars", vars});
  EXPECT_EQ(rendered.code, 0) << rendered.err.toStdString();
  EXPECT_EQ(rendered.out, "ATLAS: 01:35\n");
  EXPECT_EQ(rendered.err, "error 3: \"nobody\" is not a valid variable\n");
}

TEST(WTCommandLine, HelpAndBadArgumentsNeedNoDisplay) {
  Installation here;
  for (const char* flag : {"--help", "-h"}) {
    const Outcome help = here.tessal({flag});
    EXPECT_EQ(help.code, 0) << flag << ": " << help.err.toStdString();
    EXPECT_TRUE(help.out.contains("tessal template TEMPLATE_FILE")) << help.out.toStdString();
    EXPECT_TRUE(help.out.contains("tessal sync")) << help.out.toStdString();
    EXPECT_TRUE(help.out.contains("tessal add TASK (DURATION | START-END)")) << help.out.toStdString();
  }
  EXPECT_EQ(here.tessal({"--version"}).code, 0);
  // Neither a command nor a Qt option: refused with a usage line before anything needs a display.
  for (const QStringList& bad : {QStringList{"frobnicate"}, QStringList{"--nope"}, QStringList{"-session"}}) {
    const Outcome run = here.tessal(bad);
    EXPECT_EQ(run.code, 2) << bad.join(' ').toStdString() << ": " << run.err.toStdString();
    EXPECT_TRUE(run.err.contains("usage: tessal")) << run.err.toStdString();
    EXPECT_EQ(run.out, "");
  }
  EXPECT_FALSE(QFile::exists(here.storePath()));
}

TEST(WTCommandLine, SyncRefusesWhileTheDesktopCopyRuns) {
  Installation here;
  WTSingleInstance desktop(here.runtimeFolder() + "/tessal.socket");
  ASSERT_TRUE(desktop.start());
  const Outcome run = here.tessal({"sync"});
  EXPECT_EQ(run.code, 1);
  EXPECT_TRUE(run.err.contains("Tessal is running")) << run.err.toStdString();
  EXPECT_FALSE(QFile::exists(here.storePath()));  // the running copy's store is not opened twice
}

// A first start of the desktop copy with a password an earlier version left in the settings file, and a
// keyring whose default collection does not exist yet: its prompt is never answered. The window and the
// store come first, and the keyring is asked only for an account.
TEST(WTCommandLine, TheDesktopStartsWithoutWaitingForTheKeyringAndAsksItOnlyForAnAccount) {
  using fakesecrets::FakeSecretService;
  const QString address = PrivateBus::instance().address();
  ASSERT_FALSE(address.isEmpty()) << "dbus-daemon did not start";
  FakeSecretService keyring;
  ASSERT_TRUE(keyring.start(address));
  keyring.setBehaviour({FakeSecretService::Answer::Keyring, FakeSecretService::Prompt::Never});
  for (const bool account : {false, true}) {
    SCOPED_TRACE(account ? "an account" : "no account");
    Installation here;
    if (account) here.setSetting("WTSyncUser", "ann@example.org");
    here.setSetting("WTSyncPassword", "a password");
    const int callsBefore = keyring.calls();
    std::unique_ptr<QProcess> desktop =
        here.launch({}, {{"QT_QPA_PLATFORM", "offscreen"}, {"DBUS_SESSION_BUS_ADDRESS", address}});
    // The store is made once the window shows. The keyring would hold a start that waited for it for
    // as long as it waits itself (half a minute and more).
    EXPECT_TRUE(synctest::waitUntil([&] { return QFile::exists(here.storePath()); }, 10000))
        << desktop->readAllStandardError().toStdString();
    const WTSingleInstance probe(here.runtimeFolder() + "/tessal.socket");
    EXPECT_TRUE(synctest::waitUntil([&] { return probe.notifyRunningInstance(1000, false); }, 10000));
    if (account) {
      EXPECT_TRUE(synctest::waitUntil([&] { return keyring.calls() > callsBefore; }, 10000))
          << "the move is tried";
    } else {
      QTest::qWait(500);
      EXPECT_EQ(keyring.calls(), callsBefore) << "no account: the keyring is left alone";
    }
    desktop->kill();
    desktop->waitForFinished();
    QFile settings(here.path("config/Tessal/Tessal.conf"));
    ASSERT_TRUE(settings.open(QIODevice::ReadOnly));
    EXPECT_TRUE(settings.readAll().contains("a password")) << "the password stays until the keyring takes it";
  }
}

// `tessal sync` says once where its password came from. Without a session bus the settings file is the
// store, and nothing else is said; a keyring that does not answer costs a few seconds and is named.
TEST(WTCommandLine, SyncNamesThePasswordsStoreAndNeverHangsOnTheKeyring) {
  using fakesecrets::FakeSecretService;
  const QString address = PrivateBus::instance().address();
  ASSERT_FALSE(address.isEmpty()) << "dbus-daemon did not start";
  FakeSecretService keyring;
  ASSERT_TRUE(keyring.start(address));
  keyring.setBehaviour({FakeSecretService::Answer::Never});
  struct Row {
    const char* name;
    QString bus;  // empty: none at all
    QString password;
    QString said;
    QString server = {};  // empty: none set
  };
  const Row rows[] = {
      {"no session bus", {}, "a password", "Using the password in the settings file ("},
      {"a keyring that never answers",
       address,
       {},
       "The secret service gave no password (The secret service did not answer within 5 seconds); the "
       "settings "
       "file ("},
      // The password is read once for the whole exchange, even one that fails at once.
      {"a server that refuses",
       {},
       "a password",
       "Using the password in the settings file (",
       "http://127.0.0.1:1"},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.name);
    Installation here;
    here.setSetting("WTSyncUser", "ann@example.org");
    if (!row.password.isEmpty()) here.setSetting("WTSyncPassword", row.password);
    if (!row.server.isEmpty()) here.setSetting("WTSyncServer", row.server);
    QProcess sync;
    QProcessEnvironment environment = here.environment();
    if (row.bus.isEmpty())
      environment.remove("DBUS_SESSION_BUS_ADDRESS");
    else
      environment.insert("DBUS_SESSION_BUS_ADDRESS", row.bus);
    sync.setProcessEnvironment(environment);
    sync.start(QString::fromUtf8(TESSAL_EXE), {"sync", "--timeout", "5"});
    const Outcome run = Installation::finish(sync);
    EXPECT_EQ(run.code, 1) << "no server is set, or it refuses";
    EXPECT_EQ(run.err.count(row.said), 1) << run.err.toStdString();
    EXPECT_FALSE(run.err.contains("No secret service")) << run.err.toStdString();
    EXPECT_FALSE(run.err.contains("D-Bus")) << run.err.toStdString();
  }
}

}  // namespace
