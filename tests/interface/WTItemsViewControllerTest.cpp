#include "UiFixture.h"
#include "WTDatePopover.h"
#include "WTKeyboardContextMenu.h"
#include "WTNotesTextView.h"

#include <QApplication>
#include <QCalendarWidget>
#include <QTimer>
#include <QToolTip>

namespace {

using Part = WTTableCellView::Part;
using Field = WTItemCellDelegate::Field;

class WTItemsViewControllerTest : public OutlineTest {
 protected:
  void select(const WTObject* object,
              QItemSelectionModel::SelectionFlag how = QItemSelectionModel::ClearAndSelect) {
    outline()->selectionModel()->select(rowOf(object), how | QItemSelectionModel::Rows);
  }
  QList<const WTObject*> selected() {
    QList<const WTObject*> objects;
    for (const QModelIndex& index : outline()->selectionModel()->selectedRows())
      objects << model()->objectAt(index);
    return objects;
  }
  // The group an item is in, "MM-dd" or "Pending", and whether it is open.
  QString dayOf(const WTItem* item) {
    const QModelIndex group = model()->indexOfContainerOfItem(item);
    const auto date = model()->containerAt(group)->date();
    return (date ? RZDate::stringWithPattern(*date, "MM-dd") : QString("Pending")) +
           (outline()->isExpanded(group) ? " open" : " closed");
  }
};

// New items land selected, in open rows, in the task asked for; the timer commands act on a task.
TEST_F(WTItemsViewControllerTest, ANewTimeEntryRunsIsSelectedAndEditedInsideOpenRows) {
  auto* yesterday = makeItem<WTNote>(build, "yesterday", at(2024, 3, 13));
  WTTime* time = controller->addTimeItem(build);
  ASSERT_NE(time, nullptr);
  EXPECT_TRUE(time->running() && time->task() == build && outline()->isEditing());
  EXPECT_TRUE(outline()->selectionModel()->isSelected(rowOf(time)) &&
              outline()->currentIndex() == rowOf(time));
  EXPECT_EQ(dayOf(time) + ", " + dayOf(yesterday), "03-14 open, 03-13 closed");
  EXPECT_TRUE(outline()->isExpanded(rowOf(build)));
  // The task's menu adds what its hover buttons add, from the keyboard too.
  std::unique_ptr<QMenu> menu(controller->taskMenu(design));
  for (const auto& [kind, title] : {std::pair{WTEntity::Flat, "New Flat Fee"},
                                    {WTEntity::Note, "New Note"},
                                    {WTEntity::Expense, "New Expense"},
                                    {WTEntity::ToDo, "New To-Do"}}) {
    actionTitled(menu.get(), title)->trigger();
    const auto* item = dynamic_cast<const WTItem*>(model()->objectAt(outline()->currentIndex()));
    EXPECT_TRUE(item && item->entity() == kind && item->task() == design) << title;
  }
  EXPECT_EQ(controller->addItem(WTEntity::Flat, nullptr), nullptr);
  // A new task left with Escape before it has a name is taken back; one named stays.
  for (const QString& name : {QString(), QString("Review")}) {
    controller->addObject();
    ASSERT_NE(shown->openEditor(), nullptr);
    if (!name.isEmpty()) type(shown->openEditor(), name, true);
    if (name.isEmpty()) QTest::keyClick(shown->openEditor(), Qt::Key_Escape);
    EXPECT_EQ(project->tasks().size(), name.isEmpty() ? 2 : 3) << name.toStdString();
  }

  // The task's menu moves it among the others, a place at a time, as a drag does.
  for (int i = 0; i < 3; ++i) {
    const std::unique_ptr<QMenu> taskMenu(controller->taskMenu(design));
    QAction* down = actionTitled(taskMenu.get(), "Move Down");
    ASSERT_NE(down, nullptr);
    EXPECT_EQ(down->isEnabled(), i < 2);  // not past the last
    if (i < 2) down->trigger();
  }
  EXPECT_EQ(project->tasks().indexOf(design), 2);
  EXPECT_EQ(context->undoManager().undoActionName(), "Move");
  EXPECT_EQ(outline()->currentIndex(), rowOf(design));
  controller->toggleTimerOfTask(design);
  ASSERT_EQ(design->runningTimes().size(), 1);
  EXPECT_EQ(outline()->currentIndex(), rowOf(design->runningTimes()[0]));
  controller->toggleTimerOfTask(design);
  EXPECT_FALSE(design->running());
  controller->toggleTimer();
  EXPECT_TRUE(design->running());
  controller->stopTimer(design->runningTimes().value(0));
  EXPECT_FALSE(design->running());
}

// Completing a to-do or picking a day moves the item into its new day's group, opened.
TEST_F(WTItemsViewControllerTest, ItemsMoveIntoTheOpenGroupOfTheirNewDay) {
  auto* todo = makeItem<WTToDo>(design, "call back", at(2024, 3, 1));
  auto* time = makeItem<WTTime>(design, "meeting", at(2024, 3, 14, 9, 15));
  endTurn();
  controller->expandContainerOfItem(todo);
  // Its checkbox, Space, or the first entry of its row's menu (Shift+F10, as a right click opens it).
  WTKeyboardContextMenu keyboardMenus;
  qApp->installEventFilter(&keyboardMenus);
  enum class By { Click, Space, Menu };
  auto tick = [&](By by) {
    outline()->setFocus();
    outline()->setCurrentIndex(rowOf(todo));
    if (by == By::Click)
      QTest::mouseClick(outline()->viewport(), Qt::LeftButton, {}, shown->centreOf(todo, Part::Checkbox));
    if (by == By::Space) QTest::keyClick(outline(), Qt::Key_Space);
    if (by == By::Menu) {
      QTimer::singleShot(0, [] {
        if (auto* menu = qobject_cast<QMenu*>(QApplication::activePopupWidget())) {
          menu->actions().value(0)->trigger();
          menu->close();
        }
      });
      QTest::keyClick(outline(), Qt::Key_F10, Qt::ShiftModifier);
    }
    return context->undoManager().undoActionName() + ' ' + dayOf(todo);
  };
  EXPECT_EQ(tick(By::Click), "Complete To-Do 03-14 open");
  EXPECT_EQ(outline()->currentIndex(), rowOf(todo)) << "the keyboard stays on it";
  context->undoManager().undo();
  endTurn();
  EXPECT_EQ(dayOf(todo), "Pending open") << "undone: the group comes back as it was left";
  EXPECT_EQ(tick(By::Space), "Complete To-Do 03-14 open");
  EXPECT_EQ(tick(By::Menu), "Reopen To-Do Pending open");
  qApp->removeEventFilter(&keyboardMenus);
  shown->window.activateWindow();  // the closed menu leaves none active here
  ASSERT_TRUE(QTest::qWaitFor([&] { return QApplication::activeWindow() == &shown->window; }));
  actionTitled(std::unique_ptr<QMenu>(controller->itemMenu(time)).get(), "Change Date…")->trigger();
  WTDatePopover* popover = controller->popover();
  ASSERT_TRUE(controller->currentItem() == time && popover->isVisible());
  EXPECT_EQ(popover->date(), QDate(2024, 3, 14));
  EXPECT_EQ(popover->datePicker()->maximumDate(), QDate(2024, 3, 14)) << "no day it is not over on";
  controller->openDatePicker(todo, QRect(0, 0, 20, 20));
  EXPECT_EQ(controller->currentItem(), time);
  popover->setDate(QDate(2024, 3, 9));
  popover->hide();
  EXPECT_EQ(controller->currentItem(), nullptr);
  EXPECT_EQ(dayOf(time), "03-09 open");
  const std::optional<Date> before = todo->startDate();
  controller->openDatePicker(todo, QRect(0, 0, 20, 20));
  popover->hide();
  EXPECT_EQ(todo->startDate(), before);
  // Nor a running entry a day on which it would not have begun (negative time and money).
  auto* late = makeItem<WTTime>(build, "late", at(2024, 3, 13, 10, 30));
  late->setRunning(true);
  controller->openDatePicker(late, QRect(0, 0, 20, 20));
  EXPECT_EQ(popover->datePicker()->maximumDate(), QDate(2024, 3, 13));
  popover->datePicker()->setSelectedDate(QDate(2024, 3, 14));
  popover->hide();
  EXPECT_EQ(late->startDate(), at(2024, 3, 13, 10, 30));
  // A timer started elsewhere (the tray, a command) opens its new day's group: its running row shows.
  auto* elsewhere = makeItem<WTTime>(build, "from the tray", at(2024, 3, 12, 8, 0));
  elsewhere->setRunning(true);
  endTurn();
  EXPECT_EQ(dayOf(elsewhere), "03-12 open");
  // A day's row, never selected, shows when the keyboard is on it (as after Down from its task).
  const QModelIndex day = model()->indexOfContainerOfItem(time);
  shown->window.activateWindow();  // the closed date picker leaves none active here
  outline()->setFocus();
  ASSERT_TRUE(QTest::qWaitFor([&] { return outline()->hasFocus(); }));
  const QImage plain = outline()->viewport()->grab(outline()->visualRect(day)).toImage();
  outline()->setCurrentIndex(day);
  EXPECT_NE(outline()->viewport()->grab(outline()->visualRect(day)).toImage(), plain);
  // Dropped on another task, or among the tasks, records stay selected where they land.
  for (WTObject* dropped : {static_cast<WTObject*>(time), static_cast<WTObject*>(build)}) {
    const bool task = dropped == build;
    const std::unique_ptr<QMimeData> drag(model()->mimeData({rowOf(dropped)}));
    ASSERT_TRUE(model()->dropMimeData(drag.get(), Qt::MoveAction, task ? 0 : -1, 0,
                                      task ? QModelIndex() : rowOf(build)));
    EXPECT_TRUE(QTest::qWaitFor([&] { return outline()->currentIndex() == rowOf(dropped); })) << task;
    EXPECT_EQ(outline()->selectionModel()->selectedRows(), QModelIndexList{rowOf(dropped)}) << task;
  }
  // The item's menu moves it to another task as a drop there does, keeping its day.
  std::unique_ptr<QMenu> menu(controller->itemMenu(time));
  QAction* moveTo = actionTitled(menu.get(), "Move to Task");
  ASSERT_TRUE(moveTo && moveTo->menu() && actionTitled(moveTo->menu(), "Design"));
  actionTitled(moveTo->menu(), "Design")->trigger();
  EXPECT_EQ(time->task()->name() + ' ' + dayOf(time), "Design 03-09 open");
  EXPECT_EQ(outline()->selectionModel()->selectedRows(), QModelIndexList{rowOf(time)});
  // No move bills a minute twice in a task: a new day, another task or a drop where the entry would share
  // time with another is refused, naming that one, and moves nothing.
  makeItem<WTTime>(design, "call", at(2024, 3, 5, 9));
  auto* talk = makeItem<WTTime>(design, "talk", at(2024, 3, 6, 9, 15));
  auto* review = makeItem<WTTime>(build, "review", at(2024, 3, 5, 9, 15));
  endTurn();
  const auto refused = [&](WTTime* entry, WTTask* task, Date start) {
    const bool told =
        QToolTip::isVisible() &&
        QToolTip::text().startsWith("The entry would share time with the entry 09:00–09:30 of “Design”");
    QToolTip::hideText();
    return told && entry->task() == task && entry->startDate() == start;
  };
  controller->openDatePicker(talk, QRect(0, 0, 20, 20));
  popover->setDate(QDate(2024, 3, 5));
  popover->hide();
  EXPECT_TRUE(refused(talk, design, at(2024, 3, 6, 9, 15))) << "a new day";
  menu.reset(controller->itemMenu(review));
  actionTitled(actionTitled(menu.get(), "Move to Task")->menu(), "Design")->trigger();
  EXPECT_TRUE(refused(review, build, at(2024, 3, 5, 9, 15))) << "another task";
  const std::unique_ptr<QMimeData> drag(model()->mimeData({rowOf(review)}));
  EXPECT_FALSE(model()->dropMimeData(drag.get(), Qt::MoveAction, -1, 0, rowOf(design)));
  EXPECT_TRUE(refused(review, build, at(2024, 3, 5, 9, 15))) << "a drop";
}

// A note is stored once its editor is left; an emptied one closes with nothing stored.
TEST_F(WTItemsViewControllerTest, NotesAreStoredWhenTheirEditorIsLeft) {
  auto* flat = makeItem<WTFlat>(design, "fee", at(2024, 3, 14));
  endTurn();
  controller->expandContainerOfItem(flat);
  controller->showNotes(flat);
  WTNotesTextView* editor = controller->cellDelegate()->notesEditor();
  ASSERT_NE(editor, nullptr);
  editor->setPlainText("first\nsecond");
  EXPECT_EQ(flat->notes(), QString());
  editor->clear();
  outline()->setFocus();
  EXPECT_EQ(controller->cellDelegate()->notesEditor(), nullptr);
  controller->showNotes(flat);
  controller->cellDelegate()->notesEditor()->setPlainText("kept");
  outline()->setFocus();
  EXPECT_EQ(flat->notes(), "kept");
  // Escape leaves the field too, keeping the lines typed: a field of several lines has no Return for it.
  controller->showNotes(flat);
  editor = controller->cellDelegate()->notesEditor();
  ASSERT_NE(editor, nullptr);
  editor->setPlainText("kept\nand more");
  QTest::keyClick(editor, Qt::Key_Escape);
  EXPECT_EQ(flat->notes(), "kept\nand more");
  EXPECT_EQ(shown->openEditor(), nullptr);
  EXPECT_EQ(controller->cellDelegate()->notesEditor(), nullptr);
  // Shift+Return in a row's name goes on in its notes: the next line is not typed over the first.
  auto* note = makeItem<WTNote>(design, "", at(2024, 3, 14));
  endTurn();
  outline()->setCurrentIndex(rowOf(note));
  emit outline()->editRequested(rowOf(note));
  ASSERT_NE(shown->openEditor(), nullptr);
  type(shown->openEditor(), "First line");
  QTest::keyClick(shown->openEditor(), Qt::Key_Return, Qt::ShiftModifier);
  ASSERT_TRUE(QTest::qWaitFor([&] { return controller->cellDelegate()->notesEditor() != nullptr; }));
  QTest::keyClicks(controller->cellDelegate()->notesEditor(), "Second line");
  QTest::keyClick(controller->cellDelegate()->notesEditor(), Qt::Key_Escape);
  EXPECT_EQ(note->name() + " / " + note->notes(), "First line / Second line");
  // The row's menu opens them too, and deletes the row.
  std::unique_ptr<QMenu> menu(controller->itemMenu(flat));
  actionTitled(menu.get(), "Notes…")->trigger();
  ASSERT_NE(controller->cellDelegate()->notesEditor(), nullptr);
  QTest::keyClick(controller->cellDelegate()->notesEditor(), Qt::Key_Escape);
  actionTitled(menu.get(), "Delete")->trigger();
  EXPECT_FALSE(rowOf(flat).isValid());
  EXPECT_EQ(context->undoManager().undoActionName(), "Delete “fee”");
}

// Open rows are remembered per project and found again after a relaunch.
TEST_F(WTItemsViewControllerTest, ExpandedRowsAreRememberedPerProject) {
  auto* note = makeItem<WTNote>(design, "note", at(2024, 3, 10));
  auto* todo = makeItem<WTToDo>(build, "todo", at(2024, 3, 11));
  endTurn();
  outline()->expand(rowOf(design));
  outline()->expand(model()->indexOfContainerOfItem(note));
  const QString noteIdentity = model()->persistentIdentity(rowOf(note));
  WTProject* other = makeProject("Other");
  makeTask(other, "Alone");
  controller->setProject(other);
  controller->willDisplayView();
  EXPECT_FALSE(outline()->isExpanded(model()->index(0, 0)));

  WTItemsViewController again(context.get());
  again.setProject(project);
  again.view()->resize(800, 400);
  again.willDisplayView();
  auto open = [&](const QModelIndex& row) { return again.outlineView()->isExpanded(row); };
  WTItemsModel* tree = again.treeController();
  EXPECT_TRUE(open(tree->indexOfObject(design)) && open(tree->indexOfContainerOfItem(note)));
  EXPECT_FALSE(open(tree->indexOfObject(build)));
  EXPECT_EQ(tree->indexForPersistentIdentity(noteIdentity), tree->indexOfObject(note));
  for (const QString& identity : {design->uuid() + "|12345", QString("nobody@WTTask")})
    EXPECT_FALSE(tree->indexForPersistentIdentity(identity).isValid()) << identity.toStdString();
  EXPECT_FALSE(tree->indexOfContainer(design, at(2024, 1, 1)).isValid());  // a day without items
  const QModelIndex pending = tree->indexOfContainerOfItem(todo);
  EXPECT_EQ(tree->indexForPersistentIdentity(tree->persistentIdentity(pending)), pending);
  // A day that is not a number is no day, not the one whose key is 0.
  RZDate::setDefaultTimeZone(QStringLiteral("UTC"));
  makeItem<WTNote>(design, "epoch", Date::fromSeconds(0));
  endTurn();
  ASSERT_TRUE(tree->indexOfContainer(design, Date::fromSeconds(0)).isValid());
  EXPECT_FALSE(tree->indexForPersistentIdentity(design->uuid() + "|soon").isValid());
}

// Undo reopens and selects what it brings back; other changes leave the selection alone.
TEST_F(WTItemsViewControllerTest, WhatUndoBringsBackIsOpenedAndSelected) {
  using Command = WTViewController::Command;
  EXPECT_TRUE(controller->respondsTo(Command::ToggleArchive) && controller->respondsTo(Command::Report));
  EXPECT_EQ(controller->selectedObject(), project);
  controller->toggleArchive();
  EXPECT_TRUE(project->archived());
  WTNote* kept = makeItem<WTNote>(build, "kept", at(2024, 3, 13));
  WTNote* note = makeItem<WTNote>(build, "gone", at(2024, 3, 12));
  endTurn();
  controller->expandContainerOfItem(note);
  for (const WTObject* removed : std::initializer_list<const WTObject*>{note, build}) {
    select(removed);
    controller->removeSelectedObjects();
    endTurn();
    EXPECT_FALSE(rowOf(removed).isValid());
    EXPECT_EQ(outline()->currentIndex(),
              removed == note ? model()->indexOfContainerOfItem(kept) : rowOf(design))
        << "the keyboard goes on from a neighbour";
    outline()->collapseAll();
    select(design);
    context->undoManager().undo();
    endTurn();
    ASSERT_TRUE(rowOf(removed).isValid());
    EXPECT_EQ(selected(), (QList<const WTObject*>{removed}));
    EXPECT_EQ(outline()->currentIndex(), rowOf(removed));
    if (removed == note) {
      EXPECT_EQ(dayOf(note) + ", " + dayOf(kept), "03-12 open, 03-13 closed");
    }
  }
  makeItem<WTNote>(design, "new", at(2024, 3, 14));
  endTurn();
  EXPECT_EQ(selected(), (QList<const WTObject*>{build}));
  controller->selectItem(note);
  select(design, QItemSelectionModel::Select);
  controller->removeSelectedObjects();
  EXPECT_EQ(project->tasks(), QList<WTTask*>{build});
  EXPECT_EQ(build->items(), QList<WTItem*>{kept});
}

// Time already spent is entered stopped by typing its duration: it ends now, not that long from now.
TEST_F(WTItemsViewControllerTest, TimeAlreadySpentIsEnteredStoppedByTypingItsDuration) {
  WTTime* earlier = makeItem<WTTime>(build, "Earlier", at(2024, 3, 14, 8, 0));  // until 08:30
  std::unique_ptr<QMenu> menu(controller->taskMenu(build));
  ASSERT_NE(actionTitled(menu.get(), "New Time Entry (Already Spent)"), nullptr);
  actionTitled(menu.get(), "New Time Entry (Already Spent)")->trigger();
  ASSERT_EQ(build->items().size(), 2);
  auto* time = dynamic_cast<WTTime*>(build->items().first() == earlier ? build->items().last()
                                                                       : build->items().first());
  ASSERT_TRUE(time && !time->running() && outline()->isEditing());
  // Time shared with the earlier entry, and what is not a whole duration, change nothing.
  for (const char* typed : {"1:31", "1,30", "1:30"}) {
    if (QLineEdit* open = shown->openEditor()) QTest::keyClick(open, Qt::Key_Escape);
    controller->cellDelegate()->setEditField(WTItemCellDelegate::Field::SpentDuration);
    outline()->edit(rowOf(time));
    QLineEdit* editor = shown->openEditor();
    ASSERT_NE(editor, nullptr);
    ASSERT_EQ(editor->property("field").toInt(), int(WTItemCellDelegate::Field::SpentDuration));
    editor->setText(typed);
    outline()->endEditing();
    endTurn();
    EXPECT_EQ(time->duration(), typed == std::string("1:30") ? 90 : 0) << typed;
  }
  EXPECT_FALSE(time->running());
  EXPECT_EQ(context->undoManager().undoActionName(), "Change Duration");  // what changed, not "Typing"
  EXPECT_EQ(time->endDate(), clockNow);
  EXPECT_EQ(span(time) + ' ' + rowOf(time).data(WTItemsModel::LabelRole).toString(), "08:30-10:00 08:30");
}

// Tips belong to buttons and editable fields, never a whole row (once "Start" everywhere), and to a budget's
// cost; refused times leave the entry as it was; Tab and Shift+Tab walk the fields, committing each.
TEST_F(WTItemsViewControllerTest, AnEntrysFieldsAreChangedInItsRowEachKeepingTheOthers) {
  setNow(at(2024, 3, 13, 18, 0));
  WTTime* time = makeItem<WTTime>(design, "Sketches", at(2024, 3, 13, 12, 0));  // until 12:30
  makeItem<WTTime>(design, "Call", at(2024, 3, 13, 17, 30));                    // until 18:00
  auto* expense = makeItem<WTExpense>(design, "Ticket", at(2024, 3, 13));
  controller->expandContainerOfItem(time);  // its day is not shown yet: only its task opens
  EXPECT_TRUE(outline()->isExpanded(rowOf(design)));
  endTurn();
  controller->expandContainerOfItem(time);
  ASSERT_FALSE(design->buttonTitle().isEmpty());
  design->setBudget(dec("100"));
  endTurn();
  auto* large = makeItem<WTExpense>(build, "Server", at(2024, 3, 13));
  large->setExpense(dec("999999999.99"));
  endTurn();
  controller->expandContainerOfItem(large);
  const QString largeAmount = rowOf(large).data(WTItemsModel::CostTextRole).toString();
  const std::tuple<const WTObject*, Part, QString> tips[] = {
      // all of a task's tip, else a part of it; empty: no tip
      {design, Part::TimerButton, design->buttonTitle()},
      {design, Part::Name, {}},
      {design, Part::Cost, "50 % of the budget of 100.00 · 50.00 left"},
      {time, Part::Label, "the end stays"},
      {time, Part::End, "the start stays"},
      {time, Part::Duration, "the end moves"},
      {time, Part::Cost, {}},
      {expense, Part::Cost, "double-click"},
      {large, Part::Cost, largeAmount + "\nAmount"},  // cut short on the row: whole in the tip
  };
  for (const auto& [object, part, says] : tips) {
    const QString tip = tipAt(outline(), shown->centreOf(object, part));
    if (says.isEmpty() || object == design) {
      EXPECT_EQ(tip, says) << object->name().toStdString() << ' ' << int(part);
    } else {
      EXPECT_TRUE(tip.contains("double-click") && tip.contains(says)) << tip.toStdString();
    }
  }
  QToolTip::hideText();
  const struct {
    Part part;
    const char *typed, *shownBefore, *after;
  } rows[] = {
      // clang-format off
      {Part::Label, "11:45", "12:00", "11:45-12:30"}, {Part::Label, "12:40", "11:45", "11:45-12:30"},
      {Part::Label, "25:00", "11:45", "11:45-12:30"}, {Part::Label, "noon", "11:45", "11:45-12:30"},
      {Part::Label, "9:7", "11:45", "11:45-12:30"},   {Part::Label, "9", "11:45", "09:00-12:30"},
      {Part::End, "17:20", "12:30", "09:00-17:20"},   {Part::End, "8:59", "17:20", "09:00-17:20"},
      {Part::End, "24:00", "17:20", "09:00-17:20"},   {Part::End, "later", "17:20", "09:00-17:20"},
      // Time not spent yet, and the Call's time: never billed twice.
      {Part::End, "18:05", "17:20", "09:00-17:20"},   {Part::End, "17:31", "17:20", "09:00-17:20"},
      {Part::End, "17:30", "17:20", "09:00-17:30"},
      // clang-format on
  };
  // Types into an entry's field; gives what the editor showed first.
  auto type = [&](WTTime* entry, Part part, const char* typed) {
    const QPoint field = shown->centreOf(entry, part);
    QTest::mouseClick(outline()->viewport(), Qt::LeftButton, {}, field);
    QTest::mouseDClick(outline()->viewport(), Qt::LeftButton, {}, field);
    QLineEdit* editor = shown->openEditor();
    if (!editor) return QString("no editor");
    const QString before = editor->objectName() + ' ' + editor->text();
    editor->setText(typed);
    outline()->endEditing();
    endTurn();
    return before;
  };
  for (const auto& row : rows) {
    EXPECT_EQ(type(time, row.part, row.typed),
              QString(row.part == Part::End ? "endEditor " : "startEditor ") + row.shownBefore);
    EXPECT_EQ(span(time), row.after) << row.typed;
  }
  EXPECT_EQ(time->startDate(), at(2024, 3, 13, 9, 0));  // on the same day
  // An amount that comes from the duration opens nothing, not the name's editor.
  QTest::mouseDClick(outline()->viewport(), Qt::LeftButton, {}, shown->centreOf(time, Part::Cost));
  EXPECT_EQ(shown->openEditor(), nullptr);

  controller->cellDelegate()->setEditField(Field::Start);
  outline()->edit(rowOf(time));
  for (const auto& [name, text] :
       {std::pair{"startEditor", "11:00"}, std::pair{"endEditor", "12:15"},
        std::pair{"durationEditor", "1:45"}, std::pair{"nameEditor", "Drawings "}}) {
    QLineEdit* editor = shown->openEditor();
    ASSERT_NE(editor, nullptr) << name;
    EXPECT_EQ(editor->objectName(), name);
    editor->setText(text);
    if (editor->objectName() != "nameEditor") QTest::keyClick(editor, Qt::Key_Tab);
  }
  outline()->endEditing();
  EXPECT_EQ(span(time) + ' ' + time->name(), "11:00-12:45 Drawings");
  EXPECT_EQ(outline()->currentIndex(), rowOf(time));
  // The row as drawn with the pointer over it or not: an open field hides the hover buttons, whose bar's
  // edge would show round it.
  const auto rowWithPointer = [&](bool over) {
    outline()->setHoverIndex(over ? rowOf(time) : QModelIndex());
    return outline()->viewport()->grab(outline()->visualRect(rowOf(time))).toImage();
  };
  EXPECT_NE(rowWithPointer(true), rowWithPointer(false)) << "no field open: the buttons show";
  controller->cellDelegate()->setEditField(Field::Name);
  outline()->edit(rowOf(time));
  ASSERT_NE(shown->openEditor(), nullptr);
  EXPECT_EQ(rowWithPointer(true), rowWithPointer(false)) << "the name's field is open";
  QTest::keyClick(shown->openEditor(), Qt::Key_Backtab, Qt::ShiftModifier);
  ASSERT_NE(shown->openEditor(), nullptr);
  EXPECT_EQ(shown->openEditor()->objectName(), "durationEditor");
  outline()->endEditing();
  // An end before the start is the next morning's, and back to the evening again.
  WTTime* night = makeItem<WTTime>(design, "Release", at(2024, 3, 12, 23, 0));
  endTurn();
  controller->expandContainerOfItem(night);
  endTurn();
  type(night, Part::End, "1:15");
  EXPECT_EQ(night->endDate(), at(2024, 3, 13, 1, 15));
  type(night, Part::End, "23:45");
  EXPECT_EQ(night->endDate(), at(2024, 3, 12, 23, 45));
  // A running entry's start stays before now: a later one would run its clock backwards.
  controller->toggleTimerOfTask(build);
  WTTime* running = build->runningTimes().value(0);
  ASSERT_NE(running, nullptr);
  endTurn();
  for (const auto& [typed, after] : {std::pair{"18:30", "18:00-none"}, {"17:45", "17:45-none"}}) {
    type(running, Part::Label, typed);
    EXPECT_EQ(span(running), after) << typed;
  }
}

// A task's add buttons answer only while shown; an entry's row has none.
TEST(WTTableCellViewTest, HoverButtonsAnswerOnlyWhileShown) {
  WTTableCellView task("WTTask"), time("WTTime");
  const QRectF row(0, 0, 800, 36);
  const QPointF addTime = task.partRect(Part::AddTime, row).center();
  EXPECT_EQ(task.partAt(addTime, row, true), Part::AddTime);
  EXPECT_NE(task.partAt(addTime, row, false), Part::AddTime);
  EXPECT_EQ(task.partAt(task.partRect(Part::TimerButton, row).center(), row, false), Part::TimerButton);
  EXPECT_TRUE(time.partRect(Part::AddTime, row).isEmpty());
}

}  // namespace
