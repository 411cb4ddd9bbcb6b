#include "WTUndoManager.h"

#include <utility>

void WTUndoManager::registerUndo(std::function<void()> action) {
  if (disabled_ > 0) return;
  if (state_ != State::Idle) {
    collecting_.push_back(std::move(action));
    return;
  }
  open_.actions.push_back(std::move(action));
  ++registered_;
  if (redoStack_.empty()) return;
  redoStack_.clear();
  notify();
}

void WTUndoManager::closeGroup() {
  if (open_.actions.empty()) {
    open_.name.clear();
    return;
  }
  undoStack_.push_back(std::exchange(open_, {}));
  notify();
}

void WTUndoManager::setActionName(const QString& name) {
  if (disabled_ > 0 || state_ != State::Idle) return;
  open_.name = name;
}

QString WTUndoManager::undoActionName() const {
  if (!open_.actions.empty()) return open_.name;
  return undoStack_.empty() ? QString() : undoStack_.back().name;
}

QString WTUndoManager::redoActionName() const {
  return redoStack_.empty() ? QString() : redoStack_.back().name;
}

bool WTUndoManager::canUndo() const {
  return !open_.actions.empty() || !undoStack_.empty();
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
  for (auto it = group.actions.rbegin(); it != group.actions.rend(); ++it) (*it)();
  state_ = State::Idle;
  if (!collecting_.empty()) {
    auto& to = state == State::Undoing ? redoStack_ : undoStack_;
    to.push_back({std::exchange(collecting_, {}), std::move(group.name)});
  }
  notify();
}

void WTUndoManager::removeAllActions() {
  undoStack_.clear();
  redoStack_.clear();
  open_ = {};
  notify();
}
