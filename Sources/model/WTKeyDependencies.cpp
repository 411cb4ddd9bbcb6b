#include "WTKeyDependencies.h"

#include <QHash>

namespace {

struct Declaration {
  const char* key;
  std::vector<const char*> paths;
};

// The declared dependencies. The circular pairs (a project's rate and inherited rate, a time entry's
// duration and end date) are intended: a change of either refreshes observers of both.
const std::vector<Declaration>& declarations(WTEntity entity) {
  static const std::vector<Declaration> client = {
      {"duration", {"projects"}},
      {"cost", {"projects"}},
      {"inheritedRate", {"rate"}},
      {"tableImage", {"archived"}},
  };
  static const std::vector<Declaration> project = {
      {"duration", {"tasks"}},     {"cost", {"duration", "rate"}},
      {"tasksArray", {"tasks"}},   {"rate", {"inheritedRate", "client", "client.rate"}},
      {"inheritedRate", {"rate"}}, {"tableImage", {"archived"}},
      {"running", {"tasks"}},
  };
  static const std::vector<Declaration> task = {
      {"duration", {"items"}},           {"cost", {"rate", "items"}},  {"rate", {"project", "project.rate"}},
      {"inheritedRate", {"rate"}},       {"times", {"items"}},         {"runningTimes", {"times"}},
      {"runningDuration", {"duration"}}, {"buttonTitle", {"running"}}, {"timerButtonImage", {"running"}},
      {"tableImage", {"running"}},       {"children", {"items"}},
  };
  static const std::vector<Declaration> time = {
      {"cost", {"duration"}},
      {"duration", {"startDate", "endDate"}},
      {"endDate", {"duration"}},
  };
  static const std::vector<Declaration> flat = {
      {"cost", {"duration"}},
      {"duration", {"minutes"}},
  };
  static const std::vector<Declaration> expense = {
      {"cost", {"duration", "expense"}},
  };
  static const std::vector<Declaration> item = {
      {"cost", {"duration"}},
  };
  switch (entity) {
    case WTEntity::Client:
      return client;
    case WTEntity::Project:
      return project;
    case WTEntity::Task:
      return task;
    case WTEntity::Time:
      return time;
    case WTEntity::Flat:
      return flat;
    case WTEntity::Expense:
      return expense;
    case WTEntity::Note:
    case WTEntity::ToDo:
      return item;
  }
  return item;
}

// The to-many side of each to-one relationship a path may run through.
QString inverseOf(WTEntity entity, const QString& relationship) {
  if (entity == WTEntity::Project && relationship == QLatin1String("client"))
    return QStringLiteral("projects");
  if (entity == WTEntity::Task && relationship == QLatin1String("project")) return QStringLiteral("tasks");
  if (WTEntities::isItem(entity) && relationship == QLatin1String("task")) return QStringLiteral("items");
  return {};
}

WTEntity ownerEntity(WTEntity entity) {
  switch (entity) {
    case WTEntity::Project:
      return WTEntity::Client;
    case WTEntity::Task:
      return WTEntity::Project;
    default:
      return WTEntity::Task;
  }
}

struct Tables {
  QHash<QString, QStringList> local[8];
  QHash<QString, std::vector<WTKeyDependencies::RelatedDependency>> related[8];

  Tables() {
    for (WTEntity entity : WTEntities::kAll) {
      const int index = static_cast<int>(entity);
      for (const Declaration& declaration : declarations(entity)) {
        const QString key = QString::fromLatin1(declaration.key);
        for (const char* rawPath : declaration.paths) {
          const QString path = QString::fromLatin1(rawPath);
          const qsizetype dot = path.indexOf(u'.');
          if (dot < 0) {
            local[index][path].append(key);
            continue;
          }
          // "project.rate": when a project announces "rate", each of its tasks announces `key`.
          const QString relationship = path.left(dot);
          const QString ownerKey = path.mid(dot + 1);
          const int owner = static_cast<int>(ownerEntity(entity));
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
  for (const Declaration& declaration : declarations(entity)) {
    if (key == QLatin1String(declaration.key)) {
      QStringList paths;
      for (const char* path : declaration.paths) paths.append(QString::fromLatin1(path));
      return paths;
    }
  }
  return {};
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
