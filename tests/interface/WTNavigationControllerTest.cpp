#include "UiFixture.h"

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

// A stack in a host window, with a root page and a detail page to push.
struct WTNavigationControllerTest : ::testing::Test {
  WTNavigationControllerTest() {
    window.stack = &stack;
    window.setCentralWidget(stack.view());
    window.resize(400, 300);
  }
  QList<QWidget*> visibleViews() {
    QList<QWidget*> result;
    for (QWidget* child : stack.view()->findChildren<QWidget*>(Qt::FindDirectChildrenOnly))
      if (child->isVisible()) result << child;
    return result;
  }
  TestHostWindow window;
  WTNavigationController stack;
  Page root{"root"}, detail{"detail"};
};

TEST_F(WTNavigationControllerTest, PushSlidesInAndPopSlidesBack) {
  window.show();
  ASSERT_TRUE(QTest::qWaitForWindowExposed(&window));
  stack.pushViewController(&root);
  EXPECT_FALSE(stack.isAnimating());  // onto an empty stack: at once
  EXPECT_EQ(root.displayed, 1);
  EXPECT_EQ(visibleViews(), QList<QWidget*>{root.view()});
  EXPECT_EQ(root.view()->geometry(), stack.view()->rect());

  stack.pushViewController(&detail);
  EXPECT_TRUE(stack.isAnimating());
  EXPECT_EQ(detail.displayed, 1);
  EXPECT_EQ(stack.viewControllers(), (QList<WTViewController*>{&root, &detail}));
  QTest::qWait(60);
  EXPECT_GT(detail.view()->x(), 0);  // mid-slide the new view comes from the right
  ASSERT_TRUE(QTest::qWaitFor([&] { return !stack.isAnimating(); }, 2000));
  EXPECT_EQ(visibleViews(), QList<QWidget*>{detail.view()});
  EXPECT_EQ(detail.view()->geometry(), stack.view()->rect());

  stack.popViewController();
  EXPECT_TRUE(stack.isAnimating());
  QTest::qWait(60);
  EXPECT_LT(root.view()->x(), 0);  // back in from the left
  stack.finishAnimation();
  EXPECT_EQ(visibleViews(), QList<QWidget*>{root.view()});
  EXPECT_EQ(root.displayed, 1);  // a pop does not announce a display
  stack.popViewController();     // the root stays
  EXPECT_EQ(stack.viewControllers(), QList<WTViewController*>{&root});
  // Resizing keeps the one view filling the stack.
  window.resize(500, 350);
  QTest::qWait(10);
  EXPECT_EQ(root.view()->geometry(), stack.view()->rect());
}

TEST_F(WTNavigationControllerTest, APushFromAControllerWaitsForTheNextTurn) {
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
