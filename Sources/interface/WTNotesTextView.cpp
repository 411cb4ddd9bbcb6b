#include "WTNotesTextView.h"

#include "RZColor.h"
#include "WTTableCellView.h"

#include <QTimer>

WTNotesTextView::WTNotesTextView(QWidget* parent) : QPlainTextEdit(parent) {
  setObjectName(QStringLiteral("notesTextView"));
  setFont(WTTableCellView::notesFont());
  setFrameShape(QFrame::NoFrame);
  setTabChangesFocus(true);
  setLineWrapMode(QPlainTextEdit::WidgetWidth);
  document()->setDocumentMargin(3);
  QPalette colours = palette();
  colours.setColor(QPalette::Text, RZColor::calibratedWhite(0.33));
  colours.setColor(QPalette::Base, QColor(Qt::white));
  setPalette(colours);
  // Up to the field's largest height it grows instead of scrolling.
  setVerticalScrollBarPolicy(Qt::ScrollBarAsNeeded);
  setHorizontalScrollBarPolicy(Qt::ScrollBarAlwaysOff);
  connect(this, &QPlainTextEdit::textChanged, this, &WTNotesTextView::noteHeighChanged);
}

void WTNotesTextView::noteHeighChanged() {
  if (pending_) return;
  pending_ = true;
  QTimer::singleShot(0, this, [this] {
    pending_ = false;
    emit heightChangeRequested();
  });
}

void WTNotesTextView::focusInEvent(QFocusEvent* event) {
  QPlainTextEdit::focusInEvent(event);
  noteHeighChanged();
}

void WTNotesTextView::focusOutEvent(QFocusEvent* event) {
  QPlainTextEdit::focusOutEvent(event);
  noteHeighChanged();
}
