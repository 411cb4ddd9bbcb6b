#include "AppFixture.h"
#include "WTDialogAlertPresenter.h"
#include "WTExportController.h"
#include "WTHelpDialogs.h"
#include "WTItemsModel.h"
#include "WTReportWindowController.h"

#include <QAbstractButton>
#include <QButtonGroup>
#include <QDialog>
#include <QLabel>
#include <QMenuBar>
#include <QMessageBox>
#include <QPushButton>
#include <QTimer>

#include <functional>

namespace {

class WTMainWindowControllerTest : public WindowTest {
 protected:
  void SetUp() override {
    WindowTest::SetUp();
    presenter.quitAnyway = true;
    delegate = makeDelegate();
  }
  QAction* item(const char* identifier) { return window->toolbarItem(identifier); }
  bool validate(const char* identifier) { return window->validateToolbarItem(item(identifier)); }
  void select(WTProject* project) { window->projectsViewController()->selectObject(project); }
  // A second project, `archived` or not, listed and returned; the first one is `first`.
  WTProject* addProject(const QString& name, bool archived, WTProject** first) {
    auto* added = WTProject::insertNewObject(delegate->managedObjectContext());
    added->setName(name);
    added->setArchived(archived);
    if (archived) item("showArchived")->trigger();
    delegate->managedObjectContext()->processPendingChanges();
    window->projectsViewController()->arrayController()->rearrangeObjects();
    const QList<WTProject*> all = window->fetchProjects();
    *first = all.value(0) == added ? all.value(1) : all.value(0);
    return added;
  }
};

TEST_F(WTMainWindowControllerTest, AStoreWithAnyProjectEvenArchivedIsNotFilled) {
  {
    // A store made before: only a store made just now gets a first project.
    ASSERT_TRUE(QDir().mkpath(WTAppDelegate::applicationSupportFolder()));
    auto store = WTStore::open(WTAppDelegate::storePath());
    WTObjectContext context;
    ASSERT_TRUE(store && context.attachStore(std::move(store.value())));
    auto* project = WTProject::insertNewObject(&context);
    project->setName("Old");
    project->setArchived(true);
    ASSERT_TRUE(context.save());
  }
  open();
  const QList<WTProject*> projects = window->fetchProjects();
  ASSERT_EQ(projects.size(), 1);
  EXPECT_EQ(projects[0]->name(), "Old");
  // Hidden as archived until shown.
  EXPECT_EQ(window->projectsViewController()->arrayController()->rowCount(), 0);
  item("showArchived")->trigger();
  EXPECT_EQ(window->projectsViewController()->arrayController()->rowCount(), 1);
}

TEST_F(WTMainWindowControllerTest, StacksSwitchAndKeepTheirDepth) {
  open();
  EXPECT_LT(defaults->dateForKey("WTCustomRangeBegin").value_or(Date::now()), Date::now());
  EXPECT_EQ(window->selectedToolbarItemIdentifier(), "projects");
  EXPECT_EQ(window->currentNavigationController(), window->projectsNavigationController());
  EXPECT_EQ(window->topViewController(), window->projectsViewController());
  // Showing the shown stack changes nothing, not even the toolbar's selection.
  item("clients")->setChecked(true);
  window->showProjects();
  EXPECT_EQ(window->selectedToolbarItemIdentifier(), "clients");
  EXPECT_EQ(window->currentNavigationController(), window->projectsNavigationController());
  ASSERT_TRUE(openOutline(window->fetchProjects()[0]));
  window->showClients();
  EXPECT_EQ(window->selectedToolbarItemIdentifier(), "clients");
  EXPECT_EQ(window->topViewController(), window->clientsViewController());
  window->showProjects();
  EXPECT_EQ(window->projectsNavigationController()->viewControllers().size(), 2);
  // The root, deliberately, even with the outline on top.
  EXPECT_EQ(window->topViewController(), window->projectsViewController());
  window->goBack();
  EXPECT_EQ(window->projectsNavigationController()->viewControllers().size(), 1);
}

// The archive item and the export's project follow the selection, or the project open.
TEST_F(WTMainWindowControllerTest, TheArchiveItemAndTheExportFollowTheSelectionAndTheListsOfferReports) {
  open();
  WTProject* active = nullptr;
  WTProject* archived = addProject("Archived", true, &active);
  // "validated label" of the archive item: with nothing selected, then each project.
  auto label = [&] { return QStringLiteral("%1 %2").arg(validate("archive")).arg(item("archive")->text()); };
  EXPECT_TRUE(label() == "1 Archive" && !window->selectedProject());
  select(archived);
  EXPECT_TRUE(label() == "1 Unarchive" && window->selectedProject() == archived);
  select(active);
  EXPECT_EQ(label(), "1 Archive");
  // The command goes to the list, on the selection; the label follows once validated.
  select(archived);
  window->toggleArchive();
  EXPECT_FALSE(archived->archived());
  QCoreApplication::processEvents();
  EXPECT_EQ(item("archive")->text(), "Archive");
  for (const char* identifier : {"report", "projects", "clients", "add", "remove"})
    EXPECT_TRUE(validate(identifier)) << identifier;
  EXPECT_FALSE(validate("toggleTimer"));  // no task to time in the lists
  // With the outline on top the label follows the project itself.
  ASSERT_TRUE(openOutline(active));
  active->setArchived(true);
  EXPECT_EQ(label(), "1 Unarchive");
  EXPECT_TRUE(validate("toggleTimer") && validate("back"));
  ASSERT_NE(action("export"), nullptr);
  WTExportController* exporter = window->exportData();
  EXPECT_TRUE(exporter->isVisible());
  exporter->projectChoice()->button(WTExportController::SelectedProject)->click();
  EXPECT_EQ(exporter->projectLimit(), active);
  exporter->reject();
}

TEST_F(WTMainWindowControllerTest, CommandsReachTheTopControllerAndUndoActsOnTheStore) {
  open();
  WTObjectContext* context = delegate->managedObjectContext();
  context->processPendingChanges();
  const qsizetype before = window->fetchProjects().size();
  item("add")->trigger();
  EXPECT_EQ(window->fetchProjects().size(), before + 1);
  EXPECT_TRUE(window->projectsViewController()->tableView()->isEditing());
  window->projectsViewController()->tableView()->endEditing();
  context->processPendingChanges();
  action("undo")->trigger();
  context->processPendingChanges();
  EXPECT_EQ(window->fetchProjects().size(), before);
  action("redo")->trigger();
  EXPECT_EQ(window->fetchProjects().size(), before + 1);

  window->showClients();
  item("add")->trigger();
  ASSERT_EQ(context->fetch<WTClient>().size(), 1);
  // A client's report covers exactly its projects, in a window of its own.
  auto* client = context->fetch<WTClient>().front();
  auto* project = WTProject::insertNewObject(context);
  project->setClient(client);
  window->clientsViewController()->selectObject(client);
  item("report")->trigger();
  QList<WTReportWindowController*> reports;
  for (QWidget* widget : QApplication::topLevelWidgets())
    if (auto* report = qobject_cast<WTReportWindowController*>(widget)) reports.append(report);
  ASSERT_EQ(reports.size(), 1);
  EXPECT_TRUE(reports.front()->isVisible());
  EXPECT_EQ(reports.front()->projects(), QList<WTProject*>{project});
  reports.front()->close();
}

// Ctrl+N, "Temp", Return, Del over a running task: only the new task goes; the Edit menu names each step.
TEST_F(WTMainWindowControllerTest, DeleteTakesOnlyTheRowJustAddedAndAsksBeforeARunningTimerGoes) {
  open();
  WTObjectContext* context = delegate->managedObjectContext();
  WTProject* project = window->fetchProjects().front();
  WTTask* task = project->tasks().front();
  task->toggleTimer();
  WTItemsViewController* items = openOutline(project);
  ASSERT_TRUE(items);
  WTOutlineView* outline = items->outlineView();
  auto selected = [&] {
    QList<WTObject*> objects;
    for (const QModelIndex& index : outline->selectionModel()->selectedRows())
      objects << items->treeController()->objectAt(index);
    return objects;
  };
  auto rowOf = [&](WTTask* of) { return items->treeController()->indexOfObject(of); };
  outline->setCurrentIndex(rowOf(task));
  window->activateWindow();
  ASSERT_TRUE(QTest::qWaitForWindowActive(window.get()));
  // Tab walks on from the outline to the fields above it, the rate among them.
  QStringList walked;
  for (outline->setFocus(); walked.size() < 4; walked << QApplication::focusWidget()->objectName())
    QTest::keyClick(QApplication::focusWidget(), Qt::Key_Tab);
  EXPECT_TRUE(walked.contains("rateField")) << walked.join(' ').toStdString();
  outline->setFocus();

  QTest::keyClick(outline, Qt::Key_N, Qt::ControlModifier);
  auto* editor = qobject_cast<QLineEdit*>(outline->indexWidget(outline->currentIndex()));
  ASSERT_NE(editor, nullptr);
  QTest::keyClicks(editor, "Temp");
  QTest::keyClick(editor, Qt::Key_Return);
  QCoreApplication::processEvents();  // the editor commits on the next turn
  context->processPendingChanges();
  ASSERT_EQ(project->tasks().size(), 2);
  WTTask* temp = project->tasks().last();
  EXPECT_EQ(temp->name(), "Temp");
  EXPECT_EQ(selected(), QList<WTObject*>{temp});
  QAction* undo = action("undo");
  // The Edit menu's two items, and what was asked.
  auto said = [&] {
    return (undo->text() + " / " + action("redo")->text() + " / " + presenter.deletionQuestions.join(" | "))
        .toStdString();
  };
  EXPECT_EQ(undo->text(), "&Undo Rename");
  QTest::keyClick(outline, Qt::Key_Delete);  // an empty task goes without a question
  context->processPendingChanges();
  EXPECT_EQ(project->tasks(), QList<WTTask*>{task});
  EXPECT_TRUE(task->running());
  EXPECT_TRUE(said().starts_with("&Undo Delete “Temp” / ") && said().ends_with(" / ")) << said();
  undo->trigger();
  context->processPendingChanges();
  EXPECT_EQ(project->tasks().size(), 2);
  EXPECT_EQ(said(), "&Undo Rename / &Redo Delete “Temp” / ");

  // Renaming with Return also leaves the renamed row selected alone.
  outline->selectionModel()->select(rowOf(task), QItemSelectionModel::Select | QItemSelectionModel::Rows);
  outline->selectionModel()->setCurrentIndex(rowOf(temp),
                                             QItemSelectionModel::Select | QItemSelectionModel::Rows);
  QTest::keyClick(outline, Qt::Key_Return);
  EXPECT_TRUE(outline->isEditing());
  EXPECT_EQ(selected(), QList<WTObject*>{temp});
  outline->endEditing();

  // The task with the running timer: asked first, and kept when the answer is no.
  presenter.deletes = false;
  outline->selectionModel()->setCurrentIndex(rowOf(task),
                                             QItemSelectionModel::ClearAndSelect | QItemSelectionModel::Rows);
  QTest::keyClick(outline, Qt::Key_Delete);
  EXPECT_EQ(presenter.deletionQuestions.join(" | "),
            "Delete “Default Task” and its 1 item? A timer is running in it.");
  EXPECT_TRUE(project->tasks().contains(task) && task->running());
}

// File › Import… shows what it makes first, then makes it as one step of undo; a file with a bad row
// imports nothing.
TEST_F(WTMainWindowControllerTest, TheImportPreviewsThenMakesItAllAsOneStep) {
  open();
  ASSERT_NE(action("import"), nullptr);
  WTObjectContext* context = delegate->managedObjectContext();
  QMessageBox* refused = window->importFile(QStringLiteral(TESSAL_TEST_DATA_DIR "/import/kimai.csv"));
  // The file is read away from the window, which says so until the preview is there.
  EXPECT_EQ(refused->text(), "Reading “kimai.csv”…");
  ASSERT_TRUE(QTest::qWaitFor([&] { return !refused->informativeText().isEmpty(); }));
  EXPECT_TRUE(refused->informativeText().contains("line 5: the start time “nine” cannot be read"));
  EXPECT_EQ(refused->buttons().size(), 1);
  refused->reject();
  QMessageBox* dialog = window->importFile(QStringLiteral(TESSAL_TEST_DATA_DIR "/import/toggl-import.csv"));
  EXPECT_TRUE(dialog->isVisible());
  ASSERT_TRUE(QTest::qWaitFor([&] { return dialog->findChild<QPushButton*>("import") != nullptr; }));
  EXPECT_TRUE(dialog->informativeText().contains("New: 1 client, 1 project, 1 task, 1 entry"));
  EXPECT_TRUE(context->fetch<WTTime>().isEmpty());
  dialog->findChild<QPushButton*>("import")->click();
  ASSERT_EQ(context->fetch<WTTime>().size(), 1);
  EXPECT_EQ(context->fetch<WTTime>().first()->task()->project()->client()->name(), "Acme");
  context->undoManager().closeGroup();
  action("undo")->trigger();
  EXPECT_TRUE(context->fetch<WTTime>().isEmpty());
  EXPECT_TRUE(context->fetch<WTClient>().isEmpty());
}

// The shortcuts list is read from the menus' actions, so a changed key shows next time.
TEST_F(WindowTest, HelpMenuNamesTheLicenceAndListsTheMenusShortcuts) {
  open();
  action("about")->trigger();
  auto* about = window->findChild<QDialog*>("aboutDialog");
  ASSERT_TRUE(about && about->isVisible());
  EXPECT_TRUE(about->findChild<QLabel*>("aboutText")->text().contains("GNU General Public License"));
  about->close();
  auto listed = [&] {
    QStringList all;  // "Menu/Command/Keys"
    for (const auto& shortcut : WTHelpDialogs::shortcutsOf(window->menuBar()))
      all << shortcut.menu + "/" + shortcut.action + "/" + shortcut.keys;
    return all;
  };
  for (const QString& shortcut : {QString("Edit/Undo/Ctrl+Z"), QString("File/Add/Ctrl+N"),
                                  QString("Record/Start/Stop Timer/Ctrl+T"), QString("View/Clients/Ctrl+2")})
    EXPECT_TRUE(listed().contains(shortcut)) << shortcut.toStdString();
  for (const QString& shortcut : listed()) EXPECT_FALSE(shortcut.endsWith('/')) << shortcut.toStdString();
  action("toggleTimer")->setShortcut(QKeySequence(Qt::CTRL | Qt::SHIFT | Qt::Key_Y));
  EXPECT_FALSE(listed().contains("Record/Start/Stop Timer/Ctrl+T"));
  EXPECT_TRUE(listed().contains("Record/Start/Stop Timer/Ctrl+Shift+Y"));
}

// The desktop's question before a deletion: Return keeps everything, only "Delete" deletes; what needs no
// answer asks none.
TEST(WTDialogAlertPresenterTest, ADeletionIsChosenNeverFallenIntoAndANoticeAsksNothing) {
  WTDialogAlertPresenter presenter;
  auto whenShown = [](const std::function<void(QMessageBox*)>& act) {
    QTimer::singleShot(0, [act] {
      auto* box = qobject_cast<QMessageBox*>(QApplication::activeModalWidget());
      ASSERT_NE(box, nullptr);
      act(box);
    });
  };
  whenShown([](QMessageBox* box) {
    EXPECT_EQ(box->text() + " " + box->informativeText(),
              "Delete “General” and its 14 items? A timer is running in it.");
    QTest::keyClick(box, Qt::Key_Return);
  });
  EXPECT_FALSE(presenter.confirmDeletion("Delete “General” and its 14 items?", "A timer is running in it."));
  whenShown([](QMessageBox* box) {
    for (QAbstractButton* button : box->buttons()) {
      if (button->text() == "Delete") QTest::mouseClick(button, Qt::LeftButton);
    }
  });
  EXPECT_TRUE(presenter.confirmDeletion("Delete “General” and its 14 items?", QString()));

  // A sync that cannot reach its server says so in a notice, with what becomes of the changes: a box would
  // take the focus from what is being typed (it would wait here for an answer).
  QStringList notices;
  presenter.setNoticeSink(
      [&](const QString& summary, const QString& body) { notices << summary + " / " + body; });
  presenter.presentNetworkError("Connection refused");
  EXPECT_EQ(notices,
            QStringList{"Sync cannot reach the server / Connection refused. Your changes are kept here "
                        "and sent when the server answers again."});
  // Once the server answers again, the notice is taken back.
  QStringList withdrawn;
  presenter.setWithdrawal([&](const QString& summary) { withdrawn << summary; });
  presenter.networkRecovered();
  EXPECT_EQ(withdrawn, QStringList{"Sync cannot reach the server"});
}

}  // namespace
