#include "WTImportCommand.h"

#include "WTImportPlan.h"

#include <QCommandLineParser>
#include <QFile>
#include <QFileInfo>
#include <QTimeZone>

namespace {

const QString kFormat = QStringLiteral("format");
const QString kZone = QStringLiteral("tz");
const QString kTags = QStringLiteral("tags");
const QString kDryRun = QStringLiteral("dry-run");
const QString kStopRunning = QStringLiteral("stop-running");

struct Parsed {
  QString problem;
  QString file;
  WTImportFormats::Options options;
  bool dryRun = false;
  bool stopRunning = false;
  bool zoneGiven = false;
};

Parsed parse(const QStringList& arguments) {
  QCommandLineParser parser;
  parser.setSingleDashWordOptionMode(QCommandLineParser::ParseAsLongOptions);
  for (const QString& name : {kFormat, kZone, kTags})
    parser.addOption(QCommandLineOption(name, QString(), QStringLiteral("value")));
  parser.addOption(QCommandLineOption(kDryRun));
  parser.addOption(QCommandLineOption(kStopRunning));
  Parsed parsed;
  if (!parser.parse(QStringList{QStringLiteral("tessal")} + arguments)) {
    parsed.problem = parser.errorText();
    return parsed;
  }
  const QStringList positional = parser.positionalArguments();
  if (positional.isEmpty()) {
    parsed.problem = QStringLiteral("name the file to import");
  } else if (positional.size() > 1) {
    parsed.problem = QStringLiteral("unexpected argument '%1'").arg(positional.at(1));
  }
  for (const QString& name : {kFormat, kZone, kTags}) {
    if (parsed.problem.isEmpty() && parser.values(name).size() > 1)
      parsed.problem = QStringLiteral("--%1 may be given once").arg(name);
  }
  if (!parsed.problem.isEmpty()) return parsed;
  parsed.file = positional.first();
  parsed.dryRun = parser.isSet(kDryRun);
  parsed.stopRunning = parser.isSet(kStopRunning);
  if (parser.isSet(kFormat)) {
    parsed.options.format = parser.value(kFormat).toLower();
    if (!WTImportFormats::names().contains(parsed.options.format))
      parsed.problem = QStringLiteral("--format takes %1, not '%2'")
                           .arg(WTImportFormats::names().join(QStringLiteral(", ")), parser.value(kFormat));
  }
  if (parser.isSet(kZone)) {
    parsed.zoneGiven = true;
    parsed.options.zone = QTimeZone(parser.value(kZone).toUtf8());
    if (!parsed.options.zone.isValid())
      parsed.problem =
          QStringLiteral("--tz takes a zone such as Europe/Berlin, not '%1'").arg(parser.value(kZone));
  }
  if (parser.isSet(kTags)) {
    parsed.options.tags = parser.value(kTags).split(u',');
    static const QStringList fields = {QStringLiteral("client"), QStringLiteral("project"),
                                       QStringLiteral("task")};
    for (const QString& field : parsed.options.tags) {
      if (!fields.contains(field) || parsed.options.tags.count(field) > 1)
        parsed.problem = QStringLiteral("--tags takes client, project and task, each once, not '%1'")
                             .arg(parser.value(kTags));
    }
  }
  return parsed;
}

WTCommandOutcome failure(const QString& message) {
  return {1, {}, QStringLiteral("tessal: %1\n").arg(message)};
}

}  // namespace

namespace WTImportCommand {

QString usageLine() {
  return QStringLiteral(
      "usage: tessal import FILE [--format NAME] [--dry-run] [--tz ZONE] [--stop-running] [--tags FIELDS]\n");
}

QString problem(const QStringList& arguments) {
  return parse(arguments).problem;
}

QStringList absolute(const QStringList& arguments) {
  const Parsed parsed = parse(arguments);
  if (!parsed.problem.isEmpty()) return arguments;
  QStringList result = arguments;
  const qsizetype at = result.indexOf(parsed.file);
  if (at >= 0) result[at] = QFileInfo(parsed.file).absoluteFilePath();
  return result;
}

bool makesRecords(const QStringList& arguments) {
  const Parsed parsed = parse(arguments);
  return parsed.problem.isEmpty() && !parsed.dryRun;
}

WTCommandOutcome run(WTObjectContext& context, const QStringList& arguments, const QTimeZone& zone) {
  Parsed parsed = parse(arguments);
  Q_ASSERT(parsed.problem.isEmpty());
  QFile file(parsed.file);
  if (!file.open(QIODevice::ReadOnly))
    return failure(QStringLiteral("cannot read %1: %2").arg(parsed.file, file.errorString()));
  if (!parsed.zoneGiven) parsed.options.zone = zone;
  // A running entry had got as far as the moment the file was written.
  parsed.options.fileTime = Date::fromQDateTime(QFileInfo(file).lastModified());
  const Result<WTImportFile> read = WTImportFormats::read(file, parsed.options);
  if (!read) return failure(QStringLiteral("%1: %2").arg(parsed.file, read.error().message));
  const WTImportFile& imported = read.value();
  const WTImport::Options options{.stopRunning = parsed.stopRunning};
  // All or nothing: a row that cannot be read stops the whole file, before anything is made.
  if (parsed.dryRun || !imported.problems.empty()) {
    const WTImportPlan plan = WTImport::plan(context, imported, options);
    QString out = WTImport::preview(imported, plan, parsed.options.zone);
    if (!imported.problems.empty()) {
      return {1, out,
              QStringLiteral("tessal: %1: %2 cannot be read; nothing was imported\n")
                  .arg(parsed.file, imported.problemCount() == 1
                                        ? QStringLiteral("1 row")
                                        : QStringLiteral("%1 rows").arg(imported.problemCount()))};
    }
    return {0, out + QStringLiteral("Nothing was changed (--dry-run)\n"), {}};
  }
  const WTImportPlan plan = WTImport::apply(context, imported, options);
  return {
      0,
      WTImport::preview(imported, plan, parsed.options.zone) +
          QStringLiteral("Imported %1 %2\n").arg(plan.entries).arg(plan.entries == 1 ? "entry" : "entries"),
      {}};
}

}  // namespace WTImportCommand
