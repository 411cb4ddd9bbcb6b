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

namespace {

enum class Answer { Yes, No, Neither };  // Neither: the box was closed by something other than the user

// A warning that asks one question with two answers. Escape always means no.
Answer ask(QWidget* parent, const QString& text, const QString& detail, const QString& yes,
           QMessageBox::ButtonRole yesRole, const QString& no, bool yesIsDefault) {
  QMessageBox box(parent);
  box.setIcon(QMessageBox::Warning);
  box.setText(text);
  box.setInformativeText(detail);
  QPushButton* accept = box.addButton(yes, yesRole);
  QPushButton* reject = box.addButton(no, QMessageBox::RejectRole);
  box.setDefaultButton(yesIsDefault ? accept : reject);
  box.setEscapeButton(reject);
  box.exec();
  if (box.clickedButton() == accept) return Answer::Yes;
  return box.clickedButton() == reject ? Answer::No : Answer::Neither;
}

}  // namespace

bool WTDialogAlertPresenter::confirmQuitAnyway() {
  // Only an explicit Cancel keeps the application running.
  return ask(parent_,
             QCoreApplication::translate("WTAppDelegate",
                                         "Could not save changes while quitting. Quit anyway?"),
             {}, QCoreApplication::translate("WTAppDelegate", "Quit anyway"), QMessageBox::AcceptRole,
             QCoreApplication::translate("WTAppDelegate", "Cancel"), true) != Answer::No;
}

bool WTDialogAlertPresenter::confirmDeletion(const QString& question, const QString& detail) {
  // Return keeps what is there: a deletion is chosen, never fallen into.
  return ask(parent_, question, detail, QCoreApplication::translate("WTMainWindowController", "Delete"),
             QMessageBox::DestructiveRole, QCoreApplication::translate("WTMainWindowController", "Cancel"),
             false) == Answer::Yes;
}

bool WTDialogAlertPresenter::offerRestore(const QString& message, const QString& backup) {
  const QString made = QLocale().toString(QFileInfo(backup).lastModified(), QLocale::LongFormat);
  return ask(parent_, message,
             QCoreApplication::translate("WTAppDelegate",
                                         "The newest good backup is “%1”, made %2. Restore it? The "
                                         "damaged file is kept beside the restored one.")
                 .arg(QDir::toNativeSeparators(backup), made),
             QCoreApplication::translate("WTAppDelegate", "Restore Backup"), QMessageBox::AcceptRole,
             QCoreApplication::translate("WTAppDelegate", "Don’t Restore"), true) == Answer::Yes;
}

void WTDialogAlertPresenter::presentSyncError(const QString& message) {
  QMessageBox box(parent_);
  box.setIcon(QMessageBox::Warning);
  box.setText(QCoreApplication::translate("RZSyncManager", "Sync Error"));
  box.setInformativeText(message);
  box.addButton(QCoreApplication::translate("RZSyncManager", "Ok"), QMessageBox::AcceptRole);
  box.exec();
}

namespace {

QString unreachableSummary() {
  return QCoreApplication::translate("RZSyncManager", "Sync cannot reach the server");
}

}  // namespace

void WTDialogAlertPresenter::networkRecovered() {
  if (withdraw_) withdraw_(unreachableSummary());
}

void WTDialogAlertPresenter::presentNetworkError(const QString& message) {
  const QString summary = unreachableSummary();
  const QString body =
      QCoreApplication::translate("RZSyncManager",
                                  "%1. Your changes are kept here and sent when the server answers again.")
          .arg(message);
  if (noticeSink_) return noticeSink_(summary, body);
  presentError(summary + u'\n' + body);
}

void WTDialogAlertPresenter::presentMergeNotice(const QString& summary, const QString& message) {
  if (noticeSink_) return noticeSink_(summary, message);
  presentError(summary + u'\n' + message);
}
