#pragma once

#include <QString>

#include <optional>

// What `tessal ARGS` does. The `tessal` executable is lean: it carries out the tracking commands itself
//   tessal start|stop|add|status|log|list ...          (see WTTrackCommand.h)
//   tessal backup [FILE], tessal restore FILE          (see WTBackupCommand.h)
//   tessal --help, tessal --version                    print and exit 0
// and hands everything else, with the same arguments, to the desktop executable, which links the
// interface (WTDesktopCommands.h): the desktop application itself and the commands that render or sync
//   tessal report ..., tessal export ...              read the store (see WTReportCommand.h)
//   tessal template TEMPLATE_FILE [--vars VARS.json]   renders a report template (see WTTemplateCommand.h)
//   tessal sync [--timeout SECONDS]                    brings this installation in step with its server
// None needs a display.
namespace WTCommandLine {

// The exit status of the command named by the first argument when this process carries it (2 for
// arguments that are neither a command nor the desktop application's Qt options, with a usage line on
// stderr), or nothing when the arguments are the desktop executable's: none, Qt options only, or a
// desktop command.
std::optional<int> run(int argc, char** argv);

// start, stop, add, status, log and list: the commands the lean executable runs.
bool isTrackingCommand(const QString& command);
// report, export, template and sync: the commands of the desktop executable.
bool isDesktopCommand(const QString& command);
// Whether the arguments (after the program name) are all the desktop application's own Qt options.
bool desktopArgumentsValid(int argc, char** argv);
// Says on stderr that `argument` is no command or option, with the usage line; returns the status, 2.
int usageError(const char* argument);

}  // namespace WTCommandLine
