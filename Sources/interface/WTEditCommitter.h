#pragma once

class QWidget;

// Hands what the user is typing to the model without ending the edit, so that a save (the autosave, a
// merge of the sync, quitting) stores it while the user, who cannot tell, goes on typing: the editor
// stays open with its text, cursor and selection, and the keyboard focus does not move.
namespace WTEditCommitter {

// Commits the edit of `focus` (normally QApplication::focusWidget()): an item view's open editor through
// the view's own commit path, a line edit through its editingFinished handlers. Anything else, or none,
// is left alone. Returns whether there was an edit to commit.
bool commitWithoutEnding(QWidget* focus);

// The first part of Undo, as the user means it: what they typed into `focus` (a field or an open cell
// editor) is taken back there, the editor staying open. Returns false when there is no typing to undo.
bool undoTyping(QWidget* focus);
// Its counterpart for Redo.
bool redoTyping(QWidget* focus);
// Whether undoTyping and redoTyping would take anything back in `focus`.
bool hasTypingToUndo(const QWidget* focus);
bool hasTypingToRedo(const QWidget* focus);

// Before the records themselves are undone: an open cell editor with nothing typed in it is closed (it
// would otherwise show, and later store, a value the undo replaced), the keyboard focus going to its
// view. Focused fields stay as they are. Returns whether an editor was closed.
bool closeUntouchedEditor(QWidget* focus);

}  // namespace WTEditCommitter
