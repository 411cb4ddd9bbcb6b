#include "WTSaveLocation.h"

#include <QDir>
#include <QFileDialog>
#include <QFileInfo>
#include <QStandardPaths>

namespace {

// The folder saved into last in this run; reports and exports of a month go to one folder.
QString& lastFolder() {
  static QString folder;
  return folder;
}

}  // namespace

QString askForSaveLocation(QWidget* parent, const WTSaveRequest& request) {
  QFileDialog dialog(parent, request.title);
  dialog.setAcceptMode(QFileDialog::AcceptSave);
  dialog.setNameFilter(request.filter);
  dialog.setDefaultSuffix(request.suffix);
  // Never the folder the program happened to be started from.
  QString folder = lastFolder();
  if (folder.isEmpty() || !QFileInfo(folder).isDir())
    folder = QStandardPaths::writableLocation(QStandardPaths::DocumentsLocation);
  if (folder.isEmpty() || !QFileInfo(folder).isDir()) folder = QDir::homePath();
  dialog.setDirectory(folder);
  dialog.selectFile(request.suggestedName);
  if (dialog.exec() != QDialog::Accepted || dialog.selectedFiles().isEmpty()) return {};
  const QString chosen = dialog.selectedFiles().constFirst();
  lastFolder() = QFileInfo(chosen).absolutePath();
  return chosen;
}

QString suggestedFileName(const QString& subject, const std::optional<RZDate::Range>& period,
                          const QString& suffix) {
  QString name = subject;
  name.replace(u'/', u'-');
  if (period) {
    const QString pattern = QStringLiteral("yyyy-MM-dd");
    const QString first = RZDate::stringWithPattern((*period)[0], pattern);
    const QString last = RZDate::stringWithPattern(RZDate::yesterday((*period)[1]), pattern);
    name += u' ' + first;
    if (last != first) name += QStringLiteral(" to ") + last;
  }
  return name + u'.' + suffix;
}
