#include "WTNavigationController.h"

#include "WTViewController.h"

#include <QAbstractItemView>
#include <QApplication>
#include <QEasingCurve>
#include <QParallelAnimationGroup>
#include <QPropertyAnimation>
#include <QResizeEvent>

namespace {

// Keeps the showing child the size of the container, as an autoresizing subview would.
class WTStackView : public QWidget {
 public:
  explicit WTStackView(WTNavigationController* owner) : owner_(owner) {
    setObjectName(QStringLiteral("WTStackView"));
  }

 protected:
  void resizeEvent(QResizeEvent* event) override {
    QWidget::resizeEvent(event);
    owner_->finishAnimation();
    if (WTViewController* top = owner_->topViewController()) {
      if (top->isViewLoaded() && top->view()->parentWidget() == this) top->view()->setGeometry(rect());
    }
  }

 private:
  WTNavigationController* owner_;
};

constexpr int kSlideMilliseconds = 250;

}  // namespace

WTNavigationController::WTNavigationController(QObject* parent) : QObject(parent) {}

WTNavigationController::~WTNavigationController() {
  if (animation_) animation_->stop();
  // The views inside go with the container; their controllers make new ones if asked again.
  delete view_.data();
}

QWidget* WTNavigationController::view() {
  if (!view_) {
    view_ = new WTStackView(this);
    view_->setSizePolicy(QSizePolicy::Expanding, QSizePolicy::Expanding);
  }
  return view_;
}

WTViewController* WTNavigationController::topViewController() const {
  return viewControllers_.isEmpty() ? nullptr : viewControllers_.last();
}

void WTNavigationController::pushViewController(WTViewController* controller) {
  if (!controller || viewControllers_.contains(controller)) return;
  finishAnimation();
  QWidget* stack = view();
  WTViewController* previous = topViewController();
  QWidget* old = previous && previous->isViewLoaded() && previous->view()->parentWidget() == stack
                     ? previous->view()
                     : nullptr;
  QWidget* next = controller->view();
  next->setParent(stack);
  next->setGeometry(stack->rect());
  controller->willDisplayView();
  viewControllers_.append(controller);
  if (old) {
    replaceView(old, next, true);
  } else {
    next->show();
  }
  emit topViewControllerChanged();
}

void WTNavigationController::popViewController() {
  if (viewControllers_.size() < 2) return;
  finishAnimation();
  WTViewController* leaving = viewControllers_.takeLast();
  WTViewController* top = viewControllers_.last();
  QWidget* stack = view();
  QWidget* old = leaving->isViewLoaded() ? leaving->view() : nullptr;
  QWidget* next = top->view();
  next->setParent(stack);
  next->setGeometry(old ? old->geometry() : stack->rect());
  if (old && old->parentWidget() == stack) {
    replaceView(old, next, false);
  } else {
    next->show();
  }
  emit topViewControllerChanged();
}

void WTNavigationController::focusView(QWidget* view) {
  auto* list = view->findChild<QAbstractItemView*>();
  (list ? static_cast<QWidget*>(list) : view)->setFocus(Qt::OtherFocusReason);
}

void WTNavigationController::replaceView(QWidget* old, QWidget* next, bool push) {
  QWidget* stack = view();
  // The keyboard goes on in the view shown, not wherever Qt sends it when the old one hides.
  const QWidget* focused = QApplication::focusWidget();
  const bool keepsFocus = focused && (focused == old || old->isAncestorOf(focused));
  const int width = stack->width();
  const QRect bounds = stack->rect();
  next->setGeometry(bounds.translated(push ? width : -width, 0));
  next->show();
  next->raise();
  if (keepsFocus) focusView(next);
  if (!stack->isVisible() || width <= 0) {
    // Nothing to watch: end in the final state at once.
    next->setGeometry(bounds);
    old->hide();
    old->setParent(nullptr);
    return;
  }
  auto* group = new QParallelAnimationGroup(this);
  auto slide = [&](QWidget* widget, QRect from, QRect to) {
    auto* animation = new QPropertyAnimation(widget, "geometry", group);
    animation->setDuration(kSlideMilliseconds);
    animation->setEasingCurve(QEasingCurve::InOutQuad);
    animation->setStartValue(from);
    animation->setEndValue(to);
    group->addAnimation(animation);
  };
  slide(next, next->geometry(), bounds);
  slide(old, bounds, bounds.translated(push ? -width : width, 0));
  leaving_ = old;
  animation_ = group;
  connect(group, &QAbstractAnimation::finished, this, [this, group] {
    if (leaving_) {
      leaving_->hide();
      leaving_->setParent(nullptr);
    }
    leaving_ = nullptr;
    if (WTViewController* top = topViewController()) top->view()->setGeometry(view()->rect());
    group->deleteLater();
  });
  group->start();
}

bool WTNavigationController::isAnimating() const {
  return animation_ && animation_->state() == QAbstractAnimation::Running;
}

void WTNavigationController::finishAnimation() {
  if (!isAnimating()) return;
  // Jumping to the end runs the finished handler, which settles the views.
  animation_->setCurrentTime(animation_->totalDuration());
}
