// The PostgreSQL storage over libpq: each statement text is prepared once per connection, parameters
// travel as text.
#include "SqlDatabase.h"

#include <libpq-fe.h>

#include <unordered_map>

namespace tessal::server {

namespace {

// "?" placeholders become "$1", "$2", ...; the statements never hold a "?" inside a literal.
std::string numberedPlaceholders(const std::string& sql, int& count) {
  std::string out;
  out.reserve(sql.size() + 16);
  count = 0;
  for (const char c : sql) {
    if (c == '?') {
      out += '$';
      out += std::to_string(++count);
    } else {
      out += c;
    }
  }
  return out;
}

class ResultHolder {
 public:
  explicit ResultHolder(PGresult* result) : result_(result) {}
  ~ResultHolder() { PQclear(result_); }
  ResultHolder(const ResultHolder&) = delete;
  ResultHolder& operator=(const ResultHolder&) = delete;
  PGresult* get() const { return result_; }

 private:
  PGresult* result_;
};

class PostgresConnection final : public SqlConnection {
 public:
  explicit PostgresConnection(const std::string& uri) : connection_(PQconnectdb(uri.c_str())) {
    if (PQstatus(connection_) != CONNECTION_OK) {
      std::string message = PQerrorMessage(connection_);
      PQfinish(connection_);
      connection_ = nullptr;
      throw StorageError("cannot connect to PostgreSQL: " + message);
    }
    executeScript("SET client_min_messages = warning");
  }

  ~PostgresConnection() override { PQfinish(connection_); }

  std::vector<SqlRow> query(const std::string& sql, const std::vector<SqlParam>& params) override {
    const std::string& name = prepared(sql);
    std::vector<std::string> texts(params.size());
    std::vector<const char*> values(params.size(), nullptr);
    std::vector<int> lengths(params.size(), 0);
    for (size_t i = 0; i < params.size(); ++i) {
      if (const auto* number = std::get_if<int64_t>(&params[i])) {
        texts[i] = std::to_string(*number);
      } else if (const auto* text = std::get_if<std::string_view>(&params[i])) {
        texts[i].assign(text->data(), text->size());
      } else {
        continue;  // NULL
      }
      values[i] = texts[i].c_str();
      lengths[i] = static_cast<int>(texts[i].size());
    }
    ResultHolder result(PQexecPrepared(connection_, name.c_str(), static_cast<int>(params.size()),
                                       values.data(), lengths.data(), nullptr, 0));
    const ExecStatusType status = PQresultStatus(result.get());
    if (status != PGRES_TUPLES_OK && status != PGRES_COMMAND_OK) fail(result.get());
    std::vector<SqlRow> rows;
    const int count = PQntuples(result.get());
    const int columns = PQnfields(result.get());
    rows.reserve(count);
    for (int r = 0; r < count; ++r) {
      std::vector<std::optional<std::string>> cells(columns);
      for (int c = 0; c < columns; ++c) {
        if (PQgetisnull(result.get(), r, c)) continue;
        cells[c].emplace(PQgetvalue(result.get(), r, c),
                         static_cast<size_t>(PQgetlength(result.get(), r, c)));
      }
      rows.emplace_back(std::move(cells));
    }
    return rows;
  }

  void executeScript(const std::string& sql) override {
    ResultHolder result(PQexec(connection_, sql.c_str()));
    const ExecStatusType status = PQresultStatus(result.get());
    if (status != PGRES_COMMAND_OK && status != PGRES_TUPLES_OK) fail(result.get());
  }

  // A snapshot for the whole transaction: a "head" reply must not mix two states.
  void beginRead() override { executeScript("BEGIN ISOLATION LEVEL REPEATABLE READ READ ONLY"); }
  void beginWrite() override { executeScript("BEGIN"); }
  void commit() override { executeScript("COMMIT"); }
  void rollback() noexcept override {
    if (connection_ && PQtransactionStatus(connection_) != PQTRANS_IDLE)
      PQclear(PQexec(connection_, "ROLLBACK"));
  }
  bool healthy() const override {
    return connection_ && PQstatus(connection_) == CONNECTION_OK &&
           PQtransactionStatus(connection_) == PQTRANS_IDLE;
  }

 private:
  const std::string& prepared(const std::string& sql) {
    auto found = names_.find(sql);
    if (found != names_.end()) return found->second;
    int count = 0;
    const std::string numbered = numberedPlaceholders(sql, count);
    // Appending rather than `"s" + std::to_string(...)`: GCC 12 at -O3 reports a false -Wrestrict inside
    // std::string for the latter.
    std::string name(1, 's');
    name += std::to_string(names_.size() + 1);
    ResultHolder result(PQprepare(connection_, name.c_str(), numbered.c_str(), count, nullptr));
    if (PQresultStatus(result.get()) != PGRES_COMMAND_OK) fail(result.get());
    return names_.emplace(sql, std::move(name)).first->second;
  }

  [[noreturn]] void fail(PGresult* result) {
    std::string message = result ? PQresultErrorMessage(result) : "";
    if (message.empty()) message = PQerrorMessage(connection_);
    while (!message.empty() && (message.back() == '\n' || message.back() == ' ')) message.pop_back();
    throw StorageError(message);
  }

  PGconn* connection_;
  std::unordered_map<std::string, std::string> names_;
};

class PostgresDatabase final : public SqlDatabase {
 public:
  explicit PostgresDatabase(std::string uri) : SqlDatabase(Kind::PostgreSQL), uri_(std::move(uri)) {}

 protected:
  std::unique_ptr<SqlConnection> connect() override { return std::make_unique<PostgresConnection>(uri_); }

 private:
  std::string uri_;
};

}  // namespace

std::unique_ptr<SqlDatabase> openPostgresDatabase(const std::string& uri) {
  return std::make_unique<PostgresDatabase>(uri);
}

}  // namespace tessal::server
