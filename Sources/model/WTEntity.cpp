#include "WTEntity.h"

namespace WTEntities {

QString name(WTEntity entity) {
  switch (entity) {
    case WTEntity::Client:
      return QStringLiteral("WTClient");
    case WTEntity::Project:
      return QStringLiteral("WTProject");
    case WTEntity::Task:
      return QStringLiteral("WTTask");
    case WTEntity::Time:
      return QStringLiteral("WTTime");
    case WTEntity::Flat:
      return QStringLiteral("WTFlat");
    case WTEntity::Expense:
      return QStringLiteral("WTExpense");
    case WTEntity::Note:
      return QStringLiteral("WTNote");
    case WTEntity::ToDo:
      return QStringLiteral("WTToDo");
  }
  return {};
}

std::optional<WTEntity> fromName(QStringView text) {
  for (WTEntity entity : kAll) {
    if (name(entity) == text) return entity;
  }
  return std::nullopt;
}

bool isKindOf(WTEntity entity, QStringView kindName) {
  if (kindName == u"WTObject") return true;
  if (kindName == u"WTItem") return isItem(entity);
  return name(entity) == kindName;
}

bool isEntityName(QStringView text) {
  return text == u"WTObject" || text == u"WTItem" || fromName(text).has_value();
}

}  // namespace WTEntities
