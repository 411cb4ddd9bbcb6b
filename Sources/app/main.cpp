#include "WTApplication.h"

int main(int argc, char** argv) {
  WTApplication app(argc, argv);
  app.setQuitOnLastWindowClosed(false);  // quitting goes through the delegate's save
  app.applicationDidFinishLaunching();
  return app.exec();
}
