#pragma once

#include <QString>

#include <functional>
#include <vector>

// Undo and redo as groups of inverse actions. An action runs the inverse change through the normal
// setters, which register their own inverse in turn: while undoing those land on the redo stack, while
// redoing on the undo stack. A group is closed at the end of each event-loop turn (the owner calls
// closeGroup), so one user action undoes as a whole.
//
// Each group carries the name of the step it undoes ("Delete “Temp”", "Typing"), set by whatever made
// the change, for the Edit menu's "Undo <name>"; the name stays with the group through undo and redo.
class WTUndoManager {
 public:
  void registerUndo(std::function<void()> action);
  // Closes the open group, if it holds anything.
  void closeGroup();

  // Names the open group. The last name set before the group closes wins; a group that ends empty
  // drops it. Ignored while undoing, redoing or not recording.
  void setActionName(const QString& name);
  // The names of the steps undo and redo would take back now; empty when unnamed or none.
  QString undoActionName() const;
  QString redoActionName() const;

  // Names the group with `name` when the changes made while it lives registered anything: for an
  // operation that may change nothing (an edit storing what was already there).
  class NamedStep {
   public:
    NamedStep(WTUndoManager& manager, QString name)
        : manager_(manager), name_(std::move(name)), start_(manager.registered_) {}
    ~NamedStep() {
      if (manager_.registered_ != start_) manager_.setActionName(name_);
    }
    NamedStep(const NamedStep&) = delete;
    NamedStep& operator=(const NamedStep&) = delete;

   private:
    WTUndoManager& manager_;
    QString name_;
    quint64 start_;
  };

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
  // Whether registered actions are kept: a caller may skip making one that would be dropped.
  bool isRecording() const { return disabled_ == 0; }

  // Runs whenever what undo or redo would do may have changed: a group closed, an undo or redo ran,
  // the redo steps were dropped or everything was removed.
  void setChangeHandler(std::function<void()> handler) { changed_ = std::move(handler); }

 private:
  struct Group {
    std::vector<std::function<void()>> actions;
    QString name;
  };
  enum class State { Idle, Undoing, Redoing };
  void run(std::vector<Group>& from, State state);
  void notify() const {
    if (changed_) changed_();
  }

  std::vector<Group> undoStack_;
  std::vector<Group> redoStack_;
  Group open_;
  std::vector<std::function<void()>> collecting_;  // inverses registered while undoing or redoing
  State state_ = State::Idle;
  int disabled_ = 0;
  quint64 registered_ = 0;  // actions recorded into open groups, ever
  std::function<void()> changed_;
};
