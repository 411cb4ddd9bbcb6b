#include "AppFixture.h"
#include "RZSyncManager.h"
#include "TestFiles.h"
#include "TrackingFixture.h"
#include "WTBudgetWatcher.h"
#include "WTDesktopNotifier.h"
#include "WTPreferencesWindowController.h"
#include "WTStatusBarController.h"
#include "WTStatusBarPopup.h"
#include "WTStopwatchUpdater.h"
#include "WTStoreBackup.h"
#include "WTTrackingAlert.h"

#include <QJsonArray>
#include <QStatusBar>
#include <QStatusTipEvent>
#include <QToolButton>

#include <sqlite3.h>

// Each test gets its own data and settings folders.
class WTAppDelegateTest : public AppTest {};

TEST_F(WTAppDelegateTest, TheFirstRunMakesADefaultProjectThatQuittingKeeps) {
  auto delegate = makeDelegate();
  EXPECT_FALSE(delegate->hasContext());  // nothing is opened before somebody asks
  // Made with the store, not by the window: a command that makes the store gets it too.
  EXPECT_EQ(delegate->managedObjectContext()->fetch<WTProject>().size(), 1);
  WTMainWindowController window(*delegate);
  EXPECT_TRUE(QFile::exists(delegate->storePath()));
  const QList<WTProject*> projects = window.fetchProjects();
  ASSERT_TRUE(projects.size() == 1 && projects[0]->tasks().size() == 1);
  EXPECT_EQ(projects[0]->name() + " › " + projects[0]->tasks()[0]->name(), "Default Project › Default Task");
  EXPECT_FALSE(delegate->managedObjectContext()->undoManager().canUndo());  // not the user's step
  EXPECT_EQ(delegate->applicationShouldTerminate(), WTAppDelegate::TerminateReply::TerminateNow);
  EXPECT_FALSE(delegate->managedObjectContext()->hasChanges());
  EXPECT_TRUE(presenter.errors.isEmpty());
}

TEST_F(WTAppDelegateTest, AnUnreadableStoreIsReportedOnceAndLeftAlone) {
  const QString path = WTAppDelegate::applicationSupportFolder() + "/Tessal.sqlite";
  ASSERT_TRUE(QDir().mkpath(WTAppDelegate::applicationSupportFolder()));
  const QByteArray garbage = "these are somebody's notes, not a data file\n";
  writeFile(path, garbage);
  auto delegate = makeDelegate();
  WTMainWindowController window(*delegate);
  ASSERT_EQ(presenter.errors.size(), 1);
  EXPECT_TRUE(presenter.errors[0].contains(path)) << presenter.errors[0].toStdString();
  WTObjectContext* context = delegate->managedObjectContext();
  EXPECT_FALSE(context->hasStore());
  EXPECT_TRUE(window.fetchProjects().isEmpty());  // and nothing was made up in its place
  // The user carries on; saving cannot work, and says so only when quitting.
  WTClient::insertNewObject(context)->setName("typed anyway");
  delegate->saveAction();
  EXPECT_EQ(presenter.errors.size(), 1);
  Error error;
  EXPECT_FALSE(delegate->saveChanges(&error));
  EXPECT_FALSE(error.message.isEmpty());
  presenter.quitAnyway = false;
  EXPECT_EQ(delegate->applicationShouldTerminate(), WTAppDelegate::TerminateReply::TerminateCancel);
  EXPECT_EQ(presenter.questions, 1);
  EXPECT_TRUE(context->hasChanges());  // still in memory
  presenter.quitAnyway = true;
  EXPECT_EQ(delegate->applicationShouldTerminate(), WTAppDelegate::TerminateReply::TerminateNow);
  EXPECT_EQ(fileBytes(path), garbage);
  EXPECT_FALSE(QFile::exists(path + "-wal"));
}

// A damaged store is only ever replaced by the newest good backup the user chose to restore, and kept.
TEST_F(WTAppDelegateTest, ADamagedStoreIsKeptAndTheNewestGoodBackupOffered) {
  const QString path = WTAppDelegate::storePath();
  const QString backups = WTAppDelegate::applicationSupportFolder() + "/Backups";
  {
    auto first = makeDelegate();
    WTProject::insertNewObject(first->managedObjectContext())->setName("Backed up");
    ASSERT_TRUE(first->saveChanges());
  }
  ASSERT_TRUE(QDir(backups).removeRecursively());  // the day's copy the first start made
  ASSERT_TRUE(WTStoreBackup::copy(path, backups + "/Tessal-2026-01-02.sqlite").ok());
  // Newer, but no store: passed over.
  writeFile(backups + "/Tessal-2026-01-03.sqlite", QByteArray(8192, 'x'));
  const QByteArray garbage = QByteArray("SQLite format 3").append('\0').append(QByteArray(4080, '\x7f'));
  for (const bool restore : {false, true}) {
    SCOPED_TRACE(restore);
    writeFile(path, garbage);
    presenter.offers.clear();
    presenter.restores = restore;
    auto delegate = makeDelegate();
    WTObjectContext* context = delegate->managedObjectContext();
    ASSERT_EQ(presenter.offers.size(), 1);
    EXPECT_TRUE(presenter.offers[0].contains(path) &&
                presenter.offers[0].endsWith("/Tessal-2026-01-02.sqlite"))
        << presenter.offers[0].toStdString();
    EXPECT_EQ(namesIn<WTProject>(*context),
              restore ? QStringList({"Backed up", "Default Project"}) : QStringList());
    EXPECT_EQ(context->hasStore(), restore);
    QStringList kept =
        QDir(WTAppDelegate::applicationSupportFolder()).entryList({"Tessal.sqlite.replaced-*"});
    kept.removeIf([](const QString& name) { return name.endsWith("-wal") || name.endsWith("-shm"); });
    EXPECT_EQ(kept.size(), restore ? 1 : 0);
    EXPECT_EQ(fileBytes(restore ? WTAppDelegate::applicationSupportFolder() + '/' + kept.value(0) : path),
              garbage);
  }
  EXPECT_TRUE(presenter.errors.isEmpty()) << presenter.errors.join('\n').toStdString();
  // Damage only the check beside the loading finds (a page the loading never reads): nothing is written,
  // and the refused save names the copy to put back.
  {
    std::vector<WTStoreRecord> notes(3000);
    for (int i = 0; i < 3000; ++i) {
      notes[i].uuid = QStringLiteral("n%1@WTNote").arg(i);
      notes[i].entity = QStringLiteral("WTNote");
    }
    ASSERT_TRUE(WTStore::open(path).value()->save(notes, {}));
    // A page of the identity index, which loading does not read.
    sqlite3* db = nullptr;
    sqlite3_stmt* statement = nullptr;
    ASSERT_EQ(sqlite3_open(QFile::encodeName(path).constData(), &db), SQLITE_OK);
    ASSERT_EQ(
        sqlite3_prepare_v2(db, "SELECT max(pageno) FROM dbstat WHERE name LIKE 'sqlite_autoindex_records%'",
                           -1, &statement, nullptr),
        SQLITE_OK);
    ASSERT_EQ(sqlite3_step(statement), SQLITE_ROW);
    const qint64 page = sqlite3_column_int64(statement, 0);
    sqlite3_finalize(statement);
    sqlite3_close(db);
    QFile file(path);
    ASSERT_TRUE(page > 1 && file.open(QIODevice::ReadWrite) && file.seek((page - 1) * 4096));
    ASSERT_EQ(file.write(QByteArray(4096, 0x5a)), 4096);
  }
  auto delegate = makeDelegate();
  WTProject::insertNewObject(delegate->managedObjectContext())->setName("Typed");
  delegate->saveAction();
  ASSERT_EQ(presenter.errors.size(), 1);
  EXPECT_TRUE(presenter.errors[0].contains("damaged") &&
              presenter.errors[0].contains("/Tessal-2026-01-02.sqlite"))
      << presenter.errors[0].toStdString();
}

TEST_F(WTAppDelegateTest, TheFirstSaveOfADayLeavesACopyAndTheNewestSevenStay) {
  const QString backups = WTAppDelegate::applicationSupportFolder() + "/Backups";
  ASSERT_TRUE(QDir().mkpath(backups));
  const QDate today = QDate::currentDate();
  QStringList older;
  for (int days = 8; days >= 1; --days)
    older << today.addDays(-days).toString(u"'Tessal-'yyyy-MM-dd'.sqlite'");
  for (const QString& name : older + QStringList{"Tessal-2020-01-01-120000.sqlite"})
    writeFile(backups + '/' + name, {});
  auto delegate = makeDelegate();
  WTObjectContext* context = delegate->managedObjectContext();
  WTProject::insertNewObject(context)->setName("Saved today");
  ASSERT_TRUE(delegate->saveChanges());
  const QString copy = backups + today.toString(u"'/Tessal-'yyyy-MM-dd'.sqlite'");
  ASSERT_TRUE(QTest::qWaitFor([&] { return QFile::exists(copy); }, 10000));
  WTProject::insertNewObject(context)->setName("Saved later");
  ASSERT_TRUE(delegate->saveChanges());  // one copy a day
  delegate.reset();                      // waits for a copy in progress
  EXPECT_TRUE(WTStoreBackup::check(copy).ok());
  EXPECT_EQ(storedNames<WTProject>(copy), QStringList({"Default Project", "Saved today"}));
  // The two oldest days went; the copy `tessal backup` made stays.
  QStringList expected = older.mid(2) + QStringList{copy.section('/', -1), "Tessal-2020-01-01-120000.sqlite"};
  expected.sort();
  EXPECT_EQ(QDir(backups).entryList(QDir::Files, QDir::Name), expected);
}

// A save with nothing to save touches no editor; one with changes commits the edit in progress.
TEST_F(WTAppDelegateTest, ChangesAreSavedSoonAndCommitTheEditInProgressOnlyWhenThereIsSomethingToSave) {
  auto delegate = makeDelegate();
  WTObjectContext* context = delegate->managedObjectContext();
  WTProject::insertNewObject(context)->setName("autosaved");
  EXPECT_TRUE(context->hasChanges());
  EXPECT_TRUE(QTest::qWaitFor([&] { return !context->hasChanges(); }, 5000));
  WTProject* project = WTProject::insertNewObject(context);
  ASSERT_TRUE(delegate->saveChanges());
  int commits = 0;
  delegate->setCommitEditingHandler([&] {
    ++commits;
    project->setName("typed, not yet committed");
    return true;
  });
  ASSERT_TRUE(delegate->saveChanges());
  EXPECT_EQ(commits, 0);
  WTProject::insertNewObject(context)->setName("another change");
  ASSERT_TRUE(delegate->saveChanges());
  EXPECT_EQ(commits, 1);
  EXPECT_FALSE(context->hasChanges());
  EXPECT_EQ(storedNames<WTProject>(delegate->storePath()),
            QStringList({"Default Project", "another change", "autosaved", "typed, not yet committed"}));
  // A start from the shell is a step of its own: undoing it leaves what was being typed.
  delegate->setCommitEditingHandler([&] { return project->setName("typed as the shell started"), true; });
  delegate->carryOutRequest({{"command", "start"}, {"arguments", QJsonArray{"Default Task"}}});
  context->undoManager().undo();
  EXPECT_EQ(project->name() + ' ' + QString::number(context->fetch<WTTime>(&WTTime::running).size()),
            "typed as the shell started 0");
}

// The context's sync manager keeps the installation's journal, takes the account, and stops on quitting.
TEST_F(WTAppDelegateTest, TheContextComesWithASyncManagerOnTheStoresJournal) {
  defaults->setValue("WTSyncUser", "me@example.org");
  defaults->setValue("WTSyncPassword", "secret");
  auto delegate = makeDelegate();
  EXPECT_EQ(delegate->syncManager(), nullptr);
  delegate->managedObjectContext();  // the manager comes with the context
  RZSyncManager* sync = delegate->syncManager();
  ASSERT_NE(sync, nullptr);
  EXPECT_TRUE(sync->syncEnabled());
  EXPECT_EQ(sync->syncNetwork()->user() + " " + sync->syncNetwork()->password(), "me@example.org secret");
  delegate->applicationWillTerminate();
  EXPECT_FALSE(sync->syncEnabled());
}

// Quitting asks the ticker's question and the last save stores the answer; a session's end cannot wait.
TEST_F(WTAppDelegateTest, QuittingAsksAboutRunningTimersAndLoggingOutKeepsThemRunning) {
  for (const bool sessionEnds : {false, true}) {
    QDir(home.filePath("data")).removeRecursively();
    ScriptedPresenter asking;
    auto delegate = makeDelegate();
    delegate->startStopwatchUpdater(nullptr, &asking, nullptr, nullptr);
    WTTask::insertNewObject(delegate->managedObjectContext())->toggleTimer();
    if (sessionEnds)
      delegate->sessionWillEnd();
    else
      EXPECT_EQ(delegate->applicationShouldTerminate(), WTAppDelegate::TerminateReply::TerminateNow);
    EXPECT_TRUE(sessionEnds ? asking.shown.empty()
                            : asking.shown.size() == 1 && asking.shown[0].messageText == "Running Timer");
    // The one time entry of the store file, as a later start of the application would find it.
    auto store = WTStore::openReadOnly(delegate->storePath());
    WTObjectContext stored;
    ASSERT_TRUE(store && stored.attachStore(std::move(store.value())));
    ASSERT_EQ(stored.fetch<WTTime>().size(), 1);
    EXPECT_EQ(stored.fetch<WTTime>().first()->running(), sessionEnds);
  }
}

TEST_F(WTAppDelegateTest, BudgetNoticesWithoutANotificationServiceStandOnTheStatusLine) {
  ScriptedPresenter asking;
  auto delegate = makeDelegate();
  WTMainWindowController window(*delegate);
  WTBudgetWatcher watcher(delegate->startStopwatchUpdater(nullptr, &asking, nullptr, nullptr));
  WTDesktopNotifier notifier(QDBusConnection("never-connected"));
  WTApplication::linkBudgetNotices(watcher, notifier, window);
  window.show();
  auto* task = WTTask::insertNewObject(delegate->managedObjectContext());
  task->setName("Design");
  task->setBudget(Decimal(100));
  task->setProject(WTProject::insertNewObject(delegate->managedObjectContext()));
  task->project()->setName("Website");
  task->project()->setRate(Decimal(75));
  auto* time = WTTime::insertNewObject(delegate->managedObjectContext());
  time->setTask(task);
  time->setEndDate(time->startDate()->addingSeconds(2 * 3600));  // 2 hours at 75
  emit watcher.budgetCrossed(task, WTBudget::Level::Over);
  QStatusBar* line = nullptr;
  EXPECT_TRUE(QTest::qWaitFor([&] { return (line = window.findChild<QStatusBar*>("statusLine")); }));
  ASSERT_TRUE(line && line->isVisible());
  EXPECT_EQ(line->currentMessage(),
            "“Website › Design” is over its budget — 150 % of the budget of 100.00 · 50.00 over");
  // Its figures follow; past the whole budget by a little is not "100 %".
  task->setBudget(Decimal::fromString(u"149.50").value());
  emit watcher.budgetMoved(task, WTBudget::Level::Over);
  EXPECT_EQ(line->currentMessage(),
            "“Website › Design” is over its budget — 101 % of the budget of 149.50 · 0.50 over");
  window.withdrawNotice("Sync cannot reach the server");  // another notice's withdrawal leaves it
  EXPECT_TRUE(line->currentMessage().startsWith("“Website › Design”"));
  QStatusTipEvent passedOver{QString()};  // a menu's action without a tip
  QApplication::sendEvent(&window, &passedOver);
  EXPECT_TRUE(line->currentMessage().startsWith("“Website › Design” is over"));
  emit watcher.budgetEased(task, WTBudget::Level::Warning);
  EXPECT_TRUE(
      QTest::qWaitFor([&] { return line->currentMessage().startsWith("“Website › Design” has used 80 %"); }));
  emit watcher.budgetEased(task, WTBudget::Level::Within);
  EXPECT_EQ(line->currentMessage(), "");
}

// Without a tray the toolbar offers the list; with one, closing only hides; Ctrl+, opens one window.
TEST_F(WTAppDelegateTest, WithATrayClosingTheWindowKeepsTessalThereAndWithoutOneTheToolbarOffersTheList) {
  ScriptedPresenter asking;
  auto delegate = makeDelegate();
  WTMainWindowController window(*delegate);
  WTStopwatchUpdater* updater = delegate->startStopwatchUpdater(nullptr, &asking, nullptr, nullptr);
  WTStatusBarController statusBar(delegate->managedObjectContext(), updater);
  WTApplication::linkStatusBar(statusBar, window);
  window.show();
  WTTask::insertNewObject(delegate->managedObjectContext())->toggleTimer();
  QCoreApplication::processEvents();
  ASSERT_FALSE(statusBar.isShowingIcon());
  EXPECT_TRUE(window.runningTimeButton()->isVisible());
  window.runningTimeButton()->click();
  EXPECT_TRUE(statusBar.popup()->isVisible());
  statusBar.popup()->close();
  emit statusBar.trayAvailabilityChanged(true);
  QCoreApplication::processEvents();  // the toolbar lays its items out afresh
  EXPECT_FALSE(window.runningTimeButton()->isVisible());
  EXPECT_TRUE(window.close());
  EXPECT_TRUE(!window.isVisible() && asking.shown.empty());
  emit statusBar.showMainWindowRequested();
  EXPECT_TRUE(window.isVisible());

  QAction* preferences = window.findChild<QAction*>("preferences");
  preferences->trigger();
  auto* opened = window.findChild<WTPreferencesWindowController*>();
  ASSERT_TRUE(opened && opened->isVisible());
  opened->close();
  preferences->trigger();
  EXPECT_TRUE(window.findChildren<WTPreferencesWindowController*>().size() == 1 && opened->isVisible());
}
