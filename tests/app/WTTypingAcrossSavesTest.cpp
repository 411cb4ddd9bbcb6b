// Saves (autosave, sync replies, quitting) leave the open editor, its text, selection and the focus alone.
#include "AppFixture.h"
#include "SyncTestSupport.h"

#include <QAbstractItemView>

namespace {

class WTTypingAcrossSavesTest : public WindowTest {
 protected:
  // A new client with its name editor open, as Ctrl+2 then Ctrl+N leave it.
  QPointer<QLineEdit> newClientEditor() {
    window->showClients();
    window->clientsViewController()->addObject();
    return qobject_cast<QLineEdit*>(QApplication::focusWidget());
  }
  // Another record changes, as a merge or another window would change it, so that the save has work.
  bool saveWithOtherChanges() {
    WTProject::insertNewObject(delegate->managedObjectContext())->setName("merged elsewhere");
    return delegate->saveChanges();
  }
  // Still open and focused, holding `text` with `selected` selected and the cursor at `cursor`.
  static void expectUntouched(const QPointer<QLineEdit>& editor, const QString& text, const QString& selected,
                              int cursor) {
    ASSERT_TRUE(editor);
    EXPECT_TRUE(QApplication::focusWidget() == editor.data() && editor->isVisible());
    EXPECT_EQ(QStringLiteral("%1 [%2] @%3")
                  .arg(editor->text(), editor->selectedText())
                  .arg(editor->cursorPosition()),
              QStringLiteral("%1 [%2] @%3").arg(text, selected).arg(cursor));
  }
  // Return commits the name: the view closes its editor on its next turn of the event loop.
  static void commit(QPointer<QLineEdit>& editor) {
    QTest::keyClick(editor, Qt::Key_Return);
    ASSERT_TRUE(QTest::qWaitFor([&] { return !editor || !editor->isVisible(); }, 2000));
  }
  QStringList storedClientNames() { return storedNames<WTClient>(delegate->storePath()); }
};

// A save without changes ignores the editor; with changes it saves the text, and the row moves under it.
TEST_F(WTTypingAcrossSavesTest, AnOpenCellEditorSurvivesSavesWithAndWithoutChangesAndFollowsItsRow) {
  open();
  WTClient::insertNewObject(delegate->managedObjectContext())->setName("Mia");
  ASSERT_TRUE(delegate->managedObjectContext()->save());
  QPointer<QLineEdit> editor = newClientEditor();
  ASSERT_TRUE(editor);
  auto* view = qobject_cast<QAbstractItemView*>(editor->parentWidget()->parentWidget());
  ASSERT_TRUE(view);
  ASSERT_EQ(view->indexAt(editor->geometry().center()).row(), 0);  // an empty name sorts first
  QTest::keyClicks(editor, "Zed");
  ASSERT_TRUE(delegate->managedObjectContext()->save());
  ASSERT_TRUE(delegate->saveChanges());
  expectUntouched(editor, "Zed", "", 3);
  QTest::keyClicks(editor, "Beta");
  editor->setSelection(3, 3);  // "Bet", cursor after it
  ASSERT_TRUE(saveWithOtherChanges());
  QCoreApplication::processEvents();  // the list re-sorts on its next turn
  QCoreApplication::processEvents();
  expectUntouched(editor, "ZedBeta", "Bet", 6);
  EXPECT_EQ(view->indexAt(editor->geometry().center()).row(), 1);
  EXPECT_FALSE(delegate->managedObjectContext()->hasChanges());
  EXPECT_EQ(storedClientNames(), QStringList({"Mia", "ZedBeta"}));
  editor->end(false);
  QTest::keyClicks(editor, "Gamma");
  commit(editor);
  ASSERT_TRUE(delegate->saveChanges());
  EXPECT_EQ(storedClientNames(), QStringList({"Mia", "ZedBetaGamma"}));
}

// In a project's outline: the rate field with the focus, then a new task's name editor.
TEST_F(WTTypingAcrossSavesTest, TheOutlinesFieldAndEditorKeepFocusTextAndCursorAcrossASave) {
  open();
  WTProject* project = window->fetchProjects().value(0);
  WTItemsViewController* items = project ? openOutline(project) : nullptr;
  ASSERT_TRUE(items);
  QPointer<QLineEdit> rate = items->rateField();
  rate->setFocus();
  ASSERT_TRUE(QTest::qWaitFor([&] { return rate->hasFocus(); }, 2000));
  QTest::keyClicks(rate, "125");
  rate->setCursorPosition(1);
  ASSERT_TRUE(saveWithOtherChanges());
  expectUntouched(rate, "125", "", 1);
  ASSERT_TRUE(project->storedRate());
  EXPECT_EQ(project->storedRate()->toString(), "125");
  items->addObject();  // a new task, its name editor open
  QPointer<QLineEdit> editor = qobject_cast<QLineEdit*>(QApplication::focusWidget());
  ASSERT_TRUE(editor && items->outlineView()->isAncestorOf(editor));
  editor->selectAll();
  QTest::keyClicks(editor, "Deploy");
  editor->setSelection(6, -3);  // "loy", cursor before it
  ASSERT_TRUE(saveWithOtherChanges());
  expectUntouched(editor, "Deploy", "loy", 3);
  EXPECT_TRUE(storedNames<WTTask>(delegate->storePath()).contains("Deploy"));
}

// Undo stays in the editor or keeps the focus, never reviving replaced text; quitting saves the edit.
TEST_F(WTTypingAcrossSavesTest, UndoOfTypingStaysInTheEditorAndUndoOfARecordLeavesTheFocus) {
  open();
  QPointer<QLineEdit> editor = newClientEditor();
  ASSERT_TRUE(editor);
  ASSERT_TRUE(delegate->managedObjectContext()->save());
  QTest::keyClicks(editor, "Alpha");
  QAction* undo = action("undo");
  undo->trigger();
  expectUntouched(editor, "", "", 0);
  EXPECT_EQ(WTClient::fetchByPredicate({}, delegate->managedObjectContext()).size(), 1);
  action("redo")->trigger();
  expectUntouched(editor, "Alpha", "", 5);
  commit(editor);
  QCoreApplication::processEvents();  // the name's undo group ends with this turn
  auto* list = qobject_cast<QAbstractItemView*>(QApplication::focusWidget());
  WTClient* client = WTClient::fetchByPredicate({}, delegate->managedObjectContext()).value(0);
  ASSERT_TRUE(list && client && client->name() == "Alpha");
  undo->trigger();
  EXPECT_EQ(client->name(), "");
  EXPECT_EQ(QApplication::focusWidget(), list);
  client->setName("Beta");
  QCoreApplication::processEvents();
  for (QAction* step : {undo, action("redo")}) {
    list->edit(list->currentIndex());
    QPointer<QLineEdit> untouched = qobject_cast<QLineEdit*>(QApplication::focusWidget());
    ASSERT_TRUE(untouched && untouched->text() == client->name());
    step->trigger();
    EXPECT_EQ(client->name(), step == undo ? "" : "Beta");
    EXPECT_TRUE(!untouched || !untouched->isVisible());
    EXPECT_EQ(QApplication::focusWidget(), list);
  }
  editor = newClientEditor();
  ASSERT_TRUE(editor && delegate->managedObjectContext()->save());  // nothing else to save when quitting
  QTest::keyClicks(editor, "Gamma");
  EXPECT_TRUE(window->close());
  EXPECT_EQ(storedClientNames(), QStringList({"Beta", "Gamma"}));
}

// A merged "head" reply changing other records while the user types a new client's name.
TEST_F(WTTypingAcrossSavesTest, AMergedHeadReplyLeavesTheEditorAlone) {
  synctest::LoopbackHttpServer server;
  qint64 iteration = 1;
  QVariantMap pendingChange = synctest::changeSet();
  server.handler = [&](const synctest::HttpRequest& request) {
    if (request.json().value("action") != "head") return synctest::saveReply(++iteration);
    return synctest::headReply(++iteration, std::exchange(pendingChange, synctest::changeSet()));
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
  // Another record renamed, and a client that joins the list being edited.
  pendingChange = synctest::changeSet(
      {{"AA@WTClient", QVariantMap{{"name", "Aaron"}, {"uuid", "AA@WTClient"}}}},
      {{window->fetchProjects().value(0)->uuid(), QVariantMap{{"name", "Renamed on the laptop"}}}});
  ASSERT_TRUE(synctest::waitUntil([&] {
    return window->fetchProjects().value(0)->name() == "Renamed on the laptop" &&
           WTClient::fetchByPredicate({}, delegate->managedObjectContext()).size() == 2;
  }));
  QTest::qWait(50);  // the list takes the new row on its next turn
  ASSERT_TRUE(synctest::waitUntil([&] { return !delegate->managedObjectContext()->hasChanges(); }));
  expectUntouched(editor, "Alpha", "", 5);  // nothing selected, or the next key would replace what was typed
  QTest::keyClicks(editor, "BetaGamma");
  commit(editor);
  sync->disableSync();
  ASSERT_TRUE(delegate->saveChanges());
  EXPECT_EQ(storedClientNames(), QStringList({"Aaron", "AlphaBetaGamma"}));
}

}  // namespace
