// The bash completion the package installs, run by a real bash against the real `tessal` and store.
#include "CommandLineInstallation.h"

#include <QStandardPaths>

namespace {

using namespace commandtest;

const QString kCompletion = QStringLiteral(TESSAL_TEST_DATA_DIR "/../../packaging/tessal.bash-completion");

class BashCompletion : public ::testing::Test {
 protected:
  void SetUp() override {
    if (QStandardPaths::findExecutable("bash").isEmpty()) GTEST_SKIP() << "bash is not installed";
    ASSERT_TRUE(QFile::exists(kCompletion));
    // `tessal` on the PATH, as the package puts it.
    QDir().mkpath(here.path("bin"));
    ASSERT_TRUE(QFile::link(QString::fromUtf8(TESSAL_EXE), here.path("bin/tessal")));
  }

  // What completing `line` offers, sorted; `words` as bash cuts them, `replaced` the part readline replaces.
  QStringList completeAsBash(const QString& line, const QStringList& words, const QString& replaced) const {
    QProcess bash;
    QProcessEnvironment environment = here.environment();
    environment.insert("PATH", here.path("bin") + ":" + environment.value("PATH"));
    bash.setProcessEnvironment(environment);
    bash.start("bash",
               QStringList{"--norc", "--noprofile", "-c",
                           "source \"$1\"; COMP_LINE=$2; COMP_POINT=${#COMP_LINE}; replaced=$3; shift 3; "
                           "COMP_WORDS=(tessal \"$@\"); COMP_CWORD=$#; "
                           "_tessal tessal \"$replaced\" \"${COMP_WORDS[COMP_CWORD - 1]}\"; "
                           "printf '%s\\n' \"${COMPREPLY[@]}\"",
                           "bash", kCompletion, line, replaced} +
                   words);
    EXPECT_TRUE(bash.waitForFinished(30000));
    const QString errors = QString::fromUtf8(bash.readAllStandardError());
    EXPECT_TRUE(errors.isEmpty()) << errors.toStdString();
    QStringList offered = QString::fromUtf8(bash.readAllStandardOutput()).split('\n', Qt::SkipEmptyParts);
    offered.sort();
    return offered;
  }

  Installation here;
};

}  // namespace

// Names come quoted, narrowed, case-blind, finishing the word readline replaces; none without a store.
TEST_F(BashCompletion, OffersCommandsOptionsValuesAndQuotedNames) {
  EXPECT_EQ(completeAsBash("tessal start ", {"start", ""}, "") +
                completeAsBash("tessal report --project ", {"report", "--project", ""}, ""),
            QStringList());
  EXPECT_FALSE(QFileInfo::exists(here.storePath()));
  std::unique_ptr<WTObjectContext> context = here.openStore();
  auto* acme = WTClient::insertNewObject(context.get());
  acme->setName("Acme Corp");
  auto* other = WTClient::insertNewObject(context.get());
  other->setName("Other");
  for (const auto& [project, client, first, second] :
       {std::tuple{"Atlas", acme, "Build \"it\" now", "Design"},
        {"Beacon", other, "Build pipeline", "Fix: it's late"}}) {
    WTProject* made = commandtest::project(*context, project, client);
    task(*context, made, first);
    task(*context, made, second);
  }
  ASSERT_TRUE(context->save());
  const struct {
    QStringList words;
    QStringList offered;
    const char* line = nullptr;      // null: "tessal " and the words
    const char* replaced = nullptr;  // null: the last word
  } cases[] = {
      // clang-format off
      {{"st"}, {"start", "status", "stop"}},
      {{"report", "--"}, {"--client", "--mode", "--out", "--project", "--range", "--template"}},
      {{"export", "--range", "last-"}, {"last-month", "last-week", "last-year"}},
      {{"export", "--format", ""}, {"spreadsheet", "times"}},
      {{"report", "--mode", ""}, {"0", "1", "2", "3"}},
      {{"list", "p"}, {"projects"}},
      {{"a"}, {"add"}},
      {{"add", "--"}, {"--client", "--create", "--date", "--note", "--project"}},
      {{"add", "--date", "y"}, {"yesterday"}},
      {{"i"}, {"import"}},
      {{"re"}, {"report", "restore"}},
      {{"import", "--format", "t"}, {"tessal", "timewarrior", "toggl"}},
      {{"import", "a.csv", "--"}, {"--dry-run", "--format", "--stop-running", "--tags", "--tz"}},
      {{"add", "Design", "0:45", "--c"}, {"--client", "--create"}},
      {{"start", "--c"}, {"--client", "--create"}},
      {{"start", "Build"}, {"Build\\ \\\"it\\\"\\ now", "Build\\ pipeline"}},
      {{"start", "Build\\ \\\""}, {"Build\\ \\\"it\\\"\\ now"}},
      {{"start", "--project", "atlas", "B"}, {"Build\\ \\\"it\\\"\\ now"}},
      {{"stop", "--client", "\"Acme Corp\"", "Bu"}, {"Build\\ \\\"it\\\"\\ now"}},
      {{"start", "Design", ""}, {}},  // one task a command
      {{"report", "--client", "A"}, {"Acme\\ Corp"}},
      {{"report", "--client", "Other", "--project", ""}, {"Beacon"}},
      {{"start", "build\\ p"}, {"Build\\ pipeline"}},
      // Inside double quotes only \ " $ ` are escaped.
      {{"start", "\"Bu"}, {"Build \\\"it\\\" now", "Build pipeline"}, "tessal start \"Bu", "Bu"},
      {{"start", "'Fix: it"}, {"Fix: it'\\''s late"}, "tessal start 'Fix: it", "Fix: it"},
      // "Fix:" stays on the line as typed; tessal reads it in any case.
      {{"start", "Fix", ":"}, {"\\ it\\'s\\ late"}, "tessal start Fix:", ""},
      {{"start", "fix", ":"}, {"\\ it\\'s\\ late"}, "tessal start fix:", ""},
      {{"start", "--project", "=", "beacon", "B"}, {"Build\\ pipeline"}, "tessal start --project=beacon B", "B"},
      {{"report", "--client", "=", "Other", "--project", "="}, {"Beacon"}, "tessal report --client=Other --project=", ""},
      {{"export", "--range", "=", "this-"}, {"this-month", "this-week", "this-year"}, "tessal export --range=this-", "this-"},
      // clang-format on
  };
  for (const auto& c : cases) {
    const QString line = c.line ? QString::fromUtf8(c.line) : "tessal " + c.words.join(' ');
    EXPECT_EQ(completeAsBash(line, c.words, c.replaced ? QString::fromUtf8(c.replaced) : c.words.last()),
              c.offered)
        << line.toStdString();
  }
}
