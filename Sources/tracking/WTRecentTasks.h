#pragma once

#include <QList>
#include <QObject>

class WTObject;
class WTObjectContext;
class WTTask;

// The tasks a quick start needs most, for the tray's list: running tasks first, then by the latest end of
// their time entries, newest first (tasks never tracked last, in the store's order); at most `limit`.
//
// While active (the list is on screen) it follows the store and says when the list changed; while not, it
// only notes that something changed and arranges again when asked, so the store's changes cost nothing
// while nobody looks.
class WTRecentTasks : public QObject {
  Q_OBJECT
 public:
  static constexpr int kDefaultLimit = 5;

  // `context` (not owned) must outlive the controller.
  explicit WTRecentTasks(WTObjectContext* context, int limit = kDefaultLimit, QObject* parent = nullptr);

  // The arranged tasks, arranged afresh first when something changed since.
  const QList<WTTask*>& tasks();
  int limit() const { return limit_; }

  bool isActive() const { return active_; }
  // Active: follows the store from now on (arranging now); inactive: waits to be asked.
  void setActive(bool active);

 signals:
  // While active, after a change of the store changed the arranged tasks or their order.
  void tasksDidChange();

 private:
  void objectsDidChange(const QList<WTObject*>& inserted, const QList<WTObject*>& updated,
                        const QList<WTObject*>& deleted);
  // Arranges; returns whether the list differs from before.
  bool rearrangeObjects();

  WTObjectContext* context_;
  int limit_;
  bool active_ = false;
  bool dirty_ = true;
  QList<WTTask*> arranged_;
};
