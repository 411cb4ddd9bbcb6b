#pragma once

#include "WTItem.h"

// A to-do: pending until completed, then booked on the day it was completed.
class WTToDo final : public WTItem {
  WT_ENTITY_CLASS(WTToDo, ToDo)
 public:
  explicit WTToDo(WTObjectContext* context) : WTItem(WTEntity::ToDo, context) {}

  bool completed() const { return completed_; }
  // Stores the flag; nothing else follows (loading, sync and undo put back what was stored).
  void setCompleted(bool completed);
  // What the person ticking the box means: a to-do completed now is dated now, the completion time; one
  // opened again keeps that date. Saying what already holds changes nothing.
  void markCompleted(bool completed);

 private:
  bool completed_ = false;
};
