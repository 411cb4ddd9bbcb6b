#pragma once

#include <QFrame>
#include <QList>
#include <QPointer>

#include <utility>

class QLabel;
class QToolButton;
class QVBoxLayout;
class WTRecentTasks;
class WTTask;

// The tray's list: the limited controller's tasks, each with its image, name, project, the elapsed time of
// its running timers and its timer button ("Start"/"Stop"), and "Show Tessal" below. A frameless popup that
// closes on a click elsewhere, when "Show Tessal" is chosen, or when the list becomes empty. While it is
// open its rows keep their places (a started task comes first when it opens again): a row never moves
// under the pointer or takes the focus with it.
class WTStatusBarPopup : public QFrame {
  Q_OBJECT
 public:
  // `tasks` (not owned) must outlive the popup.
  explicit WTStatusBarPopup(WTRecentTasks* tasks, QWidget* parent = nullptr);

  // Shows the popup beside `anchor` (global coordinates: the tray icon or the button that opened it),
  // below it when there is room, above otherwise, and always inside that screen.
  void popUp(const QRect& anchor);
  // Shows the running timers' minutes as they are now (after a tick); changes nothing else, so the
  // focus and the keyboard stay where they are.
  void updateElapsedTimes();

 signals:
  void showMainWindowRequested();

 protected:
  void showEvent(QShowEvent* event) override;
  void hideEvent(QHideEvent* event) override;

 private:
  struct Row {
    WTTask* task;
    QLabel* image;
    QLabel* title;
    QLabel* elapsed;
    QToolButton* button;
  };
  void rebuildRows();
  // Shows each row's task as it is now, in the rows' order.
  void fillRows();
  void tasksDidChange();

  WTRecentTasks* tasks_;
  QVBoxLayout* rowLayout_;
  QWidget* emptyHint_;
  QList<Row> rows_;
};
