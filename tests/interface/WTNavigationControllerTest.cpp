#include "UiFixture.h"
#include "WTNavigationController.h"

#include <QLabel>

namespace {

class Page : public WTViewController {
 public:
  explicit Page(QString name) : name_(std::move(name)) {}
  int displayed = 0;
  void willDisplayView() override { ++displayed; }

 protected:
  QWidget* loadView() override { return new QLabel(name_); }

 private:
  QString name_;
};

QList<QWidget*> visibleChildren(QWidget* parent) {
  QList<QWidget*> result;
  for (QWidget* child : parent->findChildren<QWidget*>(Qt::FindDirectChildrenOnly)) {
    if (child->isVisible()) result << child;
  }
  return result;
}

TEST(WTNavigationControllerTest, PushSlidesInAndPopSlidesBack) {
  TestHostWindow window;
  WTNavigationController stack;
  window.stack = &stack;
  window.setCentralWidget(stack.view());
  window.resize(400, 300);
  window.show();
  ASSERT_TRUE(QTest::qWaitForWindowExposed(&window));

  Page root("root"), detail("detail");
  stack.pushViewController(&root);
  EXPECT_FALSE(stack.isAnimating());  // onto an empty stack: at once
  EXPECT_EQ(root.displayed, 1);
  EXPECT_EQ(visibleChildren(stack.view()), QList<QWidget*>{root.view()});
  EXPECT_EQ(root.view()->geometry(), stack.view()->rect());

  stack.pushViewController(&detail);
  EXPECT_TRUE(stack.isAnimating());
  EXPECT_EQ(detail.displayed, 1);
  EXPECT_EQ(stack.viewControllers(), (QList<WTViewController*>{&root, &detail}));
  // Mid-slide the new view comes from the right.
  QTest::qWait(60);
  EXPECT_GT(detail.view()->x(), 0);
  ASSERT_TRUE(QTest::qWaitFor([&] { return !stack.isAnimating(); }, 2000));
  EXPECT_EQ(visibleChildren(stack.view()), QList<QWidget*>{detail.view()});
  EXPECT_EQ(detail.view()->geometry(), stack.view()->rect());

  stack.popViewController();
  EXPECT_TRUE(stack.isAnimating());
  QTest::qWait(60);
  EXPECT_LT(root.view()->x(), 0);  // back in from the left
  stack.finishAnimation();
  EXPECT_EQ(visibleChildren(stack.view()), QList<QWidget*>{root.view()});
  EXPECT_EQ(root.displayed, 1);  // a pop does not announce a display
  EXPECT_EQ(stack.viewControllers(), QList<WTViewController*>{&root});

  stack.popViewController();  // the root stays
  EXPECT_EQ(stack.viewControllers(), QList<WTViewController*>{&root});
  // Resizing keeps the one view filling the stack.
  window.resize(500, 350);
  QTest::qWait(10);
  EXPECT_EQ(root.view()->geometry(), stack.view()->rect());
}

TEST(WTNavigationControllerTest, APushFromAControllerWaitsForTheNextTurn) {
  TestHostWindow window;
  WTNavigationController stack;
  window.stack = &stack;
  window.setCentralWidget(stack.view());
  Page root("root"), detail("detail");
  stack.pushViewController(&root);
  window.show();
  root.pushViewController(&detail);
  EXPECT_EQ(stack.viewControllers().size(), 1);
  QCoreApplication::processEvents();
  EXPECT_EQ(stack.viewControllers().size(), 2);
  detail.popViewController();
  EXPECT_EQ(stack.viewControllers().size(), 1);
  // Outside a host window nothing happens.
  Page lonely("lonely"), other("other");
  lonely.view();
  lonely.pushViewController(&other);
  QCoreApplication::processEvents();
  EXPECT_EQ(other.displayed, 0);
}

}  // namespace
