#include "UiFixture.h"

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

// Pushes slide in from the right and pops from the left; a page's push waits for the next turn.
TEST(WTNavigationControllerTest, PushSlidesInAndPopSlidesBack) {
  TestHostWindow window;
  WTNavigationController stack;
  Page root{"root"}, detail{"detail"};
  window.stack = &stack;
  window.setCentralWidget(stack.view());
  window.resize(400, 300);
  window.show();
  ASSERT_TRUE(QTest::qWaitForWindowExposed(&window));
  auto shown = [&] {
    QList<QWidget*> views;
    for (QWidget* child : stack.view()->findChildren<QWidget*>(Qt::FindDirectChildrenOnly))
      if (child->isVisible()) views << child;
    EXPECT_EQ(views.value(0)->geometry(), stack.view()->rect());
    return views;
  };
  stack.pushViewController(&root);
  EXPECT_FALSE(stack.isAnimating());
  EXPECT_EQ(shown(), QList<QWidget*>{root.view()});
  root.pushViewController(&detail);
  EXPECT_EQ(stack.viewControllers().size(), 1);
  QCoreApplication::processEvents();
  EXPECT_EQ(stack.viewControllers(), (QList<WTViewController*>{&root, &detail}));
  EXPECT_TRUE(stack.isAnimating());
  EXPECT_EQ(root.displayed + detail.displayed, 2);
  QTest::qWait(60);
  EXPECT_GT(detail.view()->x(), 0);  // coming in from the right
  ASSERT_TRUE(QTest::qWaitFor([&] { return !stack.isAnimating(); }, 2000));
  EXPECT_EQ(shown(), QList<QWidget*>{detail.view()});
  detail.popViewController();
  EXPECT_TRUE(stack.isAnimating());
  QTest::qWait(60);
  EXPECT_LT(root.view()->x(), 0);
  stack.finishAnimation();
  EXPECT_EQ(shown(), QList<QWidget*>{root.view()});
  EXPECT_EQ(root.displayed, 1);  // a pop does not announce a display
  stack.popViewController();     // the root stays
  EXPECT_EQ(stack.viewControllers(), QList<WTViewController*>{&root});
  window.resize(500, 350);
  QTest::qWait(10);
  EXPECT_EQ(shown(), QList<QWidget*>{root.view()});

  Page lonely("lonely"), other("other");
  lonely.view();
  lonely.pushViewController(&other);
  QCoreApplication::processEvents();
  EXPECT_EQ(other.displayed, 0);
}

}  // namespace
