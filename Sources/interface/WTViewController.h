#pragma once

#include <QObject>
#include <QPointer>
#include <QWidget>

class QAbstractItemView;
class WTNavigationController;
class WTObject;
class WTObjectContext;

// What a window that holds navigation stacks offers the controllers inside them.
class WTNavigationHost {
 public:
  virtual ~WTNavigationHost() = default;
  // The stack on screen.
  virtual WTNavigationController* currentNavigationController() const = 0;
  virtual void showProjects() = 0;
  virtual void showClients() = 0;
  // Asks the user whether to delete what `question` names (`detail`, when not empty, says more);
  // true for "Delete".
  virtual bool confirmDeletion(const QString& question, const QString& detail) = 0;
};

// Base of every list controller that lives in a navigation stack. It owns its view (made on first
// use by loadView) and answers the window's forwarded commands; a command it does not implement is
// dropped by the window (respondsTo says which it implements).
class WTViewController : public QObject {
  Q_OBJECT
 public:
  enum class Command { AddObject, RemoveSelectedObjects, ToggleArchive, Report, SelectedObject, ToggleTimer };

  explicit WTViewController(QObject* parent = nullptr);
  ~WTViewController() override;

  // The controller's view, made on first call. Owned by the controller unless a parent widget took it.
  QWidget* view();
  bool isViewLoaded() const { return view_ != nullptr; }

  // Shows `controller` on top of the visible stack, on the next turn of the event loop (after the
  // current action, such as a double click, has finished). Nothing happens outside a host window.
  void pushViewController(WTViewController* controller);
  // Takes this stack's top controller off, at once.
  void popViewController();
  // The window holding the view, when it hosts navigation stacks.
  WTNavigationHost* navigationHost() const;

  // Called just before the view is shown by a push; refreshes what it shows.
  virtual void willDisplayView() {}

  virtual bool respondsTo(Command command) const;
  virtual void addObject() {}
  virtual void removeSelectedObjects() {}
  virtual void toggleArchive() {}
  virtual void report() {}
  virtual void toggleTimer() {}
  // The record the toolbar's archive label follows; none for no selection.
  virtual WTObject* selectedObject() const { return nullptr; }

 signals:
  // The selection, or something the toolbar shows about it, changed: the window revalidates.
  void validationChanged();

 protected:
  virtual QWidget* loadView() = 0;
  // Deletes `objects` (and what they hold) from `context` as one undo step named after them. When
  // items or a running timer would go, the host window asks first (outside one nobody can be asked);
  // returns false when the user kept them.
  bool deleteObjects(WTObjectContext* context, const QList<WTObject*>& objects);
  // Escape in the name of the record just added in `view`'s current row, before anything is typed, takes
  // the addition back as Undo would: a nameless row stayed, one the commands cannot name. Called with the
  // name's editor open, the addition the last step of `context`'s undo.
  void takeBackUnlessNamed(QAbstractItemView* view, WTObjectContext* context);

 private:
  QPointer<QWidget> view_;
};
