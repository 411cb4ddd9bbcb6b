#include "WTObjectListViewController.h"

#include "WTEmptyHint.h"
#include "WTListCellDelegate.h"
#include "WTListView.h"
#include "WTObject.h"
#include "WTObjectContext.h"
#include "WTObjectListModel.h"

#include <QAction>
#include <QItemSelectionModel>
#include <QMenu>
#include <QVBoxLayout>

#include <algorithm>

WTObjectListViewController::WTObjectListViewController(WTObjectContext* context, WTEntity entity,
                                                       const QString& identifier, QObject* parent)
    : WTViewController(parent),
      context_(context),
      identifier_(identifier),
      arrayController_(new WTObjectListModel(context, entity, this)) {}

WTObjectListViewController::~WTObjectListViewController() {
  delete rowMenu_.data();
}

WTListView* WTObjectListViewController::tableView() {
  view();
  return tableView_;
}

QWidget* WTObjectListViewController::loadView() {
  auto* container = new QWidget;
  container->setObjectName(identifier_ + QStringLiteral("sView"));
  auto* layout = new QVBoxLayout(container);
  layout->setContentsMargins(0, 0, 0, 0);
  tableView_ = new WTListView(container);
  tableView_->setObjectName(identifier_ + QStringLiteral("sTable"));
  tableView_->setEmptyHint(WTEmptyHint::forAdding(
      identifier_ == QLatin1String("Client") ? tr("No clients yet") : tr("No projects yet")));
  delegate_ = new WTListCellDelegate(identifier_, tableView_);
  tableView_->setItemDelegate(delegate_);
  tableView_->setModel(arrayController_);
  layout->addWidget(tableView_);
  connect(delegate_, &WTListCellDelegate::partActivated, this, &WTObjectListViewController::partActivated);
  connect(tableView_, &WTListView::contextMenuRequestedForRow, this,
          &WTObjectListViewController::showRowMenu);
  connect(tableView_, &WTListView::openRequested, this, [this](const QModelIndex& index) {
    partActivated(index, WTTableCellView::Part::OpenButton, tableView_->visualRect(index));
  });
  connect(tableView_->selectionModel(), &QItemSelectionModel::selectionChanged, this,
          &WTViewController::validationChanged);
  // A record archived or renamed may change the toolbar's label.
  connect(arrayController_, &QAbstractItemModel::dataChanged, this, &WTViewController::validationChanged);
  return container;
}

void WTObjectListViewController::setArchivedPredicate(std::function<bool(const WTObject*)> predicate) {
  arrayController_->setFilterPredicate(std::move(predicate));
}

QList<WTObject*> WTObjectListViewController::selectedObjects() const {
  QList<WTObject*> result;
  if (!tableView_ || !tableView_->selectionModel()) return result;
  QModelIndexList rows = tableView_->selectionModel()->selectedRows();
  std::sort(rows.begin(), rows.end(),
            [](const QModelIndex& a, const QModelIndex& b) { return a.row() < b.row(); });
  for (const QModelIndex& index : rows) {
    if (WTObject* object = arrayController_->objectAt(index.row())) result.append(object);
  }
  return result;
}

void WTObjectListViewController::selectObject(WTObject* object) {
  const QModelIndex index = arrayController_->indexOfObject(object);
  if (!index.isValid()) return;
  tableView()->setCurrentIndex(index);
  tableView()->selectionModel()->select(index,
                                        QItemSelectionModel::ClearAndSelect | QItemSelectionModel::Rows);
}

bool WTObjectListViewController::respondsTo(Command command) const {
  switch (command) {
    case Command::AddObject:
    case Command::RemoveSelectedObjects:
    case Command::ToggleArchive:
    case Command::Report:
    case Command::SelectedObject:
      return true;
    default:
      return false;
  }
}

WTObject* WTObjectListViewController::selectedObject() const {
  const QList<WTObject*> selected = selectedObjects();
  return selected.isEmpty() ? nullptr : selected.last();
}

void WTObjectListViewController::removeSelectedObjects() {
  if (tableView_) tableView_->endEditing();
  if (!deleteObjects(context_, selectedObjects())) return;
  arrayController_->rearrangeObjects();
  emit validationChanged();
}

WTObject* WTObjectListViewController::clickedObject() const {
  if (!tableView_ || tableView_->clickedRow() < 0) return nullptr;
  return arrayController_->objectAt(tableView_->clickedRow());
}

void WTObjectListViewController::toggleArchive() {
  WTObject* target = tableView_ && tableView_->clickedRow() >= 0 ? clickedObject() : selectedObject();
  if (!target) return;
  target->setArchived(!target->archived());
  context_->undoManager().setActionName(target->archived() ? tr("Archive") : tr("Unarchive"));
  emit validationChanged();
}

QMenu* WTObjectListViewController::rowMenu() {
  if (rowMenu_) return rowMenu_;
  rowMenu_ = new QMenu;
  rowMenu_->setObjectName(identifier_ + QStringLiteral("RowMenu"));
  addRowMenuItems(rowMenu_);
  QAction* archive = rowMenu_->addAction(tr("Archive"), this, &WTObjectListViewController::toggleArchive);
  archive->setData(1);  // the tag the menu update looks for
  rowMenu_->addSeparator();
  rowMenu_->addAction(tr("Delete"), this, [this] {
    WTObject* object = clickedObject();
    if (object && deleteObjects(context_, {object})) {
      arrayController_->rearrangeObjects();
      emit validationChanged();
    }
  });
  return rowMenu_;
}

void WTObjectListViewController::addRowMenuItems(QMenu*) {}

void WTObjectListViewController::menuNeedsUpdate(QMenu* menu) {
  const WTObject* clicked = clickedObject();
  if (!clicked) return;
  for (QAction* action : menu->actions()) {
    if (action->data().toInt() == 1) action->setText(clicked->archived() ? tr("Unarchive") : tr("Archive"));
  }
}

void WTObjectListViewController::showRowMenu(int row, const QPoint& global) {
  if (row < 0) return;
  tableView()->setClickedRow(row);
  QMenu* menu = rowMenu();
  menuNeedsUpdate(menu);
  // The row is marked while its menu is open, without touching the selection.
  tableView()->viewport()->update();
  menu->exec(global);
  if (tableView_) {
    tableView_->setClickedRow(-1);
    tableView_->viewport()->update();
  }
}

bool WTObjectListViewController::editNewObject(WTObject* object, bool scroll) {
  const int row = arrayController_->rowOfObject(object);
  if (row < 0) return false;
  tableView()->editRow(row, scroll);
  takeBackUnlessNamed(tableView(), context_);
  return true;
}

void WTObjectListViewController::partActivated(const QModelIndex&, WTTableCellView::Part, const QRect&) {}
