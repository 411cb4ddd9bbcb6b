// The bash completion the package installs, run by a real bash against the real `tessal` and store.
#include "CommandLineInstallation.h"
#include "WTClient.h"
#include "WTProject.h"
#include "WTTask.h"

#include <gtest/gtest.h>

#include <QStandardPaths>

namespace {

using commandtest::Installation;

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

  void makeStore() {
    std::unique_ptr<WTObjectContext> context = here.openStore();
    auto* acme = WTClient::insertNewObject(context.get());
    acme->setName("Acme Corp");
    auto* other = WTClient::insertNewObject(context.get());
    other->setName("Other");
    auto project = [&](const QString& name, WTClient* client) {
      auto* project = WTProject::insertNewObject(context.get());
      project->setName(name);
      project->setClient(client);
      return project;
    };
    auto task = [&](WTProject* project, const QString& name) {
      auto* task = WTTask::insertNewObject(context.get());
      task->setName(name);
      task->setProject(project);
    };
    WTProject* atlas = project("Atlas", acme);
    WTProject* beacon = project("Beacon", other);
    task(atlas, "Build \"it\" now");
    task(atlas, "Design");
    task(beacon, "Build pipeline");
    task(beacon, "Fix: it's late");
    ASSERT_TRUE(context->save());
  }

  // What completing the last of `words` (after "tessal") offers, one a line, in order.
  QStringList complete(const QStringList& words) const {
    return completeAsBash("tessal " + words.join(' '), words, words.last());
  }
  // The same for the typed `line` as bash hands it over: cut into `words` (also at '=' and ':', quotes
  // kept), and `replaced`, the end of the last word readline puts the completion in place of (after a
  // quote still open, without the quote).
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

TEST_F(BashCompletion, OffersCommandsOptionsAndValues) {
  makeStore();
  EXPECT_EQ(complete({"st"}), QStringList({"start", "status", "stop"}));
  EXPECT_EQ(complete({"report", "--"}),
            QStringList({"--client", "--mode", "--out", "--project", "--template"}));
  EXPECT_EQ(complete({"export", "--range", "last-"}), QStringList({"last-month", "last-week", "last-year"}));
  EXPECT_EQ(complete({"report", "--mode", ""}), QStringList({"0", "1", "2", "3"}));
  EXPECT_EQ(complete({"list", "p"}), QStringList({"projects"}));
  EXPECT_EQ(complete({"a"}), QStringList({"add"}));
  EXPECT_EQ(complete({"add", "--"}), QStringList({"--client", "--create", "--date", "--note", "--project"}));
  EXPECT_EQ(complete({"add", "--date", "y"}), QStringList({"yesterday"}));
  EXPECT_EQ(complete({"add", "Design", "0:45", "--c"}), QStringList({"--client", "--create"}));
  EXPECT_EQ(complete({"start", "--c"}), QStringList({"--client", "--create"}));
}

TEST_F(BashCompletion, NamesComeQuotedAndNarrowedByTheOptionsAlreadyTyped) {
  makeStore();
  // A name with spaces and quotes becomes one word the shell reads back as the name.
  EXPECT_EQ(complete({"start", "Build"}), QStringList({"Build\\ \\\"it\\\"\\ now", "Build\\ pipeline"}));
  EXPECT_EQ(complete({"start", "Build\\ \\\""}), QStringList({"Build\\ \\\"it\\\"\\ now"}));
  EXPECT_EQ(complete({"start", "--project", "atlas", "B"}), QStringList({"Build\\ \\\"it\\\"\\ now"}));
  EXPECT_EQ(complete({"stop", "--client", "\"Acme Corp\"", "Bu"}), QStringList({"Build\\ \\\"it\\\"\\ now"}));
  EXPECT_EQ(complete({"start", "Design", ""}), QStringList()) << "one task a command";
  EXPECT_EQ(complete({"report", "--client", "A"}), QStringList({"Acme\\ Corp"}));
  EXPECT_EQ(complete({"report", "--client", "Other", "--project", ""}), QStringList({"Beacon"}));
  // Names are matched in any case, as tessal itself matches them, and come back as they are spelt.
  EXPECT_EQ(complete({"start", "build\\ p"}), QStringList({"Build\\ pipeline"}));
  EXPECT_EQ(complete({"report", "--client", "ACME"}), QStringList({"Acme\\ Corp"}));
}

// Readline puts a completion in place of its own part of the word only: after an open quote, after
// "--option=" or after a colon. What it puts there must finish the word so that it reads as the name.
TEST_F(BashCompletion, FinishesWordsBegunInQuotesAfterAnEqualsSignOrAColon) {
  makeStore();
  EXPECT_EQ(completeAsBash("tessal start \"Bu", {"start", "\"Bu"}, "Bu"),
            QStringList({"Build \\\"it\\\" now", "Build pipeline"}))
      << "inside double quotes only \\ \" $ ` are escaped";
  EXPECT_EQ(completeAsBash("tessal start 'Fix: it", {"start", "'Fix: it"}, "Fix: it"),
            QStringList({"Fix: it'\\''s late"}));
  EXPECT_EQ(completeAsBash("tessal start Fix:", {"start", "Fix", ":"}, ""), QStringList({"\\ it\\'s\\ late"}))
      << "\"Fix:\" stays on the line";
  EXPECT_EQ(
      completeAsBash("tessal start --project=beacon B", {"start", "--project", "=", "beacon", "B"}, "B"),
      QStringList({"Build\\ pipeline"}));
  EXPECT_EQ(completeAsBash("tessal report --client=Other --project=",
                           {"report", "--client", "=", "Other", "--project", "="}, ""),
            QStringList({"Beacon"}));
  EXPECT_EQ(completeAsBash("tessal start fix:", {"start", "fix", ":"}, ""), QStringList({"\\ it\\'s\\ late"}))
      << "\"fix:\" stays as typed; tessal reads it in any case";
  EXPECT_EQ(completeAsBash("tessal start \"bu", {"start", "\"bu"}, "bu"),
            QStringList({"Build \\\"it\\\" now", "Build pipeline"}));
  EXPECT_EQ(completeAsBash("tessal export --range=this-", {"export", "--range", "=", "this-"}, "this-"),
            QStringList({"this-month", "this-week", "this-year"}));
}

TEST_F(BashCompletion, WithoutAStoreOffersNoNamesAndSaysNothing) {
  EXPECT_EQ(complete({"start", ""}), QStringList());
  EXPECT_EQ(complete({"report", "--project", ""}), QStringList());
  EXPECT_FALSE(QFileInfo::exists(here.storePath()));
}
