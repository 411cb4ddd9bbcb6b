#pragma once

#include "Result.h"
#include "WTViewController.h"

#include <QList>
#include <QMainWindow>
#include <QPointer>
#include <QTimer>

#include <functional>

class QAction;
class QActionGroup;
class QToolBar;
class QToolButton;
class UserDefaults;
class WTAppDelegate;
class WTClientsViewController;
class WTExportController;
class QMessageBox;
class QTimeZone;
struct WTImportFile;
class WTNavigationController;
class WTPreferencesWindowController;
class WTProject;
class WTProjectsViewController;

// The main window: a toolbar and two navigation stacks, the projects (the projects list, then a
// project's items outline on top of it) and the clients. It switches between the stacks, forwards
// the toolbar's and menus' commands to the controller on top of the visible stack, enables and titles
// the toolbar items after it, fills an empty store with a first project, and routes Undo and Redo to
// the store.
//
// Toolbar items carry their identifier as object name: "projects", "clients", "add", "remove",
// "archive", "report" (and "toggleTimer", "back", "showArchived" for menu-only commands).
class WTMainWindowController : public QMainWindow, public WTNavigationHost {
  Q_OBJECT
 public:
  // Opens the store through the delegate (which must outlive the window), fills it on the first run,
  // and shows the projects stack.
  explicit WTMainWindowController(WTAppDelegate& delegate, QWidget* parent = nullptr);
  ~WTMainWindowController() override;

  // Registers "WTCustomRangeBegin" (a month ago) and "WTCustomRangeEnd" (now); stored values win.
  static void registerDefaults(UserDefaults& defaults);

  // The projects of the store (none when it could not be opened).
  QList<WTProject*> fetchProjects() const;

  // WTNavigationHost: the stack on screen, and switching stacks (nothing when already shown).
  WTNavigationController* currentNavigationController() const override;
  void showProjects() override;
  void showClients() override;
  // Through the delegate's alert presenter.
  bool confirmDeletion(const QString& question, const QString& detail) override;

  // The root of the visible stack (deliberately not its top).
  WTViewController* topViewController() const;
  // Forwarded to the top controller of the visible stack when it implements them; dropped otherwise.
  void addObject();
  void removeSelectedObjects();
  void toggleArchive();
  void report();
  void toggleTimer();
  // The project selected in the projects list, or open in its outline; none otherwise.
  WTProject* selectedProject() const;
  // File › Export…: the time-entry export dialog, over the window.
  WTExportController* exportData();
  // File › Import…: asks for a file, then importFile().
  void importData();
  // What importing `path` makes, in a dialog over the window (its rows that cannot be read instead, and
  // no import); its Import button makes it all, one step of undo. The dialog is returned open, saying the
  // file is being read; the file is read on a thread of its own and the preview follows.
  QMessageBox* importFile(const QString& path);
  // Pops the visible stack, unless only its root is left.
  void goBack();

  // Enables (and for "archive" titles) one toolbar item after the top controller.
  bool validateToolbarItem(QAction* item);
  void validateToolbarItems();
  QString selectedToolbarItemIdentifier() const;
  QAction* toolbarItem(const QString& identifier) const;
  QToolBar* toolbar() const { return toolbar_; }

  // Stores the chosen index of a project pop-up as "WTLastSelectedProject".
  void saveLastSelectedProject(int index);

  // Brings the window forward and makes it active (launch and re-open).
  void bringToFront();

  // Edit › Preferences… (Ctrl+,): the one preferences window, made on first use, brought forward.
  WTPreferencesWindowController* showPreferences();

  // File › Quit: asks what the delegate asks at quitting, then quits (unless cancelled).
  void quit();
  // With a tray to come back from, closing the window only hides it and Tessal keeps running there;
  // without, closing it quits.
  void setHidesOnClose(bool hides) { hidesOnClose_ = hides; }
  // Where the desktop has no tray, a toolbar button shows the running time and opens the tray's list.
  void setRunningTimeButtonVisible(bool visible);
  void setRunningTime(const QString& label);
  QToolButton* runningTimeButton() const { return runningTimeButton_; }
  // A notice on the status line under the lists, shown while it stands (the line is hidden without
  // one); it takes no focus and ends no edit.
  void showNotice(const QString& text);
  // Takes the notice off the status line if it is the one that begins with `summary`.
  void withdrawNotice(const QString& summary);
  // Shows what `text` gives instead of the notice that begins with `summary`, if that one stands (only
  // then is `text` asked).
  void renewNotice(const QString& summary, const std::function<QString()>& text);
  static constexpr int kNoticeMilliseconds = 10 * 60 * 1000;

  WTProjectsViewController* projectsViewController() const { return projectsViewController_; }
  WTClientsViewController* clientsViewController() const { return clientsViewController_; }
  WTNavigationController* projectsNavigationController() const { return projectsNavigationController_; }
  QWidget* contentView() const { return contentView_; }

 signals:
  // The running-time button was clicked; `anchor` is its place on the screen.
  void runningTimeButtonClicked(const QRect& anchor);

 protected:
  void closeEvent(QCloseEvent* event) override;
  bool event(QEvent* event) override;

 private:
  void previewImport(QMessageBox* dialog, const QString& path, Result<WTImportFile> read,
                     const QTimeZone& zone);
  void restoreWindowGeometry();
  void saveWindowGeometry();
  void buildActions();
  void showStack(WTNavigationController* stack, const QString& identifier);
  void setSelectedToolbarItemIdentifier(const QString& identifier);
  WTViewController* lastViewController() const;
  void scheduleValidation();
  void watch(WTViewController* controller);
  // Titles Edit › Undo and Redo after the step each would take back: the typing in the focused field,
  // else the store's named step ("Undo Delete “Temp”").
  void updateUndoTitles();

  WTAppDelegate& delegate_;
  QWidget* contentView_ = nullptr;
  WTProjectsViewController* projectsViewController_ = nullptr;
  WTClientsViewController* clientsViewController_ = nullptr;
  WTNavigationController* projectsNavigationController_ = nullptr;
  WTNavigationController* clientsNavigationController_ = nullptr;
  QToolBar* toolbar_ = nullptr;
  QToolButton* runningTimeButton_ = nullptr;
  QAction* runningTimeItem_ = nullptr;
  bool hidesOnClose_ = false;
  WTPreferencesWindowController* preferences_ = nullptr;  // a child window, made on first use
  bool quitting_ = false;
  QActionGroup* stackGroup_ = nullptr;
  QAction* undo_ = nullptr;
  QAction* redo_ = nullptr;
  QList<QAction*> actions_;
  QTimer validation_;
};
