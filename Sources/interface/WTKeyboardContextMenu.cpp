#include "WTKeyboardContextMenu.h"

#include <QAbstractItemView>
#include <QCoreApplication>
#include <QContextMenuEvent>
#include <QKeyEvent>

bool WTKeyboardContextMenu::eventFilter(QObject* watched, QEvent* event) {
  if (event->type() != QEvent::KeyPress) return false;
  const auto* key = static_cast<QKeyEvent*>(event);
  if (key->key() != Qt::Key_F10 || key->modifiers() != Qt::ShiftModifier) return false;
  // The first widget to hear the key is the focused one: taken here, it goes no further.
  auto* widget = qobject_cast<QWidget*>(watched);
  if (!widget) return false;
  // A view's request goes through its viewport, as a right click's does: its handlers read the point
  // there, and its current row is under it.
  QWidget* target = widget;
  QPoint point = widget->rect().center();
  if (auto* view = qobject_cast<QAbstractItemView*>(widget); view && view->currentIndex().isValid()) {
    target = view->viewport();
    point = view->visualRect(view->currentIndex()).center();
  }
  QContextMenuEvent request(QContextMenuEvent::Keyboard, point, target->mapToGlobal(point));
  QCoreApplication::sendEvent(target, &request);
  return true;
}
