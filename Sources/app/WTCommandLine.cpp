#include "WTCommandLine.h"

#include "RZSyncCommand.h"
#include "RZSyncErrorPresenter.h"
#include "UserDefaults.h"
#include "WTAlertPresenter.h"
#include "WTAppDelegate.h"
#include "WTApplication.h"
#include "WTObjectContext.h"
#include "WTPasswordStore.h"
#include "WTQtKeychain.h"
#include "WTReportCommand.h"
#include "WTSingleInstance.h"
#include "WTStoreWriterLock.h"
#include "WTTemplateCommand.h"
#include "WTTimerCommands.h"
#include "WTTrackCommand.h"

#include <QCoreApplication>
#include <QDir>
#include <QEventLoop>
#include <QGuiApplication>
#include <QLoggingCategory>
#include <QTextStream>

#include <cstdio>

namespace {

// Speaks to the shell: store errors go to stderr; the sync command reports the sync's own failures
// itself, once, so the manager's alerts stay quiet; quitting never asks.
class WTCommandLinePresenter final : public WTAlertPresenter, public RZSyncErrorPresenter {
 public:
  explicit WTCommandLinePresenter(QTextStream& err) : err_(err) {}
  bool presentError(const QString& message) override {
    err_ << message << '\n';
    err_.flush();
    return false;
  }
  bool confirmQuitAnyway() override { return false; }
  bool confirmDeletion(const QString&, const QString&) override { return false; }
  void presentSyncError(const QString&) override {}
  void presentNetworkError(const QString&) override {}

 private:
  QTextStream& err_;
};

// A command waits this long for the keyring, then goes on with the settings file.
constexpr int kKeychainTimeoutMs = 5000;

// Settles the password before the first poll and says once where it came from. A password in the
// settings file is used as it is; otherwise the keyring is asked, without moving anything into it (a
// command never makes a keyring prompt), for a few seconds at most.
void usePassword(WTAppDelegate& delegate, UserDefaults& defaults, QTextStream& err) {
  delegate.setPasswordStore(std::make_unique<WTPasswordStore>(
      &defaults, std::make_unique<WTQtKeychain>(QStringLiteral("Tessal"), kKeychainTimeoutMs)));
  WTPasswordStore& passwords = *delegate.passwordStore();
  QEventLoop loop;
  bool loaded = false;
  passwords.load(
      [&] {
        loaded = true;
        loop.quit();
      },
      WTPasswordStore::FilePassword::Keep);
  if (!loaded) loop.exec();
  const QString file = QDir::toNativeSeparators(defaults.fileName());
  switch (passwords.location()) {
    case WTPasswordStore::Location::Keychain:
      err << "Using the password in the secret service.\n";
      break;
    case WTPasswordStore::Location::SettingsFile:
      err << "Using the password in the settings file (" << file << ").\n";
      break;
    case WTPasswordStore::Location::None:
      if (!passwords.keychainError().isEmpty())
        err << "The secret service gave no password (" << passwords.keychainError()
            << "); the settings file (" << file << ") holds none either.\n";
      break;
  }
  err.flush();
}

int runSync(const QStringList& arguments, QTextStream& out, QTextStream& err) {
  // The store is one process's: while the desktop copy runs, it is the one that syncs.
  WTSingleInstance instance;
  if (!instance.start(false)) {
    err << "Tessal is running and keeps its store in step itself; quit it to sync from here.\n";
    err.flush();
    return 1;
  }
  // A start or stop from the shell changes the store by itself only while it holds the writer lock.
  QDir().mkpath(WTAppDelegate::applicationSupportFolder());
  WTStoreWriterLock writerLock(WTAppDelegate::storePath());
  if (!writerLock.lock(10000)) {
    err << "The data file is busy (" << writerLock.filePath() << " is held); try again.\n";
    err.flush();
    return 1;
  }
  UserDefaults defaults;
  WTApplication::registerDefaults(defaults);
  WTCommandLinePresenter presenter(err);
  WTAppDelegate delegate(&defaults, &presenter);
  delegate.setSyncErrorPresenter(&presenter);
  usePassword(delegate, defaults, err);
  if (!delegate.managedObjectContext()->hasStore()) return 1;  // already reported
  const int status = runSyncCommand(*delegate.syncManager(), arguments, out, err);
  delegate.applicationWillTerminate();
  Error error;
  if (!delegate.saveChanges(&error)) {
    err << "Could not save: " << error.message << '\n';
    err.flush();
    return 1;
  }
  return status;
}

constexpr char kUsage[] =
    "usage: tessal [start|stop|add|status|log|list|report|export|template|sync] [ARGS...]\n"
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
    "  tessal log [--range RANGE] [--project NAME]   the time entries of a range (today by default) and its\n"
    "                                                totals\n"
    "  tessal list tasks|projects|clients [--project NAME] [--client NAME] [--qualified]\n"
    "                                                the names there are, one a line; qualified, tasks are\n"
    "                                                PROJECT › TASK, which start and stop take too\n"
    "  tessal report (--project NAME | --client NAME) [--mode 0-3] [--template FILE] [--out FILE]\n"
    "                                                a report as HTML on stdout, or in FILE as .html, .pdf or .csv\n"
    "                                                (modes: 0 tasks, 1 items, 2 days, 3 months)\n"
    "  tessal export [--range RANGE] [--project NAME] [--out FILE.csv]\n"
    "                                                time entries as CSV; RANGE is today, yesterday, this-week,\n"
    "                                                last-week, this-month, last-month, this-year, last-year,\n"
    "                                                any (the default) or YYYY-MM-DD..YYYY-MM-DD\n"
    "  tessal template TEMPLATE_FILE [--vars VARS.json]\n"
    "                                                render a report template with a JSON object's "
    "variables\n"
    "  tessal sync [--timeout SECONDS]               bring this installation in step with its sync server\n"
    "  tessal --help                                 show this text\n"
    "  tessal --version                              show the version\n"
    "\n"
    "While the desktop application runs, start, stop and add are carried out by it.\n"
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

// Whether the arguments (after the program name) are all the desktop application's own.
bool desktopArgumentsValid(int argc, char** argv) {
  for (int i = 1; i < argc; ++i) {
    bool takesValue = false;
    if (!isQtOption(QString::fromLocal8Bit(argv[i]), takesValue)) return false;
    if (takesValue && ++i >= argc) return false;
  }
  return true;
}

}  // namespace

std::optional<int> runCommandLine(int argc, char** argv) {
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
  static const QStringList commands = {QStringLiteral("report"), QStringLiteral("export"), QStringLiteral("log"),
                                       QStringLiteral("list"),
                                       QStringLiteral("template"), QStringLiteral("sync")};
  if (!commands.contains(command) && !WTTimerCommands::isTimerCommand(command)) {
    if (desktopArgumentsValid(argc, argv)) return std::nullopt;
    std::fprintf(stderr, "tessal: unknown command or option '%s'\n", argv[1]);
    std::fputs(kUsage, stderr);
    return 2;
  }

  std::unique_ptr<QCoreApplication> app;
  QStringList arguments;
  for (int i = 2; i < argc; ++i) arguments.append(QString::fromLocal8Bit(argv[i]));
  if (command == QLatin1String("report") && reportCommandWritesPDF(arguments)) {
    // Laying a PDF out needs fonts, which need a GUI application; the offscreen platform gives one on
    // any machine, with a display or without.
    qputenv("QT_QPA_PLATFORM", "offscreen");
    app = std::make_unique<QGuiApplication>(argc, argv);
  } else {
    app = std::make_unique<QCoreApplication>(argc, argv);
  }
  app->setApplicationName(QStringLiteral("Tessal"));
  app->setOrganizationName(QStringLiteral("Tessal"));
  QTextStream out(stdout), err(stderr);
  if (WTTimerCommands::isTimerCommand(command) || command == QLatin1String("log") ||
      command == QLatin1String("list")) {
    // Their output is for people and scripts: the journal's and the store's diary stays out of it.
    QLoggingCategory::setFilterRules(QStringLiteral("*.debug=false\n*.info=false"));
  }
  if (WTTimerCommands::isTimerCommand(command)) return runTrackCommand(command, arguments, out, err);
  if (command == QLatin1String("log")) return runLogCommand(arguments, out, err);
  if (command == QLatin1String("list")) return runListCommand(arguments, out, err);
  if (command == QLatin1String("report")) return runReportCommand(arguments, out, err);
  if (command == QLatin1String("export")) return runExportCommand(arguments, out, err);
  if (command == QLatin1String("template")) return runTemplateCommand(arguments, out, err);
  return runSync(arguments, out, err);
}
