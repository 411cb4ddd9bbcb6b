#include "WTToDo.h"

#include "WTObjectContext.h"
#include "WTStoreRecord.h"

WT_ENTITY_CLASS_IMPL(WTToDo)

const WTKeyTable& WTToDo::keys() {
  static const WTKeyTable table(
      &itemKeys(), {WTKeys::stored("completed", &WTToDo::completed_, &WTStoreRecord::completed)});
  return table;
}

void WTToDo::setCompleted(bool completed) {
  setStoredValue(QStringLiteral("completed"), completed);
}

void WTToDo::markCompleted(bool completed) {
  if (completed == completed_) return;
  setCompleted(completed);
  if (completed) setStartDate(Date::now());
}
