#pragma once

#include <QDate>
#include <QFrame>

class QCalendarWidget;

// The small pop-over with a calendar that books an item on another day. It closes when a day is
// chosen, on Escape or on a click elsewhere, and announces that it is about to close either way.
class WTDatePopover : public QFrame {
  Q_OBJECT
 public:
  explicit WTDatePopover(QWidget* parent = nullptr);

  QCalendarWidget* datePicker() const { return datePicker_; }
  QDate date() const;
  void setDate(const QDate& date);
  // Shows the pop-over under `anchor` (global coordinates), kept on the anchor's screen.
  void showRelativeToRect(const QRect& anchor);

 signals:
  void popoverWillClose();

 protected:
  void hideEvent(QHideEvent* event) override;

 private:
  QCalendarWidget* datePicker_;
};
