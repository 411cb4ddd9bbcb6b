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
  const Outcome html = here.expect({"report", "--client", "ACME", "--mode", "1"}, 0, "Beacon", kBerlin);
  EXPECT_EQ(html.err, "");
  EXPECT_TRUE(html.out.contains("260.00")) << "the grand total";  // 120 + 60 + 80
  EXPECT_FALSE(html.out.contains("Other"));
  const QString htmlFile = here.path("report.html");
  here.expect({"report", "--client", "acme", "--mode", "1", "--out", htmlFile}, 0, "", kBerlin);
  EXPECT_EQ(bytesOf(htmlFile), html.out.toUtf8());

  // Projects by name, tasks in their order; durations as the report writes them, money with two decimals.
  const QString csvFile = here.path("report.csv");
  EXPECT_EQ(here.expect({"report", "--client", "Acme", "--out", csvFile}, 0, "", kBerlin).out, "");
  EXPECT_EQ(bytesOf(csvFile),
            "\"Atlas\",\"Design \\\"v2\\\", "
            "final\",\"02:15\",\"180.00\"\n\"Beacon\",\"Build\",\"01:00\",\"80.00\"\n");
  here.expect({"report", "--project", "atlas ", "--mode", "2", "--out", csvFile}, 1, "",
              kBerlin);  // a trailing space is part of the name
  here.expect({"report", "--project", "Beacon", "--mode", "2", "--out", csvFile}, 0, "", kBerlin);
  EXPECT_EQ(bytesOf(csvFile), "\"Beacon\",\"Build\",\"2026-03-04\",\"01:00\",\"80.00\"\n");

  const QString pdfFile = here.path("report.pdf");
  here.expect({"report", "--client", "Acme", "--mode", "3", "--out", pdfFile}, 0, "", kBerlin);
  EXPECT_TRUE(bytesOf(pdfFile).startsWith("%PDF-"));
  EXPECT_FALSE(QFile::exists(pdfFile + ".part"));
  const QString pdftotext = QStandardPaths::findExecutable("pdftotext");
  if (pdftotext.isEmpty()) GTEST_SKIP() << "pdftotext (poppler-utils) is not installed";
  QProcess text;
  text.start(pdftotext, {pdfFile, "-"});
  ASSERT_TRUE(text.waitForFinished(30000));
  const QString pages = QString::fromUtf8(text.readAllStandardOutput());
  EXPECT_TRUE(pages.contains("260.00") && pages.contains("Acme")) << pages.toStdString();
}

// Refused arguments (2) and names that fit no record or several (1, naming the candidates) write nothing.
TEST_F(ReportCommand, RefusesBadArgumentsNamesAndBrokenTemplatesWritingNothing) {
  const QString out = here.path("never.html");
  const struct {
    QStringList arguments;
    int code;
    QStringList says;
  } cases[] = {
      // clang-format off
      {{"report"}, 2, {"usage: tessal report"}},
      {{"report", "--project", "Beacon", "--client", "Acme"}, 2, {"usage: tessal report"}},
      {{"report", "--project", "Beacon", "--mode", "4"}, 2, {"usage: tessal report"}},
      {{"report", "--project", "Beacon", "--mode", "one"}, 2, {"usage: tessal report"}},
      {{"report", "--project", "Beacon", "--out", here.path("report.doc")}, 2, {"usage: tessal report"}},
      {{"report", "--project", "Beacon", "--template", here.path("missing.txt")}, 2,
       {"usage: tessal report"}},
      {{"report", "--project", "Beacon", "--project", "Atlas"}, 2, {"usage: tessal report"}},
      {{"report", "--project", "Beacon", "stray"}, 2, {"usage: tessal report"}},
      {{"report", "--projects", "Beacon"}, 2, {"usage: tessal report"}},
      {{"export", "--range", "fortnight"}, 2, {"usage: tessal export"}},
      {{"export", "--range", "2026-03-04..2026-03-03"}, 2, {"usage: tessal export"}},
      {{"export", "--range", "2026-02-30..2026-03-03"}, 2, {"usage: tessal export"}},
      {{"report", "--project", "ATLAS"}, 1,
       {"2 projects are named “ATLAS”", "“Atlas” (Acme)", "“atlas” (Other)"}},
      {{"export", "--project", "Nowhere"}, 1, {"no project is named “Nowhere”", "“Beacon” (Acme)"}},
      {{"report", "--client", "Initech"}, 1, {"“Acme”, “Other”"}},
      // clang-format on
  };
  for (const auto& c : cases) {
    const Outcome run = here.expect(c.arguments, c.code, c.says.first());
    EXPECT_EQ(run.out, "");
    for (const QString& said : c.says) EXPECT_TRUE(run.err.contains(said)) << run.err.toStdString();
  }

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

TEST_F(ReportCommand, ExportsTheTimeEntriesOfARange) {
  // 3 March covers its whole day, up to the entry that starts at 23:30, and not the next morning's.
  const Outcome day = here.expect({"export", "--range", "2026-03-03..2026-03-03"}, 0, "", kBerlin);
  const QStringList lines = day.out.split('\n', Qt::SkipEmptyParts);
  ASSERT_EQ(lines.size(), 2) << day.out.toStdString();
  for (const QString& line : lines)
    EXPECT_TRUE(line.startsWith("\"Atlas\",\"Design \\\"v2\\\", final\",")) << line.toStdString();
  EXPECT_EQ(here.tessal({"export"}, kBerlin).out.count('\n'), 3);
  const Outcome beacon =
      here.expect({"export", "--range", "any", "--project", "beacon"}, 0, "\"Beacon\",\"Build\",", kBerlin);
  EXPECT_EQ(beacon.out.count('\n'), 1);

  // The file is the answer: stdout stays empty, stderr stays for problems.
  const QString file = here.path("times.csv");
  const Outcome written =
      here.expect({"export", "--range", "2026-03-03..2026-03-03", "--out", file}, 0, "", kBerlin);
  EXPECT_EQ(written.out + written.err, "");
  EXPECT_EQ(bytesOf(file), day.out.toUtf8());
  here.expect({"export", "--range", "last-year", "--out", file}, 0, "", kBerlin);
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

  here.expect({"report", "--project", "late"}, 0, "");
  EXPECT_EQ(here.expect({"export", "--project", "Beacon"}, 0, "").out.count('\n'), 1);

  EXPECT_EQ(bytesOf(here.storePath()), store);
  EXPECT_EQ(bytesOf(here.storePath() + "-wal"), log);
  project(*context, "Later");
  EXPECT_TRUE(context->save()) << "the running copy still writes";
}

TEST(ReportCommandWithoutStore, SaysThereIsNoDataAndCreatesNone) {
  Installation here;
  here.expect({"export"}, 1, "There is no data file at");
  EXPECT_FALSE(QFile::exists(here.storePath()));
}

}  // namespace
