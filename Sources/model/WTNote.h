#pragma once

#include "WTItem.h"

// A note booked on a day; it has no values of its own and costs nothing.
class WTNote final : public WTItem {
  WT_ENTITY_CLASS(WTNote, Note)
 public:
  explicit WTNote(WTObjectContext* context) : WTItem(WTEntity::Note, context) {}
};
