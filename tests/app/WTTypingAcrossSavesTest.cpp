// Saves happen while the user types: the autosave, every sync reply, quitting. Whatever saves must leave
// the open editor, its text, cursor and selection, and the keyboard focus exactly as they were.
#include "AppFixture.h"
#include "SyncTestSupport.h"
#include "WTClient.h"
#include "WTClientsViewController.h"
#include "WTItemsViewController.h"
#include "WTListView.h"
#include "WTMainWindowController.h"
#include "WTNavigationController.h"
#include "WTObjectContext.h"
#include "WTOutlineView.h"
#include "WTProject.h"
#include "WTProjectsViewController.h"
#include "WTTask.h"

#include <gtest/gtest.h>

#include <QAbstractItemView>
#include <QAction>
#include <QApplication>
#include <QLineEdit>
#include <QPointer>
#include <QTest>

namespace {

class WTTypingAcrossSavesTest : public WindowTest {
 protected:
  // A new client with its name editor open, as Ctrl+2 then Ctrl+N leave it.
  QLineEdit* newClientEditor() {
    window->showClients();
    window->clientsViewController()->addObject();
    return qobject_cast<QLineEdit*>(QApplication::focusWidget());
  }
  // Another record changes, as a merge or another window would change it, so that the save has work.
  void changeSomethingElse(const QString& name) {
    WTProject::insertNewObject(delegate->managedObjectContext())->setName(name);
  }
  QStringList storedClientNames() {
    QStringList names;
    auto other = makeDelegate();
    for (WTClient* client : WTClient::fetchByPredicate({}, other->managedObjectContext()))
      names << client->name();
    return names;
  }
};

TEST_F(WTTypingAcrossSavesTest, AnOpenCellEditorSurvivesSavesWithAndWithoutChanges) {
  open();
  QPointer<QLineEdit> editor = newClientEditor();
  ASSERT_TRUE(editor);
  QTest::keyClicks(editor, "Alpha");

  // Nothing else changed since the insertion was saved: the save must not even look at the editor.
  ASSERT_TRUE(delegate->managedObjectContext()->save());
  ASSERT_TRUE(delegate->saveChanges());
  ASSERT_TRUE(editor);
  EXPECT_EQ(QApplication::focusWidget(), editor.data());
  EXPECT_TRUE(editor->isVisible());  // still open: a closed editor is hidden, then deleted
  EXPECT_EQ(editor->text(), "Alpha");

  // With something to save, the typed text is saved too, and the editor stays as the user left it.
  QTest::keyClicks(editor, "Beta");
  editor->setSelection(5, 3);  // "Bet", cursor after it
  changeSomethingElse("merged elsewhere");
  ASSERT_TRUE(delegate->saveChanges());
  ASSERT_TRUE(editor);
  EXPECT_EQ(QApplication::focusWidget(), editor.data());
  EXPECT_TRUE(editor->isVisible());  // still open: a closed editor is hidden, then deleted
  EXPECT_EQ(editor->text(), "AlphaBeta");
  EXPECT_EQ(editor->selectedText(), "Bet");
  EXPECT_EQ(editor->cursorPosition(), 8);
  EXPECT_FALSE(delegate->managedObjectContext()->hasChanges());
  EXPECT_EQ(storedClientNames(), QStringList({"AlphaBeta"}));

  editor->end(false);
  QTest::keyClicks(editor, "Gamma");
  QTest::keyClick(editor, Qt::Key_Return);
  // The view commits and closes on its next turn of the event loop.
  ASSERT_TRUE(QTest::qWaitFor([&] { return !editor || !editor->isVisible(); }, 2000));
  ASSERT_TRUE(delegate->saveChanges());
  EXPECT_EQ(storedClientNames(), QStringList({"AlphaBetaGamma"}));
}

// Committing the name re-sorts the list: the edited row moves under its open editor.
TEST_F(WTTypingAcrossSavesTest, AnEditorFollowsItsRowWhenTheCommittedNameReordersTheList) {
  open();
  WTClient::insertNewObject(delegate->managedObjectContext())->setName("Mia");
  ASSERT_TRUE(delegate->managedObjectContext()->save());
  QPointer<QLineEdit> editor = newClientEditor();
  ASSERT_TRUE(editor);
  auto* view = qobject_cast<QAbstractItemView*>(editor->parentWidget()->parentWidget());
  ASSERT_TRUE(view);
  ASSERT_EQ(view->indexAt(editor->geometry().center()).row(), 0);  // an empty name sorts first
  QTest::keyClicks(editor, "Zed");

  changeSomethingElse("merged elsewhere");
  ASSERT_TRUE(delegate->saveChanges());
  QCoreApplication::processEvents();  // the list re-sorts on its next turn
  QCoreApplication::processEvents();
  ASSERT_TRUE(editor);
  EXPECT_EQ(QApplication::focusWidget(), editor.data());
  EXPECT_TRUE(editor->isVisible());
  EXPECT_EQ(editor->text(), "Zed");
  EXPECT_EQ(view->indexAt(editor->geometry().center()).row(), 1);
  QTest::keyClicks(editor, "ta");
  QTest::keyClick(editor, Qt::Key_Return);
  ASSERT_TRUE(QTest::qWaitFor([&] { return !editor || !editor->isVisible(); }, 2000));
  ASSERT_TRUE(delegate->saveChanges());
  QStringList names = storedClientNames();
  names.sort();
  EXPECT_EQ(names, QStringList({"Mia", "Zedta"}));
}

// In a project's outline: the rate field with the focus, then a new task's name editor.
TEST_F(WTTypingAcrossSavesTest, TheOutlinesFieldAndEditorKeepFocusTextAndCursorAcrossASave) {
  open();
  WTProject* project = window->fetchProjects().value(0);
  ASSERT_TRUE(project);
  WTItemsViewController* items = openOutline(project);
  ASSERT_TRUE(items);
  QLineEdit* rate = items->rateField();
  rate->setFocus();
  ASSERT_TRUE(QTest::qWaitFor([&] { return rate->hasFocus(); }, 2000));
  QTest::keyClicks(rate, "125");
  rate->setCursorPosition(1);
  changeSomethingElse("merged elsewhere");
  ASSERT_TRUE(delegate->saveChanges());
  EXPECT_EQ(QApplication::focusWidget(), rate);
  EXPECT_EQ(rate->text(), "125");
  EXPECT_EQ(rate->cursorPosition(), 1);
  ASSERT_TRUE(project->storedRate());
  EXPECT_EQ(project->storedRate()->toString(), "125");

  items->addObject();  // a new task, its name editor open
  QPointer<QLineEdit> editor = qobject_cast<QLineEdit*>(QApplication::focusWidget());
  ASSERT_TRUE(editor);
  ASSERT_TRUE(items->outlineView()->isAncestorOf(editor));
  editor->selectAll();
  QTest::keyClicks(editor, "Deploy");
  editor->setSelection(6, -3);  // "loy", cursor before it
  changeSomethingElse("merged again");
  ASSERT_TRUE(delegate->saveChanges());
  ASSERT_TRUE(editor);
  EXPECT_EQ(QApplication::focusWidget(), editor.data());
  EXPECT_TRUE(editor->isVisible());
  EXPECT_EQ(editor->text(), "Deploy");
  EXPECT_EQ(editor->selectedText(), "loy");
  EXPECT_EQ(editor->cursorPosition(), 3);
  QStringList names;
  auto other = makeDelegate();
  for (WTProject* stored : WTProject::fetchByPredicate({}, other->managedObjectContext()))
    for (WTTask* task : stored->tasks()) names << task->name();
  EXPECT_TRUE(names.contains("Deploy")) << names.join(", ").toStdString();
}

// Undo and Redo take back typing where it was typed, and records with the keyboard focus kept where it was.
TEST_F(WTTypingAcrossSavesTest, UndoOfTypingStaysInTheEditor) {
  open();
  auto* undo = action("undo");
  ASSERT_TRUE(undo);
  QPointer<QLineEdit> editor = newClientEditor();
  ASSERT_TRUE(editor);
  ASSERT_TRUE(delegate->managedObjectContext()->save());
  QTest::keyClicks(editor, "Alpha");
  undo->trigger();
  ASSERT_TRUE(editor);
  EXPECT_EQ(QApplication::focusWidget(), editor.data());
  EXPECT_TRUE(editor->isVisible());
  EXPECT_EQ(editor->text(), "");
  EXPECT_EQ(WTClient::fetchByPredicate({}, delegate->managedObjectContext()).size(), 1);

  auto* redo = action("redo");
  ASSERT_TRUE(redo);
  redo->trigger();
  ASSERT_TRUE(editor);
  EXPECT_EQ(QApplication::focusWidget(), editor.data());
  EXPECT_EQ(editor->text(), "Alpha");
}

TEST_F(WTTypingAcrossSavesTest, UndoOfARecordLeavesTheKeyboardFocusWhereItWas) {
  open();
  auto* undo = action("undo");
  ASSERT_TRUE(undo);
  QPointer<QLineEdit> editor = newClientEditor();
  ASSERT_TRUE(editor);
  QTest::keyClicks(editor, "Alpha");
  QTest::keyClick(editor, Qt::Key_Return);
  ASSERT_TRUE(QTest::qWaitFor([&] { return !editor || !editor->isVisible(); }, 2000));
  QCoreApplication::processEvents();  // the name's undo group ends with this turn
  QWidget* list = QApplication::focusWidget();
  ASSERT_TRUE(list);
  WTClient* client = WTClient::fetchByPredicate({}, delegate->managedObjectContext()).value(0);
  ASSERT_TRUE(client);
  ASSERT_EQ(client->name(), "Alpha");
  undo->trigger();
  EXPECT_EQ(client->name(), "");
  EXPECT_EQ(QApplication::focusWidget(), list);

  // An editor opened on the row, nothing typed: undoing the row's name must not leave the editor showing
  // (and on Return storing) the name the undo replaced.
  client->setName("Beta");
  QCoreApplication::processEvents();
  auto* view = qobject_cast<QAbstractItemView*>(list);
  ASSERT_TRUE(view);
  view->edit(view->currentIndex());
  QPointer<QLineEdit> untouched = qobject_cast<QLineEdit*>(QApplication::focusWidget());
  ASSERT_TRUE(untouched);
  ASSERT_EQ(untouched->text(), "Beta");
  undo->trigger();
  EXPECT_EQ(client->name(), "");
  EXPECT_TRUE(!untouched || !untouched->isVisible());
  EXPECT_EQ(QApplication::focusWidget(), list);

  view->edit(view->currentIndex());
  untouched = qobject_cast<QLineEdit*>(QApplication::focusWidget());
  ASSERT_TRUE(untouched);
  action("redo")->trigger();
  EXPECT_EQ(client->name(), "Beta");
  EXPECT_TRUE(!untouched || !untouched->isVisible());
  EXPECT_EQ(QApplication::focusWidget(), list);
}

// Quitting is the one save that stores an edit in progress even when nothing else changed.
TEST_F(WTTypingAcrossSavesTest, QuittingStoresWhatIsBeingTyped) {
  open();
  QPointer<QLineEdit> editor = newClientEditor();
  ASSERT_TRUE(editor);
  ASSERT_TRUE(delegate->managedObjectContext()->save());
  QTest::keyClicks(editor, "Alpha");
  EXPECT_TRUE(window->close());
  EXPECT_EQ(storedClientNames(), QStringList({"Alpha"}));
}

// The real path of the report: a "head" reply that changes another record is merged and saved while the
// user types a new client's name.
TEST_F(WTTypingAcrossSavesTest, AMergedHeadReplyLeavesTheEditorAlone) {
  synctest::LoopbackHttpServer server;
  qint64 iteration = 1;
  QVariantMap pendingChange;
  server.handler = [&](const synctest::HttpRequest& request) {
    const QVariantMap body = request.json();
    QVariantMap reply{{"action", body.value("action")}, {"iteration", ++iteration}};
    if (body.value("action") == "head") {
      reply.insert("result",
                   pendingChange.isEmpty()
                       ? QVariantMap{{"i", QVariantMap{}}, {"u", QVariantMap{}}, {"x", QVariantList{}}}
                       : pendingChange);
      pendingChange.clear();
    }
    return synctest::LoopbackHttpServer::json(reply);
  };
  defaults->setValue("WTSyncServer", server.address());
  defaults->setValue("WTSyncUser", "typist@example.org");
  defaults->setValue("WTSyncPassword", "a password");
  open();
  // An installation that syncs starts without a first project: here is one for the laptop to rename.
  WTProject::insertNewObject(delegate->managedObjectContext())->setName("Atlas");
  RZSyncManager* sync = delegate->syncManager();
  ASSERT_TRUE(sync);
  sync->setIntervals({50, 50, 50});
  sync->rescheduleTimer(0);

  QPointer<QLineEdit> editor = newClientEditor();
  ASSERT_TRUE(editor);
  QTest::keyClicks(editor, "Alpha");
  // Let the autosave store the new client and a few polls pass, as the user pauses.
  const qsizetype seen = server.requests.size();
  ASSERT_TRUE(synctest::waitUntil([&] { return server.requests.size() >= seen + 3; }));

  const QString projectId = window->fetchProjects().value(0)->uuid();
  // Another record renamed, and a client that joins the list being edited.
  pendingChange = QVariantMap{
      {"i", QVariantMap{{"AA@WTClient", QVariantMap{{"name", "Aaron"}, {"uuid", "AA@WTClient"}}}}},
      {"u", QVariantMap{{projectId, QVariantMap{{"name", "Renamed on the laptop"}}}}},
      {"x", QVariantList{}}};
  ASSERT_TRUE(synctest::waitUntil(
      [&] { return window->fetchProjects().value(0)->name() == "Renamed on the laptop"; }));
  ASSERT_TRUE(synctest::waitUntil(
      [&] { return WTClient::fetchByPredicate({}, delegate->managedObjectContext()).size() == 2; }));
  QTest::qWait(50);  // the list takes the new row on its next turn
  ASSERT_TRUE(synctest::waitUntil([&] { return !delegate->managedObjectContext()->hasChanges(); }));

  ASSERT_TRUE(editor);
  EXPECT_EQ(QApplication::focusWidget(), editor.data());
  EXPECT_TRUE(editor->isVisible());  // still open: a closed editor is hidden, then deleted
  EXPECT_EQ(editor->text(), "Alpha");
  EXPECT_EQ(editor->cursorPosition(), 5);
  EXPECT_FALSE(editor->hasSelectedText());  // or the next key would replace what was typed
  QTest::keyClicks(editor, "BetaGamma");
  QTest::keyClick(editor, Qt::Key_Return);
  ASSERT_TRUE(QTest::qWaitFor([&] { return !editor || !editor->isVisible(); }, 2000));
  sync->disableSync();
  ASSERT_TRUE(delegate->saveChanges());
  QStringList names = storedClientNames();
  names.sort();
  EXPECT_EQ(names, QStringList({"Aaron", "AlphaBetaGamma"}));
}

}  // namespace
