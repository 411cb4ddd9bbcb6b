#include "WTApplication.h"

#include "UserDefaults.h"
#include "WTAppDelegate.h"
#include "WTDialogAlertPresenter.h"
#include "WTImages.h"
#include "WTMainWindowController.h"

WTApplication::WTApplication(int& argc, char** argv)
    : QApplication(argc, argv),
      defaults_(std::make_unique<UserDefaults>()),
      presenter_(std::make_unique<WTDialogAlertPresenter>()) {
  setApplicationName(QStringLiteral("Tessal"));
  setOrganizationName(QStringLiteral("Tessal"));
  setDesktopFileName(QStringLiteral("tessal"));
  setWindowIcon(WTImages::icon(QStringLiteral("tessal")));
  registerDefaults(*defaults_);
  delegate_ = std::make_unique<WTAppDelegate>(defaults_.get(), presenter_.get());
  delegate_->setSyncErrorPresenter(presenter_.get());
  connect(this, &QCoreApplication::aboutToQuit, delegate_.get(), &WTAppDelegate::applicationWillTerminate);
}

WTApplication::~WTApplication() {
  mainWindowController_.reset();
  delegate_.reset();
}

void WTApplication::registerDefaults(UserDefaults& defaults) {
  defaults.registerDefaults(
      {{QStringLiteral("wtInvoiceUnit"), QStringLiteral("h")}, {QStringLiteral("WTIdleTime"), 5}});
}

WTMainWindowController* WTApplication::mainWindowController() {
  if (!mainWindowController_) {
    mainWindowController_ = std::make_unique<WTMainWindowController>(*delegate_);
    presenter_->setParentWidget(mainWindowController_.get());
  }
  return mainWindowController_.get();
}

QMainWindow* WTApplication::mainWindow() {
  return mainWindowController();
}

void WTApplication::applicationDidFinishLaunching() {
  mainWindowController()->bringToFront();
}

bool WTApplication::applicationShouldHandleReopen(bool) {
  mainWindowController()->bringToFront();
  return true;
}
