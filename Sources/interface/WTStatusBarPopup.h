#pragma once

#include <QFrame>
#include <QList>
#include <QPointer>

#include <utility>

class QLabel;
class QVBoxLayout;
class WTRecentTasks;
class WTTask;

// The tray's list: the limited controller's tasks, each with its image, name, project, the elapsed time of
// its running timers and its timer button ("Start"/"Stop"), and "Show Tessal" below. A frameless popup that
// closes on a click elsewhere, when "Show Tessal" is chosen, or when the list becomes empty.
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
  void rebuildRows();

  WTRecentTasks* tasks_;
  QVBoxLayout* rows_;
  QWidget* emptyHint_;
  // Each row's task and the label of its elapsed time.
  QList<std::pair<WTTask*, QLabel*>> elapsed_;
};
