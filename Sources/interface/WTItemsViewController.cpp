#include "WTItemsViewController.h"

#include "Decimal.h"
#include "RZBackgroundView.h"
#include "RZDate.h"
#include "WTBillingDialog.h"
#include "WTDatePopover.h"
#include "WTEmptyHint.h"
#include "WTImages.h"
#include "WTItem.h"
#include "WTItemCellDelegate.h"
#include "WTItemContainer.h"
#include "WTItemsModel.h"
#include "WTObjectContext.h"
#include "WTOutlineView.h"
#include "WTProject.h"
#include "WTRateField.h"
#include "WTReportWindowController.h"
#include "WTTask.h"
#include "WTTime.h"
#include "WTToDo.h"

#include <QCalendarWidget>
#include <QCursor>
#include <QHBoxLayout>
#include <QItemSelectionModel>
#include <QLabel>
#include <QLineEdit>
#include <QLocale>
#include <QMenu>
#include <QScrollBar>
#include <QShortcut>
#include <QTimer>
#include <QToolButton>
#include <QToolTip>
#include <QVBoxLayout>

WTItemsViewController::WTItemsViewController(WTObjectContext* context, QObject* parent)
    : WTViewController(parent), context_(context), treeController_(new WTItemsModel(context, this)) {
  setObjectName(QStringLiteral("Items"));
  connect(treeController_, &WTItemsModel::projectChanged, this, &WTItemsViewController::refreshHeader);
  connect(treeController_, &WTItemsModel::projectChanged, this, &WTViewController::validationChanged);
  // Dropped records are shown where they landed, selected, with the keyboard on them: once the drop
  // event is done with the view.
  connect(treeController_, &WTItemsModel::recordsDropped, this, [this](const QList<WTObject*>& records) {
    QTimer::singleShot(0, this, [this, records] { revealObjects(records); });
  });
  connect(treeController_, &WTItemsModel::dropRefused, this,
          [this](const QString& reason) { showMoveRefusal(reason, QRect(QCursor::pos(), QSize(1, 1))); });
  // Records that undo or redo puts back are shown and selected, not left inside a closed row.
  connect(context_, &WTObjectContext::objectValueDidChange, this, [this](WTObject* object, const QString&) {
    const WTUndoManager& undo = context_->undoManager();
    if (undo.isUndoing() || undo.isRedoing()) restoredCandidates_.insert(object);
  });
  connect(context_, &WTObjectContext::objectsDidChange, this,
          [this](const QList<WTObject*>& inserted, const QList<WTObject*>&, const QList<WTObject*>&) {
            const QSet<WTObject*> candidates = std::exchange(restoredCandidates_, {});
            QList<WTObject*> restored;
            for (WTObject* object : inserted) {
              if (candidates.contains(object)) restored.append(object);
            }
            if (!restored.isEmpty()) revealObjects(restored);
          });
  connect(treeController_, &WTItemsModel::projectDeleted, this, [this] {
    project_ = nullptr;
    emit backRequested();
  });
}

WTItemsViewController::~WTItemsViewController() {
  qDeleteAll(cellViewPrototypes_);
  delete popover_.data();
}

void WTItemsViewController::setProject(WTProject* project) {
  if (rateField_ && project != project_) {  // what was typed for the other project goes with it
    WTRateField::setRefused(rateField_, {});
    rateField_->setModified(false);
  }
  project_ = project;
}

WTOutlineView* WTItemsViewController::outlineView() {
  view();
  return outlineView_;
}

WTItemCellDelegate* WTItemsViewController::cellDelegate() {
  view();
  return delegate_;
}

QWidget* WTItemsViewController::loadView() {
  auto* container = new QWidget;
  container->setObjectName(QStringLiteral("ItemsView"));
  auto* layout = new QVBoxLayout(container);
  layout->setContentsMargins(0, 0, 0, 0);
  layout->setSpacing(0);

  header_ = new RZBackgroundView(container);
  header_->setObjectName(QStringLiteral("projectHeader"));
  header_->setIBGradientBeginHexColor(QStringLiteral("F5F7FA"));
  header_->setIBGradientEndHexColor(QStringLiteral("DCE2EA"));
  auto* bar = new QHBoxLayout(header_);
  // The right margin keeps the totals' room free; alignTotals sets it.
  bar->setContentsMargins(8, 6, 12, 6);
  bar->setSpacing(10);
  auto* back = new QToolButton(header_);
  back->setObjectName(QStringLiteral("backButton"));
  back->setIcon(WTImages::icon(QStringLiteral("back")));
  back->setText(tr("Projects"));
  back->setToolTip(tr("Back to the projects (Alt+Left)"));
  back->setToolButtonStyle(Qt::ToolButtonTextBesideIcon);
  back->setAutoRaise(true);
  connect(back, &QToolButton::clicked, this, &WTItemsViewController::backRequested);
  bar->addWidget(back);

  auto* titles = new QVBoxLayout;
  titles->setSpacing(0);
  titleLabel_ = new QLabel(header_);
  titleLabel_->setObjectName(QStringLiteral("projectTitle"));
  QFont titleFont = titleLabel_->font();
  titleFont.setBold(true);
  titleFont.setPointSizeF(titleFont.pointSizeF() + 3);
  titleLabel_->setFont(titleFont);
  clientLabel_ = new QLabel(header_);
  clientLabel_->setObjectName(QStringLiteral("projectClient"));
  clientLabel_->setStyleSheet(QStringLiteral("color: #666;"));
  // A long name gives way to the rate and the totals (shortened, whole in its tip) rather than widening
  // the window or running under them.
  for (QLabel* label : {titleLabel_, clientLabel_}) {
    label->setSizePolicy(QSizePolicy::Ignored, QSizePolicy::Preferred);
    label->installEventFilter(this);
  }
  titles->addWidget(titleLabel_);
  titles->addWidget(clientLabel_);
  bar->addLayout(titles, 1);

  auto* rateLabel = new QLabel(tr("Rate"), header_);
  rateField_ = new QLineEdit(header_);
  rateField_->setObjectName(QStringLiteral("rateField"));
  rateField_->setAlignment(Qt::AlignRight);
  // Wide enough for what it inherits ("Inherited: 1,250.00"), not only for a typed rate.
  rateField_->setMinimumWidth(
      rateField_->fontMetrics().horizontalAdvance(tr("Inherited: %1").arg(QStringLiteral("00,000.00"))) + 16);
  rateField_->setMaximumWidth(rateField_->minimumWidth());
  rateLabel->setBuddy(rateField_);
  connect(rateField_, &QLineEdit::editingFinished, this, &WTItemsViewController::projectRateAction);
  connect(rateField_, &QLineEdit::textEdited, this, [this] { WTRateField::setRefused(rateField_, {}); });
  // Escape takes back what was typed, as in the outline's editors.
  auto* revert =
      new QShortcut(QKeySequence(Qt::Key_Escape), rateField_, nullptr, nullptr, Qt::WidgetShortcut);
  connect(revert, &QShortcut::activated, this, &WTItemsViewController::showStoredRate);
  bar->addWidget(rateLabel);
  bar->addWidget(rateField_);
  // The totals sit right above the rows' duration and cost columns (alignTotals places them); the
  // layout only keeps their room free.
  durationLabel_ = new QLabel(header_);
  durationLabel_->setObjectName(QStringLiteral("projectDuration"));
  totalsLabel_ = new QLabel(header_);
  totalsLabel_->setObjectName(QStringLiteral("projectCost"));
  for (QLabel* label : {durationLabel_, totalsLabel_}) {
    label->installEventFilter(this);  // a figure too wide keeps its leading digits, as in the rows
    label->setAlignment(Qt::AlignRight | Qt::AlignVCenter);
    QFont totalsFont = label->font();
    totalsFont.setBold(true);
    label->setFont(totalsFont);
  }
  header_->installEventFilter(this);
  layout->addWidget(header_);

  auto* line = new QFrame(container);
  line->setFrameShape(QFrame::HLine);
  line->setStyleSheet(QStringLiteral("color: #b8bec6;"));
  layout->addWidget(line);

  outlineView_ = new WTOutlineView(container);
  outlineView_->setObjectName(QStringLiteral("itemsOutline"));
  outlineView_->setEmptyHint(WTEmptyHint::forAdding(tr("No tasks yet")));
  delegate_ = new WTItemCellDelegate(this, outlineView_);
  outlineView_->setItemDelegate(delegate_);
  outlineView_->viewport()->installEventFilter(this);
  outlineView_->setModel(treeController_);
  layout->addWidget(outlineView_, 1);

  connect(delegate_, &WTItemCellDelegate::partActivated, this, &WTItemsViewController::partActivated);
  connect(delegate_, &WTItemCellDelegate::rowHeightChanged, outlineView_,
          &WTOutlineView::noteHeightOfRowChanged);
  connect(outlineView_, &WTOutlineView::editRequested, this, [this](const QModelIndex& index) {
    if (!treeController_->objectAt(index)) return;
    // The row renamed is the one selected, alone, so that a Delete after it takes nothing else.
    outlineView_->selectionModel()->select(index,
                                           QItemSelectionModel::ClearAndSelect | QItemSelectionModel::Rows);
    delegate_->setEditField(WTItemCellDelegate::Field::Name);
    outlineView_->edit(index);
  });
  outlineView_->setContextMenuPolicy(Qt::CustomContextMenu);
  connect(outlineView_, &QWidget::customContextMenuRequested, this, [this](const QPoint& point) {
    const QModelIndex index = outlineView_->indexAt(point);
    WTObject* object = treeController_->objectAt(index);
    std::unique_ptr<QMenu> menu;
    if (object && object->entity() == WTEntity::Task) menu.reset(taskMenu(static_cast<WTTask*>(object)));
    if (object && WTEntities::isItem(object->entity())) menu.reset(itemMenu(static_cast<WTItem*>(object)));
    if (menu) menu->exec(outlineView_->viewport()->mapToGlobal(point));
  });
  connect(outlineView_, &WTOutlineView::checkRequested, this, &WTItemsViewController::toggleCompleted);
  connect(outlineView_, &QTreeView::expanded, this, &WTItemsViewController::saveExpandedItems);
  connect(outlineView_, &QTreeView::collapsed, this, &WTItemsViewController::saveExpandedItems);
  reopenRowsThatComeBack();
  openRowsOfNewTimers();
  connect(outlineView_->selectionModel(), &QItemSelectionModel::selectionChanged, this,
          &WTViewController::validationChanged);
  refreshHeader();
  return container;
}

QMenu* WTItemsViewController::taskMenu(WTTask* task) {
  auto* menu = new QMenu;
  menu->setObjectName(QStringLiteral("taskMenu"));
  QPointer<WTOutlineView> outline = outlineView_;
  // What the row's hover buttons add, reachable from the keyboard too (the Menu key, Shift+F10).
  menu->addAction(tr("New Time Entry"), this, [this, task] { addTimeItem(task); });
  menu->addAction(tr("New Time Entry (Already Spent)"), this, [this, task] { addStoppedTimeItem(task); });
  for (const auto& [kind, title] : {std::pair{WTEntity::Flat, tr("New Flat Fee")},
                                    {WTEntity::Note, tr("New Note")},
                                    {WTEntity::Expense, tr("New Expense")},
                                    {WTEntity::ToDo, tr("New To-Do")}})
    menu->addAction(title, this, [this, task, kind] { addItem(kind, task); });
  menu->addSeparator();
  // What dragging a task does, one place at a time.
  const qsizetype place = project_ ? project_->tasks().indexOf(task) : -1;
  for (const auto& [title, step] : {std::pair{tr("Move Up"), -1}, {tr("Move Down"), 1}}) {
    QAction* move = menu->addAction(title, this, [this, task, place, step] {
      const WTUndoManager::NamedStep named(context_->undoManager(), tr("Move"));
      project_->moveTask(task, int(place + step));
      revealObjects({task});
    });
    move->setEnabled(place >= 0 && place + step >= 0 && place + step < project_->tasks().size());
  }
  menu->addAction(tr("Notes…"), this, [this, task] { showNotes(task); });
  menu->addAction(tr("Set Rate…"), this, [task, outline] { WTRateDialog::editRate(task, outline); });
  menu->addAction(WTBillingDialog::menuTitle(WTEntity::Task), this,
                  [task, outline] { WTBillingDialog::editBilling(task, outline); });
  return menu;
}

QMenu* WTItemsViewController::itemMenu(WTItem* item) {
  auto* menu = new QMenu;
  menu->setObjectName(QStringLiteral("itemMenu"));
  // The record is looked up again when an entry is chosen: a sync may have taken it while the menu was open.
  const QPersistentModelIndex row = treeController_->indexOfObject(item);
  const auto itemNow = [this, row] { return static_cast<WTItem*>(treeController_->objectAt(row)); };
  if (item->entity() == WTEntity::ToDo) {
    menu->addAction(static_cast<WTToDo*>(item)->completed() ? tr("Reopen To-Do") : tr("Complete To-Do"), this,
                    [this, row] { toggleCompleted(row); });
  }
  if (auto* time = dynamic_cast<WTTime*>(item); time && time->running())
    menu->addAction(tr("Stop Timer"), this, [this, itemNow] { stopTimer(dynamic_cast<WTTime*>(itemNow())); });
  menu->addAction(tr("Notes…"), this, [this, itemNow] {
    if (WTItem* item = itemNow()) showNotes(item);
  });
  // What dragging the row onto another task does: the item keeps its date.
  QMenu* tasks = menu->addMenu(tr("Move to Task"));
  for (WTTask* task : project_ ? project_->tasks() : QList<WTTask*>()) {
    if (task == item->task()) continue;
    tasks->addAction(task->name().isEmpty() ? tr("Untitled Task") : task->name(), this,
                     [this, task, itemNow] {
                       WTItem* item = itemNow();
                       if (!item) return;
                       if (moveRefused(*task, item, std::nullopt)) return;
                       const WTUndoManager::NamedStep named(context_->undoManager(), tr("Move"));
                       const QList<WTItem*> moved = task->adoptItems({item});
                       revealObjects({moved.begin(), moved.end()});
                     });
  }
  tasks->setEnabled(!tasks->isEmpty());
  menu->addAction(tr("Change Date…"), this, [this, itemNow, row] {
    if (!row.isValid()) return;
    const QRect rect = cellViewPrototypeForIndex(row)
                           .partRect(WTTableCellView::Part::DateButton, outlineView_->visualRect(row))
                           .toRect();
    openDatePicker(itemNow(), QRect(outlineView_->viewport()->mapToGlobal(rect.topLeft()), rect.size()));
  });
  menu->addSeparator();
  // The rows chosen, when the row is one of them; else the row alone.
  menu->addAction(tr("Delete"), this, [this, row] {
    if (!row.isValid()) return;
    if (!outlineView_->selectionModel()->isSelected(row))
      outlineView_->selectionModel()->select(row,
                                             QItemSelectionModel::ClearAndSelect | QItemSelectionModel::Rows);
    removeSelectedObjects();
  });
  return menu;
}

void WTItemsViewController::toggleCompleted(const QModelIndex& index) {
  WTObject* object = treeController_->objectAt(index);
  if (!object || object->entity() != WTEntity::ToDo) return;
  auto* todo = static_cast<WTToDo*>(object);
  // The to-do dates itself; it then moves between "Pending" and its day, which is opened.
  treeController_->setData(index, !todo->completed(), WTItemsModel::CompletedRole);
  refreshChildren(todo);
}

void WTItemsViewController::willDisplayView() {
  view();
  autosaveExpandedItems_ = false;
  goneOpen_.clear();
  delegate_->setEditField(WTItemCellDelegate::Field::Name);
  treeController_->setProject(project_);
  restoreExpandedItems();
  autosaveExpandedItems_ = true;
  outlineView_->scrollToTop();
  if (treeController_->rowCount() > 0) outlineView_->setCurrentIndex(treeController_->index(0, 0));
  refreshHeader();
}

bool WTItemsViewController::respondsTo(Command command) const {
  switch (command) {
    case Command::AddObject:
    case Command::RemoveSelectedObjects:
    case Command::ToggleArchive:
    case Command::Report:
    case Command::SelectedObject:
    case Command::ToggleTimer:
      return true;
    default:
      return false;
  }
}

void WTItemsViewController::addObject() {
  if (!project_) return;
  auto* task = WTTask::insertNewObject(context_);
  task->setProject(project_);
  context_->undoManager().setActionName(tr("New Task"));
  context_->processPendingChanges();
  treeController_->processChanges();
  const QModelIndex index = treeController_->indexOfObject(task);
  if (!index.isValid()) return;
  // The new row alone: the keys that asked for it (Ctrl+N) must not add it to the old selection.
  outlineView()->selectionModel()->setCurrentIndex(
      index, QItemSelectionModel::ClearAndSelect | QItemSelectionModel::Rows);
  delegate_->setEditField(WTItemCellDelegate::Field::Name);
  outlineView_->edit(index);
  takeBackUnlessNamed(outlineView_, context_);
  outlineView_->scrollTo(index);
}

void WTItemsViewController::toggleArchive() {
  if (!project_) return;
  project_->setArchived(!project_->archived());
  context_->undoManager().setActionName(project_->archived() ? tr("Archive") : tr("Unarchive"));
  emit validationChanged();
}

void WTItemsViewController::report() {
  if (project_) WTReportWindowController::showReport(context_, QList<WTProject*>{project_});
}

WTObject* WTItemsViewController::selectedObject() const {
  return project_;
}

WTTask* WTItemsViewController::taskOfIndex(const QModelIndex& index) const {
  WTObject* object = treeController_->objectAt(index);
  if (!object) {
    const auto container = treeController_->containerAt(index);
    return container ? container->task() : nullptr;
  }
  if (object->entity() == WTEntity::Task) return static_cast<WTTask*>(object);
  return static_cast<WTItem*>(object)->task();
}

void WTItemsViewController::toggleTimer() {
  if (!outlineView_) return;
  toggleTimerOfTask(taskOfIndex(outlineView_->currentIndex()));
}

WTItem* WTItemsViewController::addItem(WTEntity kind, WTTask* task) {
  if (!task || !WTEntities::isItem(kind)) return nullptr;
  auto* item = static_cast<WTItem*>(context_->insertNewObject(kind));
  item->setTask(task);
  switch (kind) {
    case WTEntity::Time:
      context_->undoManager().setActionName(tr("New Time Entry"));
      break;
    case WTEntity::Flat:
      context_->undoManager().setActionName(tr("New Flat Fee"));
      break;
    case WTEntity::Expense:
      context_->undoManager().setActionName(tr("New Expense"));
      break;
    case WTEntity::ToDo:
      context_->undoManager().setActionName(tr("New To-Do"));
      break;
    default:
      context_->undoManager().setActionName(tr("New Note"));
      break;
  }
  selectItem(item);
  return item;
}

WTTime* WTItemsViewController::addTimeItem(WTTask* task) {
  auto* time = static_cast<WTTime*>(addItem(WTEntity::Time, task));
  if (time) time->setRunning(true);
  return time;
}

WTTime* WTItemsViewController::addStoppedTimeItem(WTTask* task) {
  if (!task) return nullptr;
  auto* time = static_cast<WTTime*>(context_->insertNewObject(WTEntity::Time));
  time->setTask(task);
  // Time already spent ends now: the length typed at once moves its start back.
  time->setEndDate(time->startDate());
  selectItem(time);
  if (outlineView_ && outlineView_->isEditing()) outlineView_->endEditing();
  const QModelIndex index = treeController_->indexOfObject(time);
  if (index.isValid()) {
    delegate_->setEditField(WTItemCellDelegate::Field::SpentDuration);
    outlineView_->edit(index);
  }
  return time;
}

void WTItemsViewController::toggleTimerOfTask(WTTask* task) {
  if (!task) return;
  if (WTTime* time = task->toggleTimer()) selectItem(time);
}

void WTItemsViewController::stopTimer(WTTime* time) {
  if (time) time->setRunning(false);
}

void WTItemsViewController::showNotes(WTObject* object) {
  context_->processPendingChanges();
  treeController_->processChanges();
  const QModelIndex index = treeController_->indexOfObject(object);
  if (!index.isValid()) return;
  outlineView()->setCurrentIndex(index);
  outlineView_->scrollTo(index);
  delegate_->setEditField(WTItemCellDelegate::Field::Notes);
  outlineView_->edit(index);
  outlineView_->noteHeightOfRowChanged(index);
}

void WTItemsViewController::refreshChildren(WTItem* item) {
  if (!item) return;
  context_->processPendingChanges();
  treeController_->processChanges();
  expandContainerOfItem(item);
  // The keyboard stays on the item, in its new place.
  const QModelIndex index = treeController_->indexOfObject(item);
  if (index.isValid()) outlineView_->setCurrentIndex(index);
}

WTDatePopover* WTItemsViewController::popover() {
  if (!popover_) {
    popover_ = new WTDatePopover(outlineView());
    connect(popover_, &WTDatePopover::popoverWillClose, this, &WTItemsViewController::popoverWillClose);
  }
  return popover_;
}

void WTItemsViewController::openDatePicker(WTItem* item, const QRect& anchor) {
  if (!item || (popover_ && popover_->isVisible()) || currentItem_) return;
  currentItem_ = item;
  const QDateTime date = (item->date() ? *item->date() : Date::now()).toQDateTime();
  // A time entry is offered no day on which it would not be time already spent.
  QDate latest = QDate(9999, 12, 31);
  if (const auto* time = dynamic_cast<const WTTime*>(item)) {
    latest = Date::now().toQDateTime().date();
    for (int before = 0; before < 366 && !time->isSpentOnDayOf(Date::fromQDateTime(latest.startOfDay()));
         ++before)
      latest = latest.addDays(-1);
  }
  popover()->datePicker()->setMaximumDate(latest);
  popover_->setDate(date.date());
  shownDate_ = popover_->date();
  popover_->showRelativeToRect(anchor);
}

void WTItemsViewController::popoverWillClose() {
  WTItem* item = std::exchange(currentItem_, nullptr);
  if (!item || !popover_) return;
  const QDateTime old = (item->date() ? *item->date() : Date::now()).toQDateTime();
  const QDate picked = popover_->date();
  // Only a new day moves the item: closing without a choice leaves it (and its seconds) alone.
  if (picked.isValid() && picked != old.date() && picked != shownDate_) {
    const Date day = Date::fromQDateTime(QDateTime(picked, old.time()));
    WTTask* task = item->task();
    if (!task || moveRefused(*task, item, day)) return;
    task->adoptItems({item}, day);
    context_->undoManager().setActionName(tr("Move"));
    refreshChildren(item);
  }
}

bool WTItemsViewController::moveRefused(const WTTask& task, WTItem* item, std::optional<Date> day) {
  const std::optional<WTTask::Clash> clash = task.clashOfAdopting({item}, day);
  if (!clash) return false;
  const QRect row = outlineView_->visualRect(treeController_->indexOfObject(item));
  showMoveRefusal(WTItemsModel::clashRefusal(task, *clash),
                  QRect(outlineView_->viewport()->mapToGlobal(row.topLeft()), row.size()));
  return true;
}

void WTItemsViewController::showMoveRefusal(const QString& reason, const QRect& anchor) {
  // Under the row, where the eye is; it stays while the pointer is over the outline.
  QWidget* viewport = outlineView_->viewport();
  QToolTip::showText(anchor.bottomLeft(), reason, viewport, viewport->rect(), 10000);
}

bool WTItemsViewController::isRowBeingEdited(const QModelIndex& index) const {
  return delegate_ && delegate_->isEditingNotes(index);
}

WTTableCellView& WTItemsViewController::cellViewPrototypeForIndex(const QModelIndex& index) {
  const QString kind = treeController_->kindAt(index);
  WTTableCellView*& prototype = cellViewPrototypes_[kind];
  if (!prototype) prototype = new WTTableCellView(kind);
  const qreal width = outlineView_ ? outlineView_->viewport()->width() : 600;
  prototype->setFrame(QRectF(prototype->frame().topLeft(), QSizeF(width, prototype->frame().height())));
  prototype->setNotes(isRowBeingEdited(index) ? delegate_->notesEditingText()
                                              : index.data(WTItemsModel::NotesRole).toString());
  return *prototype;
}

qreal WTItemsViewController::heightOfRow(const QModelIndex& index) {
  const bool editing = isRowBeingEdited(index);
  const qreal height = cellViewPrototypeForIndex(index).requestedHeight(editing);
  return treeController_->isItemIndex(index) ? std::max(height, 30.0) : height;
}

void WTItemsViewController::partActivated(const QModelIndex& index, WTTableCellView::Part part,
                                          const QRect& rect) {
  using Part = WTTableCellView::Part;
  WTObject* object = treeController_->objectAt(index);
  auto* task = object && object->entity() == WTEntity::Task ? static_cast<WTTask*>(object) : nullptr;
  auto* item = object && WTEntities::isItem(object->entity()) ? static_cast<WTItem*>(object) : nullptr;
  switch (part) {
    case Part::Disclosure:
      outlineView_->setExpanded(index, !outlineView_->isExpanded(index));
      break;
    case Part::AddTime:
      addTimeItem(task);
      break;
    case Part::AddFlat:
      addItem(WTEntity::Flat, task);
      break;
    case Part::AddNote:
      addItem(WTEntity::Note, task);
      break;
    case Part::AddExpense:
      addItem(WTEntity::Expense, task);
      break;
    case Part::AddToDo:
      addItem(WTEntity::ToDo, task);
      break;
    case Part::TimerButton:
      if (task) toggleTimerOfTask(task);
      if (item && item->entity() == WTEntity::Time) stopTimer(static_cast<WTTime*>(item));
      break;
    case Part::Checkbox:
      toggleCompleted(index);
      break;
    case Part::DateButton:
      openDatePicker(item, QRect(outlineView_->viewport()->mapToGlobal(rect.topLeft()), rect.size()));
      break;
    case Part::NotesButton:
      showNotes(object);
      break;
    default:
      break;
  }
}
