// `tessal start`, `stop`, `status` and `log` as a user's shell and key bindings run them: the real
// executable over a real store file, on its own or while a desktop copy (offscreen) holds the store.
#include "CommandLineInstallation.h"
#include "WTSingleInstance.h"

#include <gtest/gtest.h>

#include <QColor>
#include <QElapsedTimer>
#include <QJsonArray>
#include <QJsonDocument>
#include <QJsonObject>
#include <QThread>
#include <QTimeZone>

#include <algorithm>
#include <cmath>

namespace {

using commandtest::addTime;
using commandtest::Installation;
using commandtest::Outcome;
using commandtest::project;
using commandtest::task;

const QString kQuoted = QStringLiteral("Build \"it\" now");

// Acme's Atlas and the client-less Hermes both have a "Design"; Atlas also has a task whose name holds
// quotes and spaces. Nothing runs.
class TrackCommand : public ::testing::Test {
 protected:
  void SetUp() override {
    std::unique_ptr<WTObjectContext> context = here.openStore();
    auto* acme = WTClient::insertNewObject(context.get());
    acme->setName("Acme");
    acme->setRate(Decimal::fromString(u"80"));
    WTProject* atlas = project(*context, "Atlas", acme);
    WTProject* hermes = project(*context, "Hermes");
    hermes->setRate(Decimal::fromString(u"100"));
    task(*context, atlas, "Design")->setColor(QColor(255, 0, 0, 128));
    task(*context, atlas, kQuoted);
    task(*context, hermes, "Design");
    const Date nine =
        Date::fromQDateTime(QDateTime(QDate(2026, 3, 3), QTime(9, 0), QTimeZone("Europe/Berlin")));
    addTime(*context, task(*context, hermes, "Review"), nine, nine.addingSeconds(75 * 60));
    ASSERT_TRUE(context->save());
  }

  // What the store file holds now: "PROJECT/TASK" of each running entry, sorted, the number of entries,
  // and "PROJECT/TASK COLOUR" of each task with a colour.
  struct Stored {
    QStringList running;
    qsizetype times = 0;
    QStringList colors;
  };
  Stored stored() const {
    Stored result;
    const std::unique_ptr<WTObjectContext> context = here.readStore();
    const QList<WTTime*> times = context->fetch<WTTime>();
    result.times = times.size();
    for (const WTTime* time : times) {
      if (time->running())
        result.running.append(time->task()->project()->name() + "/" + time->task()->name());
    }
    result.running.sort();
    for (const WTTask* task : context->fetch<WTTask>()) {
      if (task->color().isNull()) continue;
      const QString color = WTObject::colorText(task->color());
      result.colors.append(task->project()->name() + "/" + task->name() + " " + color);
    }
    return result;
  }

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

  Installation here;
};

TEST_F(TrackCommand, StartsStopsAndTellsWhatRunsOnTheStoreItself) {
  Outcome run = here.tessal({"status"});
  EXPECT_EQ(run.code, 1) << "nothing runs";
  EXPECT_EQ(run.out, "No timer is running\n");

  run = here.tessal({"start", "design"});
  EXPECT_EQ(run.code, 1);
  EXPECT_TRUE(
      run.err.contains("2 tasks are named “design”: “Design” in “Atlas” (Acme), “Design” in “Hermes”"))
      << run.err.toStdString();
  EXPECT_EQ(stored().times, 1) << "an ambiguous name starts nothing";

  run = here.tessal({"start", "design", "--project", "ATLAS"});
  EXPECT_EQ(run.code, 0) << run.err.toStdString();
  EXPECT_EQ(run.out, "Started Atlas › Design\n");
  run = here.tessal({"start", "Design", "--client", "acme"});
  EXPECT_EQ(run.code, 0);
  EXPECT_EQ(run.out, "Atlas › Design is running already\n");
  run = here.tessal({"start", kQuoted.toUpper()});
  EXPECT_EQ(run.code, 0) << run.err.toStdString();
  EXPECT_EQ(stored().running, QStringList({"Atlas/" + kQuoted, "Atlas/Design"}));
  EXPECT_EQ(stored().times, 3);

  run = here.tessal({"status"});
  EXPECT_EQ(run.code, 0);
  EXPECT_EQ(run.out.count('\n'), 3) << run.out.toStdString();
  EXPECT_TRUE(run.out.contains("Atlas › " + kQuoted + "  00:0"));
  EXPECT_TRUE(run.out.contains("\nTotal  00:0"));
  run = here.tessal({"status", "--json"});
  const QJsonObject status = QJsonDocument::fromJson(run.out.toUtf8()).object();
  ASSERT_EQ(status["running"].toArray().size(), 2) << run.out.toStdString();
  EXPECT_EQ(status["running"][0]["client"].toString(), "Acme");
  EXPECT_EQ(status["running"][0]["task"].toString(), "Design") << "oldest first";
  EXPECT_TRUE(status["minutes"].isDouble());

  run = here.tessal({"stop", kQuoted});
  EXPECT_EQ(run.code, 0) << run.err.toStdString();
  EXPECT_TRUE(run.out.startsWith("Stopped Atlas › " + kQuoted + "  ")) << run.out.toStdString();
  EXPECT_EQ(stored().running, QStringList({"Atlas/Design"}));
  run = here.tessal({"stop", "review"});
  EXPECT_EQ(run.out, "Hermes › Review is not running\n");
  run = here.tessal({"stop"});
  EXPECT_EQ(run.code, 0);
  EXPECT_TRUE(run.out.startsWith("Stopped Atlas › Design")) << run.out.toStdString();
  EXPECT_EQ(stored().running, QStringList());
  // `tessal` loads no GUI library, so it keeps a colour as the store's text: rewritten, the task keeps it.
  EXPECT_EQ(stored().colors, QStringList({"Atlas/Design #80ff0000"}));
  EXPECT_EQ(here.tessal({"status"}).code, 1);
  EXPECT_EQ(here.tessal({"stop"}).out, "No timer is running\n");

  // The entries wait in the sync journal, as the desktop copy's own changes do.
  QFile journal(here.journalPath());
  ASSERT_TRUE(journal.open(QIODevice::ReadOnly));
  const QJsonObject inserted =
      QJsonDocument::fromJson(journal.readAll()).object()["track"].toObject()["i"].toObject();
  EXPECT_EQ(inserted.size(), 2);
}

TEST_F(TrackCommand, StartingStopsTheOtherTimersWhenTheSettingSaysSo) {
  here.setSetting("WTStopsOtherTimes", "YES");
  ASSERT_EQ(here.tessal({"start", "Review"}).code, 0);
  const Outcome run = here.tessal({"start", "Design", "--project", "Hermes"});
  EXPECT_EQ(run.code, 0);
  EXPECT_TRUE(run.out.startsWith("Stopped Hermes › Review  00:0")) << run.out.toStdString();
  EXPECT_TRUE(run.out.endsWith("Started Hermes › Design\n"));
  EXPECT_EQ(stored().running, QStringList({"Hermes/Design"}));
}

TEST_F(TrackCommand, TwoStartsAtTheSameMomentActAsOneAfterTheOther) {
  // Each writer reads, decides and saves: two at once would both find the task idle and start it twice,
  // or each stop only the timers it saw. One writer at a time makes the second see the first's change.
  here.setSetting("WTStopsOtherTimes", "YES");
  for (int round = 0; round < 3; ++round) {
    std::unique_ptr<QProcess> first = here.launch({"start", "Review"});
    std::unique_ptr<QProcess> second = here.launch({"start", "Review"});
    std::unique_ptr<QProcess> other = here.launch({"start", kQuoted});
    EXPECT_EQ(Installation::finish(*first).code, 0);
    EXPECT_EQ(Installation::finish(*second).code, 0);
    EXPECT_EQ(Installation::finish(*other).code, 0);
    const Stored now = stored();
    EXPECT_EQ(now.running.size(), 1) << "round " << round << ": " << now.running.join(", ").toStdString();
    ASSERT_EQ(here.tessal({"stop"}).code, 0);
  }
}

TEST_F(TrackCommand, ADesktopCopyCarriesOutTheChangesItsWindowShows) {
  std::unique_ptr<QProcess> desktop = startDesktop();
  Outcome run = here.tessal({"start", "Review"});
  EXPECT_EQ(run.code, 0) << run.err.toStdString();
  EXPECT_EQ(run.out, "Started Hermes › Review\n");
  // Saved by the desktop copy before it answered, so a reader sees it at once.
  EXPECT_EQ(stored().running, QStringList({"Hermes/Review"}));
  EXPECT_EQ(here.tessal({"status"}).code, 0);

  std::unique_ptr<QProcess> first = here.launch({"start", "design", "--project", "atlas"});
  std::unique_ptr<QProcess> second = here.launch({"start", kQuoted});
  EXPECT_EQ(Installation::finish(*first).code, 0);
  EXPECT_EQ(Installation::finish(*second).code, 0);
  EXPECT_EQ(stored().running, QStringList({"Atlas/" + kQuoted, "Atlas/Design", "Hermes/Review"}));

  // Stopping finds the entries the desktop copy started: it, not the command, holds them.
  run = here.tessal({"stop"});
  EXPECT_EQ(run.code, 0);
  EXPECT_EQ(run.out.count("Stopped"), 3) << run.out.toStdString();
  EXPECT_EQ(stored().running, QStringList());
  EXPECT_EQ(here.tessal({"start", "nothing"}).code, 1);

  // An added entry's times of day are the shell's, whatever zone the desktop copy runs in.
  const QMap<QString, QString> auckland = {{"TZ", "Pacific/Auckland"}};
  run = here.tessal({"add", "Review", "10:15-11:00", "--date", "2026-03-05"}, auckland);
  EXPECT_EQ(run.code, 0) << run.err.toStdString();
  EXPECT_EQ(run.out, "Added Hermes › Review  2026-03-05 10:15–11:00  00:45\n");
  EXPECT_TRUE(here.tessal({"log", "--range", "2026-03-05..2026-03-05"}, auckland)
                  .out.startsWith("2026-03-05  10:15–11:00"));
  run = here.tessal({"add", "Review", "10:45-11:30", "--date", "2026-03-05"}, auckland);
  EXPECT_EQ(run.code, 1);
  EXPECT_TRUE(run.err.contains("overlaps the entry 2026-03-05 10:15–11:00 of Hermes › Review"))
      << run.err.toStdString();
  run = here.tessal({"add", "Plan", "0:20", "--project", "Hermes", "--create", "--date", "yesterday"});
  EXPECT_EQ(run.code, 0) << run.err.toStdString();
  EXPECT_TRUE(run.out.startsWith("Created task Hermes › Plan\nAdded Hermes › Plan  "))
      << run.out.toStdString();
  EXPECT_EQ(stored().times, 6);
  EXPECT_EQ(desktop->state(), QProcess::Running);
  desktop->kill();
  desktop->waitForFinished();

  // With the desktop copy gone, the commands change the store themselves again.
  EXPECT_EQ(here.tessal({"start", "Review"}).code, 0);
  EXPECT_EQ(stored().running, QStringList({"Hermes/Review"}));
}

// Each run in turn over the same store: its exit code and what it says (stdout on success, else stderr).
// Refused arguments (2) change nothing; refusals of what cannot be (1) add nothing.
TEST_F(TrackCommand, SaysWhatItDidOrWhyNot) {
  // Review has 09:00–10:15 on 2026-03-03 (Berlin).
  const QString tomorrow = QDateTime::currentDateTime()
                               .toTimeZone(QTimeZone("Europe/Berlin"))
                               .date()
                               .addDays(1)
                               .toString(Qt::ISODate);
  const struct {
    QStringList arguments;
    int code;
    QString says;
  } cases[] = {
      {{"start"}, 2, "usage: tessal start"},
      {{"start", "Design", "Review"}, 2, "usage: tessal start"},
      {{"start", "Review", "--bogus"}, 2, "usage: tessal start"},
      {{"stop", "--project", "Atlas"}, 2, "usage: tessal stop"},
      {{"status", "Design"}, 2, "usage: tessal status"},
      {{"log", "--range", "soon"}, 2, "usage: tessal log"},
      {{"start", "Review", "--project", "a", "--project", "b"}, 2, "usage: tessal start"},
      {{"stop", "--create"}, 2, "usage: tessal stop"},
      {{"add", "Review"}, 2, "usage: tessal add"},
      {{"add", "Review", "soon"}, 2, "usage: tessal add"},
      {{"add", "Review", "0"}, 2, "usage: tessal add"},
      {{"add", "Review", "24:00-25:00"}, 2, "usage: tessal add"},
      {{"add", "Review", "0:45", "--date", "someday"}, 2, "usage: tessal add"},
      {{"add", "Review", "9:00-10:00", "--note", "a", "--note", "b"}, 2, "usage: tessal add"},
      {{"add", "review", "10:15-11:00", "--date", "2026-03-03", "--note", "Call"},
       0,
       "Added Hermes › Review  2026-03-03 10:15–11:00  00:45\n"},
      {{"add", "Review", "8:30-9:01", "--date", "2026-03-03"},
       1,
       "the entry 2026-03-03 08:30–09:01 overlaps the entry 2026-03-03 09:00–10:15 of Hermes › Review"},
      {{"add", "Review", "11:00-10:30", "--date", "2026-03-02"},
       1,
       "would end (10:30) before it starts (11:00)"},
      {{"add", "Review", "00:00-00:01", "--date", tomorrow}, 1, "is not over yet"},
      {{"add", "Review", "1:00", "--date", tomorrow}, 1, "is not over yet"},
      {{"add", "Design", "0:30"}, 1, "2 tasks are named “Design”"},
      {{"add", "Design", "45", "--project", "Atlas"}, 0, "Added Atlas › Design  "},
      {{"add", "Design", "0:10", "--project", "Atlas"}, 1, "overlaps the entry "},
      {{"start", "Write"}, 1, "no task is named “Write”"},
      {{"start", "Write", "--create"},
       1,
       "name the project to make it in with --project: “Atlas” (Acme), “Hermes”"},
      {{"start", "Write", "--project", "Zeus", "--client", "Olymp", "--create"},
       0,
       "Created client Olymp\nCreated project Zeus\nCreated task Zeus › Write\nStarted Zeus › Write\n"},
      {{"start", "write", "--project", "zeus", "--create"}, 0, "Zeus › Write is running already\n"},
      {{"add", "Design", "0:10", "--date", "2026-03-04", "--project", "hermes", "--create"},
       0,
       "Added Hermes › Design  2026-03-04 "},
      {{"add", "Atlas › Plan", "0:10", "--date", "2026-03-04", "--create"},
       0,
       "Created task Atlas › Plan\nAdded Atlas › Plan  "},
      {{"start", "Design", "--create"}, 1, "2 tasks are named “Design”"},
  };
  const QMap<QString, QString> berlin = {{"TZ", "Europe/Berlin"}, {"LANG", "C.UTF-8"}};
  for (const auto& c : cases) {
    const Outcome run = here.tessal(c.arguments, berlin);
    EXPECT_EQ(run.code, c.code) << c.arguments.join(' ').toStdString() << ": " << run.err.toStdString();
    EXPECT_TRUE((c.code == 0 ? run.out : run.err).contains(c.says))
        << c.arguments.join(' ').toStdString() << ": " << run.out.toStdString() << run.err.toStdString();
  }
  EXPECT_EQ(here.tessal({"list", "tasks", "--qualified"}, berlin).out.toStdString(),
            "Atlas › Build \"it\" now\nAtlas › Design\nAtlas › Plan\nHermes › Design\nHermes › Review\nZeus "
            "› Write\n");
  EXPECT_EQ(here.tessal({"list", "projects", "--client", "olymp"}, berlin).out.toStdString(), "Zeus\n");
  EXPECT_EQ(stored().running, QStringList({"Zeus/Write"}));
  // Exactly the accepted entries were added: 45 minutes ending this minute, the noted call, two on 4 March
  // and the running one.
  const std::unique_ptr<WTObjectContext> context = here.readStore();
  EXPECT_EQ(context->fetch<WTTime>().size(), 6);
  const QList<WTTime*> endingNow = context->fetch<WTTime>([](const WTTime* time) {
    return time->task()->project()->name() == "Atlas" && time->duration() == 45 && time->endDate() &&
           std::abs(time->endDate()->timeIntervalSince(Date::now())) < 120;
  });
  EXPECT_EQ(endingNow.size(), 1);
  EXPECT_EQ(context->fetch<WTTime>([](const WTTime* time) { return time->name() == "Call"; }).size(), 1);
}

TEST_F(TrackCommand, LogsTheEntriesOfARangeWithTheirTotals) {
  const QMap<QString, QString> berlin = {{"TZ", "Europe/Berlin"}, {"LANG", "C.UTF-8"}};
  Outcome run = here.tessal({"log", "--range", "2026-03-03..2026-03-03"}, berlin);
  EXPECT_EQ(run.code, 0) << run.err.toStdString();
  EXPECT_EQ(run.out.toStdString(),
            "2026-03-03  09:00–10:15  Hermes › Review  01:15  125.00\n"
            "Total: 1 entry  01:15  125.00\n");
  run = here.tessal({"log", "--range", "2026-03-04..2026-03-05", "--project", "hermes"}, berlin);
  EXPECT_EQ(run.out.toStdString(), "Total: 0 entries  00:00  0.00\n");
  run = here.tessal({"log", "--project", "nowhere"});
  EXPECT_EQ(run.code, 1);
  EXPECT_TRUE(run.err.contains("no project is named “nowhere”")) << run.err.toStdString();
}

TEST_F(TrackCommand, ListsEachNameOnceForPickersAndCompletion) {
  const QMap<QString, QString> c = {{"LANG", "C.UTF-8"}};
  EXPECT_EQ(here.tessal({"list", "tasks"}, c).out.toStdString(), "Build \"it\" now\nDesign\nReview\n");
  EXPECT_EQ(here.tessal({"list", "tasks", "--project", "HERMES"}, c).out.toStdString(), "Design\nReview\n");
  EXPECT_EQ(here.tessal({"list", "tasks", "--client", "acme"}, c).out.toStdString(),
            "Build \"it\" now\nDesign\n");
  EXPECT_EQ(here.tessal({"list", "projects", "--client", "Acme"}, c).out.toStdString(), "Atlas\n");
  EXPECT_EQ(here.tessal({"list", "clients"}, c).out.toStdString(), "Acme\n");
  EXPECT_EQ(here.tessal({"list", "notes"}).code, 2);

  // A picker offers every task once under a name of its own, and start takes that name back.
  EXPECT_EQ(here.tessal({"list", "tasks", "--qualified"}, c).out.toStdString(),
            "Atlas › Build \"it\" now\nAtlas › Design\nHermes › Design\nHermes › Review\n");
  const Outcome started = here.tessal({"start", "hermes › design"});
  EXPECT_EQ(started.code, 0) << started.err.toStdString();
  EXPECT_EQ(stored().running, QStringList({"Hermes/Design"}));
}

TEST(TrackCommandWithoutStore, SaysThereIsNoDataAndCreatesNoneUnlessAskedToCreate) {
  Installation here;
  for (const QStringList& arguments :
       {QStringList{"start", "Design"}, {"stop"}, {"status"}, {"add", "Design", "0:30"}}) {
    const Outcome run = here.tessal(arguments);
    EXPECT_EQ(run.code, 1);
    EXPECT_TRUE(run.err.contains("There is no data file at")) << run.err.toStdString();
  }
  EXPECT_FALSE(QFileInfo::exists(QFileInfo(here.storePath()).path()));

  // The shell alone starts a day's work: the store it makes has the first project, as the desktop's has.
  Outcome run = here.tessal({"add", "Design", "0:30", "--create"});
  EXPECT_EQ(run.code, 0) << run.err.toStdString();
  EXPECT_EQ(here.tessal({"list", "tasks", "--qualified"}).out.toStdString(),
            "Default Project › Default Task\nDefault Project › Design\n");
  EXPECT_EQ(here.tessal({"start", "Default Task"}).code, 0);

  // An installation that syncs takes its projects from the account: a first project of its own would
  // reach the account from every device set up.
  Installation syncing;
  syncing.setSetting("WTSyncUser", "shell@example.org");
  run = syncing.tessal({"start", "Design", "--create"});
  EXPECT_EQ(run.code, 1);
  EXPECT_TRUE(run.err.contains("there is no project to make it in")) << run.err.toStdString();
  run = syncing.tessal({"start", "Design", "--project", "Work", "--create"});
  EXPECT_EQ(run.code, 0) << run.err.toStdString();
  EXPECT_EQ(syncing.tessal({"list", "projects"}).out, "Work\n");
}

}  // namespace
