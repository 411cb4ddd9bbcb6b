#pragma once

#include "Result.h"

#include <QPageSize>
#include <QString>

class QTextDocument;

// Reports as PDF, the same from the report window and from `tessal report --out FILE.pdf`. Needs a
// QGuiApplication (any platform, offscreen included) for fonts and layout.
namespace WTReportPDF {

// A4, or Letter where the locale measures in inches.
QPageSize localPageSize();

// Lays `document` out on pages of localPageSize(), never cutting a line, numbered at their foot, and
// writes them to `path`. Written beside it first and renamed over it, so a failure leaves an old file
// as it was.
Result<void> write(QTextDocument& document, const QString& title, const QString& path);

}  // namespace WTReportPDF
