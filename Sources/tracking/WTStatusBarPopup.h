#pragma once

#include <QFrame>
#include <QPointer>

class QVBoxLayout;
class RZLimitedArrayController;

// The tray's list: the limited controller's tasks, each with its image, name, project and timer button
// ("Start"/"Stop"), and "Show Tessal" below. A frameless popup that closes on a click elsewhere, when
// "Show Tessal" is chosen, or when the list becomes empty.
class WTStatusBarPopup : public QFrame {
  Q_OBJECT
 public:
  // `tasks` (not owned) must outlive the popup.
  explicit WTStatusBarPopup(RZLimitedArrayController* tasks, QWidget* parent = nullptr);

  // Shows the popup beside `anchor` (global coordinates: the tray icon or the button that opened it),
  // below it when there is room, above otherwise, and always inside that screen.
  void popUp(const QRect& anchor);
  // The rows on screen, for whoever drives the popup (tests, accessibility).
  int rowCount() const;

 signals:
  void showMainWindowRequested();

 protected:
  void showEvent(QShowEvent* event) override;
  void hideEvent(QHideEvent* event) override;

 private:
  void rebuildRows();

  RZLimitedArrayController* tasks_;
  QVBoxLayout* rows_;
  QWidget* emptyHint_;
};
