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
enum Statement { All, Timers, ItemsOfTasks, Running, Owners, ByRowid };

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
    "SELECT rowid, taskUuid FROM records WHERE " WT_STORE_RUNNING " AND NOT " WT_STORE_OWNERS,
    "SELECT rowid, entity, uuid, projectUuid, clientUuid, name FROM records WHERE " WT_STORE_OWNERS,
    "SELECT " WT_STORE_COLUMNS " FROM records WHERE rowid = ?1",
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
  int code = SQLITE_OK;
  sqlite3_stmt* s = loadStatement(int(which), &code);
  if (code != SQLITE_OK) return readError(code);
  QByteArray taskList;
  if (which == Records::ItemsOfTasks) {
    taskList = QJsonDocument(QJsonArray::fromStringList(keys)).toJson(QJsonDocument::Compact);
    sqlite3_bind_text(s, 1, taskList.constData(), int(taskList.size()), SQLITE_STATIC);
  }
  WTStoreRecord record;
  while ((code = sqlite3_step(s)) == SQLITE_ROW) {
    if (!WTStoreRows::readRecord(s, record)) {
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
  std::vector<qint64> chosen;  // rows
  QList<QByteArray> runningTasks;
  sqlite3_stmt* running = loadStatement(Running, &code);
  while (code == SQLITE_OK && (code = sqlite3_step(running)) == SQLITE_ROW) {
    code = SQLITE_OK;
    chosen.push_back(sqlite3_column_int64(running, 0));
    runningTasks.append(text(running, 1).toByteArray());
  }
  if (running) sqlite3_reset(running);

  struct Task {
    qint64 row;
    QByteArray project;
    bool wanted;
  };
  std::vector<Task> tasks;
  QSet<QByteArray> wantedProjects;
  QHash<QByteArray, std::pair<qint64, QByteArray>> projects;  // row and client by uuid
  QHash<QByteArray, qint64> clients;
  sqlite3_stmt* owners = code == SQLITE_DONE ? loadStatement(Owners, &code) : nullptr;
  while (code == SQLITE_OK && (code = sqlite3_step(owners)) == SQLITE_ROW) {
    code = SQLITE_OK;
    const qint64 row = sqlite3_column_int64(owners, 0);
    const QByteArrayView entity = text(owners, 1), uuid = text(owners, 2);
    if (entity == "WTTask") {
      const QByteArrayView name = text(owners, 5);
      const QString decoded = QString::fromUtf8(name);
      const bool wanted =
          runningTasks.contains(uuid) || std::any_of(names.begin(), names.end(), [&](const QString& wanted) {
            return WTObject::sameName(decoded, wanted);
          });
      tasks.push_back({row, text(owners, 3).toByteArray(), wanted});
      if (wanted && !tasks.back().project.isNull()) wantedProjects.insert(tasks.back().project);
    } else if (entity == "WTProject") {
      projects.insert(uuid.toByteArray(), {row, text(owners, 4).toByteArray()});
    } else {
      clients.insert(uuid.toByteArray(), row);
    }
  }
  if (owners) sqlite3_reset(owners);

  for (const Task& task : tasks) {
    if (task.wanted || wantedProjects.contains(task.project)) chosen.push_back(task.row);
  }
  QSet<qint64> wantedClients;
  for (const QByteArray& uuid : wantedProjects) {
    const auto project = projects.constFind(uuid);
    if (project == projects.cend()) continue;
    chosen.push_back(project->first);
    const auto client = clients.constFind(project->second);
    if (client != clients.cend() && !wantedClients.contains(*client)) {
      wantedClients.insert(*client);
      chosen.push_back(*client);
    }
  }

  sqlite3_stmt* s = code == SQLITE_DONE ? loadStatement(ByRowid, &code) : nullptr;
  WTStoreRecord record;
  for (auto row = chosen.cbegin(); code == SQLITE_OK && row != chosen.cend(); ++row) {
    sqlite3_bind_int64(s, 1, *row);
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
