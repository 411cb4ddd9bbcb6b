#include "WTViewController.h"

#include "WTNavigationController.h"

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
