#include "UiFixture.h"
#include "WTDeletion.h"
#include "WTKeyboardContextMenu.h"

#include <QApplication>
#include <QTimer>
#include <QTreeView>

namespace {

auto notArchived = [](const WTObject* object) { return !object->archived(); };

class WTObjectListModelTest : public UiTest {};

QStringList names(const WTObjectListModel& model) {
  QStringList result;
  for (int row = 0; row < model.rowCount(); ++row)
    result << model.index(row, 0).data(WTObjectListModel::NameRole).toString();
  return result;
}

// A row shows its records' totals and look; only a project takes a client, and only a client is one.
TEST_F(WTObjectListModelTest, RowsShowTotalsClientAndArchivedLook) {
  auto* client = makeClient("ACME");
  auto* project = makeProject("Site");
  auto* task = makeTask(project, "Work");
  makeItem<WTTime>(task, "time", at(2024, 3, 14, 9));  // 30 minutes
  WTObjectListModel projects(context.get(), WTEntity::Project), clients(context.get(), WTEntity::Client);
  const QModelIndex row = projects.index(0, 0), clientRow = clients.index(0, 0);
  auto shows = [](const QModelIndex& index) {
    QStringList parts;
    for (int role :
         {int(WTObjectListModel::SubtitleRole), int(WTObjectListModel::DurationTextRole),
          int(WTObjectListModel::CostTextRole), int(WTObjectListModel::BilledTextRole),
          int(WTObjectListModel::ImageRole), int(Qt::ToolTipRole), int(WTObjectListModel::ArchivedRole)})
      parts << index.data(role).toString();
    return parts.join(u'|');
  };
  EXPECT_EQ(shows(row), "No Client|00:30|25.00||folder_32||false");
  auto clientOf = [](WTObjectListModel& list, const WTObject* object) {
    return list.setData(list.index(0, 0), WTObjectListModel::variantFromObject(object),
                        WTObjectListModel::ClientRole);
  };
  EXPECT_FALSE(clientOf(projects, task) || clientOf(clients, client));
  ASSERT_TRUE(clientOf(projects, client));
  EXPECT_EQ(project->client(), client);
  EXPECT_EQ(shows(clientRow), "1 project · 100.00 an hour|00:30|50.00||admin_2_32||false");
  QSignalSpy changed(&projects, &QAbstractItemModel::dataChanged),
      clientChanged(&clients, &QAbstractItemModel::dataChanged);
  project->setArchived(true);
  client->setName("ACME Ltd");
  client->setRate(Decimal(120));
  endTurn();
  EXPECT_TRUE(changed.count() >= 1 && clientChanged.count() >= 1);
  EXPECT_EQ(shows(row), "ACME Ltd|00:30|60.00||folder_32_dis||true");  // no timer runs in it: no tip
  EXPECT_EQ(shows(clientRow), "1 project · 120.00 an hour|00:30|60.00||admin_2_32||false");
  client->setCurrency("KWD");  // three places, and the code where it is the client's own
  endTurn();
  EXPECT_EQ(shows(row), "ACME Ltd|00:30|60.000||folder_32_dis||true");
  EXPECT_EQ(shows(clientRow), "1 project · 120.000 KWD an hour|00:30|60.000||admin_2_32||false");
  // Beside the raw totals, what the client's rounding rule bills.
  client->setRoundingMinutes(15);
  client->setRoundingMode("up");
  makeItem<WTTime>(task, at(2024, 3, 14, 11))->setEndDate(at(2024, 3, 14, 11, 10));
  endTurn();
  EXPECT_EQ(shows(row), "ACME Ltd|00:40|80.000|billed 00:45 · 90.000|folder_32_dis||true");
  EXPECT_EQ(shows(clientRow),
            "1 project · 120.000 KWD an hour|00:40|80.000|billed 00:45 · 90.000|admin_2_32||false");
}

// The filtered list follows changes row by row, and lists an archived project while its timer runs.
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
  auto after = [&](auto change) {
    change();
    endTurn();
    return names(model).join(u' ');
  };
  EXPECT_EQ(after([&] { alpha->setName("zulu"); }), "beta zulu");
  EXPECT_EQ(moved.count(), 1);
  WTTime* time = nullptr;
  EXPECT_EQ(after([&] { time = task->toggleTimer(); }), "beta gamma zulu");
  EXPECT_EQ(inserted.count(), 1);
  auto shows = [&](int row) {
    const QModelIndex index = model.index(row, 0);
    return QStringList{index.data(WTObjectListModel::ArchivedRole).toString(),
                       index.data(WTObjectListModel::RunningRole).toString(),
                       index.data(Qt::ToolTipRole).toString()};
  };
  EXPECT_EQ(shows(1), QStringList({"true", "true", "Archived, listed while a timer runs in it"}));
  EXPECT_EQ(shows(0), QStringList({"false", "false", ""}));
  EXPECT_EQ(after([&] { task->toggleTimer(); }), "beta zulu");
  EXPECT_EQ(removed.count(), 1);
  EXPECT_EQ(after([&] { time->setRunning(true); }), "beta gamma zulu");
  EXPECT_EQ(after([&] { context->deleteObject(time); }), "beta zulu");
  EXPECT_EQ(after([&] { gamma->setArchived(false); }), "beta gamma zulu");
  EXPECT_EQ(after([&] { context->deleteObject(gamma); }), "beta zulu");
  EXPECT_EQ(after([&] { context->undoManager().undo(); }), "beta gamma zulu");  // back in its place
  EXPECT_EQ(resets.count(), 0);
}

// What a deletion asks and how Undo names it, for selections of records holding what goes with them.
TEST_F(WTObjectListModelTest, ADeletionAsksOnlyWhenItemsOrARunningTimerGoAndNamesWhatGoes) {
  auto* client = makeClient("ACME");
  auto* site = makeProject("Site");
  site->setClient(client);
  WTTask *general = makeTask(site, "General"), *empty = makeTask(site, "Temp"), *build = makeTask(site, "");
  for (int i = 0; i < 14; ++i) makeItem<WTNote>(general, "note", at(2024, 3, 1));
  WTItem* note = general->items().value(0);
  makeItem<WTFlat>(build, "fee", at(2024, 3, 2));
  WTTime* running = build->toggleTimer();
  running->setName("");
  auto* idle = makeProject("Idle");
  makeTask(idle, "General");
  const struct {
    QList<WTObject*> selected;
    const char* question;  // empty: nothing worth asking about
    const char* undoName;
  } rows[] = {
      {{empty}, "", "Delete “Temp”"},
      {{general}, "Delete “General” and its 14 items?", "Delete “General”"},
      {{general, note}, "Delete “General” and its 14 items?", "Delete “General”"},  // the note goes with it
      {{general, empty}, "Delete 2 tasks and their 14 items?", "Delete 2 Tasks"},
      {{running}, "Delete this time entry? Its timer is running.", "Delete Time Entry"},
      {{note, running}, "Delete 2 items? A timer is running among them.", "Delete 2 Items"},
      {{build}, "Delete this task and its 2 items? A timer is running in it.", "Delete Task"},
      {{site}, "Delete “Site” and its 3 tasks with 16 items? A timer is running in it.", "Delete “Site”"},
      {{site, idle},
       "Delete 2 projects and their 4 tasks with 16 items? A timer is running among them.",
       "Delete 2 Projects"},
      {{idle}, "", "Delete “Idle”"},  // only an empty task
      {{empty, note}, "", "Delete 2 Rows"},
      {{client}, "", "Delete “ACME”"},  // its projects stay
  };
  for (const auto& row : rows) {
    const WTDeletion deletion(row.selected);
    const QString detail = deletion.detail().isEmpty() ? QString() : ' ' + deletion.detail();
    EXPECT_EQ(deletion.needsQuestion() ? deletion.question() + detail : QString(),
              QString::fromUtf8(row.question));
    EXPECT_EQ(deletion.undoName(), QString::fromUtf8(row.undoName));
  }
}

// The projects list as the main window shows it, archived projects hidden.
class WTListControllerTest : public UiTest {
 protected:
  void SetUp() override {
    UiTest::SetUp();
    shown = std::make_unique<ShownProjects>(context.get(), QSize(800, 500));
    projects = &shown->controller;
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

// The row menu acts on the clicked row, the toolbar on the last selected one, if any; removing asks the
// window only when something of value goes.
TEST_F(WTListControllerTest, TheRowMenuAndTheToolbarActOnTheClickedOrLastSelectedRow) {
  auto* archived = makeProject("Archived");
  auto *a = makeProject("A"), *c = makeProject("C");
  makeItem<WTNote>(makeTask(a, "General"), "note", at(2024, 3, 1));
  archived->setArchived(true);
  projects->setArchivedPredicate({});  // archived ones shown
  endTurn();
  select(c);
  QMenu* menu = projects->rowMenu();
  auto click = [&](int row) {
    projects->tableView()->setClickedRow(row);
    projects->menuNeedsUpdate(menu);
  };
  click(rowOf(archived));
  QAction* tagged = actionTitled(menu, "Unarchive");
  ASSERT_NE(tagged, nullptr);
  tagged->trigger();
  EXPECT_FALSE(archived->archived() || c->archived());
  click(rowOf(c));
  EXPECT_EQ(tagged->text(), "Archive");
  tagged->setText("untouched");
  click(-1);
  EXPECT_EQ(tagged->text(), "untouched");
  QSignalSpy validation(projects, &WTViewController::validationChanged);
  select(a);
  EXPECT_GE(validation.count(), 1);
  EXPECT_EQ(projects->selectedObject(), c);  // last in list order
  projects->toggleArchive();
  EXPECT_TRUE(c->archived() && !a->archived());
  endTurn();  // drawn archived and selected, still listed
  EXPECT_GE(rowOf(c), 0);

  projects->selectObject(archived);
  projects->removeSelectedObjects();
  EXPECT_EQ(names(*projects->arrayController()), QStringList({"A", "C"}));
  // The row the keyboard moved to is selected: Delete never acts on a row no one sees chosen.
  const QModelIndex current = projects->tableView()->currentIndex();
  EXPECT_TRUE(current.isValid());
  EXPECT_EQ(projects->tableView()->selectionModel()->selectedRows(), QModelIndexList{current});
  EXPECT_EQ(shown->window.questions, QStringList{});
  projects->tableView()->selectionModel()->clearSelection();
  projects->toggleArchive();  // nothing selected: nothing happens
  EXPECT_FALSE(a->archived());
  shown->window.deletes = false;
  projects->selectObject(a);
  projects->removeSelectedObjects();
  EXPECT_EQ(shown->window.questions, QStringList{"Delete “A” and its 1 task with 1 item?"});
  shown->window.deletes = true;
  click(rowOf(a));
  menu->actions().last()->trigger();
  EXPECT_EQ(shown->window.questions.size(), 2);
  EXPECT_EQ(context->fetch<WTProject>(), QList<WTProject*>{c});
  EXPECT_EQ(context->undoManager().undoActionName(), "Delete “A”");
}

// The client chooser offers clients not archived, and Shift+F10 reaches it in the current row's menu; a
// project opens in an outline, reused next time.
TEST_F(WTListControllerTest, TheClientChooserAndOpeningAProject) {
  auto* first = makeProject("First");
  makeTask(first, "Only task");
  auto* second = makeProject("Second");
  auto* acme = makeClient("ACME");
  makeClient("Gone")->setArchived(true);
  endTurn();
  WTKeyboardContextMenu keyboardMenus;
  qApp->installEventFilter(&keyboardMenus);
  QListView* list = projects->tableView();
  list->setCurrentIndex(projects->arrayController()->indexOfObject(second));
  QStringList titles;
  QTimer::singleShot(0, [&] {
    auto* rowMenu = qobject_cast<QMenu*>(QApplication::activePopupWidget());
    QMenu* chooser =
        rowMenu && actionTitled(rowMenu, "Client") ? actionTitled(rowMenu, "Client")->menu() : nullptr;
    if (chooser) {
      emit chooser->aboutToShow();
      for (const QAction* action : chooser->actions()) titles << action->text();
      actionTitled(chooser, "ACME")->trigger();
    }
    if (rowMenu) rowMenu->close();
  });
  QTest::keyClick(list, Qt::Key_F10, Qt::ShiftModifier);
  qApp->removeEventFilter(&keyboardMenus);
  EXPECT_EQ(titles, (QStringList{"No Client", "", "ACME", "", "Edit Clients…"}));
  EXPECT_EQ(second->client(), acme);
  shown->window.activateWindow();  // the closed menu leaves none active here

  WTNavigationController& stack = shown->stack;
  list->setFocus();
  ASSERT_TRUE(QTest::qWaitFor([&] { return QApplication::focusWidget() == list; }));
  projects->openProject(first);
  ASSERT_TRUE(QTest::qWaitFor([&] { return stack.viewControllers().size() == 2; }));
  WTItemsViewController* items = projects->itemsViewController();
  EXPECT_EQ(stack.topViewController(), items);
  EXPECT_EQ(items->treeController()->index(0, 0).data(WTItemsModel::NameRole).toString(), "Only task");
  ASSERT_TRUE(QTest::qWaitFor([&] { return !stack.isAnimating(); }, 2000));
  EXPECT_TRUE(items->view()->isVisible() && !projects->view()->isVisible());
  // The keyboard goes on in the outline, not in the project's rate field, and back in the list.
  EXPECT_TRUE(qobject_cast<QTreeView*>(QApplication::focusWidget()));
  stack.popViewController();
  stack.finishAnimation();
  EXPECT_EQ(QApplication::focusWidget(), list);
  stack.popViewController();  // the root stays
  EXPECT_TRUE(projects->view()->isVisible() && !items->view()->isVisible());
  projects->openProject(second);
  ASSERT_TRUE(QTest::qWaitFor([&] { return stack.viewControllers().size() == 2; }));
  EXPECT_TRUE(projects->itemsViewController() == items && items->project() == second);
  projects->openClients();
  EXPECT_EQ(shown->window.clientsShown, 1);
  stack.popViewController();
  stack.finishAnimation();
  // A new project has a task General and is named at once, unless the list hides it.
  projects->addObject();
  const QList<WTProject*> all = context->fetch<WTProject>();
  ASSERT_EQ(all.size(), 3);
  WTProject* fresh = *std::find_if(all.begin(), all.end(), [](auto* p) { return p->name().isEmpty(); });
  ASSERT_EQ(fresh->tasks().size(), 1);
  EXPECT_EQ(fresh->tasks()[0]->name(), "General");
  EXPECT_EQ(projects->tableView()->currentIndex(), projects->arrayController()->indexOfObject(fresh));
  auto* editor = projects->tableView()->findChild<QLineEdit*>("nameEditor");
  ASSERT_NE(editor, nullptr);
  editor->setText(" Brand new  ");  // the spaces are not the name's
  projects->tableView()->setFocus();
  QTest::qWait(10);
  EXPECT_EQ(fresh->name(), "Brand new");
  // Escape before a name is typed takes a new project back.
  projects->addObject();
  QTest::keyClick(projects->tableView()->findChild<QLineEdit*>("nameEditor"), Qt::Key_Escape);
  EXPECT_EQ(context->fetch<WTProject>().size(), 3);
  EXPECT_EQ(context->undoManager().redoActionName(), "New Project");
  projects->setArchivedPredicate([](const WTObject* object) { return !object->name().isEmpty(); });
  projects->addObject();
  EXPECT_EQ(context->fetch<WTProject>().size(), 4);
  EXPECT_FALSE(projects->tableView()->isEditing());
}

}  // namespace
