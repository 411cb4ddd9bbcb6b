#include "WTItemKindFilter.h"

#include <QCoreApplication>

QStringList WTItemKindFilter::filters() const { return {QStringLiteral("item_kind")}; }

QVariant WTItemKindFilter::filterInvoked(const QString& filter, const QStringList&, const QVariant& value) {
  if (filter != QLatin1String("item_kind")) return {};
  static const std::pair<const char*, const char*> kinds[] = {
      {"WTTime", QT_TRANSLATE_NOOP("WTItemKindFilter", "Time")},
      {"WTFlat", QT_TRANSLATE_NOOP("WTItemKindFilter", "Flat fee")},
      {"WTExpense", QT_TRANSLATE_NOOP("WTItemKindFilter", "Expense")},
      {"WTToDo", QT_TRANSLATE_NOOP("WTItemKindFilter", "To-do")},
      {"WTNote", QT_TRANSLATE_NOOP("WTItemKindFilter", "Note")},
  };
  const QString name = value.toString();
  for (const auto& [entity, title] : kinds) {
    if (name == QLatin1String(entity)) return QCoreApplication::translate("WTItemKindFilter", title);
  }
  return value;
}
