#include "UiFixture.h"
#include "WTClient.h"
#include "WTClientsViewController.h"
#include "WTDeletion.h"
#include "WTListView.h"
#include "WTObjectListModel.h"

#include <QSignalSpy>

namespace {

auto notArchived = [](const WTObject* object) { return !object->archived(); };

class WTObjectListModelTest : public UiTest {};

QStringList names(const WTObjectListModel& model) {
  QStringList result;
  for (int row = 0; row < model.rowCount(); ++row)
    result << model.index(row, 0).data(WTObjectListModel::NameRole).toString();
  return result;
}

TEST_F(WTObjectListModelTest, RowsShowTotalsClientAndArchivedLook) {
  auto* client = makeClient("ACME");
  auto* project = makeProject("Site");
  auto* task = makeTask(project, "Work");
  makeItem<WTTime>(task, "time", at(2024, 3, 14, 9));  // 30 minutes
  WTObjectListModel projects(context.get(), WTEntity::Project);
  WTObjectListModel clients(context.get(), WTEntity::Client);
  const QModelIndex row = projects.index(0, 0), clientRow = clients.index(0, 0);
  // What a row shows: subtitle, duration, cost, image, tool tip.
  auto shows = [](const QModelIndex& index) {
    QStringList parts;
    for (int role :
         {int(WTObjectListModel::SubtitleRole), int(WTObjectListModel::DurationTextRole),
          int(WTObjectListModel::CostTextRole), int(WTObjectListModel::ImageRole), int(Qt::ToolTipRole)})
      parts << index.data(role).toString();
    return parts.join(u'|');
  };
  EXPECT_EQ(shows(row), "No Client|00:30|25.00|folder_32|");
  // Only a project takes a client, and only a client is one.
  auto clientOf = [](WTObjectListModel& list, const WTObject* object) {
    return list.setData(list.index(0, 0), WTObjectListModel::variantFromObject(object),
                        WTObjectListModel::ClientRole);
  };
  EXPECT_FALSE(clientOf(projects, task));
  EXPECT_FALSE(clientOf(clients, client));
  ASSERT_TRUE(clientOf(projects, client));
  EXPECT_EQ(project->client(), client);
  EXPECT_EQ(shows(clientRow), "1 project · 100.00 an hour|00:30|50.00|admin_2_32|");
  QSignalSpy changed(&projects, &QAbstractItemModel::dataChanged);
  QSignalSpy clientChanged(&clients, &QAbstractItemModel::dataChanged);
  project->setArchived(true);
  client->setName("ACME Ltd");
  client->setRate(Decimal(120));
  endTurn();
  EXPECT_GE(changed.count(), 1);
  EXPECT_GE(clientChanged.count(), 1);
  // Archived, but no timer runs in it: no tip.
  EXPECT_EQ(shows(row), "ACME Ltd|00:30|60.00|folder_32_dis|");
  EXPECT_TRUE(row.data(WTObjectListModel::ArchivedRole).toBool());
  EXPECT_EQ(shows(clientRow), "1 project · 120.00 an hour|00:30|60.00|admin_2_32|");
}

// The filtered list follows changes row by row, never by a reset; an archived project comes in, still
// marked, while a timer started elsewhere (the tray) runs in it, and goes when it stops.
TEST_F(WTObjectListModelTest, AFilteredListFollowsChangesRowByRowAndShowsAnArchivedProjectWhileItsTimerRuns) {
  makeProject("beta");
  auto* alpha = makeProject("Alpha");
  auto* gamma = makeProject("gamma");
  WTTask* task = makeTask(gamma, "Default Task");
  gamma->setArchived(true);
  WTObjectListModel model(context.get(), WTEntity::Project);
  QAbstractItemModelTester tester(&model, QAbstractItemModelTester::FailureReportingMode::Fatal);
  model.setFilterPredicate(notArchived);
  EXPECT_EQ(names(model), (QStringList{"Alpha", "beta"}));  // case does not decide the order
  QSignalSpy resets(&model, &QAbstractItemModel::modelReset);
  QSignalSpy moved(&model, &QAbstractItemModel::rowsMoved);
  QSignalSpy inserted(&model, &QAbstractItemModel::rowsInserted);
  QSignalSpy removed(&model, &QAbstractItemModel::rowsRemoved);
  alpha->setName("zulu");
  endTurn();
  EXPECT_EQ(names(model), (QStringList{"beta", "zulu"}));
  EXPECT_EQ(moved.count(), 1);

  WTTime* time = task->toggleTimer();
  endTurn();
  ASSERT_EQ(names(model), (QStringList{"beta", "gamma", "zulu"}));
  EXPECT_EQ(inserted.count(), 1);
  const QModelIndex row = model.indexOfObject(gamma);
  EXPECT_TRUE(row.data(WTObjectListModel::ArchivedRole).toBool());
  EXPECT_TRUE(row.data(WTObjectListModel::RunningRole).toBool());
  EXPECT_EQ(row.data(Qt::ToolTipRole).toString(), "Archived, listed while a timer runs in it");
  EXPECT_FALSE(model.index(0, 0).data(WTObjectListModel::RunningRole).toBool());
  EXPECT_FALSE(model.index(0, 0).data(Qt::ToolTipRole).isValid());
  EXPECT_TRUE(gamma->archived());
  task->toggleTimer();
  endTurn();
  EXPECT_EQ(names(model), (QStringList{"beta", "zulu"}));
  EXPECT_EQ(removed.count(), 1);
  time->setRunning(true);
  endTurn();
  EXPECT_EQ(names(model).size(), 3);
  context->deleteObject(time);  // the running entry goes, and the project with it
  endTurn();
  EXPECT_EQ(names(model).size(), 2);

  gamma->setArchived(false);
  endTurn();
  EXPECT_EQ(names(model).size(), 3);
  context->deleteObject(gamma);
  endTurn();
  EXPECT_EQ(names(model), (QStringList{"beta", "zulu"}));
  context->undoManager().undo();  // back in its place
  endTurn();
  EXPECT_EQ(names(model), (QStringList{"beta", "gamma", "zulu"}));
  EXPECT_EQ(resets.count(), 0);
}

// What a deletion asks and how Undo names it, for selections of records holding what goes with them.
TEST_F(WTObjectListModelTest, ADeletionAsksOnlyWhenItemsOrARunningTimerGoAndNamesWhatGoes) {
  auto* client = makeClient("ACME");
  auto* site = makeProject("Site");
  site->setClient(client);
  WTTask* general = makeTask(site, "General");
  WTTask* empty = makeTask(site, "Temp");
  WTTask* build = makeTask(site, "");
  for (int i = 0; i < 14; ++i) makeItem<WTNote>(general, "note", at(2024, 3, 1));
  WTNote* note = general->items().isEmpty() ? nullptr : static_cast<WTNote*>(general->items().first());
  makeItem<WTFlat>(build, "fee", at(2024, 3, 2));
  WTTime* running = build->toggleTimer();
  running->setName("");
  auto* idle = makeProject("Idle");
  makeTask(idle, "General");

  struct Row {
    QList<WTObject*> selected;
    const char* question;  // empty: nothing worth asking about
    const char* undoName;
  };
  const Row rows[] = {
      {{empty}, "", "Delete “Temp”"},
      {{general}, "Delete “General” and its 14 items?", "Delete “General”"},
      {{general, note}, "Delete “General” and its 14 items?", "Delete “General”"},  // the note goes with it
      {{general, empty}, "Delete 2 tasks and their 14 items?", "Delete 2 Tasks"},
      {{running}, "Delete this time entry? Its timer is running.", "Delete Time Entry"},
      {{note, running}, "Delete 2 items? A timer is running among them.", "Delete 2 Items"},
      {{build}, "Delete this task and its 2 items? A timer is running in it.", "Delete Task"},
      {{site}, "Delete “Site” and its 16 items? A timer is running in it.", "Delete “Site”"},
      {{site, idle},
       "Delete 2 projects and their 16 items? A timer is running among them.",
       "Delete 2 Projects"},
      {{idle}, "", "Delete “Idle”"},  // only an empty task
      {{empty, note}, "", "Delete 2 Rows"},
      {{client}, "", "Delete “ACME”"},  // its projects stay
  };
  for (const Row& row : rows) {
    const WTDeletion deletion(row.selected);
    const QString asked = deletion.needsQuestion()
                              ? (deletion.detail().isEmpty() ? deletion.question()
                                                             : deletion.question() + ' ' + deletion.detail())
                              : QString();
    EXPECT_EQ(asked, QString::fromUtf8(row.question)) << row.undoName;
    EXPECT_EQ(deletion.undoName(), QString::fromUtf8(row.undoName));
  }
}

// The projects list as the main window shows it, archived projects hidden.
class WTListControllerTest : public UiTest {
 protected:
  void SetUp() override {
    UiTest::SetUp();
    shown = std::make_unique<ShownProjects>(context.get());
    projects = &shown->projects;
    projects->setArchivedPredicate(notArchived);
  }
  void TearDown() override {
    shown.reset();
    UiTest::TearDown();
  }
  int rowOf(const WTObject* object) { return projects->arrayController()->rowOfObject(object); }
  void select(const WTObject* object, QItemSelectionModel::SelectionFlags how = QItemSelectionModel::Select) {
    projects->tableView()->selectionModel()->select(projects->arrayController()->indexOfObject(object), how);
  }

  std::unique_ptr<ShownProjects> shown;
  WTProjectsViewController* projects = nullptr;
};

TEST_F(WTListControllerTest, ANewProjectHasATaskGeneralAndItsNameIsEditedAtOnce) {
  makeProject("Existing");
  endTurn();
  projects->addObject();
  const QList<WTProject*> all = context->fetch<WTProject>();
  ASSERT_EQ(all.size(), 2);
  WTProject* fresh = all[0]->name().isEmpty() ? all[0] : all[1];
  ASSERT_EQ(fresh->tasks().size(), 1);
  EXPECT_EQ(fresh->tasks()[0]->name(), "General");
  EXPECT_EQ(projects->tableView()->currentIndex(), projects->arrayController()->indexOfObject(fresh));
  auto* editor = projects->tableView()->findChild<QLineEdit*>("nameEditor");
  ASSERT_NE(editor, nullptr);
  editor->setText("Brand new");
  projects->tableView()->setFocus();
  QTest::qWait(10);
  EXPECT_EQ(fresh->name(), "Brand new");
  // One the list hides (here: every unnamed one) is made but not edited.
  projects->setArchivedPredicate([](const WTObject* object) { return !object->name().isEmpty(); });
  projects->addObject();
  EXPECT_EQ(context->fetch<WTProject>().size(), 3);
  EXPECT_FALSE(projects->tableView()->isEditing());
}

// The row menu's archive item acts on the clicked row; without one it is left as it was, and the
// toolbar's command takes the last selected row.
TEST_F(WTListControllerTest, TheRowMenuArchivesTheClickedRowAndTheToolbarTheLastSelected) {
  auto* archived = makeProject("Archived");
  auto* a = makeProject("A");
  auto* c = makeProject("C");
  archived->setArchived(true);
  projects->setArchivedPredicate({});  // archived ones shown
  endTurn();
  select(c);
  QMenu* menu = projects->rowMenu();
  projects->tableView()->setClickedRow(rowOf(archived));
  projects->menuNeedsUpdate(menu);
  QAction* tagged = actionTitled(menu, "Unarchive");
  ASSERT_NE(tagged, nullptr);
  tagged->trigger();
  EXPECT_FALSE(archived->archived());
  EXPECT_FALSE(c->archived());
  projects->tableView()->setClickedRow(rowOf(c));
  projects->menuNeedsUpdate(menu);
  EXPECT_EQ(tagged->text(), "Archive");
  projects->tableView()->setClickedRow(-1);
  tagged->setText("untouched");
  projects->menuNeedsUpdate(menu);
  EXPECT_EQ(tagged->text(), "untouched");

  QSignalSpy validation(projects, &WTViewController::validationChanged);
  select(a);
  EXPECT_GE(validation.count(), 1);
  EXPECT_EQ(projects->selectedObject(), c);  // last in list order
  projects->toggleArchive();
  EXPECT_TRUE(c->archived());
  EXPECT_FALSE(a->archived());
  endTurn();  // drawn archived and selected, still listed
  EXPECT_GE(rowOf(c), 0);
  projects->tableView()->selectionModel()->clearSelection();
  projects->toggleArchive();  // nothing selected: nothing happens
  EXPECT_FALSE(a->archived());
}

// Removing asks the window only when something of value goes, by the toolbar and the row's menu alike.
TEST_F(WTListControllerTest, RemoveAsksWhenItemsGo) {
  auto* a = makeProject("A");
  auto* b = makeProject("B");
  endTurn();
  select(a, QItemSelectionModel::ClearAndSelect);
  projects->removeSelectedObjects();
  EXPECT_EQ(context->fetch<WTProject>(), QList<WTProject*>{b});
  EXPECT_EQ(names(*projects->arrayController()), QStringList{"B"});
  EXPECT_EQ(projects->selectedObject(), nullptr);
  EXPECT_EQ(shown->window.questions, QStringList{});

  makeItem<WTNote>(makeTask(b, "General"), "note", at(2024, 3, 1));
  shown->window.deletes = false;
  projects->selectObject(b);
  projects->removeSelectedObjects();
  EXPECT_EQ(shown->window.questions, QStringList{"Delete “B” and its 1 item?"});
  EXPECT_TRUE(context->fetch<WTProject>().contains(b));
  shown->window.deletes = true;
  projects->tableView()->setClickedRow(rowOf(b));
  projects->rowMenu()->actions().last()->trigger();
  EXPECT_EQ(shown->window.questions.size(), 2);
  EXPECT_FALSE(context->fetch<WTProject>().contains(b));
  EXPECT_EQ(context->undoManager().undoActionName(), "Delete “B”");
}

TEST_F(WTListControllerTest, OpeningAProjectPushesItsOutlineAndReusesIt) {
  auto* first = makeProject("First");
  makeTask(first, "Only task");
  auto* second = makeProject("Second");
  endTurn();
  WTNavigationController& stack = shown->stack;
  projects->openProject(first);
  EXPECT_EQ(stack.viewControllers().size(), 1);  // on the next turn, after the click
  ASSERT_TRUE(QTest::qWaitFor([&] { return stack.viewControllers().size() == 2; }));
  WTItemsViewController* items = projects->itemsViewController();
  EXPECT_EQ(stack.topViewController(), items);
  EXPECT_EQ(items->treeController()->index(0, 0).data(WTItemsModel::NameRole).toString(), "Only task");
  stack.popViewController();
  projects->openProject(second);
  ASSERT_TRUE(QTest::qWaitFor([&] { return stack.viewControllers().size() == 2; }));
  EXPECT_EQ(projects->itemsViewController(), items);
  EXPECT_EQ(items->project(), second);
  projects->openClients();
  EXPECT_EQ(shown->window.clientsShown, 1);
}

TEST_F(WTListControllerTest, TheClientChooserSetsTheProjectsClientAndClientsAreAdded) {
  auto* project = makeProject("Site");
  auto* acme = makeClient("ACME");
  auto* gone = makeClient("Gone");
  gone->setArchived(true);
  endTurn();
  std::unique_ptr<QMenu> menu(projects->clientMenu(project));
  EXPECT_EQ(titlesOf(menu.get()), (QStringList{"No Client", "", "ACME", "", "Edit Clients…"}));
  actionTitled(menu.get(), "ACME")->trigger();
  EXPECT_EQ(project->client(), acme);

  WTClientsViewController clients(context.get());
  clients.view()->resize(600, 400);
  clients.view()->show();
  clients.addObject();
  EXPECT_EQ(context->fetch<WTClient>().size(), 3);
  EXPECT_TRUE(clients.tableView()->isEditing());
  EXPECT_TRUE(clients.respondsTo(WTViewController::Command::AddObject));
  EXPECT_FALSE(clients.respondsTo(WTViewController::Command::ToggleTimer));
}

}  // namespace
