#include "WTReportCommand.h"

#include "WTCSVExport.h"
#include "WTCommandArguments.h"
#include "WTProject.h"
#include "WTRangePredicate.h"
#include "WTReportGenerator.h"
#include "WTStoreSnapshot.h"

#include <QCommandLineParser>
#include <QFileInfo>

#include <optional>

namespace {

using WTCommandArguments::endProcess;
using WTCommandArguments::failure;
using WTCommandArguments::parse;
using WTCommandArguments::usage;
using WTCommandArguments::writeText;

constexpr char kReportUsage[] =
    "usage: tessal report (--project NAME [--client NAME] | --client NAME) [--mode 0-3] [--range RANGE]\n"
    "                     [--template FILE] [--out FILE]\n";
constexpr char kExportUsage[] =
    "usage: tessal export [--range RANGE] [--project NAME [--client NAME]] [--format times|spreadsheet]\n"
    "                     [--out FILE.csv]\n";

enum class ReportFormat { HTML, PDF, CSV, Unknown };

ReportFormat formatOf(const QString& path) {
  const QString suffix = QFileInfo(path).suffix().toLower();
  if (suffix == QLatin1String("html") || suffix == QLatin1String("htm")) return ReportFormat::HTML;
  if (suffix == QLatin1String("pdf")) return ReportFormat::PDF;
  if (suffix == QLatin1String("csv")) return ReportFormat::CSV;
  return ReportFormat::Unknown;
}

}  // namespace

bool reportCommandWritesPDF(const QStringList& arguments) {
  for (qsizetype i = 0; i + 1 < arguments.size(); ++i) {
    if (arguments[i] == QLatin1String("--out") && formatOf(arguments[i + 1]) == ReportFormat::PDF)
      return true;
  }
  for (const QString& argument : arguments) {
    if (argument.startsWith(QLatin1String("--out=")) && formatOf(argument.mid(6)) == ReportFormat::PDF)
      return true;
  }
  return false;
}

int runReportCommand(const QStringList& arguments, QTextStream& out, QTextStream& err,
                     const WTReportPDFWriter& writePDF) {
  QCommandLineParser parser;
  const QString problem = parse(parser, arguments,
                                {QStringLiteral("project"), QStringLiteral("client"), QStringLiteral("mode"),
                                 QStringLiteral("range"), QStringLiteral("template"), QStringLiteral("out")});
  if (!problem.isEmpty()) return usage(err, kReportUsage, problem);
  // A client alone reports all its projects; with a project, it says whose project is meant.
  const bool byProject = parser.isSet(QStringLiteral("project"));
  const QString client =
      parser.isSet(QStringLiteral("client")) ? parser.value(QStringLiteral("client")) : QString();
  if (!byProject && client.isNull())
    return usage(err, kReportUsage, QStringLiteral("name --project or --client"));
  int mode = 0;
  if (parser.isSet(QStringLiteral("mode"))) {
    bool number = false;
    mode = parser.value(QStringLiteral("mode")).toInt(&number);
    if (!number || mode < 0 || mode > 3)
      return usage(err, kReportUsage, QStringLiteral("--mode takes 0, 1, 2 or 3"));
  }
  // The words of the export; the report covers all by default, as the window does.
  const Result<std::optional<RZDate::Range>> period = WTRangePredicate::boundsForRangeWord(
      parser.isSet(QStringLiteral("range")) ? parser.value(QStringLiteral("range")) : QStringLiteral("any"));
  if (!period) return usage(err, kReportUsage, period.error().message);
  const QString outPath = parser.value(QStringLiteral("out"));
  const ReportFormat format = outPath.isEmpty() ? ReportFormat::HTML : formatOf(outPath);
  if (format == ReportFormat::Unknown)
    return usage(err, kReportUsage,
                 QStringLiteral("%1: the file name must end in .html, .pdf or .csv").arg(outPath));
  const QString templatePath = parser.value(QStringLiteral("template"));
  if (!templatePath.isEmpty() && !QFileInfo(templatePath).isFile())
    return usage(err, kReportUsage, QStringLiteral("%1: no such file").arg(templatePath));

  const std::optional<WTNamedProjects> named =
      byProject ? WTNamedProjects::read(err, WTNamedProjects::Project,
                                        parser.value(QStringLiteral("project")), client)
                : WTNamedProjects::read(err, WTNamedProjects::Client, client);
  if (!named) return 1;
  const QList<WTProject*>& projects = named->projects;
  const QString& title = named->title;

  Result<void> written = Result<void>::success();
  if (format == ReportFormat::CSV) {
    written =
        WTCSVExport::writeTextAtomically(outPath, WTCSVExport::reportCSV(projects, mode, period.value()));
  } else {
    WTReportGenerator generator(projects, mode);
    generator.setPeriod(period.value());
    generator.setLogsErrors(false);  // each is printed below as "error CODE: MESSAGE"
    const WTReport report = generator.render(templatePath);
    if (!report.templateRead) {
      const QString path = templatePath.isEmpty() ? WTReportGenerator::templatePath() : templatePath;
      return failure(err, QStringLiteral("%1: could not be read as a template").arg(path));
    }
    if (!report.errors.empty()) {
      for (const WTReportTemplateError& error : report.errors)
        err << "error " << error.code << ": " << error.message << '\n';
      err.flush();
      return 1;
    }
    if (outPath.isEmpty()) {
      writeText(out, report.html);
      endProcess(0, out, err, named->snapshot->context());
    }
    if (format == ReportFormat::HTML) {
      written = WTCSVExport::writeTextAtomically(outPath, report.html);
    } else if (writePDF) {
      written = writePDF(report.html, title, outPath);
    } else {
      return failure(err, QStringLiteral("%1: this program cannot write a PDF").arg(outPath));
    }
  }
  if (!written) return failure(err, written.error().message);
  endProcess(0, out, err, named->snapshot->context());
}

int runExportCommand(const QStringList& arguments, QTextStream& out, QTextStream& err) {
  QCommandLineParser parser;
  const QString problem = parse(parser, arguments,
                                {QStringLiteral("range"), QStringLiteral("project"), QStringLiteral("client"),
                                 QStringLiteral("format"), QStringLiteral("out")});
  if (!problem.isEmpty()) return usage(err, kExportUsage, problem);
  if (const QString alone = WTCommandArguments::clientWithoutProject(parser); !alone.isEmpty())
    return usage(err, kExportUsage, alone);
  const QString formatWord = parser.isSet(QStringLiteral("format")) ? parser.value(QStringLiteral("format"))
                                                                    : QStringLiteral("times");
  if (formatWord != QLatin1String("times") && formatWord != QLatin1String("spreadsheet"))
    return usage(err, kExportUsage,
                 QStringLiteral("%1: not a format (times or spreadsheet)").arg(formatWord));
  const bool spreadsheet = formatWord == QLatin1String("spreadsheet");
  const QString rangeWord =
      parser.isSet(QStringLiteral("range")) ? parser.value(QStringLiteral("range")) : QStringLiteral("any");
  // The time entries count both ends of the range, as they always have; the spreadsheet is what is billed
  // and takes a billing period, as the report does.
  const Result<std::optional<RZDate::Range>> period = WTRangePredicate::boundsForRangeWord(rangeWord);
  if (!period) return usage(err, kExportUsage, period.error().message);
  const Result<WTItemPredicate> predicate = spreadsheet ? WTRangePredicate::predicateForPeriod(period.value())
                                                        : WTRangePredicate::predicateForRangeWord(rangeWord);

  // One project's entries need only that project's items read.
  const std::optional<WTProjectScope> scope = WTProjectScope::read(err, parser);
  if (!scope) return 1;
  WTObjectContext& context = scope->snapshot->context();
  const WTProject* project = scope->project;
  const QString outPath = parser.value(QStringLiteral("out"));
  if (outPath.isEmpty()) {
    writeText(out, spreadsheet ? WTCSVExport::spreadsheetCSV(
                                     WTCSVExport::billableItemsMatching(context, predicate.value(), project))
                               : WTCSVExport::timesCSV(
                                     WTRangePredicate::timesMatching(context, predicate.value(), project)));
    return 0;
  }
  const Result<int> exported =
      spreadsheet ? WTCSVExport::exportSpreadsheet(context, predicate.value(), project, outPath)
                  : WTCSVExport::exportTimes(context, predicate.value(), project, outPath);
  if (!exported) return failure(err, exported.error().message);
  return 0;
}
