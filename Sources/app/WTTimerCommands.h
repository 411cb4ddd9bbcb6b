#pragma once

#include <QJsonObject>
#include <QString>
#include <QStringList>

#include <optional>

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
//   start TASK [--project NAME] [--client NAME]
//     Starts the task's timer as the outline's timer button does ("WTStopsOtherTimes" included); a task
//     that runs already is left running. TASK and the filters match names without regard to case; no
//     match or several exit 1 naming the candidates.
//   stop [TASK] [--project NAME] [--client NAME]
//     Stops every running entry, or the named task's.
//   status [--json]
//     Each running entry as "PROJECT › TASK  H:MM" and the total; exit 0 while something runs, else 1.
namespace WTTimerCommands {

// start and stop change the store; status only reads it.
bool changesData(const QString& command);
bool isTimerCommand(const QString& command);

// The arguments' problem as an outcome of status 2 with a usage line; none when they are fine.
std::optional<WTCommandOutcome> checkArguments(const QString& command, const QStringList& arguments);

// Carries the command out on `context`; saving is the caller's. The arguments must have passed
// checkArguments.
WTCommandOutcome run(WTObjectContext& context, const QString& command, const QStringList& arguments);

// The request that asks the desktop copy to run a command, and the desktop copy's answer to one: the
// command carried out on `context`, or status 2 for anything that is not a command changing data.
QJsonObject request(const QString& command, const QStringList& arguments);
WTCommandOutcome answer(WTObjectContext& context, const QJsonObject& request);

}  // namespace WTTimerCommands
