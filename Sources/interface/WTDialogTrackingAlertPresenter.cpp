#include "WTDialogTrackingAlertPresenter.h"

#include <QMessageBox>
#include <QPushButton>

WTTrackingAlertAnswer WTDialogTrackingAlertPresenter::runAlert(const WTTrackingAlert& alert) {
  QMessageBox box(parent_.data());
  box.setIcon(QMessageBox::Question);
  box.setWindowTitle(alert.messageText);
  box.setText(alert.messageText);
  box.setInformativeText(alert.informativeText);
  // Both buttons answer; neither is a rejection that Escape could pick behind the user's back.
  QPushButton* defaultButton = box.addButton(alert.defaultButton, QMessageBox::AcceptRole);
  QPushButton* alternateButton = box.addButton(alert.alternateButton, QMessageBox::AcceptRole);
  box.setDefaultButton(defaultButton);
  box.exec();
  return box.clickedButton() == alternateButton ? WTTrackingAlertAnswer::Alternate
                                                : WTTrackingAlertAnswer::Default;
}
