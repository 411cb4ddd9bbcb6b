// `tessal report` and `tessal export` as a user's shell runs them: the real executable over a real store
// file, without a display, beside a desktop copy or not.
#include "CommandLineInstallation.h"
#include "WTSingleInstance.h"

#include <gtest/gtest.h>

#include <QStandardPaths>
#include <QTimeZone>

namespace {

using commandtest::addTime;
using commandtest::Installation;
using commandtest::Outcome;
using commandtest::project;
using commandtest::task;

const QMap<QString, QString> kBerlin = {{"TZ", "Europe/Berlin"}, {"LANG", "C.UTF-8"}};

Date berlin(int month, int day, int hour, int minute = 0) {
  return Date::fromQDateTime(
      QDateTime(QDate(2026, month, day), QTime(hour, minute), QTimeZone("Europe/Berlin")));
}

QByteArray bytesOf(const QString& path) {
  QFile file(path);
  return file.open(QIODevice::ReadOnly) ? file.readAll() : QByteArray();
}

// Two clients with a project name that differs only in case, a task name with quotes and a comma, and time
// entries around the day 3 March 2026 in Berlin.
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
    addTime(*context, design, berlin(3, 3, 0, 30), berlin(3, 3, 2));       // 90 minutes: 120.00
    addTime(*context, design, berlin(3, 3, 23, 30), berlin(3, 4, 0, 15));  // 45 minutes: 60.00
    addTime(*context, task(*context, beacon, "Build"), berlin(3, 4, 10), berlin(3, 4, 11));
    ASSERT_TRUE(context->save());
  }

  Installation here;
  std::unique_ptr<WTObjectContext> context;  // stays open, as a desktop copy's would
};

TEST_F(ReportCommand, WritesTheReportAsHtmlPdfAndCsv) {
  const Outcome html = here.tessal({"report", "--client", "ACME", "--mode", "1"}, kBerlin);
  ASSERT_EQ(html.code, 0) << html.err.toStdString();
  EXPECT_EQ(html.err, "");
  EXPECT_TRUE(html.out.contains("Beacon")) << html.out.toStdString();
  EXPECT_TRUE(html.out.contains("260.00")) << "the grand total";  // 120 + 60 + 80
  EXPECT_FALSE(html.out.contains("Other"));

  const QString htmlFile = here.path("report.html");
  ASSERT_EQ(here.tessal({"report", "--client", "acme", "--mode", "1", "--out", htmlFile}, kBerlin).code, 0);
  EXPECT_EQ(bytesOf(htmlFile), html.out.toUtf8());

  // Projects by name, tasks in their order; durations as the report writes them, money with two decimals.
  const QString csvFile = here.path("report.csv");
  const Outcome csv = here.tessal({"report", "--client", "Acme", "--out", csvFile}, kBerlin);
  ASSERT_EQ(csv.code, 0) << csv.err.toStdString();
  EXPECT_EQ(csv.out, "");
  EXPECT_EQ(QString::fromUtf8(bytesOf(csvFile)),
            "\"Atlas\",\"Design \\\"v2\\\", final\",\"02:15\",\"180.00\"\n"
            "\"Beacon\",\"Build\",\"01:00\",\"80.00\"\n");
  const Outcome days =
      here.tessal({"report", "--project", "atlas ", "--mode", "2", "--out", csvFile}, kBerlin);
  EXPECT_EQ(days.code, 1) << "a trailing space is part of the name";
  ASSERT_EQ(here.tessal({"report", "--project", "Beacon", "--mode", "2", "--out", csvFile}, kBerlin).code, 0);
  EXPECT_EQ(QString::fromUtf8(bytesOf(csvFile)), "\"Beacon\",\"Build\",\"2026-03-04\",\"01:00\",\"80.00\"\n");

  const QString pdfFile = here.path("report.pdf");
  const Outcome pdf = here.tessal({"report", "--client", "Acme", "--mode", "3", "--out", pdfFile}, kBerlin);
  ASSERT_EQ(pdf.code, 0) << pdf.err.toStdString();
  EXPECT_TRUE(bytesOf(pdfFile).startsWith("%PDF-"));
  EXPECT_FALSE(QFile::exists(pdfFile + ".part"));
  const QString pdftotext = QStandardPaths::findExecutable("pdftotext");
  if (pdftotext.isEmpty()) GTEST_SKIP() << "pdftotext (poppler-utils) is not installed";
  QProcess text;
  text.start(pdftotext, {pdfFile, "-"});
  ASSERT_TRUE(text.waitForFinished(30000));
  const QString pages = QString::fromUtf8(text.readAllStandardOutput());
  EXPECT_TRUE(pages.contains("260.00")) << pages.toStdString();
  EXPECT_TRUE(pages.contains("Acme")) << pages.toStdString();
}

// Refused arguments (2) and names that fit no record or several (1, naming the candidates) write nothing.
TEST_F(ReportCommand, RefusesBadArgumentsNamesAndBrokenTemplatesWritingNothing) {
  const QString out = here.path("never.html");
  const struct {
    QStringList arguments;
    int code;
    QStringList says;
  } cases[] = {
      {{"report"}, 2, {"usage: tessal report"}},
      {{"report", "--project", "Beacon", "--client", "Acme"}, 2, {"usage: tessal report"}},
      {{"report", "--project", "Beacon", "--mode", "4"}, 2, {"usage: tessal report"}},
      {{"report", "--project", "Beacon", "--mode", "one"}, 2, {"usage: tessal report"}},
      {{"report", "--project", "Beacon", "--out", here.path("report.doc")}, 2, {"usage: tessal report"}},
      {{"report", "--project", "Beacon", "--template", here.path("missing.txt")},
       2,
       {"usage: tessal report"}},
      {{"report", "--project", "Beacon", "--project", "Atlas"}, 2, {"usage: tessal report"}},
      {{"report", "--project", "Beacon", "stray"}, 2, {"usage: tessal report"}},
      {{"report", "--projects", "Beacon"}, 2, {"usage: tessal report"}},
      {{"export", "--range", "fortnight"}, 2, {"usage: tessal export"}},
      {{"export", "--range", "2026-03-04..2026-03-03"}, 2, {"usage: tessal export"}},
      {{"export", "--range", "2026-02-30..2026-03-03"}, 2, {"usage: tessal export"}},
      {{"report", "--project", "ATLAS"},
       1,
       {"2 projects are named “ATLAS”", "“Atlas” (Acme)", "“atlas” (Other)"}},
      {{"export", "--project", "Nowhere"}, 1, {"no project is named “Nowhere”", "“Beacon” (Acme)"}},
      {{"report", "--client", "Initech"}, 1, {"“Acme”, “Other”"}},
  };
  for (const auto& c : cases) {
    const Outcome run = here.tessal(c.arguments);
    EXPECT_EQ(run.code, c.code) << c.arguments.join(' ').toStdString() << ": " << run.err.toStdString();
    for (const QString& said : c.says) EXPECT_TRUE(run.err.contains(said)) << run.err.toStdString();
    EXPECT_EQ(run.out, "");
  }

  const QString broken =
      here.file("broken.txt", "{% for p in projects %}{{ p.name }}{% /if %}\n{{ nowhere }}");
  const Outcome run = here.tessal({"report", "--project", "Beacon", "--template", broken, "--out", out});
  EXPECT_EQ(run.code, 1);
  EXPECT_TRUE(run.err.startsWith("error ")) << run.err.toStdString();
  EXPECT_FALSE(QFile::exists(out));
  const Outcome toStdout = here.tessal({"report", "--project", "Beacon", "--template", broken});
  EXPECT_EQ(toStdout.code, 1);
  EXPECT_EQ(toStdout.out, "");

  // A template of the user's own is used as given.
  const QString own = here.file("own.txt", "{% for p in projects %}<{{ p.name }}:{{ mode }}>{% /for %}");
  const Outcome rendered = here.tessal({"report", "--client", "Acme", "--mode", "2", "--template", own});
  EXPECT_EQ(rendered.code, 0) << rendered.err.toStdString();
  EXPECT_EQ(rendered.out, "<Atlas:2><Beacon:2>");
}

TEST_F(ReportCommand, ExportsTheTimeEntriesOfARange) {
  // 3 March covers its whole day, up to the entry that starts at 23:30, and not the next morning's.
  const Outcome day = here.tessal({"export", "--range", "2026-03-03..2026-03-03"}, kBerlin);
  ASSERT_EQ(day.code, 0) << day.err.toStdString();
  const QStringList lines = day.out.split('\n', Qt::SkipEmptyParts);
  ASSERT_EQ(lines.size(), 2) << day.out.toStdString();
  for (const QString& line : lines)
    EXPECT_TRUE(line.startsWith("\"Atlas\",\"Design \\\"v2\\\", final\",")) << line.toStdString();

  const Outcome all = here.tessal({"export"}, kBerlin);
  EXPECT_EQ(all.out.count('\n'), 3);
  const Outcome beacon = here.tessal({"export", "--range", "any", "--project", "beacon"}, kBerlin);
  ASSERT_EQ(beacon.code, 0) << beacon.err.toStdString();
  ASSERT_EQ(beacon.out.count('\n'), 1);
  EXPECT_TRUE(beacon.out.startsWith("\"Beacon\",\"Build\",")) << beacon.out.toStdString();

  const QString file = here.path("times.csv");
  const Outcome written =
      here.tessal({"export", "--range", "2026-03-03..2026-03-03", "--out", file}, kBerlin);
  ASSERT_EQ(written.code, 0) << written.err.toStdString();
  EXPECT_EQ(written.out, "");
  EXPECT_EQ(bytesOf(file), day.out.toUtf8());
  // The file is the answer: stderr stays for problems.
  EXPECT_EQ(written.err, "");

  const Outcome none = here.tessal({"export", "--range", "last-year", "--out", file}, kBerlin);
  ASSERT_EQ(none.code, 0);
  EXPECT_EQ(bytesOf(file), QByteArray());
}

TEST_F(ReportCommand, ReadsBesideARunningDesktopCopyAndChangesNothing) {
  WTSingleInstance desktop(here.runtimeFolder() + "/tessal.socket");
  ASSERT_TRUE(desktop.start());
  // Saved by the running copy a moment ago: still in its write-ahead log.
  project(*context, "Late");
  ASSERT_TRUE(context->save());
  const QByteArray store = bytesOf(here.storePath());
  const QByteArray log = bytesOf(here.storePath() + "-wal");
  ASSERT_FALSE(log.isEmpty());

  const Outcome report = here.tessal({"report", "--project", "late"});
  EXPECT_EQ(report.code, 0) << report.err.toStdString();
  const Outcome exported = here.tessal({"export", "--project", "Beacon"});
  EXPECT_EQ(exported.code, 0) << exported.err.toStdString();
  EXPECT_EQ(exported.out.count('\n'), 1);

  EXPECT_EQ(bytesOf(here.storePath()), store);
  EXPECT_EQ(bytesOf(here.storePath() + "-wal"), log);
  project(*context, "Later");
  EXPECT_TRUE(context->save()) << "the running copy still writes";
}

TEST(ReportCommandWithoutStore, SaysThereIsNoDataAndCreatesNone) {
  Installation here;
  const Outcome run = here.tessal({"export"});
  EXPECT_EQ(run.code, 1);
  EXPECT_TRUE(run.err.contains("There is no data file at")) << run.err.toStdString();
  EXPECT_FALSE(QFile::exists(here.storePath()));
}

}  // namespace
