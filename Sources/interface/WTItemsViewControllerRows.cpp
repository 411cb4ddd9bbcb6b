#include "WTItemsViewController.h"

#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTItem.h"
#include "WTItemCellDelegate.h"
#include "WTItemsModel.h"
#include "WTObjectContext.h"
#include "WTOutlineView.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTTime.h"

#include <QItemSelectionModel>

#include <algorithm>

// Which rows of the outline are open and chosen: kept across reloads, removals and undo.

namespace {

const QString kExpandedItemsKey = SettingsKeys::kExpandedItemsPrefix;

}  // namespace

QString WTItemsViewController::autosaveName() const {
  return project_ ? project_->uuid() : QString();
}

QStringList WTItemsViewController::expandedIdentities() const {
  QStringList identities;
  if (!outlineView_) return identities;
  for (int taskRow = 0; taskRow < treeController_->rowCount(); ++taskRow) {
    const QModelIndex task = treeController_->index(taskRow, 0);
    if (outlineView_->isExpanded(task)) identities.append(treeController_->persistentIdentity(task));
    for (int row = 0; row < treeController_->rowCount(task); ++row) {
      const QModelIndex group = treeController_->index(row, 0, task);
      if (outlineView_->isExpanded(group)) identities.append(treeController_->persistentIdentity(group));
    }
  }
  return identities;
}

void WTItemsViewController::saveExpandedItems() {
  if (!autosaveExpandedItems_ || !project_) return;
  if (UserDefaults* defaults = context_->userDefaults()) {
    defaults->setValue(kExpandedItemsKey + autosaveName(), expandedIdentities());
  }
}

void WTItemsViewController::restoreExpandedItems() {
  if (!project_) return;
  UserDefaults* defaults = context_->userDefaults();
  if (!defaults) return;
  const QStringList identities = defaults->value(kExpandedItemsKey + autosaveName()).toStringList();
  for (const QString& identity : identities) {
    const QModelIndex index = treeController_->indexForPersistentIdentity(identity);
    if (index.isValid()) outlineView_->expand(index);
  }
}
// A day's group goes when its last item leaves; when it comes back (a to-do completed, then undone) it
// opens as it was left.
void WTItemsViewController::reopenRowsThatComeBack() {
  connect(treeController_, &QAbstractItemModel::rowsAboutToBeRemoved, this,
          [this](const QModelIndex& parent, int first, int last) {
            for (int row = first; row <= last; ++row) {
              const QModelIndex index = treeController_->index(row, 0, parent);
              if (outlineView_->isExpanded(index))
                goneOpen_.insert(treeController_->persistentIdentity(index));
            }
          });
  connect(treeController_, &QAbstractItemModel::rowsInserted, this,
          [this](const QModelIndex& parent, int first, int last) {
            for (int row = first; row <= last && !goneOpen_.isEmpty(); ++row) {
              const QModelIndex index = treeController_->index(row, 0, parent);
              if (goneOpen_.remove(treeController_->persistentIdentity(index))) outlineView_->expand(index);
            }
          });
}

void WTItemsViewController::openRowsOfNewTimers() {
  const auto runningAt = [this](const QModelIndex& index) {
    auto* time = dynamic_cast<WTTime*>(treeController_->objectAt(index));
    return time && time->running() ? time : nullptr;
  };
  connect(treeController_, &QAbstractItemModel::rowsInserted, this,
          [this, runningAt](const QModelIndex& parent, int first, int last) {
            // A day's group comes with its items, an item alone into a group there already.
            for (int row = first; row <= last; ++row) {
              const QModelIndex index = treeController_->index(row, 0, parent);
              WTTime* time = runningAt(index);
              for (int child = 0; !time && child < treeController_->rowCount(index); ++child)
                time = runningAt(treeController_->index(child, 0, index));
              if (time) expandContainerOfItem(time);
            }
          });
}

void WTItemsViewController::removeSelectedObjects() {
  if (!outlineView_) return;
  outlineView_->endEditing();
  QModelIndexList rows = outlineView_->selectionModel()->selectedRows();
  QList<WTObject*> objects;
  for (const QModelIndex& index : rows) {
    if (WTObject* object = treeController_->objectAt(index)) objects.append(object);
  }
  if (rows.isEmpty()) return;
  // The keyboard goes on from a neighbour of what goes: the row below, else the rows above (a day's
  // group goes with its last item), else the task.
  std::sort(rows.begin(), rows.end(), [this](const QModelIndex& a, const QModelIndex& b) {
    return outlineView_->visualRect(a).top() < outlineView_->visualRect(b).top();
  });
  const auto goes = [&](QModelIndex index) {
    for (; index.isValid(); index = index.parent())
      if (rows.contains(index)) return true;
    return false;
  };
  QModelIndex below = outlineView_->indexBelow(rows.last()), above = outlineView_->indexAbove(rows.first());
  while (below.isValid() && goes(below)) below = outlineView_->indexBelow(below);
  while (above.isValid() && goes(above)) above = outlineView_->indexAbove(above);
  const QList<QPersistentModelIndex> neighbours{below, above, outlineView_->indexAbove(above),
                                                rows.first().parent()};
  if (!deleteObjects(context_, objects)) return;
  treeController_->processChanges();
  for (const QPersistentModelIndex& neighbour : neighbours) {
    if (!neighbour.isValid()) continue;
    outlineView_->setCurrentIndex(neighbour);
    break;
  }
}

void WTItemsViewController::selectItem(WTItem* item) {
  if (!item) return;
  refreshChildren(item);  // in its place, opened and current
  const QModelIndex index = treeController_->indexOfObject(item);
  if (!index.isValid()) return;
  outlineView_->selectionModel()->select(index,
                                         QItemSelectionModel::ClearAndSelect | QItemSelectionModel::Rows);
  delegate_->setEditField(WTItemCellDelegate::Field::Name);
  outlineView_->edit(index);
  outlineView_->scrollTo(index);
}

void WTItemsViewController::revealObjects(const QList<WTObject*>& objects) {
  if (!project_ || !outlineView_) return;
  treeController_->processChanges();
  // Only the outermost of what came back is selected: a task brings its items with it.
  const QSet<WTObject*> all(objects.begin(), objects.end());
  QList<QModelIndex> rows;
  for (WTObject* object : objects) {
    if (object->entity() == WTEntity::Task) {
      if (static_cast<WTTask*>(object)->project() != project_) continue;
    } else if (WTEntities::isItem(object->entity())) {
      auto* item = static_cast<WTItem*>(object);
      if (!item->task() || item->task()->project() != project_ || all.contains(item->task())) continue;
      expandContainerOfItem(item);
    } else {
      continue;
    }
    const QModelIndex index = treeController_->indexOfObject(object);
    if (index.isValid()) rows.append(index);
  }
  if (rows.isEmpty()) return;
  QItemSelection selection;
  for (const QModelIndex& index : rows) selection.select(index, index);
  outlineView_->selectionModel()->setCurrentIndex(rows.first(), QItemSelectionModel::NoUpdate);
  outlineView_->selectionModel()->select(selection,
                                         QItemSelectionModel::ClearAndSelect | QItemSelectionModel::Rows);
  outlineView_->scrollTo(rows.first());
}

void WTItemsViewController::expandContainerOfItem(WTItem* item) {
  if (!item || !item->task()) return;
  const QModelIndex task = treeController_->indexOfObject(item->task());
  if (task.isValid()) outlineView()->expand(task);
  const QModelIndex group = treeController_->indexOfContainerOfItem(item);
  if (group.isValid()) outlineView()->expand(group);
}
