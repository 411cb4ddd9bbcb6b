#include "WTStore.h"

#include "WTObject.h"
#include "WTStoreRows.h"
#include "WTStoreSchema.h"

#include <QHash>
#include <QJsonArray>
#include <QJsonDocument>
#include <QSet>

#include <sqlite3.h>

#include <algorithm>

// Reading the store's records, whole or the part a load names.

namespace {

// The loads' statements: one for each of the first three WTStore::Records, three for RunningAndNamed.
enum Statement { All, Timers, ItemsOfTasks, Running, Owners, ByUuid };

// Each half of the timers' load is read through its own small index (version 2), so a large store's
// items are never visited. Task uuids arrive as one JSON array, so a single prepared statement serves
// any number of them.
constexpr const char* kSql[] = {
    "SELECT " WT_STORE_COLUMNS " FROM records",
    "SELECT " WT_STORE_COLUMNS " FROM records WHERE " WT_STORE_OWNERS " UNION ALL SELECT " WT_STORE_COLUMNS
    " FROM records WHERE " WT_STORE_RUNNING " AND NOT " WT_STORE_OWNERS,
    "SELECT " WT_STORE_COLUMNS " FROM records WHERE " WT_STORE_OWNERS " UNION ALL SELECT " WT_STORE_COLUMNS
    " FROM records WHERE taskUuid IN (SELECT value FROM json_each(?1)) AND NOT " WT_STORE_OWNERS,
    // Through the same two indexes, apart: the running entries and their tasks, then what links the owners
    // and the tasks' names; last a record chosen by them.
    "SELECT uuid, taskUuid FROM records WHERE " WT_STORE_RUNNING " AND NOT " WT_STORE_OWNERS,
    "SELECT entity, uuid, projectUuid, clientUuid, name FROM records WHERE " WT_STORE_OWNERS,
    "SELECT " WT_STORE_COLUMNS " FROM records WHERE uuid = ?1",
};

QByteArrayView text(sqlite3_stmt* statement, int column) {
  const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(statement, column));
  return {text, text ? sqlite3_column_bytes(statement, column) : 0};
}

}  // namespace

sqlite3_stmt* WTStore::loadStatement(int which, int* code) {
  static_assert(std::size(kSql) == kLoadStatements);
  *code = SQLITE_OK;
  if (!load_[which])
    *code = sqlite3_prepare_v3(db_, kSql[which], -1, SQLITE_PREPARE_PERSISTENT, &load_[which], nullptr);
  return load_[which];
}

Result<void> WTStore::loadAll(const std::function<void(WTStoreRecord&&)>& sink, Records which,
                              const QStringList& keys) {
  if (!shaped_) return {};  // a file opened for reading before anything was ever written to it
  if (which == Records::RunningAndNamed) return loadRunningAndNamed(sink, keys);
  if (which == Records::All || which == Records::ItemsOfTasks) readInPlace();
  int code = SQLITE_OK;
  sqlite3_stmt* s = loadStatement(int(which), &code);
  if (code != SQLITE_OK) return readError(code);
  QByteArray taskList;
  if (which == Records::ItemsOfTasks) {
    taskList = QJsonDocument(QJsonArray::fromStringList(keys)).toJson(QJsonDocument::Compact);
    sqlite3_bind_text(s, 1, taskList.constData(), int(taskList.size()), SQLITE_STATIC);
  }
  WTStoreRecord record;
  WTStoreRows::SharedUuids owners;
  while ((code = sqlite3_step(s)) == SQLITE_ROW) {
    if (!WTStoreRows::readRecord(s, record, &owners)) {
      code = SQLITE_CORRUPT;
      break;
    }
    sink(std::move(record));
  }
  sqlite3_reset(s);
  sqlite3_clear_bindings(s);
  return code == SQLITE_DONE ? Result<void>() : readError(code);
}

// The links are read first, a few bytes a record; whole rows only for the records chosen by them, in the
// same read transaction. A project is read with every one of its tasks: saving one of them writes its
// place among them.
Result<void> WTStore::loadRunningAndNamed(const std::function<void(WTStoreRecord&&)>& sink,
                                          const QStringList& names) {
  int code = sqlite3_exec(db_, "BEGIN", nullptr, nullptr, nullptr);
  if (code != SQLITE_OK) return readError(code);
  QList<QByteArray> chosen, runningTasks;
  sqlite3_stmt* running = loadStatement(Running, &code);
  while (code == SQLITE_OK && (code = sqlite3_step(running)) == SQLITE_ROW) {
    code = SQLITE_OK;
    chosen.append(text(running, 0).toByteArray());
    runningTasks.append(text(running, 1).toByteArray());
  }
  if (running) sqlite3_reset(running);

  // Every task is kept until the projects wanted are known, its uuid among the others' in one array.
  struct Task {
    qsizetype end;
    int project;  // -1 for none
    bool wanted;
  };
  struct Project {
    QByteArray uuid, client;
    bool wanted = false;
  };
  QByteArray taskUuids;
  std::vector<Task> tasks;
  std::vector<Project> projects;
  QHash<QByteArray, int> projectIndex;
  const auto project = [&](QByteArrayView uuid) {
    if (uuid.isNull()) return -1;
    const auto found = projectIndex.constFind(QByteArray::fromRawData(uuid.data(), uuid.size()));
    if (found != projectIndex.cend()) return *found;
    projects.push_back({uuid.toByteArray(), {}});
    return *projectIndex.insert(projects.back().uuid, int(projects.size() - 1));
  };
  sqlite3_stmt* owners = code == SQLITE_DONE ? loadStatement(Owners, &code) : nullptr;
  while (code == SQLITE_OK && (code = sqlite3_step(owners)) == SQLITE_ROW) {
    code = SQLITE_OK;
    const QByteArrayView entity = text(owners, 0), uuid = text(owners, 1);
    if (entity == "WTTask") {
      const QString name = QString::fromUtf8(text(owners, 4));
      const bool wanted = runningTasks.contains(uuid) ||
                          std::any_of(names.begin(), names.end(),
                                      [&](const QString& named) { return WTObject::sameName(name, named); });
      const int of = project(text(owners, 2));
      if (wanted && of >= 0) projects[of].wanted = true;
      taskUuids.append(uuid);
      tasks.push_back({taskUuids.size(), of, wanted});
    } else if (entity == "WTProject") {
      const int index = project(uuid);
      projects[index].client = text(owners, 3).toByteArray();
    }
  }
  if (owners) sqlite3_reset(owners);

  qsizetype start = 0;
  for (const Task& task : tasks) {
    if (task.wanted || (task.project >= 0 && projects[task.project].wanted))
      chosen.append(taskUuids.sliced(start, task.end - start));
    start = task.end;
  }
  QSet<QByteArray> clients;
  for (const Project& project : projects) {
    if (!project.wanted) continue;
    chosen.append(project.uuid);
    if (!project.client.isNull() && !clients.contains(project.client)) {
      clients.insert(project.client);
      chosen.append(project.client);
    }
  }

  sqlite3_stmt* s = code == SQLITE_DONE ? loadStatement(ByUuid, &code) : nullptr;
  WTStoreRecord record;
  for (auto uuid = chosen.cbegin(); code == SQLITE_OK && uuid != chosen.cend(); ++uuid) {
    sqlite3_bind_text(s, 1, uuid->constData(), int(uuid->size()), SQLITE_STATIC);
    if ((code = sqlite3_step(s)) == SQLITE_ROW) {
      code = WTStoreRows::readRecord(s, record) ? SQLITE_OK : SQLITE_CORRUPT;
      if (code == SQLITE_OK) sink(std::move(record));
    } else if (code == SQLITE_DONE) {
      code = SQLITE_OK;
    }
    sqlite3_reset(s);
  }
  sqlite3_exec(db_, "COMMIT", nullptr, nullptr, nullptr);
  return code == SQLITE_OK ? Result<void>() : readError(code);
}
