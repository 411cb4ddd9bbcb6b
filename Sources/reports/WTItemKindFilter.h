#pragma once

#include "GXTemplateFilter.h"

// "item_kind": an item's entity name ("WTTime", "WTFlat", …) as a reader calls the kind ("Time",
// "Flat fee", "Expense", "To-do", "Note"), so a report names every row's kind with one lookup instead of a
// condition per kind. Any other value is written as it is.
class WTItemKindFilter : public GXTemplateFilter {
 public:
  QStringList filters() const override;
  QVariant filterInvoked(const QString& filter, const QStringList& args, const QVariant& value) override;
};
