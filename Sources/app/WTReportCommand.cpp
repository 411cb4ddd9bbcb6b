#include "WTReportCommand.h"

#include "WTCSVExport.h"
#include "WTClient.h"
#include "WTProject.h"
#include "WTRangePredicate.h"
#include "WTReportGenerator.h"
#include "WTReportPDF.h"
#include "WTStoreSnapshot.h"
#include "WTTask.h"

#include <QCommandLineParser>
#include <QFileInfo>
#include <QTextDocument>

#include <algorithm>
#include <optional>

namespace {

constexpr char kReportUsage[] =
    "usage: tessal report (--project NAME | --client NAME) [--mode 0-3] [--template FILE] [--out FILE]\n";
constexpr char kExportUsage[] = "usage: tessal export [--range RANGE] [--project NAME] [--out FILE.csv]\n";

int usage(QTextStream& err, const char* text, const QString& problem) {
  if (!problem.isEmpty()) err << "tessal: " << problem << '\n';
  err << text;
  err.flush();
  return 2;
}

int failure(QTextStream& err, const QString& message) {
  err << "tessal: " << message << '\n';
  err.flush();
  return 1;
}

// Parses `arguments` (those after the command's name) for options that each take one value; nothing
// else is allowed. Gives the problem, or an empty text.
QString parse(QCommandLineParser& parser, const QStringList& arguments, const QStringList& options) {
  for (const QString& name : options) parser.addOption(QCommandLineOption(name, QString(), QStringLiteral("value")));
  parser.setSingleDashWordOptionMode(QCommandLineParser::ParseAsLongOptions);
  if (!parser.parse(QStringList{QStringLiteral("tessal")} + arguments)) return parser.errorText();
  if (!parser.positionalArguments().isEmpty())
    return QStringLiteral("unexpected argument '%1'").arg(parser.positionalArguments().first());
  for (const QString& name : options) {
    if (parser.values(name).size() > 1) return QStringLiteral("--%1 given more than once").arg(name);
  }
  return {};
}

enum class ReportFormat { HTML, PDF, CSV, Unknown };

ReportFormat formatOf(const QString& path) {
  const QString suffix = QFileInfo(path).suffix().toLower();
  if (suffix == QLatin1String("html") || suffix == QLatin1String("htm")) return ReportFormat::HTML;
  if (suffix == QLatin1String("pdf")) return ReportFormat::PDF;
  if (suffix == QLatin1String("csv")) return ReportFormat::CSV;
  return ReportFormat::Unknown;
}

QList<WTProject*> sortedByName(QList<WTProject*> projects) {
  std::sort(projects.begin(), projects.end(),
            [](const WTProject* a, const WTProject* b) { return a->name().localeAwareCompare(b->name()) < 0; });
  return projects;
}

// The projects a report is made of (one named project, or a named client's), with the context they
// were read into.
struct ReportedProjects {
  std::unique_ptr<WTStoreSnapshot> snapshot;
  QList<WTProject*> projects;
  QString title;
};

Result<ReportedProjects> namedProjects(std::unique_ptr<WTStoreSnapshot> snapshot, bool byProject,
                                       const QString& name) {
  ReportedProjects named;
  if (byProject) {
    const Result<WTProject*> project = WTNamedRecords::project(snapshot->context(), name);
    if (!project) return project.error();
    named.projects = {project.value()};
    named.title = project.value()->name();
  } else {
    const Result<WTClient*> client = WTNamedRecords::client(snapshot->context(), name);
    if (!client) return client.error();
    named.projects = sortedByName(client.value()->projects());
    named.title = client.value()->name();
  }
  named.snapshot = std::move(snapshot);
  return named;
}

// Reads the named projects with their items and no other items: the names are looked up among the owners
// first, then the store is read again for those projects' tasks alone. A large store's other items would
// take longer to read than the report takes to make. Errors are written to `err`.
std::optional<ReportedProjects> readNamedProjects(QTextStream& err, bool byProject, const QString& name) {
  std::unique_ptr<WTStoreSnapshot> owners = WTStoreSnapshot::open(err, WTStore::Records::ItemsOfTasks);
  if (!owners) return std::nullopt;
  Result<ReportedProjects> found = namedProjects(std::move(owners), byProject, name);
  if (!found) {
    failure(err, found.error().message);
    return std::nullopt;
  }
  QStringList tasks;
  for (const WTProject* project : found.value().projects) {
    for (const WTTask* task : project->tasks()) tasks.append(task->uuid());
  }
  found.value().snapshot.reset();
  std::unique_ptr<WTStoreSnapshot> scoped = WTStoreSnapshot::open(err, WTStore::Records::ItemsOfTasks, tasks);
  if (!scoped) return std::nullopt;
  // Looked up again in what was read: the desktop copy may have renamed something in between.
  Result<ReportedProjects> read = namedProjects(std::move(scoped), byProject, name);
  if (!read) {
    failure(err, read.error().message);
    return std::nullopt;
  }
  return std::move(read.value());
}

}  // namespace

bool reportCommandWritesPDF(const QStringList& arguments) {
  for (qsizetype i = 0; i + 1 < arguments.size(); ++i) {
    if (arguments[i] == QLatin1String("--out") && formatOf(arguments[i + 1]) == ReportFormat::PDF) return true;
  }
  for (const QString& argument : arguments) {
    if (argument.startsWith(QLatin1String("--out=")) && formatOf(argument.mid(6)) == ReportFormat::PDF) return true;
  }
  return false;
}

int runReportCommand(const QStringList& arguments, QTextStream& out, QTextStream& err) {
  QCommandLineParser parser;
  const QString problem =
      parse(parser, arguments,
            {QStringLiteral("project"), QStringLiteral("client"), QStringLiteral("mode"), QStringLiteral("template"),
             QStringLiteral("out")});
  if (!problem.isEmpty()) return usage(err, kReportUsage, problem);
  const bool byProject = parser.isSet(QStringLiteral("project"));
  if (byProject == parser.isSet(QStringLiteral("client")))
    return usage(err, kReportUsage, QStringLiteral("name either --project or --client"));
  int mode = 0;
  if (parser.isSet(QStringLiteral("mode"))) {
    bool number = false;
    mode = parser.value(QStringLiteral("mode")).toInt(&number);
    if (!number || mode < 0 || mode > 3)
      return usage(err, kReportUsage, QStringLiteral("--mode takes 0, 1, 2 or 3"));
  }
  const QString outPath = parser.value(QStringLiteral("out"));
  const ReportFormat format = outPath.isEmpty() ? ReportFormat::HTML : formatOf(outPath);
  if (format == ReportFormat::Unknown)
    return usage(err, kReportUsage, QStringLiteral("%1: the file name must end in .html, .pdf or .csv").arg(outPath));
  const QString templatePath = parser.value(QStringLiteral("template"));
  if (!templatePath.isEmpty() && !QFileInfo(templatePath).isFile())
    return usage(err, kReportUsage, QStringLiteral("%1: no such file").arg(templatePath));

  const std::optional<ReportedProjects> named = readNamedProjects(
      err, byProject, parser.value(byProject ? QStringLiteral("project") : QStringLiteral("client")));
  if (!named) return 1;
  const QList<WTProject*>& projects = named->projects;
  const QString& title = named->title;

  Result<void> written = Result<void>::success();
  if (format == ReportFormat::CSV) {
    written = WTCSVExport::writeTextAtomically(outPath, WTCSVExport::reportCSV(projects, mode));
  } else {
    WTReportGenerator generator(projects, mode);
    generator.setLogsErrors(false);  // each is printed below as "error CODE: MESSAGE"
    const WTReport report = generator.render(templatePath);
    if (!report.templateRead) {
      const QString path = templatePath.isEmpty() ? WTReportGenerator::templatePath() : templatePath;
      return failure(err, QStringLiteral("%1: could not be read as a template").arg(path));
    }
    if (!report.errors.empty()) {
      for (const WTReportTemplateError& error : report.errors) err << "error " << error.code << ": " << error.message << '\n';
      err.flush();
      return 1;
    }
    if (outPath.isEmpty()) {
      out << report.html;
      out.flush();
      return 0;
    }
    if (format == ReportFormat::HTML) {
      written = WTCSVExport::writeTextAtomically(outPath, report.html);
    } else {
      QTextDocument document;
      document.setHtml(report.html);
      document.setMetaInformation(QTextDocument::DocumentTitle, title);
      written = WTReportPDF::write(document, QStringLiteral("Report — %1").arg(title), outPath);
    }
  }
  if (!written) return failure(err, written.error().message);
  return 0;
}

int runExportCommand(const QStringList& arguments, QTextStream& out, QTextStream& err) {
  QCommandLineParser parser;
  const QString problem =
      parse(parser, arguments, {QStringLiteral("range"), QStringLiteral("project"), QStringLiteral("out")});
  if (!problem.isEmpty()) return usage(err, kExportUsage, problem);
  const QString rangeWord =
      parser.isSet(QStringLiteral("range")) ? parser.value(QStringLiteral("range")) : QStringLiteral("any");
  const Result<WTItemPredicate> predicate = WTRangePredicate::predicateForRangeWord(rangeWord);
  if (!predicate) return usage(err, kExportUsage, predicate.error().message);

  // One project's entries need only that project's items read.
  std::unique_ptr<WTStoreSnapshot> snapshot;
  const WTProject* project = nullptr;
  if (parser.isSet(QStringLiteral("project"))) {
    std::optional<ReportedProjects> named = readNamedProjects(err, true, parser.value(QStringLiteral("project")));
    if (!named) return 1;
    snapshot = std::move(named->snapshot);
    project = named->projects.first();
  } else {
    snapshot = WTStoreSnapshot::open(err);
    if (!snapshot) return 1;
  }
  const QString outPath = parser.value(QStringLiteral("out"));
  if (outPath.isEmpty()) {
    out << WTCSVExport::timesCSV(WTCSVExport::timesMatching(snapshot->context(), predicate.value(), project));
    out.flush();
    return 0;
  }
  const Result<int> exported = WTCSVExport::exportTimes(snapshot->context(), predicate.value(), project, outPath);
  if (!exported) return failure(err, exported.error().message);
  return 0;
}
