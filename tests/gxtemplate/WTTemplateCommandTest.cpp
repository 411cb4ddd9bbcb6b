#include "WTTemplateCommand.h"

#include "TemplateTestSupport.h"

#include <QFile>
#include <QTemporaryDir>

#include <unicode/locid.h>

namespace {

// `tessal template` as a report author runs it: files in, text and error lines out.
class TemplateCommandTest : public ::testing::Test {
 protected:
  QString write(const QString& name, const QByteArray& bytes) {
    QFile file(dir.filePath(name));
    EXPECT_TRUE(file.open(QIODevice::WriteOnly));
    file.write(bytes);
    return file.fileName();
  }

  int run(const QStringList& arguments) {
    out.clear();
    err.clear();
    QTextStream outStream(&out);
    QTextStream errStream(&err);
    return runTemplateCommand(arguments, outStream, errStream);
  }

  QTemporaryDir dir;
  QString out;
  QString err;
};

TEST_F(TemplateCommandTest, RendersJsonVariablesWithTheReportFilters) {
  UErrorCode status = U_ZERO_ERROR;
  icu::Locale::setDefault(icu::Locale("en_US"), status);
  const QString templ =
      write("report.txt",
            "{{ client.name | uppercase }}: {% for item in items %}{{ item.minutes | digiclock }} "
            "{{ item.cost | decimal }} {{ item.cost }}{% if item.billed %} billed{% /if %}\n{% /for %}"
            "{{ count }} {{ ratio }} {{ huge }} {{ items.1.note }}");
  const QString vars = write("vars.json", R"({
      "client": {"name": "Acme"},
      "items": [{"minutes": 90, "cost": 1234.50, "billed": true, "note": null},
                {"minutes": 5, "cost": 2, "billed": false}],
      "count": 2, "ratio": 0.1, "huge": 123456789012345678901234567890})");
  EXPECT_EQ(run({templ, "--vars", vars}), 0);
  EXPECT_EQ(out, QStringLiteral("ACME: 01:30 1,234.50 1234.50 billed\n00:05 2.00 2\n"
                                "2 0.1 123456789012345678901234567890 "));
  // null is absent: the note is no variable.
  EXPECT_EQ(err, QStringLiteral("error 3: \"items.1.note\" is not a valid variable\n"));
}

TEST_F(TemplateCommandTest, ErrorsGoToStandardErrorInTheOrderReported) {
  const QString templ = write("t.txt", "a{{ x }}{% bogus %}{% for 1 to 2 %}b");
  EXPECT_EQ(run({templ}), 0);
  EXPECT_EQ(out, QStringLiteral("ab"));
  EXPECT_EQ(err, QStringLiteral("error 3: \"x\" is not a valid variable\n"
                                "error 2: \"bogus\" is not a valid marker\n"
                                "error 6: Finished processing template, but 1 block was left open (for).\n"));
}

TEST_F(TemplateCommandTest, MissingFilesAndBadJsonExitWithTwo) {
  const QString templ = write("t.txt", "x");
  EXPECT_EQ(run({dir.filePath("missing.txt")}), 2);
  EXPECT_TRUE(out.isEmpty());
  EXPECT_TRUE(err.contains(dir.filePath("missing.txt"))) << err.toStdString();
  EXPECT_EQ(err.count(u'\n'), 1);

  for (const QByteArray& json : {QByteArray("{\"a\": }"), QByteArray("[1, 2]"), QByteArray("")}) {
    const QString vars = write("bad.json", json);
    EXPECT_EQ(run({templ, "--vars", vars}), 2) << json.constData();
    EXPECT_TRUE(err.contains(vars)) << err.toStdString();
    EXPECT_EQ(err.count(u'\n'), 1) << err.toStdString();
    EXPECT_TRUE(out.isEmpty());
  }
  EXPECT_EQ(run({templ, "--vars", dir.filePath("none.json")}), 2);
  EXPECT_TRUE(err.contains(dir.filePath("none.json")));
}

TEST_F(TemplateCommandTest, UnreadableTemplatesGiveNoResult) {
  EXPECT_EQ(run({write("latin1.txt", QByteArray("Gr\xfc\xdf"
                                                "e"))}),
            1);
  EXPECT_TRUE(out.isEmpty());
  EXPECT_EQ(run({dir.path()}), 1);  // a folder is no text
}

TEST_F(TemplateCommandTest, UsageErrorsExitWithTwo) {
  const QString templ = write("t.txt", "x");
  for (const QStringList& arguments : {QStringList{}, QStringList{templ, templ}, QStringList{templ, "--vars"},
                                       QStringList{"--verbose", templ}}) {
    EXPECT_EQ(run(arguments), 2) << arguments.join(' ').toStdString();
    EXPECT_TRUE(err.startsWith(QStringLiteral("usage: tessal template"))) << err.toStdString();
  }
  EXPECT_EQ(run({"--vars", write("v.json", "{}"), templ}), 0);
  EXPECT_EQ(out, QStringLiteral("x"));
}

}  // namespace
