#include "UiFixture.h"
#include "WTDatePopover.h"
#include "WTItemCellDelegate.h"
#include "WTItemContainer.h"
#include "WTNavigationController.h"
#include "WTNotesTextView.h"

#include <QLabel>
#include <QMenu>
#include <QScrollBar>

namespace {

using Part = WTTableCellView::Part;

class WTItemsViewControllerTest : public OutlineTest {
 protected:
  bool isEditing() { return outline()->isEditing(); }
  void selectOnly(const WTObject* object) {
    outline()->selectionModel()->select(rowOf(object),
                                        QItemSelectionModel::ClearAndSelect | QItemSelectionModel::Rows);
  }
  QList<const WTObject*> selected() {
    QList<const WTObject*> objects;
    for (const QModelIndex& index : outline()->selectionModel()->selectedRows())
      objects.append(model()->objectAt(index));
    return objects;
  }
  QLabel* label(const char* name) { return controller->view()->findChild<QLabel*>(name); }
};

TEST_F(WTItemsViewControllerTest, ANewTimeEntryRunsIsSelectedAndEditedInsideOpenRows) {
  makeItem<WTNote>(build, "yesterday", at(2024, 3, 13));
  ASSERT_FALSE(outline()->isExpanded(rowOf(build)));
  WTTime* time = controller->addTimeItem(build);
  ASSERT_NE(time, nullptr);
  EXPECT_TRUE(time->running());
  EXPECT_EQ(time->task(), build);
  EXPECT_EQ(outline()->currentIndex(), rowOf(time));
  EXPECT_TRUE(outline()->selectionModel()->isSelected(rowOf(time)));
  EXPECT_TRUE(isEditing());
  EXPECT_TRUE(outline()->isExpanded(rowOf(build)));
  EXPECT_TRUE(outline()->isExpanded(model()->indexOfContainerOfItem(time)));
  // The day of yesterday's note stays as it was.
  EXPECT_FALSE(outline()->isExpanded(model()->indexOfContainer(build, at(2024, 3, 13, 0))));
  // Each kind lands in the task it was asked for; nothing without a task.
  for (WTEntity kind : {WTEntity::Flat, WTEntity::Note, WTEntity::Expense, WTEntity::ToDo}) {
    WTItem* item = controller->addItem(kind, design);
    ASSERT_NE(item, nullptr);
    EXPECT_EQ(item->entity(), kind);
    EXPECT_EQ(item->task(), design);
    EXPECT_EQ(outline()->currentIndex(), rowOf(item));
  }
  EXPECT_EQ(controller->addItem(WTEntity::Flat, nullptr), nullptr);
}

TEST_F(WTItemsViewControllerTest, TheTimerButtonStartsAndSelectsThenStops) {
  controller->toggleTimerOfTask(design);
  ASSERT_TRUE(design->running());
  const QList<WTTime*> times = design->runningTimes();
  ASSERT_EQ(times.size(), 1);
  EXPECT_EQ(outline()->currentIndex(), rowOf(times[0]));
  controller->toggleTimerOfTask(design);
  EXPECT_FALSE(design->running());
  // The keyboard command acts on the task of the selected row.
  outline()->setCurrentIndex(rowOf(times[0]));
  controller->toggleTimer();
  EXPECT_TRUE(design->running());
  controller->stopTimer(design->runningTimes().value(0));
  EXPECT_FALSE(design->running());
}

// A tip names the button or field under the mouse and what an edit of it does; a row's text has none
// (it once said "Start" everywhere), nor has a time's cost, which follows from the time.
TEST_F(WTItemsViewControllerTest, ToolTipsBelongToButtonsAndEditableFieldsNotToTheWholeRow) {
  WTTime* time = makeItem<WTTime>(design, "Sketches", at(2024, 3, 13));
  auto* expense = makeItem<WTExpense>(design, "Ticket", at(2024, 3, 13));
  controller->expandContainerOfItem(time);  // its day is not shown yet: only its task opens
  EXPECT_TRUE(outline()->isExpanded(rowOf(design)));
  endTurn();
  controller->expandContainerOfItem(time);
  ASSERT_FALSE(design->buttonTitle().isEmpty());
  const struct {
    const WTObject* object;
    Part part;
    QString says;  // all of it for a task's tip, else a part of it; empty: no tip
  } rows[] = {
      {design, Part::TimerButton, design->buttonTitle()},
      {design, Part::Name, {}},
      {time, Part::Label, "the end stays"},
      {time, Part::End, "the start stays"},
      {time, Part::Duration, "the end moves"},
      {time, Part::Cost, {}},
      {expense, Part::Cost, "double-click"},
  };
  for (const auto& row : rows) {
    const QString tip = shown->tipAt(shown->centreOf(row.object, row.part));
    if (row.says.isEmpty() || row.object == design) {
      EXPECT_EQ(tip, row.says) << row.object->name().toStdString() << ' ' << int(row.part);
    } else {
      EXPECT_TRUE(tip.contains("double-click") && tip.contains(row.says)) << tip.toStdString();
    }
  }
  QToolTip::hideText();
}

TEST_F(WTItemsViewControllerTest, TickingAToDosBoxCompletesItIntoItsDaysOpenGroupAndBack) {
  auto* todo = makeItem<WTToDo>(design, "call back", at(2024, 3, 1));
  endTurn();
  controller->expandContainerOfItem(todo);
  auto tick = [&] {
    QTest::mouseClick(outline()->viewport(), Qt::LeftButton, {}, shown->centreOf(todo, Part::Checkbox));
  };
  tick();
  EXPECT_TRUE(todo->completed());
  EXPECT_EQ(context->undoManager().undoActionName(), "Complete To-Do");
  const QModelIndex today = model()->indexOfContainer(design, RZDate::midnight(clockNow));
  ASSERT_TRUE(today.isValid());
  EXPECT_EQ(model()->indexOfContainerOfItem(todo), today);
  EXPECT_TRUE(outline()->isExpanded(today));
  tick();
  EXPECT_FALSE(todo->completed());
  EXPECT_EQ(context->undoManager().undoActionName(), "Reopen To-Do");
  EXPECT_EQ(model()->indexOfContainerOfItem(todo), model()->indexOfContainer(design, std::nullopt));
}

TEST_F(WTItemsViewControllerTest, TheDatePopoverMovesTheItemToThePickedDay) {
  auto* time = makeItem<WTTime>(design, "meeting", at(2024, 3, 14, 9, 15));
  endTurn();
  controller->openDatePicker(time, QRect(100, 100, 20, 20));
  ASSERT_EQ(controller->currentItem(), time);
  WTDatePopover* popover = controller->popover();
  ASSERT_TRUE(popover->isVisible());
  EXPECT_EQ(popover->date(), QDate(2024, 3, 14));
  // A second open while it shows is ignored.
  auto* other = makeItem<WTNote>(design, "other", at(2024, 3, 2));
  controller->openDatePicker(other, QRect(0, 0, 20, 20));
  EXPECT_EQ(controller->currentItem(), time);

  popover->setDate(QDate(2024, 3, 9));
  popover->hide();
  EXPECT_EQ(controller->currentItem(), nullptr);
  EXPECT_EQ(time->startDate(), at(2024, 3, 9, 9, 15));
  const QModelIndex day = model()->indexOfContainer(design, at(2024, 3, 9, 0));
  ASSERT_TRUE(day.isValid());
  EXPECT_TRUE(outline()->isExpanded(day));

  // Closed without another day chosen: the item is left alone.
  controller->openDatePicker(other, QRect(0, 0, 20, 20));
  popover->hide();
  EXPECT_EQ(other->startDate(), at(2024, 3, 2));
}

TEST_F(WTItemsViewControllerTest, EditingNotesGrowsTheRowAndAnEmptyNoteShrinksItWhenLeft) {
  auto* flat = makeItem<WTFlat>(design, "fee", at(2024, 3, 14));
  endTurn();
  controller->expandContainerOfItem(flat);
  QTest::qWait(10);  // the outline lays out its rows
  auto height = [&] {
    QTest::qWait(10);
    return outline()->visualRect(rowOf(flat)).height();
  };
  const qreal plain = height();
  EXPECT_EQ(plain, 30);

  controller->showNotes(flat);
  WTNotesTextView* editor = controller->cellDelegate()->notesEditor();
  ASSERT_NE(editor, nullptr);
  const qreal open = height();
  EXPECT_GE(open, plain + WTTableCellView::kMinimumNotesHeight);  // shown while edited, though empty
  editor->setPlainText("first\nsecond\nthird\nfourth");
  EXPECT_GT(height(), open);
  EXPECT_EQ(flat->notes(), QString());  // stored only when editing ends

  // Cleared while still edited: the field stays until it is left.
  editor->clear();
  EXPECT_GE(height(), plain + WTTableCellView::kMinimumNotesHeight);
  outline()->setFocus();
  EXPECT_EQ(height(), plain);
  EXPECT_EQ(controller->cellDelegate()->notesEditor(), nullptr);

  controller->showNotes(flat);
  controller->cellDelegate()->notesEditor()->setPlainText("kept");
  outline()->setFocus();
  EXPECT_GT(height(), plain);
  EXPECT_EQ(flat->notes(), "kept");
}

TEST_F(WTItemsViewControllerTest, ExpandedRowsAreRememberedPerProject) {
  auto* note = makeItem<WTNote>(design, "note", at(2024, 3, 10));
  makeItem<WTToDo>(build, "todo", at(2024, 3, 11));
  endTurn();
  outline()->expand(rowOf(design));
  outline()->expand(model()->indexOfContainerOfItem(note));
  EXPECT_EQ(controller->autosaveName(), project->uuid());

  WTProject* other = makeProject("Other");
  makeTask(other, "Alone");
  controller->setProject(other);
  controller->willDisplayView();
  EXPECT_FALSE(outline()->isExpanded(model()->index(0, 0)));

  // A new controller (as after a relaunch) over the same settings.
  WTItemsViewController again(context.get());
  again.setProject(project);
  again.view()->resize(800, 400);
  again.willDisplayView();
  WTItemsModel* tree = again.treeController();
  EXPECT_TRUE(again.outlineView()->isExpanded(tree->indexOfObject(design)));
  EXPECT_TRUE(again.outlineView()->isExpanded(tree->indexOfContainerOfItem(note)));
  EXPECT_FALSE(again.outlineView()->isExpanded(tree->indexOfObject(build)));
}

TEST_F(WTItemsViewControllerTest, WindowCommandsActOnTheProjectAndTheSelection) {
  using Command = WTViewController::Command;
  EXPECT_TRUE(controller->respondsTo(Command::ToggleArchive));
  EXPECT_TRUE(controller->respondsTo(Command::Report));
  EXPECT_EQ(controller->selectedObject(), project);
  controller->toggleArchive();
  EXPECT_TRUE(project->archived());

  controller->addObject();
  ASSERT_EQ(project->tasks().size(), 3);
  WTTask* fresh = project->tasks().last();
  EXPECT_EQ(outline()->currentIndex(), rowOf(fresh));
  auto* editor = outline()->findChild<QLineEdit*>("nameEditor");
  ASSERT_NE(editor, nullptr);
  editor->setText("Deploy");
  outline()->setFocus();
  QCoreApplication::processEvents();
  EXPECT_EQ(fresh->name(), "Deploy");

  auto* note = makeItem<WTNote>(design, "note", at(2024, 3, 10));
  controller->selectItem(note);
  outline()->selectionModel()->select(rowOf(build), QItemSelectionModel::Select | QItemSelectionModel::Rows);
  controller->removeSelectedObjects();
  EXPECT_FALSE(context->fetch<WTNote>().contains(note));
  EXPECT_EQ(project->tasks(), (QList<WTTask*>{design, fresh}));
  EXPECT_EQ(model()->rowCount(), 2);
}

// What undo brings back is opened and selected: an item in its day, a whole task as its own row; a
// change that is not undo leaves the selection alone.
TEST_F(WTItemsViewControllerTest, WhatUndoBringsBackIsOpenedAndSelected) {
  WTNote* kept = makeItem<WTNote>(build, "kept", at(2024, 3, 13));
  WTNote* note = makeItem<WTNote>(build, "gone", at(2024, 3, 12));
  endTurn();
  controller->expandContainerOfItem(note);
  auto removeAndUndo = [&](const WTObject* removed) {
    selectOnly(removed);
    controller->removeSelectedObjects();
    endTurn();
    outline()->collapseAll();
    selectOnly(design);
    context->undoManager().undo();
    endTurn();
    ASSERT_TRUE(rowOf(removed).isValid());
    EXPECT_EQ(selected(), (QList<const WTObject*>{removed}));
    EXPECT_EQ(outline()->currentIndex(), rowOf(removed));
  };
  removeAndUndo(note);
  EXPECT_TRUE(outline()->isExpanded(rowOf(build)));
  EXPECT_TRUE(outline()->isExpanded(rowOf(note).parent()));
  EXPECT_FALSE(outline()->isExpanded(model()->indexOfContainerOfItem(kept)));
  removeAndUndo(build);
  makeItem<WTNote>(design, "new", at(2024, 3, 14));
  endTurn();
  EXPECT_EQ(selected(), (QList<const WTObject*>{build}));
}

// The header's name, rate and totals share its width without covering one another, at the narrowest
// window and with or without a vertical scroll bar beside the rows.
TEST_F(WTItemsViewControllerTest, TheHeaderTotalsStandOverTheRowsDurationAndCostColumns) {
  project->setName("The new website of the regional library and its branches");
  for (int day = 1; day <= 25; ++day) makeItem<WTTime>(design, "Sketches", at(2024, 3, day));
  endTurn();
  QLabel* title = label("projectTitle");
  QLabel* duration = label("projectDuration");
  QLabel* cost = label("projectCost");
  ASSERT_TRUE(title && duration && cost);
  QLineEdit* rate = controller->rateField();
  EXPECT_EQ(duration->text(), "12:30");
  for (const bool scrolls : {false, true}) {
    if (scrolls) outline()->expandAll();
    for (const QSize size : {QSize(620, 600), QSize(900, 600), QSize(1200, 600)}) {
      shown->window.resize(size);
      QApplication::processEvents();
      SCOPED_TRACE(testing::Message() << size.width() << (scrolls ? " with a scroll bar" : ""));
      ASSERT_EQ(outline()->verticalScrollBar()->isVisible(), scrolls);
      EXPECT_EQ(controller->view()->width(), size.width());  // the header does not widen the window
      const QRect row = outline()->visualRect(rowOf(design));
      const QRectF line(0, row.y(), outline()->viewport()->width(), row.height());
      for (const auto& [shownIn, part] : {std::pair{duration, Part::Duration}, std::pair{cost, Part::Cost}}) {
        const QRect column =
            controller->cellViewPrototypeForIndex(rowOf(design)).partRect(part, line).toRect();
        EXPECT_EQ(shownIn->mapToGlobal(QPoint(0, 0)).x(),
                  outline()->viewport()->mapToGlobal(column.topLeft()).x());
        EXPECT_EQ(shownIn->width(), column.width());
      }
      EXPECT_LT(rate->geometry().right(), duration->geometry().left());
      EXPECT_LT(title->geometry().right(), rate->geometry().left());
      // A name too long for its room is shortened visibly, not cut off, and shown whole in its tip.
      EXPECT_LE(title->fontMetrics().horizontalAdvance(title->text()), title->contentsRect().width());
      if (title->text() != project->name()) {
        EXPECT_EQ(title->toolTip(), project->name());
      }
    }
  }
}

// Totals once waited for the next minute tick after a start was moved or a rate was undone.
TEST_F(WTItemsViewControllerTest, TheHeaderTotalsFollowAMovedStartAndAnUndoneRateAtOnce) {
  WTTime* time = makeItem<WTTime>(design, "Sketches", at(2024, 3, 13, 12, 0));  // until 12:30
  endTurn();
  ASSERT_TRUE(model()->setData(rowOf(time), "11:45", WTItemsModel::StartTimeEditRole));
  EXPECT_EQ(label("projectDuration")->text(), "00:45");
  EXPECT_EQ(label("projectCost")->text().right(5), "37.50");  // at the inherited 50
  endTurn();
  design->setRate(Decimal(80));
  endTurn();
  EXPECT_EQ(label("projectCost")->text().right(5), "60.00");
  context->undoManager().undo();
  EXPECT_EQ(label("projectCost")->text().right(5), "37.50");
  context->undoManager().undo();  // the start
  EXPECT_EQ(label("projectDuration")->text(), "00:30");
}

TEST_F(WTItemsViewControllerTest, TimeAlreadySpentIsEnteredStoppedByTypingItsDuration) {
  std::unique_ptr<QMenu> menu(controller->taskMenu(build));
  QAction* spent = actionTitled(menu.get(), "New Time Entry");
  ASSERT_NE(spent, nullptr);
  spent->trigger();
  ASSERT_EQ(build->items().size(), 1);
  ASSERT_EQ(build->items().first()->entity(), WTEntity::Time);
  auto* time = static_cast<WTTime*>(build->items().first());
  EXPECT_FALSE(time->running());
  ASSERT_TRUE(isEditing());
  auto* editor = outline()->viewport()->findChild<QLineEdit*>("durationEditor");
  ASSERT_NE(editor, nullptr);
  editor->setText("1:30");
  outline()->endEditing();
  endTurn();
  EXPECT_FALSE(time->running());
  // Spent already: it ends now, not an hour and a half from now.
  EXPECT_EQ(time->endDate(), clockNow);
  EXPECT_EQ(time->startDate(), clockNow.addingSeconds(-90 * 60));
  EXPECT_EQ(rowOf(time).data(WTItemsModel::LabelRole).toString(), "08:30");
  EXPECT_EQ(rowOf(time).data(WTItemsModel::EndTimeEditRole).toString(), "10:00");
}

// A double-click opens a field, and what is refused leaves the entry as it was; Tab walks on through start,
// end, duration and name, committing each on the way, and Shift+Tab walks back.
TEST_F(WTItemsViewControllerTest, AnEntrysFieldsAreChangedInItsRowEachKeepingTheOthers) {
  WTTime* time = makeItem<WTTime>(design, "Sketches", at(2024, 3, 13, 12, 0));  // until 12:30
  endTurn();
  controller->expandContainerOfItem(time);
  const struct {
    Part part;
    const char* typed;
    const char* shownBefore;
    int startHour, startMinute, endHour, endMinute;
  } rows[] = {
      {Part::Label, "11:45", "12:00", 11, 45, 12, 30}, {Part::Label, "12:40", "11:45", 11, 45, 12, 30},
      {Part::Label, "25:00", "11:45", 11, 45, 12, 30}, {Part::Label, "noon", "11:45", 11, 45, 12, 30},
      {Part::Label, "9:7", "11:45", 11, 45, 12, 30},   {Part::Label, "9", "11:45", 9, 0, 12, 30},
      {Part::End, "17:20", "12:30", 9, 0, 17, 20},     {Part::End, "8:59", "17:20", 9, 0, 17, 20},
      {Part::End, "24:00", "17:20", 9, 0, 17, 20},     {Part::End, "later", "17:20", 9, 0, 17, 20},
  };
  for (const auto& row : rows) {
    const QPoint field = shown->centreOf(time, row.part);
    QTest::mouseClick(outline()->viewport(), Qt::LeftButton, {}, field);
    QTest::mouseDClick(outline()->viewport(), Qt::LeftButton, {}, field);
    QLineEdit* editor = shown->openEditor();
    ASSERT_NE(editor, nullptr) << row.typed;
    EXPECT_EQ(editor->objectName(), row.part == Part::End ? "endEditor" : "startEditor");
    EXPECT_EQ(editor->text(), row.shownBefore) << row.typed;
    editor->setText(row.typed);
    outline()->endEditing();
    endTurn();
    EXPECT_EQ(time->startDate(), at(2024, 3, 13, row.startHour, row.startMinute)) << row.typed;
    EXPECT_EQ(time->endDate(), at(2024, 3, 13, row.endHour, row.endMinute)) << row.typed;
  }

  controller->cellDelegate()->setEditField(WTItemCellDelegate::Field::Start);
  outline()->edit(rowOf(time));
  const std::pair<const char*, const char*> typed[] = {{"startEditor", "11:00"},
                                                       {"endEditor", "12:15"},
                                                       {"durationEditor", "1:45"},
                                                       {"nameEditor", "Drawings"}};
  for (const auto& [name, text] : typed) {
    QLineEdit* editor = shown->openEditor();
    ASSERT_NE(editor, nullptr) << name;
    EXPECT_EQ(editor->objectName(), name);
    editor->setText(text);
    if (editor->objectName() == "nameEditor") break;
    QTest::keyClick(editor, Qt::Key_Tab);
  }
  outline()->endEditing();
  EXPECT_EQ(time->startDate(), at(2024, 3, 13, 11, 0));
  EXPECT_EQ(time->endDate(), at(2024, 3, 13, 12, 45));
  EXPECT_EQ(time->name(), "Drawings");
  EXPECT_EQ(outline()->currentIndex(), rowOf(time));
  controller->cellDelegate()->setEditField(WTItemCellDelegate::Field::Name);
  outline()->edit(rowOf(time));
  ASSERT_NE(shown->openEditor(), nullptr);
  QTest::keyClick(shown->openEditor(), Qt::Key_Backtab, Qt::ShiftModifier);
  ASSERT_NE(shown->openEditor(), nullptr);
  EXPECT_EQ(shown->openEditor()->objectName(), "durationEditor");
  outline()->endEditing();
}

}  // namespace
