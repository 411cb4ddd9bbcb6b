#include "WTApplication.h"
#include "WTCommandLine.h"
#include "WTSingleInstance.h"

#include <QMainWindow>

int main(int argc, char** argv) {
  // `tessal template …` and `tessal sync …` run without a window.
  if (const std::optional<int> status = runCommandLine(argc, argv)) return *status;

  WTApplication app(argc, argv);
  // One copy per user: a second launch brings the first one's window forward and never opens the
  // store itself.
  WTSingleInstance instance;
  if (!instance.start()) return 0;
  QObject::connect(&instance, &WTSingleInstance::reopenRequested, &app,
                   [&app] { app.applicationShouldHandleReopen(app.mainWindow()->isVisible()); });
  app.setQuitOnLastWindowClosed(false);  // quitting goes through the delegate's save
  app.applicationDidFinishLaunching();
  return app.exec();
}
