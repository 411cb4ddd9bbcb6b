#include "WTCommandLine.h"

#include "TessalLogging.h"
#include "WTBackupCommand.h"
#include "WTReportCommand.h"
#include "WTTimerCommands.h"
#include "WTTrackCommand.h"

#include <QCoreApplication>
#include <QTextStream>

#include <cstdint>
#include <cstdio>
#include <cstdlib>

#include <malloc.h>
#include <sys/mman.h>
#include <unistd.h>

namespace {

// A report or an export reads tens of thousands of records into the heap, a fresh page of memory for
// every four kilobytes, and faulting each in costs more than reading its records. The heap grows here in
// one step of 64 MiB, untouched until used, which the kernel may back with 2 MiB pages (where transparent
// huge pages are left to madvise): a year's report then takes a twelfth of the faults (7,975 to 622).
// Nothing is lost where the kernel refuses: the pages stay small.
void growHeapInHugePages() {
  constexpr std::uintptr_t kHugePage = 2 << 20;
  constexpr int kStep = 64 << 20;
  mallopt(M_TOP_PAD, kStep);
  mallopt(M_TRIM_THRESHOLD, 2 * kStep);  // the process ends soon: nothing is handed back before
  const auto start = reinterpret_cast<std::uintptr_t>(sbrk(0));
  // Under the threshold for a mapping of its own, so the heap grows; kept in sight of the optimiser.
  void* volatile block = std::malloc(64 << 10);
  std::free(block);
  const auto end = reinterpret_cast<std::uintptr_t>(sbrk(0));
  const std::uintptr_t first = (start + kHugePage - 1) & ~(kHugePage - 1);
  if (end > first) madvise(reinterpret_cast<void*>(first), end - first, MADV_HUGEPAGE);
}

constexpr char kUsage[] =
    "usage: tessal [start|stop|add|status|log|list|import|report|export|template|sync|backup|restore] "
    "[ARGS...]\n"
    "       (tessal --help tells more)\n";

constexpr char kHelp[] =
    "Tessal tracks working time and bills it.\n"
    "\n"
    "usage:\n"
    "  tessal                                        start the desktop application (or bring it forward)\n"
    "  tessal start TASK [--project NAME] [--client NAME] [--create]\n"
    "                                                start the task's timer (names match without regard\n"
    "                                                to case; --create makes a missing task, project and\n"
    "                                                client)\n"
    "  tessal stop [TASK] [--project NAME] [--client NAME]\n"
    "                                                stop every running timer, or the task's\n"
    "  tessal add TASK (DURATION | START-END) [--date DAY] [--note TEXT] [--project NAME]\n"
    "             [--client NAME] [--create]         add a finished time entry: 0:45 ends now, 09:00-10:30\n"
    "                                                is on DAY (today, yesterday or YYYY-MM-DD; today by\n"
    "                                                default)\n"
    "  tessal status [--json]                        the running timers and their total; exit status 1 when\n"
    "                                                none runs\n"
    "  tessal log [--range RANGE] [--project NAME [--client NAME]]\n"
    "                                                the time entries of a range (today by default) and its\n"
    "                                                totals\n"
    "  tessal list tasks|projects|clients [--project NAME] [--client NAME] [--qualified]\n"
    "                                                the names there are, one a line; qualified, tasks are\n"
    "                                                PROJECT › TASK, which start and stop take too\n"
    "  tessal import FILE [--format NAME] [--dry-run] [--tz ZONE] [--stop-running] [--tags FIELDS]\n"
    "                                                import another tracker's export (toggl, clockify,\n"
    "                                                timewarrior, kimai, tessal): what it makes, then one\n"
    "                                                save for all of it; never the same entry twice\n"
    "  tessal report (--project NAME [--client NAME] | --client NAME) [--mode 0-3] [--range RANGE]\n"
    "                [--template FILE] [--out FILE]  a report as HTML on stdout, or in FILE as .html, .pdf "
    "or .csv\n"
    "                                                (modes: 0 tasks, 1 items, 2 days, 3 months) over the\n"
    "                                                items of RANGE (as export takes it; any by default)\n"
    "  tessal export [--range RANGE] [--project NAME [--client NAME]] [--format times|spreadsheet]\n"
    "                [--out FILE.csv]                time entries as CSV; RANGE is today, yesterday, "
    "this-week,\n"
    "                                                last-week, this-month, last-month, this-year, "
    "last-year,\n"
    "                                                any (the default) or YYYY-MM-DD..YYYY-MM-DD; the\n"
    "                                                spreadsheet has a header, fees, expenses and amounts\n"
    "  tessal template TEMPLATE_FILE [--vars VARS.json]\n"
    "                                                render a report template with a JSON object's "
    "variables\n"
    "  tessal sync [--timeout SECONDS]               bring this installation in step with its sync server\n"
    "  tessal backup [FILE]                          copy the data into FILE (or folder), or into the\n"
    "                                                Backups folder beside it; prints the copy's path\n"
    "  tessal restore FILE                           put a backup back (not while Tessal or a timer\n"
    "                                                runs); the replaced data file is kept beside it\n"
    "  tessal --help                                 show this text\n"
    "  tessal --version                              show the version\n"
    "\n"
    "While the desktop application runs, start, stop, add and import are carried out by it.\n"
    "The desktop application also takes Qt's own options (-platform NAME, -style NAME, -session ID, ...).\n"
    "Data: $XDG_DATA_HOME/Tessal2/Tessal.sqlite; settings: $XDG_CONFIG_HOME/Tessal/Tessal.conf.\n";

// Options Qt's application object takes for the desktop application, with whether each takes a value.
// A session manager restores a session with "-session ID", so these must keep reaching Qt.
bool isQtOption(const QString& argument, bool& takesValue) {
  static const QStringList withValue = {
      "-platform",     "-platformpluginpath", "-platformtheme", "-plugin",     "-qwindowgeometry",
      "-qwindowicon",  "-qwindowtitle",       "-style",         "-stylesheet", "-session",
      "-display",      "-geometry",           "-name",          "-title",      "-widgetcount",
      "-qmljsdebugger"};
  static const QStringList plain = {"-reverse", "-nograb", "-dograb", "-sync", "-visual"};
  QString name = argument.section(u'=', 0, 0);
  if (name.startsWith(QLatin1String("--"))) name.remove(0, 1);
  takesValue = withValue.contains(name) && !argument.contains(u'=');
  return withValue.contains(name) || plain.contains(name);
}

}  // namespace

bool WTCommandLine::isDesktopCommand(const QString& command) {
  static const QStringList commands = {QStringLiteral("report"), QStringLiteral("export"),
                                       QStringLiteral("template"), QStringLiteral("sync")};
  return commands.contains(command);
}

bool WTCommandLine::desktopArgumentsValid(int argc, char** argv) {
  for (int i = 1; i < argc; ++i) {
    bool takesValue = false;
    if (!isQtOption(QString::fromLocal8Bit(argv[i]), takesValue)) return false;
    if (takesValue && ++i >= argc) return false;
  }
  return true;
}

std::optional<int> WTCommandLine::run(int argc, char** argv) {
  if (argc < 2) return std::nullopt;
  const QString command = QString::fromLocal8Bit(argv[1]);
  // Nothing here may need a display: these answer before any application object exists.
  if (command == QLatin1String("--help") || command == QLatin1String("-h")) {
    std::fputs(kHelp, stdout);
    return 0;
  }
  if (command == QLatin1String("--version")) {
    std::printf("tessal %s\n", TESSAL_VERSION);
    return 0;
  }
  QStringList arguments;
  for (int i = 2; i < argc; ++i) arguments.append(QString::fromLocal8Bit(argv[i]));
  // A report or an export reads the store and writes text: here, without the desktop's libraries to
  // load, unless a report is to be laid out as a PDF.
  const bool readsHere = command == QLatin1String("export") ||
                         (command == QLatin1String("report") && !reportCommandWritesPDF(arguments));
  const bool copies = command == QLatin1String("backup") || command == QLatin1String("restore");
  if (isDesktopCommand(command) && !readsHere) return std::nullopt;
  if (!isTrackingCommand(command) && !readsHere && !copies) {
    if (desktopArgumentsValid(argc, argv)) return std::nullopt;
    return usageError(argv[1]);
  }

  // No application object: nothing a command does waits for events, and making one would load the C
  // library's locale files and an event dispatcher first. The names still place the settings.
  QCoreApplication::setApplicationName(QStringLiteral("Tessal"));
  QCoreApplication::setOrganizationName(QStringLiteral("Tessal"));
  QTextStream out(stdout), err(stderr);
  if (readsHere) growHeapInHugePages();
  if (command == QLatin1String("report")) return runReportCommand(arguments, out, err);
  if (command == QLatin1String("export")) return runExportCommand(arguments, out, err);
  TessalLogging::keepNoDiary();
  if (command == QLatin1String("backup")) return runBackupCommand(arguments, out, err);
  if (command == QLatin1String("restore")) return runRestoreCommand(arguments, out, err);
  if (command == QLatin1String("log")) return runLogCommand(arguments, out, err);
  if (command == QLatin1String("list")) return runListCommand(arguments, out, err);
  return runTrackCommand(command, arguments, out, err);
}

bool WTCommandLine::isTrackingCommand(const QString& command) {
  return WTTimerCommands::isTimerCommand(command) || command == QLatin1String("log") ||
         command == QLatin1String("list");
}

int WTCommandLine::usageError(const char* argument) {
  std::fprintf(stderr, "tessal: unknown command or option '%s'\n", argument);
  std::fputs(kUsage, stderr);
  return 2;
}
