// The SQLite storage: one file, WAL journal so that polls read while a save writes, every commit
// synced (an acknowledged save must survive a crash).
#include "SqlDatabase.h"

#include <sqlite3.h>

#include <unordered_map>

namespace tessal::server {

namespace {

class SqliteConnection final : public SqlConnection {
 public:
  explicit SqliteConnection(const std::string& path) {
    const int rc = sqlite3_open_v2(path.c_str(), &db_,
                                   SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE | SQLITE_OPEN_NOMUTEX, nullptr);
    if (rc != SQLITE_OK) {
      std::string message = db_ ? sqlite3_errmsg(db_) : sqlite3_errstr(rc);
      sqlite3_close(db_);
      db_ = nullptr;
      throw StorageError(message);  // the caller names the file
    }
    sqlite3_busy_timeout(db_, 10000);
    executeScript("PRAGMA journal_mode=WAL; PRAGMA synchronous=FULL;");
  }

  ~SqliteConnection() override {
    for (auto& [sql, statement] : statements_) sqlite3_finalize(statement);
    sqlite3_close(db_);
  }

  std::vector<SqlRow> query(const std::string& sql, const std::vector<SqlParam>& params) override {
    sqlite3_stmt* statement = prepared(sql);
    sqlite3_reset(statement);
    sqlite3_clear_bindings(statement);
    for (size_t i = 0; i < params.size(); ++i) {
      const int index = static_cast<int>(i) + 1;
      int rc = SQLITE_OK;
      if (const auto* number = std::get_if<int64_t>(&params[i])) {
        rc = sqlite3_bind_int64(statement, index, *number);
      } else if (const auto* text = std::get_if<std::string_view>(&params[i])) {
        rc = sqlite3_bind_text64(statement, index, text->data(), text->size(), SQLITE_STATIC, SQLITE_UTF8);
      } else {
        rc = sqlite3_bind_null(statement, index);
      }
      if (rc != SQLITE_OK) fail("bind");
    }
    std::vector<SqlRow> rows;
    const int columns = sqlite3_column_count(statement);
    for (;;) {
      const int rc = sqlite3_step(statement);
      if (rc == SQLITE_DONE) break;
      if (rc != SQLITE_ROW) {
        sqlite3_reset(statement);
        fail(sql.c_str());
      }
      std::vector<std::optional<std::string>> cells(columns);
      for (int c = 0; c < columns; ++c) {
        if (sqlite3_column_type(statement, c) == SQLITE_NULL) continue;
        const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(statement, c));
        cells[c].emplace(text, static_cast<size_t>(sqlite3_column_bytes(statement, c)));
      }
      rows.emplace_back(std::move(cells));
    }
    sqlite3_reset(statement);
    return rows;
  }

  void executeScript(const std::string& sql) override {
    char* message = nullptr;
    if (sqlite3_exec(db_, sql.c_str(), nullptr, nullptr, &message) != SQLITE_OK) {
      std::string text = message ? message : "unknown error";
      sqlite3_free(message);
      throw StorageError(text);
    }
  }

  // A deferred transaction takes its snapshot at the first read.
  void beginRead() override { executeScript("BEGIN"); }
  // Taking the write lock up front avoids the upgrade deadlock of two readers turning writers.
  void beginWrite() override { executeScript("BEGIN IMMEDIATE"); }
  void commit() override { executeScript("COMMIT"); }
  void rollback() noexcept override {
    if (!sqlite3_get_autocommit(db_)) sqlite3_exec(db_, "ROLLBACK", nullptr, nullptr, nullptr);
  }
  bool healthy() const override { return sqlite3_get_autocommit(db_) != 0; }

 private:
  sqlite3_stmt* prepared(const std::string& sql) {
    auto found = statements_.find(sql);
    if (found != statements_.end()) return found->second;
    sqlite3_stmt* statement = nullptr;
    if (sqlite3_prepare_v3(db_, sql.c_str(), static_cast<int>(sql.size()), SQLITE_PREPARE_PERSISTENT,
                           &statement, nullptr) != SQLITE_OK) {
      fail(sql.c_str());
    }
    statements_.emplace(sql, statement);
    return statement;
  }

  [[noreturn]] void fail(const char* what) {
    throw StorageError(std::string(what) + ": " + sqlite3_errmsg(db_));
  }

  sqlite3* db_ = nullptr;
  std::unordered_map<std::string, sqlite3_stmt*> statements_;
};

class SqliteDatabase final : public SqlDatabase {
 public:
  explicit SqliteDatabase(std::string path) : SqlDatabase(Kind::SQLite), path_(std::move(path)) {}

 protected:
  std::unique_ptr<SqlConnection> connect() override { return std::make_unique<SqliteConnection>(path_); }

 private:
  std::string path_;
};

}  // namespace

std::unique_ptr<SqlDatabase> openSqliteDatabase(const std::string& path) {
  return std::make_unique<SqliteDatabase>(path);
}

}  // namespace tessal::server
