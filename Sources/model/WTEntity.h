#pragma once

#include <QString>

#include <optional>

// The stored entities. The names are the entity names of the store, the journal and the uuid suffix.
enum class WTEntity : unsigned char { Client, Project, Task, Time, Flat, Expense, Note, ToDo };

namespace WTEntities {

inline constexpr WTEntity kAll[] = {WTEntity::Client, WTEntity::Project, WTEntity::Task, WTEntity::Time,
                                    WTEntity::Flat,   WTEntity::Expense, WTEntity::Note, WTEntity::ToDo};

QString name(WTEntity entity);
// The concrete entity of that name; none for abstract or unknown names.
std::optional<WTEntity> fromName(QStringView name);
// True when `entity` is `kindName` or descends from it ("WTObject", "WTItem" or a concrete name).
bool isKindOf(WTEntity entity, QStringView kindName);
// True for the names of the model's entities, the abstract "WTObject" and "WTItem" included.
bool isEntityName(QStringView name);
inline bool isItem(WTEntity entity) {
  return entity >= WTEntity::Time;
}
// The entity a record of `entity` is filed under (a client, which has none, answers itself).
constexpr WTEntity owner(WTEntity entity) {
  switch (entity) {
    case WTEntity::Client:
    case WTEntity::Project:
      return WTEntity::Client;
    case WTEntity::Task:
      return WTEntity::Project;
    default:
      return WTEntity::Task;
  }
}

}  // namespace WTEntities
