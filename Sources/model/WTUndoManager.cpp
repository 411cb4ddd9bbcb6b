#include "WTUndoManager.h"

#include <utility>

void WTUndoManager::registerUndo(std::function<void()> action) {
  if (disabled_ > 0) return;
  if (state_ != State::Idle) {
    collecting_.push_back(std::move(action));
    return;
  }
  open_.push_back(std::move(action));
  redoStack_.clear();
}

void WTUndoManager::closeGroup() {
  if (open_.empty()) return;
  undoStack_.push_back(std::move(open_));
  open_.clear();
}

bool WTUndoManager::canUndo() const {
  return !open_.empty() || !undoStack_.empty();
}
bool WTUndoManager::canRedo() const {
  return !redoStack_.empty();
}

void WTUndoManager::undo() {
  closeGroup();
  run(undoStack_, State::Undoing);
}

void WTUndoManager::redo() {
  closeGroup();
  run(redoStack_, State::Redoing);
}

void WTUndoManager::run(std::vector<Group>& from, State state) {
  if (from.empty() || state_ != State::Idle) return;
  Group group = std::move(from.back());
  from.pop_back();
  state_ = state;
  collecting_.clear();
  for (auto it = group.rbegin(); it != group.rend(); ++it) (*it)();
  state_ = State::Idle;
  if (collecting_.empty()) return;
  auto& to = state == State::Undoing ? redoStack_ : undoStack_;
  to.push_back(std::move(collecting_));
  collecting_.clear();
}

void WTUndoManager::removeAllActions() {
  undoStack_.clear();
  redoStack_.clear();
  open_.clear();
}
