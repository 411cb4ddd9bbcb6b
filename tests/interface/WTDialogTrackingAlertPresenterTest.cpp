#include "WTDialogTrackingAlertPresenter.h"

#include <gtest/gtest.h>

#include <QApplication>
#include <QMessageBox>
#include <QPushButton>
#include <QTest>
#include <QTimer>

#include <functional>

namespace {

const WTTrackingAlert kQuit{"Running Timer", "Would you like to stop the running timers before quitting?",
                            "Stop", "Keep running"};

// Runs the alert and acts on its message box once it is on screen, from inside its own event loop.
WTTrackingAlertAnswer answer(const std::function<void(QMessageBox*)>& act) {
  QTimer::singleShot(0, [act] {
    auto* box = qobject_cast<QMessageBox*>(QApplication::activeModalWidget());
    ASSERT_NE(box, nullptr) << "no message box is open";
    act(box);
  });
  return WTDialogTrackingAlertPresenter().runAlert(kQuit);
}

QAbstractButton* buttonTitled(QMessageBox* box, const QString& title) {
  for (QAbstractButton* button : box->buttons())
    if (button->text() == title) return button;
  return nullptr;
}

// The texts are shown, Return chooses the default, the other button its answer; Escape chooses nothing.
TEST(WTDialogTrackingAlertPresenterTest, ShowsTheTextsAndAnswersWithTheButtonChosen) {
  bool checked = false;
  EXPECT_EQ(answer([&](QMessageBox* box) {
              EXPECT_EQ(box->text(), kQuit.messageText);
              EXPECT_EQ(box->informativeText(), kQuit.informativeText);
              EXPECT_EQ(box->buttons().size(), 2);
              ASSERT_NE(buttonTitled(box, "Stop"), nullptr);
              EXPECT_EQ(box->defaultButton(), buttonTitled(box, "Stop"));
              checked = true;
              QTest::mouseClick(buttonTitled(box, "Keep running"), Qt::LeftButton);
            }),
            WTTrackingAlertAnswer::Alternate);
  EXPECT_TRUE(checked);
  EXPECT_EQ(answer([](QMessageBox* box) {
              QTest::keyClick(box, Qt::Key_Escape);
              EXPECT_TRUE(box->isVisible()) << "Escape must not answer for the user";
              if (box->isVisible()) QTest::keyClick(box, Qt::Key_Return);
            }),
            WTTrackingAlertAnswer::Default);
}

}  // namespace
