#include "WTDialogAlertPresenter.h"

#include <QCoreApplication>
#include <QDir>
#include <QFileInfo>
#include <QLocale>
#include <QMessageBox>
#include <QPushButton>

bool WTDialogAlertPresenter::presentError(const QString& message) {
  QMessageBox box(QMessageBox::Warning, QCoreApplication::applicationName(), message, QMessageBox::Ok,
                  parent_);
  box.exec();
  return false;
}

bool WTDialogAlertPresenter::confirmQuitAnyway() {
  QMessageBox box(parent_);
  box.setIcon(QMessageBox::Warning);
  box.setText(
      QCoreApplication::translate("WTAppDelegate", "Could not save changes while quitting. Quit anyway?"));
  QPushButton* quit =
      box.addButton(QCoreApplication::translate("WTAppDelegate", "Quit anyway"), QMessageBox::AcceptRole);
  QPushButton* cancel =
      box.addButton(QCoreApplication::translate("WTAppDelegate", "Cancel"), QMessageBox::RejectRole);
  box.setDefaultButton(quit);
  box.setEscapeButton(cancel);
  box.exec();
  return box.clickedButton() != cancel;
}

bool WTDialogAlertPresenter::confirmDeletion(const QString& question, const QString& detail) {
  QMessageBox box(parent_);
  box.setIcon(QMessageBox::Warning);
  box.setText(question);
  box.setInformativeText(detail);
  QPushButton* remove = box.addButton(QCoreApplication::translate("WTMainWindowController", "Delete"),
                                      QMessageBox::DestructiveRole);
  QPushButton* cancel =
      box.addButton(QCoreApplication::translate("WTMainWindowController", "Cancel"), QMessageBox::RejectRole);
  // Return keeps what is there: a deletion is chosen, never fallen into.
  box.setDefaultButton(cancel);
  box.setEscapeButton(cancel);
  box.exec();
  return box.clickedButton() == remove;
}

bool WTDialogAlertPresenter::offerRestore(const QString& message, const QString& backup) {
  QMessageBox box(parent_);
  box.setIcon(QMessageBox::Warning);
  box.setText(message);
  const QString made = QLocale().toString(QFileInfo(backup).lastModified(), QLocale::LongFormat);
  box.setInformativeText(
      QCoreApplication::translate("WTAppDelegate",
                                  "The newest good backup is “%1”, made %2. Restore it? The "
                                  "damaged file is kept beside the restored one.")
          .arg(QDir::toNativeSeparators(backup), made));
  QPushButton* restore =
      box.addButton(QCoreApplication::translate("WTAppDelegate", "Restore Backup"), QMessageBox::AcceptRole);
  QPushButton* keep =
      box.addButton(QCoreApplication::translate("WTAppDelegate", "Don’t Restore"), QMessageBox::RejectRole);
  box.setDefaultButton(restore);
  box.setEscapeButton(keep);
  box.exec();
  return box.clickedButton() == restore;
}

void WTDialogAlertPresenter::presentSyncError(const QString& message) {
  QMessageBox box(parent_);
  box.setIcon(QMessageBox::Warning);
  box.setText(QCoreApplication::translate("RZSyncManager", "Sync Error"));
  box.setInformativeText(message);
  box.addButton(QCoreApplication::translate("RZSyncManager", "Ok"), QMessageBox::AcceptRole);
  box.exec();
}

void WTDialogAlertPresenter::presentNetworkError(const QString& message) {
  presentError(message);
}
