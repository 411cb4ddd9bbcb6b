// The real `tessal` commands over a real store file, alone or beside a desktop copy holding the store.
#include "CommandLineInstallation.h"
#include "TestFiles.h"
#include "WTCommandArguments.h"
#include "WTSingleInstance.h"

#include <QColor>
#include <QElapsedTimer>
#include <QJsonArray>
#include <QJsonDocument>
#include <QJsonObject>
#include <QRegularExpression>
#include <QThread>
#include <QTimeZone>

#include <cmath>

namespace {

using namespace commandtest;

const QMap<QString, QString> kBerlin = {{"TZ", "Europe/Berlin"}, {"LANG", "C.UTF-8"}};
const QString kQuoted = QStringLiteral("Build \"it\" now");

Date berlin(int month, int day, int hour, int minute = 0) {
  return Date::fromQDateTime(
      QDateTime(QDate(2026, month, day), QTime(hour, minute), QTimeZone("Europe/Berlin")));
}

// A store file with its write-ahead log.
QByteArray storeBytes(const QString& path) {
  return fileBytes(path) + fileBytes(path + "-wal");
}

// Acme's Atlas (in francs) and client-less Hermes both have a "Design"; one name holds quotes. Nothing runs.
class TrackCommand : public ::testing::Test {
 protected:
  void SetUp() override {
    std::unique_ptr<WTObjectContext> context = here.openStore();
    auto* acme = WTClient::insertNewObject(context.get());
    acme->setName("Acme");
    acme->setRate(Decimal::fromString(u"80"));
    acme->setCurrency("CHF");
    WTProject* atlas = project(*context, "Atlas", acme);
    WTProject* hermes = project(*context, "Hermes");
    hermes->setRate(Decimal::fromString(u"100"));
    task(*context, atlas, "Design")->setColor(QColor(255, 0, 0, 128));
    task(*context, atlas, kQuoted);
    task(*context, hermes, "Design");
    addTime(*context, task(*context, hermes, "Review"), berlin(3, 3, 9), berlin(3, 3, 10, 15));
    ASSERT_TRUE(context->save());
  }

  // "PROJECT/TASK" of each running entry, sorted, as the store file holds them now.
  QStringList running() const {
    QStringList result;
    const std::unique_ptr<WTObjectContext> context = here.readStore();
    for (const WTTime* time : context->fetch<WTTime>())
      if (time->running()) result << time->task()->project()->name() + "/" + time->task()->name();
    result.sort();
    return result;
  }
  qsizetype times() const { return here.readStore()->fetch<WTTime>().size(); }

  // A desktop copy on this installation, offscreen, once it answers on its socket.
  std::unique_ptr<QProcess> startDesktop() const {
    std::unique_ptr<QProcess> desktop = here.launch({}, {{"QT_QPA_PLATFORM", "offscreen"}});
    EXPECT_TRUE(desktop->waitForStarted());
    const WTSingleInstance probe(here.runtimeFolder() + "/tessal.socket");
    QElapsedTimer waited;
    waited.start();
    while (!probe.notifyRunningInstance(1000, false) && waited.elapsed() < 30000) QThread::msleep(20);
    EXPECT_EQ(desktop->state(), QProcess::Running) << desktop->readAllStandardError().toStdString();
    return desktop;
  }

  Installation here{kBerlin};
};

TEST_F(TrackCommand, StartsStopsAndTellsWhatRunsOnTheStoreItself) {
  EXPECT_EQ(here.expect({"status"}, 1, "").out, "No timer is running\n");
  EXPECT_EQ(here.out({"start", "design", "--project", "ATLAS"}), "Started Atlas › Design\n");
  // A developer's logging rules still show the journal's lines; without them stderr stays empty.
  EXPECT_TRUE(
      here.expect({"start", kQuoted.toUpper()}, 0, "", {{"QT_LOGGING_RULES", "tessal.sync.debug=true"}})
          .err.contains("tessal.sync: INSERT("));
  EXPECT_EQ(running(), QStringList({"Atlas/" + kQuoted, "Atlas/Design"}));
  EXPECT_EQ(times(), 3);

  const Outcome status = here.expect({"status"}, 0, "Atlas › " + kQuoted + "  00:0");
  EXPECT_TRUE(status.out.count('\n') == 3 && status.out.contains("\nTotal  00:0"))
      << status.out.toStdString();
  const QJsonObject json = QJsonDocument::fromJson(here.tessal({"status", "--json"}).out.toUtf8()).object();
  ASSERT_EQ(json["running"].toArray().size(), 2);
  EXPECT_EQ(json["running"][0]["client"].toString() + " " + json["running"][0]["task"].toString(),
            "Acme Design")
      << "oldest first";

  const Outcome stopped = here.expect({"stop", kQuoted}, 0, "");
  EXPECT_TRUE(stopped.out.startsWith("Stopped Atlas › " + kQuoted + "  ") && stopped.err.isEmpty())
      << stopped.err.toStdString();
  EXPECT_EQ(running(), QStringList({"Atlas/Design"}));
  EXPECT_EQ(here.out({"stop", "review"}), "Hermes › Review is not running\n");
  EXPECT_TRUE(here.expect({"stop"}, 0, "").out.startsWith("Stopped Atlas › Design"));
  EXPECT_EQ(here.out({"stop"}), "No timer is running\n");
  // `tessal` loads no GUI library, so it keeps a colour as the store's text: rewritten, the task keeps it.
  QStringList colors;
  const std::unique_ptr<WTObjectContext> context = here.readStore();
  for (const WTTask* task : context->fetch<WTTask>())
    if (!task->color().isNull()) colors << task->name() + " " + WTObject::colorText(task->color());
  EXPECT_EQ(colors, QStringList({"Design #80ff0000"}));
  // The entries wait in the sync journal, as the desktop copy's own changes do.
  // Each entry's stop joined its start's insertion, read back from the store by the stopping command.
  EXPECT_EQ(here.journal().filter(QRegularExpression("@WTTime i .*\"endDate\"")).size(), 2);
  EXPECT_EQ(here.journal().filter(QRegularExpression("@WTTime u ")).size(), 0);
}

TEST_F(TrackCommand, StartingStopsTheOtherTimersWhenTheSettingSaysSo) {
  here.setSetting("WTStopsOtherTimes", "YES");
  ASSERT_EQ(here.tessal({"start", "Review"}).code, 0);
  const Outcome run =
      here.expect({"start", "Design", "--project", "Hermes"}, 0, "Stopped Hermes › Review  00:0");
  EXPECT_TRUE(run.out.endsWith("Started Hermes › Design\n"));
  EXPECT_EQ(running(), QStringList({"Hermes/Design"}));
  // Writers one at a time: two at once would both start the task or each stop only what it saw.
  for (int round = 0; round < 3; ++round) {
    std::unique_ptr<QProcess> runs[] = {here.launch({"start", "Review"}), here.launch({"start", "Review"}),
                                        here.launch({"start", kQuoted})};
    for (auto& process : runs) EXPECT_EQ(Installation::finish(*process).code, 0);
    EXPECT_EQ(running().size(), 1) << "round " << round << ": " << running().join(", ").toStdString();
    ASSERT_EQ(here.tessal({"stop"}).code, 0);
  }
}

TEST_F(TrackCommand, ADesktopCopyCarriesOutTheChangesItsWindowShows) {
  std::unique_ptr<QProcess> desktop = startDesktop();
  EXPECT_EQ(here.out({"start", "Review"}), "Started Hermes › Review\n");
  // Saved by the desktop copy before it answered, so a reader sees it at once.
  EXPECT_EQ(running(), QStringList({"Hermes/Review"}));
  std::unique_ptr<QProcess> first = here.launch({"start", "design", "--project", "atlas"});
  std::unique_ptr<QProcess> second = here.launch({"start", kQuoted});
  EXPECT_EQ(Installation::finish(*first).code + Installation::finish(*second).code, 0);
  EXPECT_EQ(running(), QStringList({"Atlas/" + kQuoted, "Atlas/Design", "Hermes/Review"}));
  // Stopping finds the entries the desktop copy started: it, not the command, holds them.
  EXPECT_EQ(here.expect({"stop"}, 0, "Stopped").out.count("Stopped"), 3);
  EXPECT_EQ(running(), QStringList());

  // An added entry's times of day are the shell's, whatever zone the desktop copy runs in.
  const QMap<QString, QString> auckland = {{"TZ", "Pacific/Auckland"}};
  EXPECT_EQ(here.out({"add", "Review", "10:15-11:00", "--date", "2026-03-05"}, auckland),
            "Added Hermes › Review  2026-03-05 10:15–11:00  00:45\n");
  here.expect({"log", "--range", "2026-03-05..2026-03-05"}, 0, "2026-03-05  10:15–11:00", auckland);
  const QString file = here.file("in.csv",
                                 "Client,Project,Description,Start date,Start time,Duration\n"
                                 "acme,atlas,Sketch,2026-03-06,09:00,1:00:00\n");
  here.expect({"import", file}, 0, "Found: 1 client, 1 project, 0 tasks\nAlready there: 0 entries\n",
              auckland);
  here.expect({"import", file}, 0, "Found: 1 client, 1 project, 1 task\nAlready there: 1 entry\n", auckland);
  here.expect({"log", "--range", "2026-03-06..2026-03-06"}, 0,
              "2026-03-06  09:00–10:00  Atlas › Default Task", auckland);
  EXPECT_EQ(times(), 6);
  EXPECT_EQ(desktop->state(), QProcess::Running);
  desktop->kill();
  desktop->waitForFinished();
  // With the desktop copy gone, the commands change the store themselves again.
  EXPECT_EQ(here.tessal({"start", "Review"}).code, 0);
  EXPECT_EQ(running(), QStringList({"Hermes/Review"}));
}

// Refused arguments exit with 2 and a usage line on stderr, write nothing and change nothing.
TEST_F(TrackCommand, RefusedArgumentsChangeNothing) {
  const QList<QStringList> refused = {
      // clang-format off
      {"start"}, {"start", "Design", "Review"}, {"start", "Review", "--bogus"}, {"stop", "--project", "Atlas"},
      {"status", "Design"}, {"log", "--range", "soon"}, {"start", "Review", "--project", "a", "--project", "b"},
      {"stop", "--create"}, {"add", "Review"}, {"add", "Review", "soon"}, {"add", "Review", "0"},
      {"add", "Review", "24:00-25:00"}, {"add", "Review", "0:45", "--date", "someday"}, {"add", "Review", "1:30:00"},
      {"add", "Review", "9:00-10:00", "--note", "a", "--note", "b"}, {"list", "notes"},
      {"report"}, {"log", "--client", "Acme"}, {"export", "--client", "Acme"}, {"report", "--project", "Hermes", "--mode", "4"},
      {"report", "--project", "Hermes", "--mode", "one"}, {"report", "--project", "Hermes", "--out", here.path("r.doc")},
      {"report", "--project", "Hermes", "--template", here.path("missing.txt")},
      {"report", "--project", "Hermes", "--project", "Atlas"}, {"report", "--project", "Hermes", "stray"},
      {"report", "--projects", "Hermes"}, {"export", "--range", "fortnight"}, {"export", "--format", "xlsx"},
      {"report", "--project", "Hermes", "--range", "fortnight"},
      {"import"}, {"import", "a.csv", "b.csv"},
      {"import", "a.csv", "--tz", "Mars/Base"}, {"import", "a.csv", "--format", "harvest"},
      {"import", "a.csv", "--tags", "project,project"},
      // clang-format on
  };
  for (const QStringList& arguments : refused) {
    const Outcome run = here.expect(arguments, 2, "usage: tessal " + arguments[0]);
    EXPECT_EQ(run.out, "") << arguments.join(' ').toStdString();
  }
  EXPECT_EQ(times(), 1);
  EXPECT_FALSE(QFile::exists(here.path("r.doc")));
}

// Each run in turn: exit code and what it says; refusals of what cannot be (1) add nothing.
TEST_F(TrackCommand, SaysWhatItDidOrWhyNot) {
  // Review has 09:00–10:15 on 2026-03-03 (Berlin).
  const QDate today = QDateTime::currentDateTime().toTimeZone(QTimeZone("Europe/Berlin")).date();
  const QString tomorrow = today.addDays(1).toString(Qt::ISODate);
  const QString yesterday = today.addDays(-1).toString(Qt::ISODate);
  const struct {
    QStringList arguments;
    int code;
    QString says;
  } cases[] = {
      // clang-format off
      {{"add", "review", "10:15-11:00", "--date", "2026-03-03", "--note", "Call"}, 0, "Added Hermes › Review  2026-03-03 10:15–11:00  00:45\n"},
      {{"add", "Review", "8:30-9:01", "--date", "2026-03-03"}, 1, "the entry 2026-03-03 08:30–09:01 overlaps the entry 2026-03-03 09:00–10:15 of Hermes › Review"},
      {{"add", "Review", "23:30-0:45", "--date", "2026-03-02"}, 0, "Added Hermes › Review  2026-03-02 23:30–2026-03-03 00:45  01:15\n"},
      {{"add", "Review", "02:30-03:15", "--date", "2026-03-29"}, 1, "there is no 02:30 on 2026-03-29 here: the clocks go forward then"},
      {{"add", "Review", "00:00-00:01", "--date", tomorrow}, 1, "is not over yet"},
      {{"add", "Review", "1:00", "--date", tomorrow}, 1, "is not over yet"},
      {{"add", "Review", "1:00:00", "--date", tomorrow}, 1, "–" + tomorrow + " "},  // a day, read as a duration
      {{"add", "Review", "12:00-12:30", "--date", "yesterday"}, 0, "Added Hermes › Review  " + yesterday + " 12:00–12:30  00:30\n"},
      {{"add", "Design", "0:30"}, 1, "2 tasks are named “Design”: “Design” in “Atlas” (Acme), “Design” in “Hermes”"},
      {{"add", "Design", "45", "--project", "Atlas"}, 0, "Added Atlas › Design  "},
      {{"add", "Design", "0:10", "--project", "Atlas"}, 1, "overlaps the entry "},
      {{"start", "Write"}, 1, "no task is named “Write”"},
      {{"start", "Design", "--project", "Hermes", "--client", "Acme"}, 1, "no task is named “Design”, and there are no tasks of projects named “Hermes”, of clients named “Acme”"},
      {{"start", "Write", "--create"}, 1, "name the project to make it in with --project: “Atlas” (Acme), “Hermes”"},
      {{"start", "Write", "--project", "Zeus", "--client", "Olymp", "--create"}, 0, "Created client Olymp\nCreated project Zeus\nCreated task Zeus › Write\nStarted Zeus › Write\n"},
      {{"start", "write", "--project", "zeus", "--create"}, 0, "Zeus › Write is running already\n"},
      {{"add", "Design", "0:10", "--date", "2026-03-04", "--project", "hermes", "--create"}, 0, "Added Hermes › Design  2026-03-04 "},
      {{"add", "Atlas › Plan", "0:10", "--date", "2026-03-04", "--create"}, 0, "Created task Atlas › Plan\nAdded Atlas › Plan  "},
      {{"start", "Design", "--create"}, 1, "2 tasks are named “Design”"},
      // Of several so named, stop means the one running, and a name spelt exactly as typed the one so spelt.
      {{"start", "Design", "--project", "Hermes"}, 0, "Started Hermes › Design\n"},
      {{"stop", "Design"}, 0, "Stopped Hermes › Design  00:00\n"},
      {{"add", "Design", "0:10", "--date", "2026-03-04", "--project", "ATLAS", "--client", "Hestia", "--create"}, 0, "Created client Hestia\nCreated project ATLAS\n"},
      {{"log", "--range", "2026-03-04..2026-03-04", "--project", "Atlas"}, 0, "Atlas › Plan"},
      {{"log", "--project", "nowhere"}, 1, "no project is named “nowhere”"},
      {{"list", "tasks", "--project", "nowhere"}, 1, "no project is named “nowhere”"},
      {{"list", "projects", "--client", "nobody"}, 1, "no client is named “nobody”"},
      // clang-format on
  };
  for (const auto& c : cases) here.expect(c.arguments, c.code, c.says);
  EXPECT_EQ(running(), QStringList({"Zeus/Write"}));
  // Exactly the accepted: 45 minutes ending now, the call, the night's, yesterday's, three on 4 March, two
  // started.
  const std::unique_ptr<WTObjectContext> context = here.readStore();
  EXPECT_EQ(context->fetch<WTTime>().size(), 10);
  const auto endsNow = [](const WTTime* time) {
    return time->duration() == 45 && std::abs(time->endDate()->timeIntervalSince(Date::now())) < 120;
  };
  EXPECT_EQ(context->fetch<WTTime>(endsNow).size(), 1);
  EXPECT_EQ(context->fetch<WTTime>([](const WTTime* time) { return time->name() == "Call"; }).size(), 1);
}

// An import is previewed, made once, and refused whole (the store file as it was) for one bad row.
TEST_F(TrackCommand, ImportsAFileOnceAndAllOrNothing) {
  const QByteArray header = "Client,Project,Task,Description,Billable,Start date,Start time,Duration\n";
  const QString good =
      here.file("good.csv", header +
                                "ACME,atlas,design,Sketch,Yes,2026-03-04,09:00,1:30:00\n"
                                ",Zeus,,\"Plan, \"\"big\"\"\",No,2026-03-04,11:00,0:30:00\n");
  const QString sheet = here.file("sheet.csv",
                                  "client,project,task,kind,name,date,start,end,duration,billed "
                                  "duration,rate,amount,currency,notes\n"
                                  "Acme,Atlas,Design,time,Sketch,2026-03-06,09:00,10:00,,,,,,\n"
                                  "Acme,Atlas,Design,expense,Train,2026-03-06,,,,,,45.60,EUR,\n");
  const QString bad = here.file("bad.csv", header +
                                               ",Zeus,,Early,Yes,2026-03-05,08:00,1:00:00\n"
                                               ",Zeus,,Late,Yes,2026-03-05,25:00,1:00:00\n");
  const struct {
    QStringList arguments;
    int code;
    QString says;
  } cases[] = {
      // clang-format off
      {{"import", good, "--dry-run"}, 0, "A toggl file\nNew: 0 clients, 1 project, 1 task, 2 entries\nFound: 1 client, 1 project, 1 task\nAlready there: 0 entries\n  ACME  01:30\n  (no client)  00:30; 00:30 of it marked not billable, which Tessal bills as well\nNothing was changed (--dry-run)\n"},
      {{"import", bad}, 1, "tessal: " + bad + ": 1 row cannot be read; nothing was imported\n"},
      {{"import", sheet, "--dry-run"}, 0, "Left out, as only time entries are imported: 1 row\n  line 3: expense\n"},
      {{"import", here.path("missing.csv")}, 1, "cannot read " + here.path("missing.csv")},
      {{"import", good}, 0, "Imported 2 entries\n"},
      {{"import", good}, 0, "Already there: 2 entries\n"},
      // clang-format on
  };
  for (const auto& c : cases) {
    const QByteArray store = storeBytes(here.storePath());
    here.expect(c.arguments, c.code, c.says);
    if (c.code != 0 || c.arguments.contains("--dry-run")) {
      EXPECT_EQ(storeBytes(here.storePath()), store) << c.says.toStdString();
    }
  }
  here.expect({"log", "--range", "2026-03-04..2026-03-04"}, 0,
              "2026-03-04  09:00–10:30  Atlas › Design  01:30  120.00 CHF\n"
              "2026-03-04  11:00–11:30  Zeus › Default Task  00:30");
  EXPECT_TRUE(here.journal().join('\n').contains("importId"));
}

TEST_F(TrackCommand, LogsAndListsEachNameOnceForPickersAndCompletion) {
  const std::pair<QStringList, std::string> cases[] = {
      // clang-format off
      // Each line bills its minutes to the cent and the total is their sum; an entry at midnight is the new day's only.
      {{"add", "Review", "00:00-00:01", "--date", "2026-03-04"}, "Added Hermes › Review  2026-03-04 00:00–00:01  00:01\n"},
      {{"add", "Review", "00:01-00:02", "--date", "2026-03-04"}, "Added Hermes › Review  2026-03-04 00:01–00:02  00:01\n"},
      {{"log", "--range", "2026-03-03..2026-03-03"}, "2026-03-03  09:00–10:15  Hermes › Review  01:15  125.00 USD\nTotal: 1 entry  01:15  125.00 USD\n"},
      {{"log", "--range", "2026-03-04..2026-03-04"}, "2026-03-04  00:00–00:01  Hermes › Review  00:01  1.67 USD\n2026-03-04  00:01–00:02  Hermes › Review  00:01  1.67 USD\nTotal: 2 entries  00:02  3.34 USD\n"},
      {{"log", "--range", "2026-03-05..2026-03-05", "--project", "atlas"}, "Total: 0 entries  00:00  0.00 CHF\n"},
      {{"list", "tasks"}, "Build \"it\" now\nDesign\nReview\n"},
      {{"list", "tasks", "--project", "HERMES"}, "Design\nReview\n"},
      {{"list", "tasks", "--client", "acme"}, "Build \"it\" now\nDesign\n"},
      {{"list", "projects", "--client", "Acme"}, "Atlas\n"},
      {{"list", "clients"}, "Acme\n"},
      // A picker offers every task once under a name of its own, and start takes that name back.
      {{"list", "tasks", "--qualified"}, "Atlas › Build \"it\" now\nAtlas › Design\nHermes › Design\nHermes › Review\n"},
      {{"start", "hermes › design"}, "Started Hermes › Design\n"},
      // A project's name may hold the separator too.
      {{"add", "Audit", "09:00-09:10", "--date", "2026-03-06", "--project", "Bank › Audit", "--create"}, "Created project Bank › Audit\nCreated task Bank › Audit › Audit\nAdded Bank › Audit › Audit  2026-03-06 09:00–09:10  00:10\n"},
      {{"start", "bank › audit › audit"}, "Started Bank › Audit › Audit\n"},
      // clang-format on
  };
  for (const auto& [arguments, out] : cases) EXPECT_EQ(here.out(arguments), out) << out;
  EXPECT_EQ(running(), QStringList({"Bank › Audit/Audit", "Hermes/Design"}));
  here.setSetting("WTRoundingMinutes", "15");  // the minutes billed then stand beside those that ran
  here.setSetting("WTRoundingMode", "up");
  EXPECT_EQ(
      here.out({"log", "--range", "2026-03-04..2026-03-04"}),
      "2026-03-04  00:00–00:01  Hermes › Review  00:01  billed 00:15  25.00 USD\n2026-03-04  00:01–00:02  "
      "Hermes › Review  00:01  billed 00:15  25.00 USD\nTotal: 2 entries  00:02  billed 00:30  50.00 USD\n");
}

TEST(CommandWithoutStore, SaysThereIsNoDataAndCreatesNoneUnlessAskedToCreate) {
  Installation here;
  const QList<QStringList> noStore = {{"start", "Design"},       {"stop"},   {"status"},
                                      {"add", "Design", "0:30"}, {"export"}, {"restore", "none.sqlite"}};
  for (const QStringList& arguments : noStore) here.expect(arguments, 1, "There is no data file at");
  EXPECT_FALSE(QFileInfo::exists(QFileInfo(here.storePath()).path()));
  // The shell alone starts a day's work: the store it makes has the first project, as the desktop's has.
  here.expect({"add", "Design", "0:30", "--create"}, 0, "");
  EXPECT_EQ(here.out({"list", "tasks", "--qualified"}),
            "Default Project › Default Task\nDefault Project › Design\n");
  EXPECT_EQ(here.tessal({"start", "Default Task"}).code, 0);
  // Syncing: projects come from the account, so no first project of its own.
  Installation syncing;
  syncing.setSetting("WTSyncUser", "shell@example.org");
  syncing.expect({"start", "Design", "--create"}, 1, "there is no project to make it in");
  syncing.expect({"start", "Design", "--project", "Work", "--create"}, 0, "");
  EXPECT_EQ(syncing.out({"list", "projects"}), "Work\n");
}

// A copy goes back only whole and checked, never while the desktop copy runs, and the store it replaces
// is kept; a damaged store names the newest good copy.
TEST(BackupCommand, PutsBackOnlyACheckedCopyAndKeepsTheStoreItReplaces) {
  Installation here;
  auto addProject = [&](const QString& name) {
    auto context = here.openStore();
    project(*context, name);
    ASSERT_TRUE(context->save());
  };
  addProject("Before");
  const QString copy = here.expect({"backup"}, 0, here.path("data/Tessal2/Backups/Tessal-")).out.trimmed();
  here.expect({"backup", copy}, 1, "exists already");
  here.expect({"backup", here.path("")}, 0, here.path("Tessal-"));
  addProject("After");
  here.expect({"start", "Design", "--project", "After", "--create"}, 0, "");
  const QString store = here.storePath();
  const QByteArray before = storeBytes(store);
  const QList<std::pair<QStringList, QString>> refused = {
      {{"restore"}, "name the backup file"},
      {{"restore", here.file("notes.txt", "Not a data file.\n")}, "is not a Tessal data file"},
      {{"restore", here.file("half.sqlite", fileBytes(copy).left(fileBytes(copy).size() / 2 + 100))},
       "is damaged"},
      {{"restore", here.path("missing.sqlite")}, "There is no data file at"},
      {{"restore", store}, "is the data file itself"},
      {{"restore", copy}, "After › Design is running: stop the timer first"}};
  for (const auto& [arguments, says] : refused) here.expect(arguments, arguments.size() == 1 ? 2 : 1, says);
  {
    WTSingleInstance desktop(here.runtimeFolder() + "/tessal.socket");
    ASSERT_TRUE(desktop.start());
    here.expect({"restore", copy}, 1, "Tessal is running");
  }
  EXPECT_EQ(storeBytes(store), before);
  here.expect({"stop"}, 0, "");
  const QByteArray stopped = storeBytes(store);
  const QString kept = here.expect({"restore", copy}, 0, "The replaced data file is kept as ")
                           .out.section("kept as ", 1)
                           .chopped(2);
  EXPECT_EQ(here.out({"list", "projects"}), "Before\n");
  EXPECT_EQ(storeBytes(kept), stopped);
  here.file("data/Tessal2/Tessal.sqlite", "garbage");
  here.expect({"status"}, 1, "The newest good backup is " + copy);
}

// Two clients with project names differing in case, quotes and a comma, entries around 3 March in Berlin.
class ReportCommand : public ::testing::Test {
 protected:
  void SetUp() override {
    context = here.openStore();
    auto* acme = WTClient::insertNewObject(context.get());
    acme->setName("Acme");
    acme->setRate(Decimal::fromString(u"80"));
    auto* other = WTClient::insertNewObject(context.get());
    other->setName("Other");
    WTProject* atlas = project(*context, "Atlas", acme);
    WTProject* beacon = project(*context, "Beacon", acme);
    project(*context, "atlas", other);
    WTTask* design = task(*context, atlas, "Design \"v2\", final");
    addTime(*context, design, berlin(3, 3, 0), berlin(3, 3, 1, 30));       // 90 minutes: 120.00
    addTime(*context, design, berlin(3, 3, 23, 30), berlin(3, 4, 0, 15));  // 45 minutes: 60.00
    addTime(*context, task(*context, beacon, "Build"), berlin(3, 4, 10), berlin(3, 4, 11));
    ASSERT_TRUE(context->save());
  }

  Installation here{kBerlin};
  std::unique_ptr<WTObjectContext> context;  // stays open, as a desktop copy's would
};

TEST_F(ReportCommand, WritesTheReportAsHtmlPdfAndCsvAndExportsARange) {
  const Outcome html = here.expect({"report", "--client", "ACME", "--mode", "1"}, 0, "Beacon");
  EXPECT_EQ(html.err, "");
  EXPECT_TRUE(html.out.contains("260.00")) << "the grand total";  // 120 + 60 + 80
  EXPECT_FALSE(html.out.contains("Other"));
  const QString htmlFile = here.path("report.html"), csvFile = here.path("report.csv"),
                pdfFile = here.path("report.pdf");
  // The file is the answer: stdout stays empty, stderr stays for problems.
  for (const QStringList& out : {QStringList{"--client", "acme", "--mode", "1", "--out", htmlFile},
                                 {"--client", "Acme", "--out", csvFile},
                                 {"--client", "Acme", "--mode", "3", "--out", pdfFile}})
    EXPECT_EQ(here.expect(QStringList{"report"} + out, 0, "").out, "");
  EXPECT_EQ(fileBytes(htmlFile), html.out.toUtf8());
  // Projects by name, tasks in their order; durations as the report writes them, money with two decimals.
  EXPECT_EQ(fileBytes(csvFile),
            "\"Atlas\",\"Design \\\"v2\\\", "
            "final\",\"02:15\",\"180.00\"\n\"Beacon\",\"Build\",\"01:00\",\"80.00\"\n");
  EXPECT_TRUE(fileBytes(pdfFile).startsWith("%PDF-"));
  EXPECT_FALSE(QFile::exists(pdfFile + ".part"));
  EXPECT_EQ(here.expect({"report", "--client", "Acme", "--out", here.path("no/r.pdf")}, 1, "").err,
            "tessal: " + here.path("no/r.pdf") + ": No such file or directory\n");
  here.expect({"report", "--project", "atlas ", "--mode", "2", "--out", csvFile}, 1,
              "");  // a trailing space counts
  // A billing period of the export's words: 4 March's entry (the one across midnight started on the 3rd).
  here.expect({"report", "--client", "Acme", "--range", "2026-03-04..2026-03-04", "--out", csvFile}, 0, "");
  EXPECT_EQ(fileBytes(csvFile), "\"Beacon\",\"Build\",\"01:00\",\"80.00\"\n");

  // The range word reaches the export: 3 March's two entries.
  const Outcome day = here.expect({"export", "--range", "2026-03-03..2026-03-03"}, 0, "");
  EXPECT_EQ(day.out.count('\n'), 2) << day.out.toStdString();
  const QString file = here.path("times.csv");
  const Outcome written = here.expect({"export", "--range", "2026-03-03..2026-03-03", "--out", file}, 0, "");
  EXPECT_EQ(written.out + written.err, "");
  EXPECT_EQ(fileBytes(file), day.out.toUtf8());
  EXPECT_EQ(here.expect({"export", "--range", "2026-03-03..2026-03-03", "--format", "times"}, 0, "").out,
            day.out);

  // The spreadsheet's columns are the export's own; here, the format is chosen and the preference read.
  here.setSetting("WTCurrency", "CHF");
  const Outcome sheet = here.expect({"export", "--format", "spreadsheet"}, 0, "");
  EXPECT_TRUE(sheet.out.startsWith("client,project,task,") && sheet.out.count(",CHF,,none\r\n") == 3 &&
              sheet.out.contains(",2026-03-03,23:30,00:15,0:45,0:45,80.00,60.00,"))
      << sheet.out.toStdString();
  here.expect({"export", "--format", "spreadsheet", "--out", file}, 0, "");
  EXPECT_EQ(fileBytes(file), sheet.out.toUtf8());
  // What is billed takes a billing period: the entry at midnight on 3 March is not the 2nd's.
  EXPECT_EQ(
      here.out({"export", "--format", "spreadsheet", "--range", "2026-03-02..2026-03-02"}).find("Design"),
      std::string::npos);
}

// A report or an export goes to stdout in slices: each character arrives, in UTF-8, even a pair of
// surrogates across the end of a slice, and all of it is out when the writing returns (the process may end
// without unwinding).
TEST(WTCommandArguments, ALongTextReachesItsFileWholeInUtf8) {
  const QString grin = QStringLiteral("\U0001F600");
  const QString text = QString(16383, u'a') + grin + QString(16382, u'ä') + grin + QString(40000, u'z');
  QTemporaryDir folder;
  QFile file(folder.filePath("out.txt"));
  ASSERT_TRUE(file.open(QIODevice::WriteOnly));
  QTextStream out(&file);
  out << "head ";
  WTCommandArguments::writeText(out, text);
  EXPECT_EQ(fileBytes(file.fileName()), "head " + text.toUtf8());
}

// Names that fit no record or several (1, naming the candidates) and broken templates write nothing.
TEST_F(ReportCommand, RefusesNamesAndBrokenTemplatesWritingNothingAndUsesTheUsersTemplate) {
  const std::pair<QStringList, QStringList> cases[] = {
      {{"report", "--project", "ATLAS"},
       {"2 projects are named “ATLAS”", "“Atlas” (Acme)", "“atlas” (Other)"}},
      {{"export", "--project", "Nowhere"}, {"no project is named “Nowhere”", "“Beacon” (Acme)"}},
      {{"report", "--client", "Initech"}, {"“Acme”, “Other”"}},
  };
  for (const auto& [arguments, says] : cases) {
    const Outcome run = here.expect(arguments, 1, says.first());
    EXPECT_EQ(run.out, "");
    for (const QString& said : says) EXPECT_TRUE(run.err.contains(said)) << run.err.toStdString();
  }
  // --client says whose project is meant: Acme's Atlas has the entries, Other's none.
  for (const char* command : {"log", "export", "report"}) {
    const QStringList atlas = {command, "--project", "ATLAS", "--range", "any"};
    EXPECT_TRUE(here.expect(atlas + QStringList{"--client", "acme"}, 0, "").out.contains("Design"))
        << command;
    EXPECT_FALSE(here.expect(atlas + QStringList{"--client", "Other"}, 0, "").out.contains("Design"))
        << command;
  }
  const QString out = here.path("never.html");
  const QString broken =
      here.file("broken.txt", "{% for p in projects %}{{ p.name }}{% /if %}\n{{ nowhere }}");
  EXPECT_TRUE(here.expect({"report", "--project", "Beacon", "--template", broken, "--out", out}, 1, "")
                  .err.startsWith("error "));
  EXPECT_FALSE(QFile::exists(out));
  EXPECT_EQ(here.expect({"report", "--project", "Beacon", "--template", broken}, 1, "").out, "");
  // A template of the user's own is used as given.
  const QString own = here.file("own.txt", "{% for p in projects %}<{{ p.name }}:{{ mode }}>{% /for %}");
  EXPECT_EQ(here.out({"report", "--client", "Acme", "--mode", "2", "--template", own}),
            "<Atlas:2><Beacon:2>");
}

TEST_F(ReportCommand, ReadsBesideARunningDesktopCopyAndChangesNothing) {
  WTSingleInstance desktop(here.runtimeFolder() + "/tessal.socket");
  ASSERT_TRUE(desktop.start());
  // Saved by the running copy a moment ago: still in its write-ahead log.
  project(*context, "Late");
  ASSERT_TRUE(context->save());
  const QByteArray store = fileBytes(here.storePath()), log = fileBytes(here.storePath() + "-wal");
  ASSERT_FALSE(log.isEmpty());
  here.expect({"report", "--project", "late"}, 0, "");
  EXPECT_EQ(here.expect({"export", "--project", "Beacon"}, 0, "").out.count('\n'), 1);
  EXPECT_EQ(fileBytes(here.storePath()), store);
  EXPECT_EQ(fileBytes(here.storePath() + "-wal"), log);
  project(*context, "Later");
  EXPECT_TRUE(context->save()) << "the running copy still writes";
}

}  // namespace
