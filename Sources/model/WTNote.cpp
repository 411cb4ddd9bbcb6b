#include "WTNote.h"

#include "WTObjectContext.h"

WT_ENTITY_CLASS_IMPL(WTNote)

const WTKeyTable& WTNote::keys() {
  static const WTKeyTable table(&itemKeys(), {});
  return table;
}
