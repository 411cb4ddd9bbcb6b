#include "WTCommandLine.h"

#include "RZSyncCommand.h"
#include "RZSyncErrorPresenter.h"
#include "UserDefaults.h"
#include "WTAlertPresenter.h"
#include "WTAppDelegate.h"
#include "WTApplication.h"
#include "WTObjectContext.h"
#include "WTSingleInstance.h"
#include "WTTemplateCommand.h"

#include <QCoreApplication>
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
  void presentSyncError(const QString&) override {}
  void presentNetworkError(const QString&) override {}

 private:
  QTextStream& err_;
};

int runSync(const QStringList& arguments, QTextStream& out, QTextStream& err) {
  // The store is one process's: while the desktop copy runs, it is the one that syncs.
  WTSingleInstance instance;
  if (!instance.start(false)) {
    err << "Tessal is running and keeps its store in step itself; quit it to sync from here.\n";
    err.flush();
    return 1;
  }
  UserDefaults defaults;
  WTApplication::registerDefaults(defaults);
  WTCommandLinePresenter presenter(err);
  WTAppDelegate delegate(&defaults, &presenter);
  delegate.setSyncErrorPresenter(&presenter);
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

}  // namespace

std::optional<int> runCommandLine(int argc, char** argv) {
  if (argc < 2) return std::nullopt;
  const QString command = QString::fromLocal8Bit(argv[1]);
  if (command != QLatin1String("template") && command != QLatin1String("sync")) return std::nullopt;

  QCoreApplication app(argc, argv);
  app.setApplicationName(QStringLiteral("Tessal"));
  app.setOrganizationName(QStringLiteral("Tessal"));
  QTextStream out(stdout), err(stderr);
  const QStringList arguments = app.arguments().mid(2);
  if (command == QLatin1String("template")) return runTemplateCommand(arguments, out, err);
  return runSync(arguments, out, err);
}
