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

}  // namespace WTEditCommitter
