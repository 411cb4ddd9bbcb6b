#pragma once

#include <QPlainTextEdit>

// The notes field under a row's main line while it is edited. It tells its row to take a new height
// whenever its text changes or it gains or loses focus, one event-loop turn later (after the focus
// change is complete), so the outline relayouts once and nothing animates.
class WTNotesTextView : public QPlainTextEdit {
  Q_OBJECT
 public:
  explicit WTNotesTextView(QWidget* parent = nullptr);

  // Asks for the row's relayout on the next turn of the event loop (several asks make one).
  void noteHeighChanged();

 signals:
  // The row holding this field should take its new height now.
  void heightChangeRequested();

 protected:
  void focusInEvent(QFocusEvent* event) override;
  void focusOutEvent(QFocusEvent* event) override;

 private:
  bool pending_ = false;
};
