#include "WTNote.h"

#include "WTObjectContext.h"

WT_ENTITY_CLASS_IMPL(WTNote)
