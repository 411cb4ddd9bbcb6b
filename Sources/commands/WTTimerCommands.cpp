#include "WTTimerCommands.h"

#include "DurationText.h"
#include "RZDate.h"
#include "WTClient.h"
#include "WTImportCommand.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTStoreSnapshot.h"
#include "WTTask.h"
#include "WTTime.h"

#include <QCommandLineParser>
#include <QJsonArray>
#include <QJsonDocument>
#include <QRegularExpression>
#include <QTimeZone>

#include <algorithm>
#include <utility>

namespace {

const QString kStart = QStringLiteral("start");
const QString kStop = QStringLiteral("stop");
const QString kStatus = QStringLiteral("status");
const QString kAdd = QStringLiteral("add");
const QString kImport = QStringLiteral("import");

QString usageLine(const QString& command) {
  if (command == kImport) return WTImportCommand::usageLine();
  if (command == kStart)
    return QStringLiteral("usage: tessal start TASK [--project NAME] [--client NAME] [--create]\n");
  if (command == kStop) return QStringLiteral("usage: tessal stop [TASK] [--project NAME] [--client NAME]\n");
  if (command == kAdd)
    return QStringLiteral(
        "usage: tessal add TASK (DURATION | START-END) [--date DAY] [--note TEXT] [--project NAME]\n"
        "                  [--client NAME] [--create]\n");
  return QStringLiteral("usage: tessal status [--json]\n");
}

// The time an added entry covers, as typed: a duration, or a start and an end on the day.
struct Span {
  int minutes = 0;  // a duration when the times are null
  QTime start;
  QTime end;
};

// "DURATION" ("45", "0:45", "1:30", as the window takes them also days, "1:00:00") or "START-END"
// ("09:00-10:30"); the problem when it is neither.
std::optional<Span> parseSpan(const QString& text, QString& problem) {
  static const QRegularExpression range(QStringLiteral("^(\\d{1,2}:\\d{2})-(\\d{1,2}:\\d{2})$"));
  static const QRegularExpression duration(QStringLiteral("^\\d{1,4}(:\\d{1,2}){0,2}$"));
  Span span;
  if (const QRegularExpressionMatch match = range.match(text); match.hasMatch()) {
    span.start = QTime::fromString(match.captured(1), u"H:mm");
    span.end = QTime::fromString(match.captured(2), u"H:mm");
    if (span.start.isValid() && span.end.isValid()) return span;
  } else if (duration.match(text).hasMatch()) {
    // Other trackers write hours:minutes:seconds: "1:30:00" would be a day and 30 hours here.
    if (const QStringList pieces = text.split(u':');
        pieces.size() == 3 && (pieces[1].toInt() >= 24 || pieces[2].toInt() >= 60)) {
      problem = QStringLiteral(
                    "'%1' reads as days:hours:minutes, with hours under 24 and minutes under 60; "
                    "an hour and a half is 1:30")
                    .arg(text);
      return std::nullopt;
    }
    span.minutes = DurationText::minutesFromString(text);
    if (span.minutes > 0) return span;
    problem = QStringLiteral("a duration of no time adds nothing");
    return std::nullopt;
  }
  problem =
      QStringLiteral("'%1' is neither a duration (0:45) nor START-END in hours and minutes (09:00-10:30)")
          .arg(text);
  return std::nullopt;
}

// The day "--date" names, "today" when not given, as days back from today or as a date.
struct Day {
  int daysBack = 0;
  QDate date;  // when given as one
};

std::optional<Day> parseDay(const QString& text) {
  if (text.isNull() || text.compare(u"today", Qt::CaseInsensitive) == 0) return Day{};
  if (text.compare(u"yesterday", Qt::CaseInsensitive) == 0) return Day{1, {}};
  const QDate date = QDate::fromString(text, Qt::ISODate);
  if (date.isValid() && text.size() == 10) return Day{0, date};
  return std::nullopt;
}

// The parsed arguments of one of the commands, or the problem with them.
struct Arguments {
  QString problem;
  QString task;  // null when none was named
  QString project;
  QString client;
  bool json = false;
  bool create = false;
  // add
  Span span;
  Day day;
  QString note;  // null when none was given
};

Arguments parse(const QString& command, const QStringList& arguments) {
  QCommandLineParser parser;
  parser.setSingleDashWordOptionMode(QCommandLineParser::ParseAsLongOptions);
  const bool namesTasks = command != kStatus;
  const bool adds = command == kAdd;
  const QStringList valued = adds         ? QStringList{QStringLiteral("project"), QStringLiteral("client"),
                                                QStringLiteral("date"), QStringLiteral("note")}
                             : namesTasks ? QStringList{QStringLiteral("project"), QStringLiteral("client")}
                                          : QStringList();
  for (const QString& name : valued)
    parser.addOption(QCommandLineOption(name, QString(), QStringLiteral("value")));
  if (command == kStart || adds) parser.addOption(QCommandLineOption(QStringLiteral("create")));
  if (!namesTasks) parser.addOption(QCommandLineOption(QStringLiteral("json")));
  Arguments parsed;
  if (!parser.parse(QStringList{QStringLiteral("tessal")} + arguments)) {
    parsed.problem = parser.errorText();
    return parsed;
  }
  const QStringList positional = parser.positionalArguments();
  const qsizetype allowed = adds ? 2 : namesTasks ? 1 : 0;
  if (positional.size() > allowed) {
    parsed.problem = QStringLiteral("unexpected argument '%1'").arg(positional.at(allowed));
  } else if (command == kStart && positional.isEmpty()) {
    parsed.problem = QStringLiteral("name the task to start");
  } else if (adds && positional.size() < 2) {
    parsed.problem =
        QStringLiteral("name the task and its time: a duration (0:45) or START-END (09:00-10:30)");
  }
  for (const QString& name : valued) {
    if (parsed.problem.isEmpty() && parser.values(name).size() > 1)
      parsed.problem = QStringLiteral("--%1 may be given once").arg(name);
  }
  if (!parsed.problem.isEmpty()) return parsed;
  if (!positional.isEmpty()) parsed.task = positional.first();
  if (namesTasks) {
    // Null, not empty, when not given: an empty name is a name too.
    if (parser.isSet(QStringLiteral("project"))) parsed.project = parser.value(QStringLiteral("project"));
    if (parser.isSet(QStringLiteral("client"))) parsed.client = parser.value(QStringLiteral("client"));
    if (parsed.task.isNull() && (!parsed.project.isNull() || !parsed.client.isNull()))
      parsed.problem = QStringLiteral("--project and --client narrow down a task: name one");
    parsed.create = (command == kStart || adds) && parser.isSet(QStringLiteral("create"));
  } else {
    parsed.json = parser.isSet(QStringLiteral("json"));
  }
  if (adds && parsed.problem.isEmpty()) {
    if (const std::optional<Span> span = parseSpan(positional.at(1), parsed.problem)) parsed.span = *span;
    const QString day =
        parser.isSet(QStringLiteral("date")) ? parser.value(QStringLiteral("date")) : QString();
    if (const std::optional<Day> read = parseDay(day))
      parsed.day = *read;
    else if (parsed.problem.isEmpty())
      parsed.problem = QStringLiteral("--date takes today, yesterday or YYYY-MM-DD, not '%1'").arg(day);
    if (parser.isSet(QStringLiteral("note"))) parsed.note = parser.value(QStringLiteral("note"));
  }
  return parsed;
}

WTCommandOutcome failure(const QString& message) {
  return {1, {}, QStringLiteral("tessal: %1\n").arg(message)};
}

// Every running entry, oldest first.
QList<WTTime*> runningTimes(const WTObjectContext& context) {
  QList<WTTime*> running =
      context.fetch<WTTime>([](const WTTime* time) { return time->running() && time->task(); });
  std::sort(running.begin(), running.end(), [](const WTTime* a, const WTTime* b) {
    return a->startDate().value_or(Date()) < b->startDate().value_or(Date());
  });
  return running;
}

// The task the arguments name; with --create, made (with its project and client) when missing, which is
// told in `out`.
Result<WTTask*> namedTask(WTObjectContext& context, const Arguments& arguments, QString& out) {
  if (!arguments.create)
    return WTNamedRecords::task(context, arguments.task, arguments.project, arguments.client);
  QStringList made;
  Result<WTTask*> task =
      WTNamedRecords::taskMadeIfMissing(context, arguments.task, arguments.project, arguments.client, made);
  for (const QString& line : made) out += QStringLiteral("Created %1\n").arg(line);
  return task;
}

WTCommandOutcome start(WTObjectContext& context, const Arguments& arguments) {
  QString out;
  const Result<WTTask*> found = namedTask(context, arguments, out);
  if (!found) return failure(found.error().message);
  WTTask* task = found.value();
  if (task->running())
    return {0, out + QStringLiteral("%1 is running already\n").arg(WTNamedRecords::label(*task)), {}};
  // What the timer button stops on the way ("WTStopsOtherTimes"), told as the stop command tells it.
  const QList<WTTime*> runningBefore = runningTimes(context);
  task->toggleTimer();
  for (const WTTime* time : runningBefore) {
    if (!time->running())
      out +=
          QStringLiteral("Stopped %1  %2\n")
              .arg(WTNamedRecords::label(*time->task()), DurationText::stringWithMinutes(time->duration()));
  }
  out += QStringLiteral("Started %1\n").arg(WTNamedRecords::label(*task));
  return {0, out, {}};
}

WTCommandOutcome stop(WTObjectContext& context, const Arguments& arguments) {
  const WTTask* only = nullptr;
  if (!arguments.task.isNull()) {
    const Result<WTTask*> found =
        WTNamedRecords::task(context, arguments.task, arguments.project, arguments.client, &WTTask::running);
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

QString timeOfDay(Date date, const QTimeZone& zone) {
  return date.toQDateTime().toTimeZone(zone).toString(u"HH:mm");
}

// Adds a finished entry to a task, as typing one into the outline does. It must be over (nothing of it
// after now) and share no time with the task's other entries. A duration alone ends now, or on another
// day at the present time of day.
WTCommandOutcome add(WTObjectContext& context, const Arguments& arguments, const QTimeZone& zone) {
  const Date now = Date::now();
  const QDateTime here = now.toQDateTime().toTimeZone(zone);
  const QDate day =
      arguments.day.date.isValid() ? arguments.day.date : here.date().addDays(-arguments.day.daysBack);
  Date start, end;
  if (arguments.span.start.isValid()) {
    // As on a wall clock, an end before the start is the next morning's: work past midnight.
    const QDate endDay = arguments.span.end < arguments.span.start ? day.addDays(1) : day;
    // A time the clocks skip on that day would otherwise be moved by the zone's shift, unseen.
    for (const auto& [typed, on] :
         {std::pair{arguments.span.start, day}, std::pair{arguments.span.end, endDay}}) {
      if (const QDateTime at(on, typed, zone); !at.isValid() || at.time() != typed)
        return failure(QStringLiteral("there is no %1 on %2 here: the clocks go forward then")
                           .arg(typed.toString(u"HH:mm"), on.toString(Qt::ISODate)));
    }
    start = Date::fromQDateTime(QDateTime(day, arguments.span.start, zone));
    end = Date::fromQDateTime(QDateTime(endDay, arguments.span.end, zone));
  } else {
    end = day == here.date()
              ? RZDate::beginOfMinute(now)
              : Date::fromQDateTime(QDateTime(day, QTime(here.time().hour(), here.time().minute()), zone));
    start = end.addingSeconds(-60.0 * arguments.span.minutes);
  }
  // An entry that ends on another day names that day too.
  const auto dayOf = [&](Date date) { return date.toQDateTime().toTimeZone(zone).toString(u"yyyy-MM-dd"); };
  const QString when =
      QStringLiteral("%1 %2–%3%4")
          .arg(dayOf(start), timeOfDay(start, zone),
               dayOf(end) == dayOf(start) ? QString() : dayOf(end) + u' ', timeOfDay(end, zone));
  if (end > now) return failure(QStringLiteral("the entry %1 is not over yet; add it once it is").arg(when));

  QString out;
  const Result<WTTask*> found = namedTask(context, arguments, out);
  if (!found) return failure(found.error().message);
  WTTask* task = found.value();
  if (const WTTime* other = task->timeOverlapping(start, end)) {
    const Date otherStart = *other->startDate();
    return failure(QStringLiteral("the entry %1 overlaps the entry %2 %3–%4 of %5")
                       .arg(when, dayOf(otherStart), timeOfDay(otherStart, zone),
                            other->running() ? QStringLiteral("now")
                                             : timeOfDay(other->endDate().value_or(otherStart), zone),
                            WTNamedRecords::label(*task)));
  }
  auto* time = WTTime::insertNewObject(&context);
  time->setTask(task);
  time->setStartDate(start);
  time->setEndDate(end);
  if (!arguments.note.isNull()) time->setName(arguments.note);
  out += QStringLiteral("Added %1  %2  %3\n")
             .arg(WTNamedRecords::label(*task), when, DurationText::stringWithMinutes(time->duration()));
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
  return command == kStart || command == kStop || command == kAdd || command == kImport;
}

bool readsEveryRecord(const QString& command) {
  return command == kImport;
}

bool isTimerCommand(const QString& command) {
  return changesData(command) || command == kStatus;
}

std::optional<WTCommandOutcome> checkArguments(const QString& command, const QStringList& arguments) {
  const QString problem =
      command == kImport ? WTImportCommand::problem(arguments) : parse(command, arguments).problem;
  if (problem.isEmpty()) return std::nullopt;
  return WTCommandOutcome{2, {}, QStringLiteral("tessal: %1\n%2").arg(problem, usageLine(command))};
}

bool createsRecords(const QString& command, const QStringList& arguments) {
  if (command == kImport) return WTImportCommand::makesRecords(arguments);
  return changesData(command) && parse(command, arguments).create;
}

QString taskWithItems(const QString& command, const QStringList& arguments) {
  return command == kAdd ? parse(command, arguments).task : QString();
}

std::optional<QStringList> namedTasksToRead(const QString& command, const QStringList& arguments) {
  if (command != kStart && command != kStop) return std::nullopt;
  const Arguments parsed = parse(command, arguments);
  if (parsed.create) return std::nullopt;
  return parsed.task.isNull() ? QStringList() : WTNamedRecords::taskNames(parsed.task);
}

WTCommandOutcome run(WTObjectContext& context, const QString& command, const QStringList& arguments,
                     const QTimeZone& zone) {
  if (command == kImport) return WTImportCommand::run(context, arguments, zone);
  const Arguments parsed = parse(command, arguments);
  Q_ASSERT(parsed.problem.isEmpty());
  if (command == kStart) return start(context, parsed);
  if (command == kStop) return stop(context, parsed);
  if (command == kAdd) return add(context, parsed, zone);
  return status(context, parsed);
}

WTCommandOutcome run(WTObjectContext& context, const QString& command, const QStringList& arguments) {
  // Only adding and importing read times of day: starting and stopping need not have the system's zone
  // read from its files first.
  const bool readsTimesOfDay = command == kAdd || command == kImport;
  return run(context, command, arguments, readsTimesOfDay ? QTimeZone::systemTimeZone() : QTimeZone::utc());
}

QJsonObject request(const QString& command, const QStringList& arguments) {
  // Times of day are the shell's: its zone travels with them.
  // The desktop copy runs in a folder of its own: a file to import is named whole.
  const QStringList sent = command == kImport ? WTImportCommand::absolute(arguments) : arguments;
  return {{QStringLiteral("command"), command},
          {QStringLiteral("arguments"), QJsonArray::fromStringList(sent)},
          {QStringLiteral("zone"), QString::fromUtf8(QTimeZone::systemTimeZoneId())}};
}

WTCommandOutcome answer(WTObjectContext& context, const QJsonObject& request) {
  const QString command = request.value(QStringLiteral("command")).toString();
  QStringList arguments;
  for (const QJsonValue& argument : request.value(QStringLiteral("arguments")).toArray())
    arguments.append(argument.toString());
  if (!changesData(command))
    return {
        2, {}, QStringLiteral("tessal: the running Tessal carries out only start, stop, add and import\n")};
  if (std::optional<WTCommandOutcome> problem = checkArguments(command, arguments)) return *problem;
  const QTimeZone zone(request.value(QStringLiteral("zone")).toString().toUtf8());
  return run(context, command, arguments, zone.isValid() ? zone : QTimeZone::systemTimeZone());
}

}  // namespace WTTimerCommands
