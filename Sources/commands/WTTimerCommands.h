#pragma once

#include <QJsonObject>
#include <QString>
#include <QStringList>

#include <optional>

class QTimeZone;
class WTObjectContext;

// What a command gives the shell: its exit status and its texts for stdout and stderr. It travels as JSON
// when the desktop copy carries a command out for the shell.
struct WTCommandOutcome {
  int status = 0;
  QString out;
  QString err;

  QJsonObject toJson() const;
  static WTCommandOutcome fromJson(const QJsonObject& json);
};

// The commands that start and stop timers and tell what runs, carried out on an object context: the
// desktop copy's own when it runs (a request sent over its single-instance socket), otherwise one the
// command opened itself. Both give the same outcome for the same arguments.
//
//   start TASK [--project NAME] [--client NAME] [--create]
//     Starts the task's timer as the outline's timer button does ("WTStopsOtherTimes" included); a task
//     that runs already is left running. TASK and the filters match names without regard to case; no
//     match or several exit 1 naming the candidates. --create makes a task that no name matches, with its
//     project and client when they are missing too (WTNamedRecords::taskMadeIfMissing).
//   add TASK (DURATION | START-END) [--date DAY] [--note TEXT] [--project NAME] [--client NAME] [--create]
//     Adds a finished time entry: START-END ("09:00-10:30") on DAY (today, yesterday or YYYY-MM-DD; today
//     by default; an END before START is the next morning's), or DURATION ("0:45", "45") ending now, or on
//     another DAY at the present time of day. An entry that is not over yet or shares time with another
//     entry of the task exits 1 saying so, naming the other entry.
//   stop [TASK] [--project NAME] [--client NAME]
//     Stops every running entry, or the named task's.
//   status [--json]
//     Each running entry as "PROJECT › TASK  H:MM" and the total; exit 0 while something runs, else 1.
//   import FILE ...
//     Another tracker's export into the store (WTImportCommand.h).
namespace WTTimerCommands {

// start, stop, add and import change the store; status only reads it.
bool changesData(const QString& command);
// Whether the command needs every record read (import finds what a former import made), not only the
// timers.
bool readsEveryRecord(const QString& command);
bool isTimerCommand(const QString& command);
// Whether the (checked) arguments may make records, and so a store where there is none yet.
bool createsRecords(const QString& command, const QStringList& arguments);
// The task name whose items the command reads besides the running entries (add checks an entry against
// the task's others); null for the commands that need only the running entries.
QString taskWithItems(const QString& command, const QStringList& arguments);
// The task names to read (WTStore::Records::RunningAndNamed) for start and stop, which find what they name
// among those tasks as among all (none for stop alone); none when every owner may be needed: start
// --create may make its task in any project. Only a command that fails there (its name found no task, or
// several) needs every owner read to say what there is.
std::optional<QStringList> namedTasksToRead(const QString& command, const QStringList& arguments);

// The arguments' problem as an outcome of status 2 with a usage line; none when they are fine.
std::optional<WTCommandOutcome> checkArguments(const QString& command, const QStringList& arguments);

// Carries the command out on `context`; saving is the caller's. The arguments must have passed
// checkArguments.
WTCommandOutcome run(WTObjectContext& context, const QString& command, const QStringList& arguments);
// The same with times of day in `zone` rather than the system's.
WTCommandOutcome run(WTObjectContext& context, const QString& command, const QStringList& arguments,
                     const QTimeZone& zone);

// The request that asks the desktop copy to run a command, and the desktop copy's answer to one: the
// command carried out on `context`, or status 2 for anything that is not a command changing data.
QJsonObject request(const QString& command, const QStringList& arguments);
WTCommandOutcome answer(WTObjectContext& context, const QJsonObject& request);

}  // namespace WTTimerCommands
