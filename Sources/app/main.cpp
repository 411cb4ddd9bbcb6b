#include "TessalLogging.h"
#include "WTAppDelegate.h"
#include "WTApplication.h"
#include "WTCommandLine.h"
#include "WTDesktopCommands.h"
#include "WTSingleInstance.h"
#include "WTStoreWriterLock.h"

#include <QDir>
#include <QMainWindow>

int main(int argc, char** argv) {
  // `tessal` hands this executable the desktop and the commands it does not carry itself; run directly,
  // it answers them all. The commands run without a window.
  if (const std::optional<int> status = WTCommandLine::run(argc, argv)) return *status;
  if (const std::optional<int> status = runDesktopCommand(argc, argv)) return *status;

  WTApplication app(argc, argv);
  // One copy per user: a second launch brings the first one's window forward and never opens the
  // store itself.
  WTSingleInstance instance;
  if (!instance.start()) return 0;
  // The store has one writer: a command changing it by itself finishes first (within milliseconds), and
  // from now on commands hand their changes to this copy.
  WTAppDelegate& delegate = app.delegate();
  QDir().mkpath(WTAppDelegate::applicationSupportFolder());
  WTStoreWriterLock writerLock(delegate.storePath());
  if (!writerLock.lock(10000))
    qCWarning(lcStore, "Could not take %s; another process may be changing the store",
              qPrintable(writerLock.filePath()));
  instance.setRequestHandler(
      [&delegate](const QJsonObject& request) { return delegate.carryOutRequest(request); });
  QObject::connect(&instance, &WTSingleInstance::reopenRequested, &app,
                   [&app] { app.applicationShouldHandleReopen(app.mainWindow()->isVisible()); });
  app.setQuitOnLastWindowClosed(false);  // quitting goes through the delegate's save
  app.applicationDidFinishLaunching();
  return app.exec();
}
