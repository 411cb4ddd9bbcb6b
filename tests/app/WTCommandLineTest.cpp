// `tessal`'s window-less commands as a shell runs them, and the socket that keeps one desktop copy.
#include "CommandLineInstallation.h"
#include "FakeSecretService.h"
#include "PrivateBus.h"
#include "WTSingleInstance.h"

#include <QSignalSpy>
#include <QTcpServer>

#include <atomic>
#include <thread>

namespace {

using namespace commandtest;

// `tessal template`: JSON variables in, text out as a report renders it, errors in order on stderr and
// exit 1; a refusal is one line.
TEST(WTCommandLine, TemplateRendersJsonVariablesAndRefusesInOneLine) {
  Installation here;
  const QString templ = here.file(
      "report.txt",
      "{{ client.name | uppercase }}: {% for item in items %}{{ item.minutes | digiclock }} "
      "{{ item.cost | decimal }} {{ item.cost }}{% if item.billed %} billed{% /if %}\n{% /for %}"
      "{{ count }} {{ ratio }} {{ huge }} {{ items.1.note }}{{ sign | html }}{% bogus %}{% for 1 to 2 %}");
  const QString vars = here.file("vars.json", R"({"client": {"name": "Acme"},
      "items": [{"minutes": 90, "cost": 1234.50, "billed": true, "note": null},
                {"minutes": 5, "cost": 2, "billed": false}],
      "count": 2, "ratio": 0.1, "huge": 123456789012345678901234567890, "sign": "a<b"})");
  const Outcome run = here.expect({"template", templ, "--vars", vars}, 1, "", {{"LANG", "en_US.UTF-8"}});
  EXPECT_EQ(run.out,
            "ACME: 01:30 1,234.50 1234.50 billed\n00:05 2.00 2\n2 0.1 123456789012345678901234567890 a&lt;b");
  // null is absent: the note is no variable.
  EXPECT_EQ(run.err,
            "error 3: \"items.1.note\" is not a valid variable\nerror 2: \"bogus\" is not a valid marker\n"
            "error 6: Finished processing template, but 1 block was left open (for).\n");

  const QString x = here.file("x.txt", "x"), usage = "usage: tessal template";
  const QString bad[] = {here.file("bad1.json", "{\"a\": }"),
                         here.file("bad2.json", "[1, 2]"),
                         here.file("bad3.json", ""),
                         here.path("none.json"),
                         here.path("missing.txt"),
                         here.file("latin1.txt", "Gr\xfc\xdf\x65"),
                         here.path("")};
  // 2 for what the user typed wrong, 1 when the template gave no result (a folder is no text).
  const QString t = "template";
  const std::tuple<QStringList, int, QString> cases[] = {
      // clang-format off
      {{t, bad[4]}, 2, bad[4]}, {{t, x, "--vars", bad[0]}, 2, bad[0]}, {{t, x, "--vars", bad[1]}, 2, bad[1]},
      {{t, x, "--vars", bad[2]}, 2, bad[2]}, {{t, x, "--vars", bad[3]}, 2, bad[3]}, {{t, bad[5]}, 1, "latin1.txt"},
      {{t, bad[6]}, 1, bad[6]}, {{t}, 2, usage}, {{t, x, x}, 2, usage}, {{t, x, "--vars"}, 2, usage},
      {{t, "--verbose", x}, 2, usage},
      // Neither a command nor a Qt option: refused with a usage line before anything needs a display.
      {{"frobnicate"}, 2, "usage: tessal"}, {{"--nope"}, 2, "usage: tessal"}, {{"-session"}, 2, "usage: tessal"},
      // clang-format on
  };
  for (const auto& [arguments, code, says] : cases) {
    const Outcome refused = here.expect(arguments, code, says);
    const qsizetype lines = arguments[0] == t ? refused.err.count(u'\n') : 1;  // a usage text may be longer
    EXPECT_EQ(refused.out + QString::number(lines), "1") << refused.err.toStdString();
  }
  EXPECT_EQ(here.out({"template", "--vars", here.file("v.json", "{}"), x}), "x");
  for (const char* flag : {"--help", "-h"})
    for (const char* line :
         {"tessal template TEMPLATE_FILE", "tessal sync", "tessal add TASK (DURATION | START-END)"})
      here.expect({flag}, 0, line);
  EXPECT_EQ(here.tessal({"--version"}).code, 0);
  EXPECT_FALSE(QFile::exists(here.storePath()));
}

TEST(WTCommandLine, SyncRefusesWhileTheDesktopCopyRuns) {
  Installation here;
  WTSingleInstance desktop(here.runtimeFolder() + "/tessal.socket");
  ASSERT_TRUE(desktop.start());
  here.expect({"sync"}, 1, "Tessal is running");
  EXPECT_FALSE(QFile::exists(here.storePath()));  // the running copy's store is not opened twice
}

// A start while `tessal sync` waits on its server finds the store held by the sync, which carries it out.
TEST(WTCommandLine, AStartDuringASyncIsCarriedOutByTheSync) {
  Installation here;
  QTcpServer silent;  // takes the connection and never answers
  ASSERT_TRUE(silent.listen(QHostAddress::LocalHost));
  here.setSetting("WTSyncServer", QStringLiteral("http://127.0.0.1:%1").arg(silent.serverPort()));
  here.setSetting("WTSyncUser", "ann@example.org");
  here.setSetting("WTSyncPassword", "a password");
  const std::unique_ptr<QProcess> sync = here.launch({"sync", "--timeout", "3"});
  ASSERT_TRUE(silent.waitForNewConnection(20000));
  here.expect({"start", "Review", "--project", "Work", "--create"}, 0, "Started");
  EXPECT_EQ(Installation::finish(*sync).code, 1);  // not in step: the server never answered
  here.expect({"status"}, 0, "Review");
}

// `tessal sync` says once where its password came from, and never hangs on a keyring.
TEST(WTCommandLineKeyring, SyncNamesThePasswordsStoreAndNeverHangsOnTheKeyring) {
  const QString address = PrivateBus::instance().address();
  fakesecrets::FakeSecretService keyring;
  ASSERT_TRUE(keyring.start(address)) << "dbus-daemon did not start";
  keyring.setBehaviour({fakesecrets::FakeSecretService::Answer::Never});
  const std::pair<QString, QString> rows[] = {
      // bus (empty: none), what is said; a password in the settings file only without a bus
      {{}, "Using the password in the settings file ("},
      {address,
       "The secret service gave no password (The secret service did not answer within 5 seconds); "
       "the settings file ("},
  };
  for (const auto& [bus, said] : rows) {
    SCOPED_TRACE(said.toStdString());
    Installation here;
    here.setSetting("WTSyncUser", "ann@example.org");
    if (bus.isEmpty()) here.setSetting("WTSyncPassword", "a password");
    const Outcome run = here.expect({"sync", "--timeout", "5"}, 1, said, {{"DBUS_SESSION_BUS_ADDRESS", bus}});
    EXPECT_EQ(run.err.count(said), 1) << "said once";
    EXPECT_FALSE(run.err.contains("No secret service") || run.err.contains("D-Bus")) << run.err.toStdString();
  }
}

// A busy copy keeps its socket (a takeover would open its store twice); a dead copy's socket is taken.
TEST(WTSingleInstanceTest, OneCopyKeepsTheSocketWhileItLives) {
  QTemporaryDir dir;
  const QString path = dir.filePath("tessal.socket");
  {
    WTSingleInstance first(path);
    ASSERT_TRUE(first.start() && first.isListening());
    QSignalSpy reopened(&first, &WTSingleInstance::reopenRequested);
    // The second copy runs elsewhere (its own thread here) while the first keeps serving events.
    auto startSecondCopy = [&](bool bringForward) {
      std::atomic<int> started{-1};
      std::thread second([&] { started = WTSingleInstance(path).start(bringForward) ? 1 : 0; });
      EXPECT_TRUE(QTest::qWaitFor([&] { return started != -1; }, 5000));
      second.join();
      return started.load();
    };
    EXPECT_EQ(startSecondCopy(true), 0);
    EXPECT_EQ(reopened.count(), 1);
    EXPECT_EQ(startSecondCopy(false), 0);
    EXPECT_EQ(reopened.count(), 1);
    WTSingleInstance second(path);  // asks from this thread, so the first cannot answer meanwhile
    EXPECT_FALSE(second.start(false) || second.isListening());
    EXPECT_TRUE(first.isListening() && QFile::exists(path));
  }
  QFile::remove(path);
  ASSERT_TRUE(QFile(path).open(QIODevice::WriteOnly));
  WTSingleInstance instance(path);
  EXPECT_TRUE(instance.start() && instance.isListening());
  // Nobody else listens: asking a copy to come forward reaches nobody.
  EXPECT_FALSE(WTSingleInstance(dir.filePath("other.socket")).notifyRunningInstance(200));
}

}  // namespace
