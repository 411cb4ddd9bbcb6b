#pragma once

#include "Date.h"
#include "Decimal.h"
#include "WTItem.h"
#include "WTTask.h"

#include <QAbstractItemModel>
#include <QHash>
#include <QPointer>
#include <QSet>
#include <QTimer>

#include <memory>
#include <optional>
#include <utility>
#include <vector>

class QMimeData;
class WTItemContainer;
class WTObject;
class WTObjectContext;
class WTProject;

// One project as a tree for the items outline: its tasks in their stored order (level 0), each
// task's groups, "Pending" first and then one per day, newest first (level 1), and the groups' items
// (level 2).
//
// The tree follows the records by itself: changes are collected as they are announced and applied
// once per event-loop turn (or at once by processChanges) as exact row inserts, removals and moves, so
// the outline keeps its expanded rows and selection; a change of a total repaints only the rows that
// show it. Drag and drop carries the private types "WTObjectUUIDs" and "WTContainsTasks"; a drop is
// carried out by the records' own operations (WTProject::moveTasks, WTTask::adoptItems).
class WTItemsModel : public QAbstractItemModel {
  Q_OBJECT
 public:
  enum Role {
    ObjectRole = Qt::UserRole + 1,  // the task or item as a pointer (quintptr); none for groups
    KindRole,                       // "WTTask", "WTItemContainer", "WTTime", "WTFlat", "WTNote", ...
    NameRole,                       // a task's or item's name; a group's title
    LabelRole,                      // a time entry's start ("HH:mm"), another item's kind
    NotesRole,
    DurationTextRole,  // empty where the row has no duration
    CostTextRole,      // empty where the row has no cost
    DurationEditRole,  // time entries and flat fees: the duration as text, settable ("1:30")
    AmountEditRole,    // expenses: the exact amount as typed in the user's locale, settable
    ImageRole,         // tasks: "notepad_32" or "notepad_clock_32"
    TimerImageRole,    // tasks: "play_32" or "stop_32"; running time entries: "stop_32"
    RunningRole,
    CompletedRole,      // to-dos, settable
    DateRole,           // items: the start date as a QDateTime
    StartTimeEditRole,  // time entries: the start's hour and minute ("9:05"), settable on its day
    // Stopped time entries: the end's hour and minute, settable on its day but not before the start.
    EndTimeEditRole,
    // Stopped time entries: the duration as DurationEditRole, set by moving the start (the end stays).
    SpentDurationEditRole,
    BudgetRole,  // tasks with a budget: a WTBudgetState
    // What a task, group or item bills where it differs from the duration and cost shown ("billed 0:15
    // · 25.00"); empty where they agree.
    BilledTextRole,
  };

  static const QString kObjectUUIDsType;    // "WTObjectUUIDs"
  static const QString kContainsTasksType;  // "WTContainsTasks"

  // `context` is not owned and must outlive the model.
  explicit WTItemsModel(WTObjectContext* context, QObject* parent = nullptr);
  ~WTItemsModel() override;

  WTObjectContext* context() const { return context_; }
  WTProject* project() const { return project_; }
  // Shows `project` (none shows nothing); rebuilds the tree (a model reset).
  void setProject(WTProject* project);

  // Lookups; invalid indexes when the row does not exist (yet).
  QModelIndex indexOfObject(const WTObject* object) const;
  QModelIndex indexOfContainer(const WTTask* task, std::optional<Date> day) const;
  // The group row that holds `item` (its day's, or "Pending" for an open to-do).
  QModelIndex indexOfContainerOfItem(const WTItem* item) const;
  WTObject* objectAt(const QModelIndex& index) const;
  std::shared_ptr<WTItemContainer> containerAt(const QModelIndex& index) const;
  bool isTaskIndex(const QModelIndex& index) const;
  bool isContainerIndex(const QModelIndex& index) const;
  bool isItemIndex(const QModelIndex& index) const;
  // "WTTask", "WTItemContainer" or the item's entity name.
  QString kindAt(const QModelIndex& index) const;

  // A text that names the row across launches (tasks and items by uuid, groups by task and day) and
  // back; an invalid index when the row is gone.
  QString persistentIdentity(const QModelIndex& index) const;
  QModelIndex indexForPersistentIdentity(const QString& identity) const;

  // Applies the collected changes now.
  void processChanges();
  bool hasPendingChanges() const;

  // QAbstractItemModel
  QModelIndex index(int row, int column, const QModelIndex& parent = QModelIndex()) const override;
  QModelIndex parent(const QModelIndex& child) const override;
  int rowCount(const QModelIndex& parent = QModelIndex()) const override;
  int columnCount(const QModelIndex& parent = QModelIndex()) const override;
  bool hasChildren(const QModelIndex& parent = QModelIndex()) const override;
  QVariant data(const QModelIndex& index, int role = Qt::DisplayRole) const override;
  bool setData(const QModelIndex& index, const QVariant& value, int role = Qt::EditRole) override;
  // "billed 0:15 · 25.00": the billed duration where it differs from the raw one, and the billed cost
  // where its text or the duration differs (raw durations first, billed second); empty where all agree.
  static QString billedText(std::optional<std::pair<int, int>> durations, const Decimal& cost,
                            const Decimal& billed, const QString& currency);
  // Why `text` set under `role` (a duration) would be refused, for the person who typed it; empty when it
  // would be taken.
  static QString refusalFor(int role, const QString& text);
  // The same for the row at `index`, which also answers an expense's amount (in its currency) and a start
  // or end time of day: one that is not a time, or that would put the start after the end.
  QString refusalFor(const QModelIndex& index, int role, const QString& text) const;
  Qt::ItemFlags flags(const QModelIndex& index) const override;

  // Drag and drop (WTItemsModelDragAndDrop.cpp).
  QStringList mimeTypes() const override;
  // Carries the uuids of the tasks and items among `indexes`, in outline order; none (a refused
  // drag) when no task or item is among them.
  QMimeData* mimeData(const QModelIndexList& indexes) const override;
  // Tasks (the flag set) only between top-level rows; items only onto a task or a group row.
  bool canDropMimeData(const QMimeData* data, Qt::DropAction action, int row, int column,
                       const QModelIndex& parent) const override;
  bool dropMimeData(const QMimeData* data, Qt::DropAction action, int row, int column,
                    const QModelIndex& parent) override;
  Qt::DropActions supportedDropActions() const override;
  Qt::DropActions supportedDragActions() const override;

  // Why a move onto `task` is refused: the entry would share time with another of the task's there.
  static QString clashRefusal(const WTTask& task, const WTTask::Clash& clash);
  // The uuids and the flag of a drag, as mimeData wrote them.
  static QStringList objectUUIDs(const QMimeData* data);
  static bool containsTasks(const QMimeData* data);

 signals:
  // The shown project's name, notes, rate or totals changed.
  void projectChanged();
  // The shown project was deleted; the model now shows nothing.
  void projectDeleted();
  // A drop moved these tasks (in the project's order) or items (to another task, day or back to
  // "Pending").
  void recordsDropped(const QList<WTObject*>& records);
  // A drop moved nothing, for this reason (clashRefusal).
  void dropRefused(const QString& reason);

 private:
  struct Node;  // WTItemsModelNode.h
  // The tree and its rows (WTItemsModel.cpp).
  Node* nodeOf(const QModelIndex& index) const;
  QModelIndex indexOfNode(const Node* node) const;
  std::unique_ptr<Node> makeTaskNode(WTTask* task, Node* parent);
  std::unique_ptr<Node> makeContainerNode(std::shared_ptr<WTItemContainer> container, Node* parent);
  std::unique_ptr<Node> makeItemNode(WTItem* item, Node* parent);
  void forget(Node* node);
  // Following the store (WTItemsModelChanges.cpp).
  template <class Key>
  struct ChildRows;
  void syncTasks();
  void syncTask(Node* taskNode);
  void syncContainerItems(Node* containerNode);
  void objectValueDidChange(WTObject* object, const QString& key);
  void objectsDidChange(const QList<WTObject*>& inserted, const QList<WTObject*>& updated,
                        const QList<WTObject*>& deleted);
  void markTaskDirty(WTTask* task);
  void markChanged(const WTObject* object);
  void markSubtreeChanged(const Node* node);
  void schedule();
  bool belongsHere(const WTObject* object) const;

  WTObjectContext* context_;
  WTProject* project_ = nullptr;
  std::unique_ptr<Node> root_;
  QHash<const WTObject*, Node*> nodes_;
  QSet<WTTask*> dirtyTasks_;
  bool tasksDirty_ = false;
  QSet<const WTObject*> changed_;
  QTimer flushTimer_;
};
