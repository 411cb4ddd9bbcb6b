#include "WTEditCommitter.h"

#include <QAbstractItemDelegate>
#include <QAbstractItemView>
#include <QLineEdit>
#include <QPlainTextEdit>
#include <QPointer>

namespace {

// The item view whose viewport holds `focus`, and the viewport's child it lives in: the open editor, if
// any (the view's commit slot ignores a child that is not one of its editors).
QAbstractItemView* owningEditor(QWidget* focus, QWidget*& editor) {
  for (QWidget* child = focus; child && child->parentWidget(); child = child->parentWidget()) {
    auto* view = qobject_cast<QAbstractItemView*>(child->parentWidget()->parentWidget());
    if (view && child->parentWidget() == view->viewport()) {
      editor = child;
      return view;
    }
  }
  return nullptr;
}

// A line edit's text, cursor and selection, put back after handlers that may have rewritten the text.
class LineEditState {
 public:
  explicit LineEditState(QLineEdit* edit)
      : edit_(edit),
        text_(edit->text()),
        cursor_(edit->cursorPosition()),
        selectionStart_(edit->selectionStart()),
        selectionLength_(edit->selectionLength()) {}
  void restore() const {
    if (!edit_) return;
    if (edit_->text() != text_) edit_->setText(text_);
    if (selectionLength_ > 0) {
      // The cursor stays at whichever end of the selection it was.
      if (cursor_ == selectionStart_)
        edit_->setSelection(selectionStart_ + selectionLength_, -selectionLength_);
      else
        edit_->setSelection(selectionStart_, selectionLength_);
    } else {
      edit_->setCursorPosition(cursor_);
    }
  }

 private:
  QPointer<QLineEdit> edit_;
  QString text_;
  int cursor_;
  int selectionStart_;
  int selectionLength_;
};

}  // namespace

bool WTEditCommitter::commitWithoutEnding(QWidget* focus) {
  if (!focus) return false;
  QWidget* editor = nullptr;
  if (QAbstractItemView* view = owningEditor(focus, editor)) {
    // The view's own slot finds the editor's index and delegate and writes the value; the editor stays.
    QMetaObject::invokeMethod(view, "commitData", Qt::DirectConnection, Q_ARG(QWidget*, editor));
    return true;
  }
  if (auto* edit = qobject_cast<QLineEdit*>(focus)) {
    // Fields bound to a record store their text when editing finishes; the user keeps what they see.
    const LineEditState state(edit);
    emit edit->editingFinished();
    state.restore();
    return true;
  }
  return false;
}

bool WTEditCommitter::hasTypingToUndo(const QWidget* focus) {
  if (auto* edit = qobject_cast<const QLineEdit*>(focus)) return edit->isUndoAvailable();
  if (auto* text = qobject_cast<const QPlainTextEdit*>(focus)) return text->document()->isUndoAvailable();
  return false;
}

bool WTEditCommitter::hasTypingToRedo(const QWidget* focus) {
  if (auto* edit = qobject_cast<const QLineEdit*>(focus)) return edit->isRedoAvailable();
  if (auto* text = qobject_cast<const QPlainTextEdit*>(focus)) return text->document()->isRedoAvailable();
  return false;
}

bool WTEditCommitter::undoTyping(QWidget* focus) {
  if (auto* edit = qobject_cast<QLineEdit*>(focus); edit && edit->isUndoAvailable()) {
    edit->undo();
    return true;
  }
  if (auto* text = qobject_cast<QPlainTextEdit*>(focus); text && text->document()->isUndoAvailable()) {
    text->undo();
    return true;
  }
  return false;
}

bool WTEditCommitter::redoTyping(QWidget* focus) {
  if (auto* edit = qobject_cast<QLineEdit*>(focus); edit && edit->isRedoAvailable()) {
    edit->redo();
    return true;
  }
  if (auto* text = qobject_cast<QPlainTextEdit*>(focus); text && text->document()->isRedoAvailable()) {
    text->redo();
    return true;
  }
  return false;
}

bool WTEditCommitter::closeUntouchedEditor(QWidget* focus) {
  if (!focus) return false;
  QWidget* editor = nullptr;
  QAbstractItemView* view = owningEditor(focus, editor);
  if (!view) return false;
  // The view's own slot releases the editor and, as it had the focus, gives the focus to the view.
  return QMetaObject::invokeMethod(view, "closeEditor", Qt::DirectConnection, Q_ARG(QWidget*, editor),
                                   Q_ARG(QAbstractItemDelegate::EndEditHint, QAbstractItemDelegate::NoHint));
}
