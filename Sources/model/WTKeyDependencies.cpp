#include "WTKeyDependencies.h"

#include "WTObject.h"

#include <QHash>

namespace {

// The to-many side of each to-one relationship a path may run through.
QString inverseOf(WTEntity entity, const QString& relationship) {
  if (entity == WTEntity::Project && relationship == QLatin1String("client"))
    return QStringLiteral("projects");
  if (entity == WTEntity::Task && relationship == QLatin1String("project")) return QStringLiteral("tasks");
  if (WTEntities::isItem(entity) && relationship == QLatin1String("task")) return QStringLiteral("items");
  return {};
}

struct Tables {
  QHash<QString, QStringList> local[8];
  QHash<QString, std::vector<WTKeyDependencies::RelatedDependency>> related[8];

  Tables() {
    for (WTEntity entity : WTEntities::kAll) {
      const int index = static_cast<int>(entity);
      for (const WTKeyDescriptor& declaration : WTObject::keyTable(entity).keys()) {
        const QString& key = declaration.name;
        for (const QString& path : declaration.affectedBy) {
          const qsizetype dot = path.indexOf(u'.');
          if (dot < 0) {
            local[index][path].append(key);
            continue;
          }
          // "project.rate": when a project announces "rate", each of its tasks announces `key`.
          const QString relationship = path.left(dot);
          const QString ownerKey = path.mid(dot + 1);
          const int owner = static_cast<int>(WTEntities::owner(entity));
          related[owner][ownerKey].push_back({inverseOf(entity, relationship), key});
        }
      }
    }
  }
};

const Tables& tables() {
  static const Tables instance;
  return instance;
}

}  // namespace

namespace WTKeyDependencies {

QStringList keyPathsForValuesAffecting(WTEntity entity, const QString& key) {
  const WTKeyDescriptor* declaration = WTObject::keyTable(entity).find(key);
  return declaration ? declaration->affectedBy : QStringList();
}

const QStringList& dependentKeys(WTEntity entity, const QString& key) {
  static const QStringList none;
  const auto& table = tables().local[static_cast<int>(entity)];
  auto it = table.constFind(key);
  return it == table.constEnd() ? none : *it;
}

const std::vector<RelatedDependency>& relatedDependents(WTEntity entity, const QString& key) {
  static const std::vector<RelatedDependency> none;
  const auto& table = tables().related[static_cast<int>(entity)];
  auto it = table.constFind(key);
  return it == table.constEnd() ? none : *it;
}

}  // namespace WTKeyDependencies
