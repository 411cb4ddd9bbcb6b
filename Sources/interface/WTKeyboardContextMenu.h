#pragma once

#include <QObject>

// Shift+F10 opens the focused widget's context menu as the Menu key does; the windowing system turns only
// that key into a menu request, and many keyboards have none. In a list or an outline the menu is the
// current row's, as a right click there would open it. Installed on the application.
class WTKeyboardContextMenu : public QObject {
 public:
  using QObject::QObject;

 protected:
  bool eventFilter(QObject* watched, QEvent* event) override;
};
