#pragma once

#include <QString>

#include <functional>
#include <vector>

// Undo and redo as groups of inverse actions. An action runs the inverse change through the normal
// setters, which register their own inverse in turn: while undoing those land on the redo stack, while
// redoing on the undo stack. A group is closed at the end of each event-loop turn (the owner calls
// closeGroup), so one user action undoes as a whole.
class WTUndoManager {
 public:
  void registerUndo(std::function<void()> action);
  // Closes the open group, if it holds anything.
  void closeGroup();

  bool canUndo() const;
  bool canRedo() const;
  void undo();
  void redo();
  void removeAllActions();
  bool isUndoing() const { return state_ == State::Undoing; }
  bool isRedoing() const { return state_ == State::Redoing; }

  // While disabled nothing is recorded (loading, merging from elsewhere).
  void disableRegistration() { ++disabled_; }
  void enableRegistration() { --disabled_; }

 private:
  using Group = std::vector<std::function<void()>>;
  enum class State { Idle, Undoing, Redoing };
  void run(std::vector<Group>& from, State state);

  std::vector<Group> undoStack_;
  std::vector<Group> redoStack_;
  Group open_;
  Group collecting_;  // inverses registered while undoing or redoing
  State state_ = State::Idle;
  int disabled_ = 0;
};
