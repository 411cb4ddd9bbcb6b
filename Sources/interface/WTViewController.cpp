#include "WTViewController.h"

#include "WTDeletion.h"
#include "WTNavigationController.h"
#include "WTObjectContext.h"

#include <QAbstractItemView>
#include <QTimer>

WTViewController::WTViewController(QObject* parent) : QObject(parent) {}

WTViewController::~WTViewController() {
  // A view still inside a stack belongs to the stack's widget tree; take it out before deleting.
  delete view_.data();
}

QWidget* WTViewController::view() {
  if (!view_) view_ = loadView();
  return view_;
}

WTNavigationHost* WTViewController::navigationHost() const {
  if (!view_) return nullptr;
  return dynamic_cast<WTNavigationHost*>(view_->window());
}

void WTViewController::pushViewController(WTViewController* controller) {
  WTNavigationHost* host = navigationHost();
  if (!host || !controller) return;
  QPointer<WTNavigationController> stack = host->currentNavigationController();
  QPointer<WTViewController> pushed = controller;
  QTimer::singleShot(0, this, [stack, pushed] {
    if (stack && pushed) stack->pushViewController(pushed);
  });
}

void WTViewController::popViewController() {
  WTNavigationHost* host = navigationHost();
  if (!host) return;
  if (WTNavigationController* stack = host->currentNavigationController()) stack->popViewController();
}

bool WTViewController::respondsTo(Command) const {
  return false;
}

bool WTViewController::deleteObjects(WTObjectContext* context, const QList<WTObject*>& objects) {
  const WTDeletion deletion(objects);
  if (deletion.objects().isEmpty()) return false;
  WTNavigationHost* host = navigationHost();
  if (deletion.needsQuestion() && host && !host->confirmDeletion(deletion.question(), deletion.detail()))
    return false;
  for (WTObject* object : deletion.objects()) context->deleteObject(object);
  context->undoManager().setActionName(deletion.undoName());
  return true;
}

void WTViewController::takeBackUnlessNamed(QAbstractItemView* view, WTObjectContext* context) {
  if (!view->indexWidget(view->currentIndex())) return;  // no name editor opened
  const QPersistentModelIndex row = view->currentIndex();
  const QString step = context->undoManager().undoActionName();
  connect(
      view->itemDelegate(), &QAbstractItemDelegate::closeEditor, this,
      [view, row, step, context](QWidget*, QAbstractItemDelegate::EndEditHint hint) {
        // Escape is the one way a name editor closes without storing what it holds.
        WTUndoManager& undo = context->undoManager();
        if (hint == QAbstractItemDelegate::RevertModelCache && row.isValid() && view->currentIndex() == row &&
            undo.canUndo() && undo.undoActionName() == step)
          undo.undo();
      },
      Qt::SingleShotConnection);
}
