// The `tessal` executable's window-less commands, run as a user's shell would run them: a separate
// process with its own data and settings folders.
#include "CommandLineInstallation.h"
#include "SyncTestSupport.h"
#include "WTProject.h"
#include "WTSingleInstance.h"
#include "WTTask.h"

#include <gtest/gtest.h>

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

  const Outcome missing = here.tessal({"template", templateFile, "--vars", "/nonexistent/vars.json"});
  EXPECT_EQ(missing.code, 2);
  EXPECT_TRUE(missing.err.contains("/nonexistent/vars.json")) << missing.err.toStdString();
  EXPECT_EQ(missing.out, "");
}

TEST(WTCommandLine, HelpVersionAndBadArgumentsNeedNoDisplay) {
  Installation here;
  for (const char* flag : {"--help", "-h"}) {
    const Outcome help = here.tessal({flag});
    EXPECT_EQ(help.code, 0) << flag << ": " << help.err.toStdString();
    EXPECT_TRUE(help.out.contains("tessal template TEMPLATE_FILE")) << help.out.toStdString();
    EXPECT_TRUE(help.out.contains("tessal sync")) << help.out.toStdString();
    EXPECT_TRUE(help.out.contains("tessal add TASK (DURATION | START-END)")) << help.out.toStdString();
  }
  const Outcome version = here.tessal({"--version"});
  EXPECT_EQ(version.code, 0) << version.err.toStdString();
  EXPECT_EQ(version.out, QStringLiteral("tessal %1\n").arg(QStringLiteral(TESSAL_VERSION)));

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

// What one installation made reaches another through the real server, by the command alone.
TEST(WTCommandLine, SyncBringsTwoInstallationsInStepThroughTheRealServer) {
  if (!synctest::SyncServerProcess::available()) GTEST_SKIP() << "tessal-sync-server is not built";
  synctest::SyncServerProcess server;
  ASSERT_TRUE(server.addUser("shell@example.org", "a password"));
  ASSERT_TRUE(server.start());
  Installation laptop, desktop;
  for (Installation* installation : {&laptop, &desktop}) {
    installation->setSetting("WTSyncServer", server.address());
    installation->setSetting("WTSyncUser", "shell@example.org");
    installation->setSetting("WTSyncPassword", "a password");
  }
  QString projectId;
  {
    // Made the way the desktop copy makes records: with the sync manager journaling every save.
    auto context = laptop.openStore();
    RZSyncManager journaling(context.get(), laptop.journalPath());
    auto* project = WTProject::insertNewObject(context.get());
    project->setName("Made on the laptop");
    auto* task = WTTask::insertNewObject(context.get());
    task->setName("Its task");
    task->setProject(project);
    projectId = project->uuid();
    ASSERT_TRUE(context->save());
  }
  const Outcome first = laptop.tessal({"sync", "--timeout", "30"});
  ASSERT_EQ(first.code, 0) << first.err.toStdString();
  EXPECT_TRUE(first.out.startsWith("In step with ")) << first.out.toStdString();

  const Outcome second = desktop.tessal({"sync", "--timeout", "30"});
  ASSERT_EQ(second.code, 0) << second.err.toStdString();
  auto context = desktop.openStore();
  auto* project = dynamic_cast<WTProject*>(context->objectWithUUID(projectId));
  ASSERT_NE(project, nullptr);
  EXPECT_EQ(project->name(), "Made on the laptop");
  ASSERT_EQ(project->tasks().size(), 1);
  EXPECT_EQ(project->tasks()[0]->name(), "Its task");
  // The store the command made for a synced installation got no first project of its own to send.
  EXPECT_EQ(context->fetch<WTProject>().size(), 1);
}

}  // namespace
