#include "UiFixture.h"
#include "WTDatePopover.h"
#include "WTItemCellDelegate.h"
#include "WTItemContainer.h"
#include "WTItemsModel.h"
#include "WTItemsViewController.h"
#include "WTNavigationController.h"
#include "WTNotesTextView.h"
#include "WTOutlineView.h"

#include <QApplication>
#include <QCalendarWidget>
#include <QHelpEvent>
#include <QLabel>
#include <QLineEdit>
#include <QMenu>
#include <QScrollBar>
#include <QToolTip>

namespace {

class WTItemsViewControllerTest : public UiTest {
 protected:
  void SetUp() override {
    UiTest::SetUp();
    project = makeProject("Website");
    design = makeTask(project, "Design");
    build = makeTask(project, "Build");
    shown = std::make_unique<ShownOutline>(context.get(), project);
    controller = &shown->controller;
    window = &shown->window;
    tester = std::make_unique<QAbstractItemModelTester>(
        controller->treeController(), QAbstractItemModelTester::FailureReportingMode::Fatal);
  }
  void TearDown() override {
    tester.reset();
    shown.reset();
    UiTest::TearDown();
  }

  WTOutlineView* outline() { return controller->outlineView(); }
  WTItemsModel* model() { return controller->treeController(); }
  bool isEditing() { return outline()->isEditing(); }
  QModelIndex rowOf(const WTObject* object) { return model()->indexOfObject(object); }

  WTProject* project = nullptr;
  WTTask* design = nullptr;
  WTTask* build = nullptr;
  std::unique_ptr<ShownOutline> shown;
  WTItemsViewController* controller = nullptr;
  TestHostWindow* window = nullptr;
  std::unique_ptr<QAbstractItemModelTester> tester;
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

// The tip names the button under the mouse; a row's text has none (it once said "Start" everywhere).
TEST_F(WTItemsViewControllerTest, ToolTipsBelongToButtonsNotToTheWholeRow) {
  const QModelIndex task = rowOf(design);
  const QRect visual = outline()->visualRect(task);
  const QRectF row(0, visual.y(), outline()->viewport()->width(), visual.height());
  const WTTableCellView& cell = controller->cellViewPrototypeForIndex(task);
  auto tipAt = [&](const QPointF& point) {
    QToolTip::hideText();  // fades out: wait until it is gone
    EXPECT_TRUE(QTest::qWaitFor([] { return !QToolTip::isVisible(); }, 2000));
    QHelpEvent help(QEvent::ToolTip, point.toPoint(), outline()->viewport()->mapToGlobal(point.toPoint()));
    QApplication::sendEvent(outline()->viewport(), &help);
    return QToolTip::isVisible() ? QToolTip::text() : QString();
  };
  const QRectF button = cell.partRect(WTTableCellView::Part::TimerButton, row);
  ASSERT_FALSE(button.isEmpty());
  EXPECT_EQ(tipAt(button.center()), design->buttonTitle());
  EXPECT_FALSE(design->buttonTitle().isEmpty());
  const QRectF name = cell.partRect(WTTableCellView::Part::Name, row);
  EXPECT_EQ(tipAt(name.center()), QString());
  QToolTip::hideText();
}

TEST_F(WTItemsViewControllerTest, TickingAToDosBoxCompletesItIntoItsDaysOpenGroupAndBack) {
  auto* todo = makeItem<WTToDo>(design, "call back", at(2024, 3, 1));
  endTurn();
  controller->expandContainerOfItem(todo);
  auto tick = [&] {
    const QRect visual = outline()->visualRect(rowOf(todo));
    const QRectF row(0, visual.y(), outline()->viewport()->width(), visual.height());
    const QRectF box =
        controller->cellViewPrototypeForIndex(rowOf(todo)).partRect(WTTableCellView::Part::Checkbox, row);
    QTest::mouseClick(outline()->viewport(), Qt::LeftButton, {}, box.center().toPoint());
  };
  tick();
  EXPECT_TRUE(todo->completed());
  EXPECT_EQ(context->undoManager().undoActionName(), "Complete To-Do");
  const QModelIndex today = model()->indexOfContainer(design, RZDate::midnight(now));
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
  EXPECT_EQ(RZDate::stringWithPattern(*time->startDate(), "yyyy-MM-dd HH:mm"), "2024-03-09 09:15");
  EXPECT_EQ(time->duration(), 30);
  const QModelIndex day = model()->indexOfContainer(design, at(2024, 3, 9, 0));
  ASSERT_TRUE(day.isValid());
  EXPECT_TRUE(outline()->isExpanded(day));

  // Closed without another day chosen: the item is left alone.
  controller->openDatePicker(other, QRect(0, 0, 20, 20));
  const Date before = *other->startDate();
  popover->hide();
  EXPECT_EQ(*other->startDate(), before);
}

TEST_F(WTItemsViewControllerTest, RowHeightsFollowTheKindAndTheNotes) {
  auto* note = makeItem<WTNote>(design, "note", at(2024, 3, 14));
  controller->expandContainerOfItem(note);
  endTurn();
  const QModelIndex task = rowOf(design);
  const QModelIndex group = model()->indexOfContainerOfItem(note);
  const QModelIndex item = rowOf(note);
  // Tasks and groups take their cell's height exactly; items never less than 30 points.
  EXPECT_EQ(controller->heightOfRow(task),
            controller->cellViewPrototypeForIndex(task).requestedHeight(false));
  EXPECT_LT(controller->heightOfRow(group), 30);
  EXPECT_EQ(controller->heightOfRow(item), 30);

  // Notes put their field under the main line: at least 20 points, at most 300.
  note->setNotes("one line");
  const qreal oneLine = controller->heightOfRow(item);
  EXPECT_GE(oneLine, 30 + WTTableCellView::kMinimumNotesHeight);
  note->setNotes(QString("a line of notes\n").repeated(200));
  EXPECT_EQ(controller->heightOfRow(item),
            30 + WTTableCellView::kMaximumNotesHeight + WTTableCellView::kNotesBottomMargin);
  note->setNotes(QString());
  EXPECT_EQ(controller->heightOfRow(item), 30);
}

TEST_F(WTItemsViewControllerTest, EditingNotesGrowsTheRowAndAnEmptyNoteShrinksItWhenLeft) {
  auto* flat = makeItem<WTFlat>(design, "fee", at(2024, 3, 14));
  endTurn();
  controller->expandContainerOfItem(flat);
  QTest::qWait(10);  // the outline lays out its rows
  const QModelIndex row = rowOf(flat);
  const qreal plain = outline()->visualRect(row).height();
  EXPECT_EQ(plain, 30);

  controller->showNotes(flat);
  WTNotesTextView* editor = controller->cellDelegate()->notesEditor();
  ASSERT_NE(editor, nullptr);
  QCoreApplication::processEvents();
  const qreal open = outline()->visualRect(row).height();
  EXPECT_GE(open, plain + WTTableCellView::kMinimumNotesHeight);  // shown while edited, though empty

  editor->setPlainText("first\nsecond\nthird\nfourth");
  QTest::qWait(10);
  const qreal grown = outline()->visualRect(row).height();
  EXPECT_GT(grown, open);
  EXPECT_EQ(flat->notes(), QString());  // stored only when editing ends

  // Cleared while still edited: the field stays until it is left.
  editor->clear();
  QTest::qWait(10);
  EXPECT_GE(outline()->visualRect(row).height(), plain + WTTableCellView::kMinimumNotesHeight);
  outline()->setFocus();
  QTest::qWait(10);
  EXPECT_EQ(controller->cellDelegate()->notesEditor(), nullptr);
  EXPECT_EQ(outline()->visualRect(row).height(), plain);

  controller->showNotes(flat);
  controller->cellDelegate()->notesEditor()->setPlainText("kept");
  outline()->setFocus();
  QTest::qWait(10);
  EXPECT_EQ(flat->notes(), "kept");
  EXPECT_GT(outline()->visualRect(row).height(), plain);
}

TEST_F(WTItemsViewControllerTest, ExpandedRowsAreRememberedPerProject) {
  auto* note = makeItem<WTNote>(design, "note", at(2024, 3, 10));
  makeItem<WTToDo>(build, "todo", at(2024, 3, 11));
  endTurn();
  outline()->expand(rowOf(design));
  outline()->expand(model()->indexOfContainerOfItem(note));
  EXPECT_EQ(controller->autosaveName(), project->uuid());

  // Another project shown meanwhile keeps its own.
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
  EXPECT_TRUE(isEditing());
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
  EXPECT_TRUE(note->isDeleted() || !context->fetch<WTNote>().contains(note));
  EXPECT_EQ(project->tasks(), (QList<WTTask*>{design, fresh}));
  EXPECT_EQ(model()->rowCount(), 2);
}

TEST_F(WTItemsViewControllerTest, AnEmptyRateFieldInherits) {
  QLineEdit* rate = controller->rateField();
  rate->setText("120");
  controller->projectRateAction();
  EXPECT_EQ(project->storedRate(), Decimal(120));
  rate->clear();
  controller->projectRateAction();
  EXPECT_EQ(project->storedRate(), std::nullopt);
  EXPECT_EQ(rate->placeholderText(), "Inherited: 50.00");
}

}  // namespace

namespace {

TEST_F(WTItemsViewControllerTest, WhatUndoBringsBackIsOpenedAndSelected) {
  WTNote* kept = makeItem<WTNote>(build, "kept", at(2024, 3, 13));
  WTNote* note = makeItem<WTNote>(build, "gone", at(2024, 3, 12));
  endTurn();
  auto selectOnly = [&](const WTObject* object) {
    outline()->selectionModel()->select(rowOf(object),
                                        QItemSelectionModel::ClearAndSelect | QItemSelectionModel::Rows);
  };
  auto selected = [&] {
    QList<const WTObject*> objects;
    for (const QModelIndex& index : outline()->selectionModel()->selectedRows()) {
      objects.append(model()->objectAt(index));
    }
    return objects;
  };

  controller->expandContainerOfItem(note);
  selectOnly(note);
  controller->removeSelectedObjects();
  endTurn();
  outline()->collapseAll();
  selectOnly(design);
  context->undoManager().undo();
  endTurn();
  ASSERT_TRUE(rowOf(note).isValid());
  EXPECT_TRUE(outline()->isExpanded(rowOf(build)));
  EXPECT_TRUE(outline()->isExpanded(rowOf(note).parent()));
  EXPECT_FALSE(outline()->isExpanded(model()->indexOfContainerOfItem(kept)));
  EXPECT_EQ(selected(), (QList<const WTObject*>{note}));
  EXPECT_EQ(outline()->currentIndex(), rowOf(note));

  // A whole task comes back as itself: its row is selected, not each of its items.
  selectOnly(build);
  controller->removeSelectedObjects();
  endTurn();
  selectOnly(design);
  context->undoManager().undo();
  endTurn();
  EXPECT_EQ(selected(), (QList<const WTObject*>{build}));

  // A change that is not undo leaves the selection alone.
  makeItem<WTNote>(design, "new", at(2024, 3, 14));
  endTurn();
  EXPECT_EQ(selected(), (QList<const WTObject*>{build}));
}

}  // namespace

namespace {

// The header's name, rate and totals share its width without covering one another, at the narrowest
// window and with or without a vertical scroll bar beside the rows.
TEST_F(WTItemsViewControllerTest, TheHeaderTotalsStandOverTheRowsDurationAndCostColumns) {
  project->setName("The new website of the regional library and its branches");
  for (int day = 1; day <= 25; ++day) makeItem<WTTime>(design, "Sketches", at(2024, 3, day));
  endTurn();
  auto* title = controller->view()->findChild<QLabel*>("projectTitle");
  auto* duration = controller->view()->findChild<QLabel*>("projectDuration");
  auto* cost = controller->view()->findChild<QLabel*>("projectCost");
  ASSERT_NE(title, nullptr);
  ASSERT_NE(duration, nullptr);
  ASSERT_NE(cost, nullptr);
  QLineEdit* rate = controller->rateField();
  EXPECT_EQ(duration->text(), "12:30");
  for (const bool scrolls : {false, true}) {
    if (scrolls) outline()->expandAll();
    for (const QSize size : {QSize(620, 600), QSize(900, 600), QSize(1200, 600)}) {
      window->resize(size);
      QApplication::processEvents();
      SCOPED_TRACE(testing::Message() << size.width() << (scrolls ? " with a scroll bar" : ""));
      ASSERT_EQ(outline()->verticalScrollBar()->isVisible(), scrolls);
      EXPECT_EQ(controller->view()->width(), size.width());  // the header does not widen the window
      const QRect row = outline()->visualRect(rowOf(design));
      const QRectF line(0, row.y(), outline()->viewport()->width(), row.height());
      WTTableCellView& cell = controller->cellViewPrototypeForIndex(rowOf(design));
      for (const auto& [label, part] : {std::pair{duration, WTTableCellView::Part::Duration},
                                        std::pair{cost, WTTableCellView::Part::Cost}}) {
        const QRect column = cell.partRect(part, line).toRect();
        const QPoint columnLeft = outline()->viewport()->mapToGlobal(column.topLeft());
        const QPoint labelLeft = label->mapToGlobal(QPoint(0, 0));
        EXPECT_EQ(labelLeft.x(), columnLeft.x());
        EXPECT_EQ(label->width(), column.width());
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
  auto* duration = controller->view()->findChild<QLabel*>("projectDuration");
  auto* cost = controller->view()->findChild<QLabel*>("projectCost");
  ASSERT_TRUE(model()->setData(rowOf(time), "11:45", WTItemsModel::StartTimeEditRole));
  EXPECT_EQ(duration->text(), "00:45");
  EXPECT_EQ(cost->text().right(5), "37.50");  // at the inherited 50
  endTurn();
  design->setRate(Decimal(80));
  endTurn();
  EXPECT_EQ(cost->text().right(5), "60.00");
  context->undoManager().undo();
  EXPECT_EQ(cost->text().right(5), "37.50");
  context->undoManager().undo();  // the start
  EXPECT_EQ(duration->text(), "00:30");
}

}  // namespace

namespace {

TEST_F(WTItemsViewControllerTest, TimeAlreadySpentIsEnteredStoppedByTypingItsDuration) {
  std::unique_ptr<QMenu> menu(controller->taskMenu(build));
  QAction* spent = nullptr;
  for (QAction* action : menu->actions()) {
    if (action->text().startsWith("New Time Entry")) spent = action;
  }
  ASSERT_NE(spent, nullptr);
  spent->trigger();
  const QList<WTItem*> items = build->items();
  ASSERT_EQ(items.size(), 1);
  ASSERT_EQ(items.first()->entity(), WTEntity::Time);
  auto* time = static_cast<WTTime*>(items.first());
  EXPECT_FALSE(time->running());
  ASSERT_TRUE(isEditing());
  auto* editor = outline()->viewport()->findChild<QLineEdit*>("durationEditor");
  ASSERT_NE(editor, nullptr);
  editor->setText("1:30");
  outline()->endEditing();
  endTurn();
  EXPECT_EQ(time->duration(), 90);
  EXPECT_FALSE(time->running());
  // Spent already: it ends now, not an hour and a half from now.
  EXPECT_EQ(time->endDate(), now);
  EXPECT_EQ(time->startDate(), now.addingSeconds(-90 * 60));
  EXPECT_EQ(rowOf(time).data(WTItemsModel::LabelRole).toString(), "08:30");
  EXPECT_EQ(rowOf(time).data(WTItemsModel::EndTimeEditRole).toString(), "10:00");
}

TEST_F(WTItemsViewControllerTest, DurationsAndAmountsSayTheyCanBeChanged) {
  WTTime* time = makeItem<WTTime>(design, "Sketches", at(2024, 3, 13));
  auto* expense = makeItem<WTExpense>(design, "Ticket", at(2024, 3, 13));
  endTurn();
  controller->expandContainerOfItem(time);
  auto tipAt = [&](const WTObject* object, WTTableCellView::Part part) {
    const QModelIndex index = rowOf(object);
    const QRect visual = outline()->visualRect(index);
    const QRectF row(0, visual.y(), outline()->viewport()->width(), visual.height());
    const QPoint point = controller->cellViewPrototypeForIndex(index).partRect(part, row).center().toPoint();
    QToolTip::hideText();
    EXPECT_TRUE(QTest::qWaitFor([] { return !QToolTip::isVisible(); }, 2000));
    QHelpEvent help(QEvent::ToolTip, point, outline()->viewport()->mapToGlobal(point));
    QApplication::sendEvent(outline()->viewport(), &help);
    return QToolTip::isVisible() ? QToolTip::text() : QString();
  };
  // Each of an entry's fields says what an edit of it moves and what stays.
  const std::pair<WTTableCellView::Part, const char*> timeTips[] = {
      {WTTableCellView::Part::Label, "the end stays"},
      {WTTableCellView::Part::End, "the start stays"},
      {WTTableCellView::Part::Duration, "the end moves"},
  };
  for (const auto& [part, says] : timeTips) {
    const QString tip = tipAt(time, part);
    EXPECT_TRUE(tip.contains("double-click") && tip.contains(says)) << tip.toStdString();
  }
  EXPECT_TRUE(tipAt(expense, WTTableCellView::Part::Cost).contains("double-click"));
  EXPECT_EQ(tipAt(time, WTTableCellView::Part::Cost), QString());  // a time's cost follows from it
  QToolTip::hideText();
}

}  // namespace

namespace {

TEST_F(WTItemsViewControllerTest, AnEntrysStartAndEndAreChangedInItsRowEachKeepingTheOther) {
  WTTime* time = makeItem<WTTime>(design, "Sketches", at(2024, 3, 13, 12, 0));  // until 12:30
  endTurn();
  controller->expandContainerOfItem(time);
  const Date end = *time->endDate();
  auto typeInto = [&](WTTableCellView::Part part, const char* editorName, const char* text) {
    const QModelIndex index = rowOf(time);
    const QRect visual = outline()->visualRect(index);
    const QRectF row(0, visual.y(), outline()->viewport()->width(), visual.height());
    const QRectF field = controller->cellViewPrototypeForIndex(index).partRect(part, row);
    QTest::mouseClick(outline()->viewport(), Qt::LeftButton, {}, field.center().toPoint());
    QTest::mouseDClick(outline()->viewport(), Qt::LeftButton, {}, field.center().toPoint());
    auto* editor = outline()->viewport()->findChild<QLineEdit*>(editorName);
    if (!editor) return QString("no editor");
    const QString shown = editor->text();
    editor->setText(text);
    outline()->endEditing();
    endTurn();
    QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);  // the closed editor goes
    return shown;
  };
  auto typeStart = [&](const char* text) {
    return typeInto(WTTableCellView::Part::Label, "startEditor", text);
  };
  auto typeEnd = [&](const char* text) { return typeInto(WTTableCellView::Part::End, "endEditor", text); };
  EXPECT_EQ(typeStart("11:45"), "12:00");
  EXPECT_EQ(time->startDate(), at(2024, 3, 13, 11, 45));
  EXPECT_EQ(time->endDate(), end);
  EXPECT_EQ(time->duration(), 45);
  for (const char* refused : {"12:40", "25:00", "noon", "9:7"}) {
    EXPECT_EQ(typeStart(refused), "11:45") << refused;
    EXPECT_EQ(time->startDate(), at(2024, 3, 13, 11, 45)) << refused;
  }
  EXPECT_EQ(typeStart("9"), "11:45");
  EXPECT_EQ(time->startDate(), at(2024, 3, 13, 9, 0));
  EXPECT_EQ(time->duration(), 210);

  EXPECT_EQ(typeEnd("17:20"), "12:30");
  EXPECT_EQ(time->startDate(), at(2024, 3, 13, 9, 0));
  EXPECT_EQ(time->endDate(), at(2024, 3, 13, 17, 20));
  EXPECT_EQ(time->duration(), 500);
  for (const char* refused : {"8:59", "24:00", "later"}) {
    EXPECT_EQ(typeEnd(refused), "17:20") << refused;
    EXPECT_EQ(time->endDate(), at(2024, 3, 13, 17, 20)) << refused;
  }
}

}  // namespace

namespace {

TEST_F(WTItemsViewControllerTest, TabWalksThroughAnEntrysFieldsInTheirOrder) {
  WTTime* time = makeItem<WTTime>(design, "Sketches", at(2024, 3, 13, 12, 0));
  endTurn();
  controller->expandContainerOfItem(time);
  const QModelIndex index = rowOf(time);
  outline()->setCurrentIndex(index);
  controller->cellDelegate()->setEditField(WTItemCellDelegate::Field::Start);
  outline()->edit(index);
  auto openEditor = [&] {
    QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
    QApplication::processEvents();
    QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
    const QList<QLineEdit*> editors = outline()->viewport()->findChildren<QLineEdit*>();
    return editors.size() == 1 ? editors.first() : nullptr;
  };
  QLineEdit* editor = openEditor();
  ASSERT_NE(editor, nullptr);
  EXPECT_EQ(editor->objectName(), "startEditor");
  // Start, end, duration, name; each is committed on the way.
  const std::pair<const char*, const char*> typed[] = {
      {"startEditor", "11:00"}, {"endEditor", "12:15"}, {"durationEditor", "1:45"}};
  for (const auto& [name, text] : typed) {
    ASSERT_NE(editor, nullptr) << name;
    EXPECT_EQ(editor->objectName(), name);
    editor->setText(text);
    QTest::keyClick(editor, Qt::Key_Tab);
    editor = openEditor();
  }
  ASSERT_NE(editor, nullptr);
  EXPECT_EQ(editor->objectName(), "nameEditor");
  editor->setText("Drawings");
  outline()->endEditing();
  EXPECT_EQ(time->startDate(), at(2024, 3, 13, 11, 0));
  EXPECT_EQ(time->endDate(), at(2024, 3, 13, 12, 45));
  EXPECT_EQ(time->name(), "Drawings");
  EXPECT_EQ(outline()->currentIndex(), rowOf(time));
  // Back from the name to the duration.
  controller->cellDelegate()->setEditField(WTItemCellDelegate::Field::Name);
  outline()->edit(rowOf(time));
  editor = openEditor();
  ASSERT_NE(editor, nullptr);
  QTest::keyClick(editor, Qt::Key_Backtab, Qt::ShiftModifier);
  editor = openEditor();
  ASSERT_NE(editor, nullptr);
  EXPECT_EQ(editor->objectName(), "durationEditor");
  outline()->endEditing();
}

}  // namespace
