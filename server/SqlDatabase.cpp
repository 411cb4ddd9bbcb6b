#include "SqlDatabase.h"

#include <charconv>

namespace tessal::server {

const std::string& SqlRow::text(size_t column) const {
  static const std::string kEmpty;
  const auto& cell = cells_.at(column);
  return cell ? *cell : kEmpty;
}

int64_t SqlRow::integer(size_t column) const {
  const auto& cell = cells_.at(column);
  if (!cell) return 0;
  int64_t value = 0;
  const auto [end, ec] = std::from_chars(cell->data(), cell->data() + cell->size(), value);
  if (ec != std::errc() || end != cell->data() + cell->size()) throw StorageError("not an integer: " + *cell);
  return value;
}

SqlDatabase::Lease::~Lease() {
  if (!connection_ || !owner_) return;
  if (!connection_->healthy()) return;
  std::lock_guard lock(owner_->mutex_);
  owner_->idle_.push_back(std::move(connection_));
}

SqlDatabase::Lease SqlDatabase::acquire() {
  {
    std::lock_guard lock(mutex_);
    if (!idle_.empty()) {
      std::unique_ptr<SqlConnection> connection = std::move(idle_.back());
      idle_.pop_back();
      return Lease(this, std::move(connection));
    }
  }
  return Lease(this, connect());
}

std::unique_ptr<SqlDatabase> SqlDatabase::open(const std::string& location, std::string& error) {
  const bool postgres = location.rfind("postgresql://", 0) == 0 || location.rfind("postgres://", 0) == 0;
  std::unique_ptr<SqlDatabase> database =
      postgres ? openPostgresDatabase(location) : openSqliteDatabase(location);
  try {
    // Connecting once at start reports a wrong location before the first request does.
    database->acquire();
  } catch (const StorageError& e) {
    error = e.what();
    return nullptr;
  }
  return database;
}

}  // namespace tessal::server
