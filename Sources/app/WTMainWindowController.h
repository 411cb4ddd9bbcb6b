#pragma once

#include <QList>
#include <QMainWindow>
#include <QTimer>

class QTreeWidget;
class WTAppDelegate;
class WTProject;

// The main window: for now a plain list of the projects with their tasks, durations and costs.
class WTMainWindowController : public QMainWindow {
  Q_OBJECT
 public:
  explicit WTMainWindowController(WTAppDelegate& delegate, QWidget* parent = nullptr);

  // The projects of the store (none when it could not be opened).
  QList<WTProject*> fetchProjects() const;
  // On the first run, with an empty store, makes "Default Project" with "Default Task". Saves nothing.
  void populate();
  // Refills the list from the records.
  void reloadData();

  QTreeWidget* projectsList() const { return list_; }

 protected:
  void closeEvent(QCloseEvent* event) override;

 private:
  WTAppDelegate& delegate_;
  QTreeWidget* list_;
  QTimer reload_;
};
