#include "WTSaveLocation.h"

#include <QFileDialog>

QString askForSaveLocation(QWidget* parent, const WTSaveRequest& request) {
  QFileDialog dialog(parent, request.title);
  dialog.setAcceptMode(QFileDialog::AcceptSave);
  dialog.setNameFilter(request.filter);
  dialog.setDefaultSuffix(request.suffix);
  dialog.selectFile(request.suggestedName);
  if (dialog.exec() != QDialog::Accepted || dialog.selectedFiles().isEmpty()) return {};
  return dialog.selectedFiles().constFirst();
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
