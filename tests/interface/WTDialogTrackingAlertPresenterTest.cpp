#include "WTDialogTrackingAlertPresenter.h"

#include <gtest/gtest.h>

#include <QApplication>
#include <QMessageBox>
#include <QPushButton>
#include <QTest>
#include <QTimer>

#include <functional>

namespace {

const WTTrackingAlert kQuit{QStringLiteral("Running Timer"),
                            QStringLiteral("Would you like to stop the running timers before quitting?"),
                            QStringLiteral("Stop"), QStringLiteral("Keep running")};

// Acts on the message box once it is on screen, from inside its own event loop.
void whenShown(const std::function<void(QMessageBox*)>& act) {
  QTimer::singleShot(0, [act] {
    auto* box = qobject_cast<QMessageBox*>(QApplication::activeModalWidget());
    if (!box) {
      ADD_FAILURE() << "no message box is open";
      return;
    }
    act(box);
  });
}

QPushButton* buttonTitled(QMessageBox* box, const QString& title) {
  for (QAbstractButton* button : box->buttons()) {
    if (button->text() == title) return qobject_cast<QPushButton*>(button);
  }
  return nullptr;
}

TEST(WTDialogTrackingAlertPresenterTest, ShowsTheTextsAndAnswersWithTheButtonClicked) {
  WTDialogTrackingAlertPresenter presenter;
  bool checked = false;
  whenShown([&](QMessageBox* box) {
    EXPECT_EQ(box->text(), kQuit.messageText);
    EXPECT_EQ(box->informativeText(), kQuit.informativeText);
    EXPECT_EQ(box->buttons().size(), 2);
    ASSERT_NE(buttonTitled(box, QStringLiteral("Stop")), nullptr);
    EXPECT_EQ(box->defaultButton(), buttonTitled(box, QStringLiteral("Stop")));
    checked = true;
    QTest::mouseClick(buttonTitled(box, QStringLiteral("Keep running")), Qt::LeftButton);
  });
  EXPECT_EQ(presenter.runAlert(kQuit), WTTrackingAlertAnswer::Alternate);
  EXPECT_TRUE(checked);
}

TEST(WTDialogTrackingAlertPresenterTest, ReturnChoosesTheDefaultAndEscapeChoosesNothing) {
  WTDialogTrackingAlertPresenter presenter;
  whenShown([](QMessageBox* box) {
    QTest::keyClick(box, Qt::Key_Escape);
    const bool stillOpen = box->isVisible();
    EXPECT_TRUE(stillOpen) << "Escape must not answer for the user";
    if (stillOpen) QTest::keyClick(box, Qt::Key_Return);
  });
  EXPECT_EQ(presenter.runAlert(kQuit), WTTrackingAlertAnswer::Default);
}

}  // namespace
