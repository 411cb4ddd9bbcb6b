#pragma once

#include <QList>
#include <QObject>
#include <QPointer>
#include <QWidget>

class QPropertyAnimation;
class QParallelAnimationGroup;
class WTViewController;

// One navigation stack: an ordered list of controllers (index 0 the root, the last on top) whose top
// view fills the stack's view. A push slides the new view in from the right, a pop from the left,
// each over 250 ms, easing in and out.
class WTNavigationController : public QObject {
  Q_OBJECT
 public:
  explicit WTNavigationController(QObject* parent = nullptr);
  ~WTNavigationController() override;

  // The stack's own view: a plain container that keeps its one child filling it. Made on first call.
  QWidget* view();

  const QList<WTViewController*>& viewControllers() const { return viewControllers_; }
  WTViewController* topViewController() const;

  // Puts `controller` on top: its view gets the stack's bounds, it is told willDisplayView, and it
  // slides in over the old top (at once, without animation, onto an empty stack). Not owned.
  void pushViewController(WTViewController* controller);
  // Takes the top controller off and slides the one below back in. The root never pops.
  void popViewController();

  // Slides `next` in over `old` (from the right when pushing, from the left when popping); `old`
  // leaves the stack's view when the slide ends.
  void replaceView(QWidget* old, QWidget* next, bool push);
  // Gives the keyboard to a view shown: to its list or outline, not to the fields above it (typing in
  // a rate field changes money). No focus proxy does it: Tab would then jump from the view's
  // neighbours straight into the list, past the fields.
  static void focusView(QWidget* view);
  bool isAnimating() const;
  // Ends a running slide at once, in its final state.
  void finishAnimation();

 signals:
  // The top controller changed.
  void topViewControllerChanged();

 private:
  QList<WTViewController*> viewControllers_;
  QPointer<QWidget> view_;
  QPointer<QParallelAnimationGroup> animation_;
  QPointer<QWidget> leaving_;
};
