#include "WTTemplateCommand.h"

#include <gtest/gtest.h>

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

TEST_F(TemplateCommandTest, RefusalsAreOneLineNamingTheCause) {
  const QString templ = write("t.txt", "x");
  struct Case {
    QStringList arguments;
    int code;  // 2 for what the user typed wrong, 1 when the template gave no result
    QString says;
  };
  const QString bad[] = {write("bad1.json", "{\"a\": }"), write("bad2.json", "[1, 2]"),
                         write("bad3.json", "")};
  const Case cases[] = {
      {{dir.filePath("missing.txt")}, 2, dir.filePath("missing.txt")},
      {{templ, "--vars", bad[0]}, 2, bad[0]},
      {{templ, "--vars", bad[1]}, 2, bad[1]},
      {{templ, "--vars", bad[2]}, 2, bad[2]},
      {{templ, "--vars", dir.filePath("none.json")}, 2, dir.filePath("none.json")},
      {{write("latin1.txt", QByteArray("Gr\xfc\xdf"
                                       "e"))},
       1,
       "latin1.txt"},
      {{dir.path()}, 1, dir.path()},  // a folder is no text
      {{}, 2, "usage: tessal template"},
      {{templ, templ}, 2, "usage: tessal template"},
      {{templ, "--vars"}, 2, "usage: tessal template"},
      {{"--verbose", templ}, 2, "usage: tessal template"},
  };
  for (const Case& c : cases) {
    const std::string what = c.arguments.join(' ').toStdString();
    EXPECT_EQ(run(c.arguments), c.code) << what;
    EXPECT_TRUE(out.isEmpty() && err.contains(c.says) && err.count(u'\n') == 1)
        << what << ": " << err.toStdString();
  }
  EXPECT_EQ(run({"--vars", write("v.json", "{}"), templ}), 0);
  EXPECT_EQ(out, QStringLiteral("x"));
}

}  // namespace
