#pragma once

#include "Result.h"

#include <QStringList>
#include <QTextStream>

#include <functional>

// The reading commands over the user's store; both work while the desktop copy runs (they open the
// store read-only and never write it) and need no display.
//
//   tessal report (--project NAME | --client NAME) [--mode 0-3] [--range RANGE] [--template FILE] [--out
//   FILE]
//     The report the report window shows, as HTML on stdout, or written to FILE as HTML (.html, .htm),
//     PDF (.pdf) or the report's CSV (.csv), over the billing period RANGE (the export's words; any by
//     default). A name matching no record, or several, exits 1 naming the
//     candidates; each template error prints "error CODE: MESSAGE" and exits 1 with nothing written.
//
//   tessal export [--range WORD] [--project NAME] [--out FILE]
//     The time entries of a range (today, yesterday, this-week, last-week, this-month, last-month,
//     this-year, last-year, any (the default) or YYYY-MM-DD..YYYY-MM-DD) as CSV, on stdout or in FILE.
//
// Both exit 2 with a usage line for arguments they do not understand.
//
// Laying a PDF out takes a GUI library, which the lean `tessal` does not load: it hands a report for a
// PDF to the desktop executable, whose `writePDF` turns the HTML into the file.
using WTReportPDFWriter =
    std::function<Result<void>(const QString& html, const QString& title, const QString& path)>;
int runReportCommand(const QStringList& arguments, QTextStream& out, QTextStream& err,
                     const WTReportPDFWriter& writePDF = {});
int runExportCommand(const QStringList& arguments, QTextStream& out, QTextStream& err);

// Whether these arguments of `tessal report` ask for a PDF, which needs a (display-less) GUI application
// object for fonts and layout.
bool reportCommandWritesPDF(const QStringList& arguments);
