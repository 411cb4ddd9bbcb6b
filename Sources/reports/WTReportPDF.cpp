#include "WTReportPDF.h"

#include <QCoreApplication>
#include <QFile>
#include <QFileInfo>
#include <QLocale>
#include <QMarginsF>
#include <QPdfWriter>
#include <QTextDocument>

namespace WTReportPDF {

QPageSize localPageSize() {
  return QPageSize(QLocale().measurementSystem() == QLocale::ImperialUSSystem ? QPageSize::Letter
                                                                              : QPageSize::A4);
}

Result<void> write(QTextDocument& document, const QString& title, const QString& path) {
  const QString partial = path + QStringLiteral(".part");
  // The writer only says that it could not paint: a file that cannot be made says why, first.
  if (QFile probe(partial); !probe.open(QIODevice::WriteOnly))
    return Error{1, QStringLiteral("%1: %2").arg(path, probe.errorString())};
  {
    QPdfWriter writer(partial);
    writer.setCreator(QStringLiteral("Tessal"));
    writer.setTitle(title);
    writer.setPageSize(localPageSize());
    // The document keeps a margin of its own around the text, and its page numbers sit inside it.
    writer.setPageMargins(QMarginsF(0, 0, 0, 0));
    // An unpaginated document is broken into the device's pages by print() itself.
    document.print(&writer);
  }
  const QString failed = QCoreApplication::translate("WTReportPDF", "%1 could not be written.").arg(path);
  const QFileInfo written(partial);
  if (!written.exists() || written.size() == 0) {
    QFile::remove(partial);
    return Error{1, failed};
  }
  QFile::remove(path);
  if (!QFile::rename(partial, path)) {
    QFile::remove(partial);
    return Error{1, failed};
  }
  return Result<void>::success();
}

}  // namespace WTReportPDF
