#include "WTDialogTrackingAlertPresenter.h"

#include <gtest/gtest.h>

#include <QtTest>
#include <QtWidgets>

#include <functional>

namespace {

// Runs the alert and acts on its message box once it is on screen, from inside its own event loop.
WTTrackingAlertAnswer answer(const std::function<void(QMessageBox*)>& act) {
  QTimer::singleShot(0, [act] {
    auto* box = qobject_cast<QMessageBox*>(QApplication::activeModalWidget());
    ASSERT_NE(box, nullptr) << "no message box is open";
    act(box);
  });
  return WTDialogTrackingAlertPresenter().runAlert(
      {"Running Timer", "Stop the running timers before quitting?", "Stop", "Keep running"});
}

// The texts are shown, Return chooses the default, the other button its answer; Escape chooses nothing.
TEST(WTDialogTrackingAlertPresenterTest, ShowsTheTextsAndAnswersWithTheButtonChosen) {
  QStringList shown;
  EXPECT_EQ(answer([&](QMessageBox* box) {
              shown << box->text() << box->informativeText() << box->defaultButton()->text();
              for (QAbstractButton* button : box->buttons()) shown << button->text();
              QTest::mouseClick(box->buttons().value(shown.indexOf("Keep running") - 3), Qt::LeftButton);
            }),
            WTTrackingAlertAnswer::Alternate);
  shown.sort();
  EXPECT_EQ(shown, QStringList({"Keep running", "Running Timer", "Stop", "Stop",
                                "Stop the running timers before quitting?"}));
  EXPECT_EQ(answer([](QMessageBox* box) {
              QTest::keyClick(box, Qt::Key_Escape);
              EXPECT_TRUE(box->isVisible()) << "Escape must not answer for the user";
              if (box->isVisible()) QTest::keyClick(box, Qt::Key_Return);
            }),
            WTTrackingAlertAnswer::Default);
}

}  // namespace
