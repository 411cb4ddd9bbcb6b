#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

namespace tessal::server {

// A failure of the storage (cannot connect, constraint broken, disk full, lock wait too long). It does
// not leave the storage layer: SyncStore turns it into an error result.
class StorageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// A statement parameter; text is only borrowed for the duration of the call.
using SqlParam = std::variant<std::nullptr_t, int64_t, std::string_view>;

// One result row, every column as text (or none for NULL).
class SqlRow {
 public:
  explicit SqlRow(std::vector<std::optional<std::string>> cells) : cells_(std::move(cells)) {}
  bool isNull(size_t column) const { return !cells_.at(column).has_value(); }
  // The column's text; empty for NULL.
  const std::string& text(size_t column) const;
  // The column as an integer; 0 for NULL. Throws StorageError when the text is not an integer.
  int64_t integer(size_t column) const;

 private:
  std::vector<std::optional<std::string>> cells_;
};

// One connection, used by one thread at a time. Statements are written with "?" placeholders and a
// dialect both engines understand; each statement text is prepared once per connection.
class SqlConnection {
 public:
  virtual ~SqlConnection() = default;
  // Runs one statement and returns its rows. Throws StorageError.
  virtual std::vector<SqlRow> query(const std::string& sql, const std::vector<SqlParam>& params = {}) = 0;
  // Runs statements without parameters or results (schema set-up). Throws StorageError.
  virtual void executeScript(const std::string& sql) = 0;
  // A transaction whose reads all see one consistent state.
  virtual void beginRead() = 0;
  // A transaction that will write; writers of one account are serialised by SyncStore's row lock.
  virtual void beginWrite() = 0;
  virtual void commit() = 0;
  virtual void rollback() noexcept = 0;
  // False once the connection is broken; a broken connection is not handed out again.
  virtual bool healthy() const = 0;
};

// A storage location and a pool of connections to it.
class SqlDatabase {
 public:
  enum class Kind { SQLite, PostgreSQL };

  virtual ~SqlDatabase() = default;

  // A "postgresql://" or "postgres://" URI selects PostgreSQL; anything else is the path of a SQLite
  // file, created when missing. Returns none with `error` set when the first connection fails.
  static std::unique_ptr<SqlDatabase> open(const std::string& location, std::string& error);

  Kind kind() const { return kind_; }

  // A pooled connection, given back when the lease ends (dropped instead when broken).
  class Lease {
   public:
    Lease(SqlDatabase* owner, std::unique_ptr<SqlConnection> connection)
        : owner_(owner), connection_(std::move(connection)) {}
    Lease(Lease&&) = default;
    Lease& operator=(Lease&&) = delete;
    ~Lease();
    SqlConnection* operator->() const { return connection_.get(); }
    SqlConnection& operator*() const { return *connection_; }

   private:
    SqlDatabase* owner_;
    std::unique_ptr<SqlConnection> connection_;
  };

  // Takes an idle connection or opens a new one. Throws StorageError when it cannot connect.
  Lease acquire();

 protected:
  explicit SqlDatabase(Kind kind) : kind_(kind) {}
  virtual std::unique_ptr<SqlConnection> connect() = 0;

 private:
  Kind kind_;
  std::mutex mutex_;
  std::vector<std::unique_ptr<SqlConnection>> idle_;
};

std::unique_ptr<SqlDatabase> openSqliteDatabase(const std::string& path);
std::unique_ptr<SqlDatabase> openPostgresDatabase(const std::string& uri);

}  // namespace tessal::server
