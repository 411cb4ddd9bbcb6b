#include "WTDesktopCommands.h"

#include "RZSyncCommand.h"
#include "RZSyncErrorPresenter.h"
#include "UserDefaults.h"
#include "WTAlertPresenter.h"
#include "WTAppDelegate.h"
#include "WTApplication.h"
#include "WTCommandLine.h"
#include "WTObjectContext.h"
#include "WTPasswordStore.h"
#include "WTQtKeychain.h"
#include "WTReportCommand.h"
#include "WTReportPDF.h"
#include "WTSingleInstance.h"
#include "WTStoreWriterLock.h"
#include "WTTemplateCommand.h"

#include <QCoreApplication>
#include <QDir>
#include <QEventLoop>
#include <QGuiApplication>
#include <QTextDocument>
#include <QTextStream>

#include <memory>

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
  bool offerRestore(const QString& message, const QString& backup) override {
    err_ << message << '\n'
         << QStringLiteral("The newest good backup is %1; `tessal restore '%1'` puts it back.").arg(backup)
         << '\n';
    err_.flush();
    return false;
  }
  void presentSyncError(const QString&) override {}
  void presentNetworkError(const QString&) override {}
  void presentMergeNotice(const QString&, const QString& message) override { presentError(message); }

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
  // A start or stop from the shell finds the store held and hands its change here, as it would to the
  // window: carried out between the exchanges with the server, it is never refused for the sync's sake.
  instance.setRequestHandler(
      [&delegate](const QJsonObject& request) { return delegate.carryOutRequest(request); });
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

std::optional<int> runDesktopCommand(int argc, char** argv) {
  if (argc < 2) return std::nullopt;
  const QString command = QString::fromLocal8Bit(argv[1]);
  if (!WTCommandLine::isDesktopCommand(command)) return std::nullopt;
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
  if (command == QLatin1String("report")) {
    return runReportCommand(
        arguments, out, err, [](const QString& html, const QString& title, const QString& path) {
          QTextDocument document;
          document.setHtml(html);
          document.setMetaInformation(QTextDocument::DocumentTitle, title);
          return WTReportPDF::write(document, QStringLiteral("Report — %1").arg(title), path);
        });
  }
  if (command == QLatin1String("export")) return runExportCommand(arguments, out, err);
  if (command == QLatin1String("template")) return runTemplateCommand(arguments, out, err);
  return runSync(arguments, out, err);
}
