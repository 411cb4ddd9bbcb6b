#include "WTTimerCommands.h"

#include "DurationText.h"
#include "WTClient.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTStoreSnapshot.h"
#include "WTTask.h"
#include "WTTime.h"

#include <QCommandLineParser>
#include <QJsonArray>
#include <QJsonDocument>

#include <algorithm>

namespace {

const QString kStart = QStringLiteral("start");
const QString kStop = QStringLiteral("stop");
const QString kStatus = QStringLiteral("status");

QString usageLine(const QString& command) {
  if (command == kStart) return QStringLiteral("usage: tessal start TASK [--project NAME] [--client NAME]\n");
  if (command == kStop) return QStringLiteral("usage: tessal stop [TASK] [--project NAME] [--client NAME]\n");
  return QStringLiteral("usage: tessal status [--json]\n");
}

// The parsed arguments of one of the commands, or the problem with them.
struct Arguments {
  QString problem;
  QString task;  // null when none was named
  QString project;
  QString client;
  bool json = false;
};

Arguments parse(const QString& command, const QStringList& arguments) {
  QCommandLineParser parser;
  parser.setSingleDashWordOptionMode(QCommandLineParser::ParseAsLongOptions);
  const bool namesTasks = command != kStatus;
  if (namesTasks) {
    parser.addOption(QCommandLineOption(QStringLiteral("project"), QString(), QStringLiteral("name")));
    parser.addOption(QCommandLineOption(QStringLiteral("client"), QString(), QStringLiteral("name")));
  } else {
    parser.addOption(QCommandLineOption(QStringLiteral("json")));
  }
  Arguments parsed;
  if (!parser.parse(QStringList{QStringLiteral("tessal")} + arguments)) {
    parsed.problem = parser.errorText();
    return parsed;
  }
  const QStringList positional = parser.positionalArguments();
  const qsizetype allowed = namesTasks ? 1 : 0;
  if (positional.size() > allowed) {
    parsed.problem = QStringLiteral("unexpected argument '%1'").arg(positional.at(allowed));
  } else if (command == kStart && positional.isEmpty()) {
    parsed.problem = QStringLiteral("name the task to start");
  } else if (namesTasks && (parser.values(QStringLiteral("project")).size() > 1 ||
                            parser.values(QStringLiteral("client")).size() > 1)) {
    parsed.problem = QStringLiteral("--project and --client may each be given once");
  }
  if (!parsed.problem.isEmpty()) return parsed;
  if (!positional.isEmpty()) parsed.task = positional.first();
  if (namesTasks) {
    // Null, not empty, when not given: an empty name is a name too.
    if (parser.isSet(QStringLiteral("project"))) parsed.project = parser.value(QStringLiteral("project"));
    if (parser.isSet(QStringLiteral("client"))) parsed.client = parser.value(QStringLiteral("client"));
    if (parsed.task.isNull() && (!parsed.project.isNull() || !parsed.client.isNull()))
      parsed.problem = QStringLiteral("--project and --client narrow down a task: name one");
  } else {
    parsed.json = parser.isSet(QStringLiteral("json"));
  }
  return parsed;
}

WTCommandOutcome failure(const QString& message) {
  return {1, {}, QStringLiteral("tessal: %1\n").arg(message)};
}

// Every running entry, oldest first.
QList<WTTime*> runningTimes(const WTObjectContext& context) {
  QList<WTTime*> running = context.fetch<WTTime>([](const WTTime* time) { return time->running() && time->task(); });
  std::sort(running.begin(), running.end(), [](const WTTime* a, const WTTime* b) {
    return a->startDate().value_or(Date()) < b->startDate().value_or(Date());
  });
  return running;
}

WTCommandOutcome start(WTObjectContext& context, const Arguments& arguments) {
  const Result<WTTask*> found = WTNamedRecords::task(context, arguments.task, arguments.project, arguments.client);
  if (!found) return failure(found.error().message);
  WTTask* task = found.value();
  if (task->running()) return {0, QStringLiteral("%1 is running already\n").arg(WTNamedRecords::label(*task)), {}};
  // What the timer button stops on the way ("WTStopsOtherTimes"), told as the stop command tells it.
  const QList<WTTime*> runningBefore = runningTimes(context);
  task->toggleTimer();
  QString out;
  for (const WTTime* time : runningBefore) {
    if (!time->running())
      out += QStringLiteral("Stopped %1  %2\n")
                 .arg(WTNamedRecords::label(*time->task()), DurationText::stringWithMinutes(time->duration()));
  }
  out += QStringLiteral("Started %1\n").arg(WTNamedRecords::label(*task));
  return {0, out, {}};
}

WTCommandOutcome stop(WTObjectContext& context, const Arguments& arguments) {
  const WTTask* only = nullptr;
  if (!arguments.task.isNull()) {
    const Result<WTTask*> found = WTNamedRecords::task(context, arguments.task, arguments.project, arguments.client);
    if (!found) return failure(found.error().message);
    only = found.value();
  }
  QString out;
  for (WTTime* time : runningTimes(context)) {
    if (only && time->task() != only) continue;
    time->setRunning(false);
    out += QStringLiteral("Stopped %1  %2\n")
               .arg(WTNamedRecords::label(*time->task()), DurationText::stringWithMinutes(time->duration()));
  }
  if (out.isEmpty())
    out = only ? QStringLiteral("%1 is not running\n").arg(WTNamedRecords::label(*only))
               : QStringLiteral("No timer is running\n");
  return {0, out, {}};
}

WTCommandOutcome status(const WTObjectContext& context, const Arguments& arguments) {
  const QList<WTTime*> running = runningTimes(context);
  int total = 0;
  for (const WTTime* time : running) total += time->duration();
  const int exitStatus = running.isEmpty() ? 1 : 0;
  if (arguments.json) {
    QJsonArray entries;
    for (const WTTime* time : running) {
      const WTProject* project = time->task()->project();
      const WTClient* client = project ? project->client() : nullptr;
      entries.append(QJsonObject{
          {QStringLiteral("client"), client ? QJsonValue(client->name()) : QJsonValue()},
          {QStringLiteral("project"), project ? QJsonValue(project->name()) : QJsonValue()},
          {QStringLiteral("task"), time->task()->name()},
          {QStringLiteral("start"), time->startDate()->toQDateTime().toUTC().toString(Qt::ISODate)},
          {QStringLiteral("minutes"), time->duration()},
      });
    }
    const QJsonObject document{{QStringLiteral("running"), entries}, {QStringLiteral("minutes"), total}};
    return {exitStatus, QString::fromUtf8(QJsonDocument(document).toJson(QJsonDocument::Indented)), {}};
  }
  if (running.isEmpty()) return {exitStatus, QStringLiteral("No timer is running\n"), {}};
  QString out;
  for (const WTTime* time : running)
    out += QStringLiteral("%1  %2\n")
               .arg(WTNamedRecords::label(*time->task()), DurationText::stringWithMinutes(time->duration()));
  out += QStringLiteral("Total  %1\n").arg(DurationText::stringWithMinutes(total));
  return {exitStatus, out, {}};
}

}  // namespace

QJsonObject WTCommandOutcome::toJson() const {
  return {{QStringLiteral("status"), status}, {QStringLiteral("out"), out}, {QStringLiteral("err"), err}};
}

WTCommandOutcome WTCommandOutcome::fromJson(const QJsonObject& json) {
  return {json.value(QStringLiteral("status")).toInt(1), json.value(QStringLiteral("out")).toString(),
          json.value(QStringLiteral("err")).toString()};
}

namespace WTTimerCommands {

bool changesData(const QString& command) {
  return command == kStart || command == kStop;
}

bool isTimerCommand(const QString& command) {
  return changesData(command) || command == kStatus;
}

std::optional<WTCommandOutcome> checkArguments(const QString& command, const QStringList& arguments) {
  const Arguments parsed = parse(command, arguments);
  if (parsed.problem.isEmpty()) return std::nullopt;
  return WTCommandOutcome{2, {}, QStringLiteral("tessal: %1\n%2").arg(parsed.problem, usageLine(command))};
}

WTCommandOutcome run(WTObjectContext& context, const QString& command, const QStringList& arguments) {
  const Arguments parsed = parse(command, arguments);
  Q_ASSERT(parsed.problem.isEmpty());
  if (command == kStart) return start(context, parsed);
  if (command == kStop) return stop(context, parsed);
  return status(context, parsed);
}

QJsonObject request(const QString& command, const QStringList& arguments) {
  return {{QStringLiteral("command"), command}, {QStringLiteral("arguments"), QJsonArray::fromStringList(arguments)}};
}

WTCommandOutcome answer(WTObjectContext& context, const QJsonObject& request) {
  const QString command = request.value(QStringLiteral("command")).toString();
  QStringList arguments;
  for (const QJsonValue& argument : request.value(QStringLiteral("arguments")).toArray())
    arguments.append(argument.toString());
  if (!changesData(command))
    return {2, {}, QStringLiteral("tessal: the running Tessal carries out only start and stop\n")};
  if (std::optional<WTCommandOutcome> problem = checkArguments(command, arguments)) return *problem;
  return run(context, command, arguments);
}

}  // namespace WTTimerCommands
