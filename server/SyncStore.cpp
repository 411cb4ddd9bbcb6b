#include "SyncStore.h"

#include "SaveWork.h"
#include "SyncSchema.h"

#include <chrono>
#include <iostream>
#include <map>

namespace tessal::server {

namespace {

// Stands for "no device" in the comparisons "device <> ?": a request without a device gets every
// change, and a device id never holds a control character (SyncService checks that).
const std::string kNoDevice = "\x01";

void logStorageError(const char* operation, const StorageError& error) {
  std::cerr << "tessal-sync-server: storage error in " << operation << ": " << error.what() << std::endl;
}

// Rolls back whatever the scope leaves open (an exception, an early return).
class TransactionGuard {
 public:
  explicit TransactionGuard(SqlConnection& connection) : connection_(connection) {}
  ~TransactionGuard() {
    if (open_) connection_.rollback();
  }
  void commit() {
    connection_.commit();
    open_ = false;
  }
  void rollback() {
    connection_.rollback();
    open_ = false;
  }

 private:
  SqlConnection& connection_;
  bool open_ = true;
};

// Whether anything but `device` itself changed the account in (from, to].
bool othersChanged(SqlConnection& c, int64_t account, int64_t from, int64_t to, const std::string& device) {
  static const std::string kQueries[] = {
      "SELECT 1 FROM fields WHERE account_id = ? AND iter > ? AND iter <= ? AND device <> ? LIMIT 1",
      "SELECT 1 FROM records WHERE account_id = ? AND created_iter > ? AND created_iter <= ? AND "
      "created_device <> ? "
      "LIMIT 1",
      "SELECT 1 FROM records WHERE account_id = ? AND deleted_iter > ? AND deleted_iter <= ? AND "
      "deleted_device <> ? "
      "LIMIT 1",
  };
  for (const std::string& sql : kQueries) {
    if (!c.query(sql, {account, from, to, device}).empty()) return true;
  }
  return false;
}

// A client applies a project's "tasks" by filing every listed task under the project, which changes
// the task's own "project" locally. When the task's owner is left out (because this device wrote it
// last), the client's store would differ from the server's without anyone noticing, and its pending
// move of that task would be sent over the order it just took. So every listed task comes with its
// owner, which the order guarantees to be this project.
void addOwnersOfListedTasks(std::map<std::string, std::map<std::string, std::string>>& entries) {
  std::vector<std::pair<std::string, std::string>> owners;  // task, project
  for (const auto& [uuid, fields] : entries) {
    if (SyncSchema::entityOf(uuid) != SyncSchema::kOrderedEntity) continue;
    auto tasks = fields.find(std::string(SyncSchema::kOrderedKey));
    if (tasks == fields.end()) continue;
    if (const std::optional<JsonValue> list = JsonValue::parse(tasks->second)) {
      for (const JsonValue& task : list->elements()) owners.emplace_back(task.text(), uuid);
    }
  }
  for (const auto& [task, project] : owners) {
    std::string value;
    appendJsonString(value, project);
    entries[task].emplace(std::string(SyncSchema::kOrderedMemberKey), std::move(value));
  }
}

int64_t unixTime() {
  return std::chrono::duration_cast<std::chrono::seconds>(std::chrono::system_clock::now().time_since_epoch())
      .count();
}

}  // namespace

std::unique_ptr<SyncStore> SyncStore::open(const std::string& location, std::string& error) {
  std::unique_ptr<SqlDatabase> database = SqlDatabase::open(location, error);
  if (!database) return nullptr;
  std::unique_ptr<SyncStore> store(new SyncStore(std::move(database)));
  try {
    store->createSchema();
  } catch (const StorageError& e) {
    error = e.what();
    return nullptr;
  }
  return store;
}

void SyncStore::createSchema() {
  SqlDatabase::Lease c = database_->acquire();
  for (const char* script : syncSchema(kind())) c->executeScript(script);
}

SyncStore::Status SyncStore::createAccount(const std::string& email, const std::string& passwordHash) {
  try {
    SqlDatabase::Lease c = database_->acquire();
    const std::vector<SqlRow> rows = c->query(
        "INSERT INTO accounts (email, password_hash, head, created_at) VALUES (?, ?, 0, ?) "
        "ON CONFLICT (email) DO NOTHING RETURNING id",
        {email, passwordHash, unixTime()});
    return rows.empty() ? Status::Exists : Status::Ok;
  } catch (const StorageError& e) {
    logStorageError("createAccount", e);
    return Status::Unavailable;
  }
}

SyncStore::Status SyncStore::findAccount(const std::string& email, Account& account) {
  try {
    SqlDatabase::Lease c = database_->acquire();
    const std::vector<SqlRow> rows =
        c->query("SELECT id, password_hash FROM accounts WHERE email = ?", {email});
    if (rows.empty()) return Status::NotFound;
    account.id = rows[0].integer(0);
    account.passwordHash = rows[0].text(1);
    return Status::Ok;
  } catch (const StorageError& e) {
    logStorageError("findAccount", e);
    return Status::Unavailable;
  }
}

SyncStore::Head SyncStore::currentHead(int64_t accountId, const std::string& device) {
  Head reply;
  try {
    SqlDatabase::Lease c = database_->acquire();
    const std::vector<SqlRow> rows = c->query(
        "SELECT a.head, d.last_head FROM accounts a LEFT JOIN devices d ON d.account_id = a.id AND "
        "d.device = ? WHERE a.id = ?",
        {device, accountId});
    if (rows.empty()) {
      reply.status = Status::NotFound;
      return reply;
    }
    reply.iteration = rows[0].integer(0);
    reply.lastSent = rows[0].isNull(1) ? -1 : rows[0].integer(1);
  } catch (const StorageError& e) {
    logStorageError("currentHead", e);
    reply.status = Status::Unavailable;
  }
  return reply;
}

SyncStore::Head SyncStore::head(int64_t accountId, int64_t base, const std::string& device) {
  Head reply;
  try {
    SqlDatabase::Lease c = database_->acquire();
    // Remembering what a device was sent writes, and must not interleave with a save of the account
    // (from this process or another): a save is then either in the reply or checked against it.
    const bool remember = !device.empty();
    remember ? c->beginWrite() : c->beginRead();
    TransactionGuard transaction(*c);
    const std::vector<SqlRow> heads = c->query(remember && kind() == SqlDatabase::Kind::PostgreSQL
                                                   ? "SELECT head FROM accounts WHERE id = ? FOR SHARE"
                                                   : "SELECT head FROM accounts WHERE id = ?",
                                               {accountId});
    if (heads.empty()) {
      reply.status = Status::NotFound;
      return reply;
    }
    reply.iteration = heads[0].integer(0);
    const int64_t from = base > reply.iteration ? 0 : base;
    const std::string& others = device.empty() ? kNoDevice : device;

    std::map<std::string, std::map<std::string, std::string>> entries;  // uuid -> field -> JSON text
    std::string deleted;
    if (from < reply.iteration) {
      for (const SqlRow& row :
           c->query("SELECT uuid, name, value FROM fields WHERE account_id = ? AND iter > ? AND "
                    "device <> ?",
                    {accountId, from, others})) {
        entries[row.text(0)].emplace(row.text(1), row.text(2));
      }
      // A record created with no fields still has to reach the other devices.
      for (const SqlRow& row :
           c->query("SELECT uuid FROM records WHERE account_id = ? AND created_iter > ? AND "
                    "created_device <> ? AND deleted_iter IS NULL",
                    {accountId, from, others})) {
        entries.try_emplace(row.text(0));
      }
      for (const SqlRow& row : c->query(
               "SELECT uuid FROM records WHERE account_id = ? AND deleted_iter > ? AND deleted_device <> ?",
               {accountId, from, others})) {
        if (!deleted.empty()) deleted += ',';
        appendJsonString(deleted, row.text(0));
      }
    }
    // The latest answer counts, not the largest: after the storage was restored from a backup the
    // iterations start lower again.
    if (remember) {
      c->query(
          "INSERT INTO devices (account_id, device, last_head) VALUES (?, ?, ?) "
          "ON CONFLICT (account_id, device) DO UPDATE SET last_head = excluded.last_head",
          {accountId, device, reply.iteration});
    }
    transaction.commit();
    addOwnersOfListedTasks(entries);

    // Every record goes under both "i" and "u": a client drops its pending values for a field only
    // from the section the server names, and it may hold them under either.
    std::string section = "{";
    bool firstRecord = true;
    for (const auto& [uuid, fields] : entries) {
      if (!firstRecord) section += ',';
      firstRecord = false;
      appendJsonString(section, uuid);
      section += ":{";
      bool first = true;
      for (const auto& [name, value] : fields) {
        if (!first) section += ',';
        first = false;
        appendJsonString(section, name);
        section += ':';
        section += value;
      }
      section += '}';
    }
    section += '}';
    reply.result.reserve(2 * section.size() + deleted.size() + 24);
    reply.result = "{\"i\":" + section + ",\"u\":" + section + ",\"x\":[" + deleted + "]}";
  } catch (const StorageError& e) {
    logStorageError("head", e);
    reply.status = Status::Unavailable;
  }
  return reply;
}

SyncStore::Save SyncStore::save(int64_t accountId, int64_t base, const std::string& device,
                                const ChangeSet& changes) {
  Save reply;
  try {
    SqlDatabase::Lease c = database_->acquire();
    c->beginWrite();
    TransactionGuard transaction(*c);
    // Saves of one account run one after the other: the row lock holds the others until commit.
    const std::vector<SqlRow> heads =
        c->query(kind() == SqlDatabase::Kind::PostgreSQL ? "SELECT head FROM accounts WHERE id = ? FOR UPDATE"
                                                         : "SELECT head FROM accounts WHERE id = ?",
                 {accountId});
    if (heads.empty()) {
      reply.status = Status::NotFound;
      return reply;
    }
    const int64_t head = heads[0].integer(0);
    // A request overtaken by a later head of the same device (it timed out, the device moved on): the
    // device has merged values this save would overwrite behind its back. Checked under the account's
    // lock, so a head answered by any process just before counts.
    if (!device.empty()) {
      const std::vector<SqlRow> sent =
          c->query("SELECT last_head FROM devices WHERE account_id = ? AND device = ?", {accountId, device});
      if (!sent.empty() && base < sent[0].integer(0)) {
        reply.refused = reply.overtaken = true;
        return reply;
      }
    }
    if (base > head) {
      // The client counts from a history this server does not have; its next "head" gets everything.
      reply.refused = true;
      return reply;
    }
    const bool stale =
        base < head && othersChanged(*c, accountId, base, head, device.empty() ? kNoDevice : device);
    if (stale && device.empty()) {
      // Without a device the reply cannot leave out the client's own changes, so its base may not stay
      // behind: it must catch up first.
      reply.refused = true;
      return reply;
    }

    SaveWork work(*c, accountId, base, head, device);
    for (const RecordChange& change : changes.inserted) work.applyRecord(change);
    for (const RecordChange& change : changes.updated) work.applyRecord(change);
    for (const std::string& uuid : changes.deleted) work.applyDelete(uuid);
    work.settle();

    const int64_t newHead =
        work.wroteServer() ? work.serverIteration() : (work.wroteSender() ? work.senderIteration() : head);
    if (newHead != head) c->query("UPDATE accounts SET head = ? WHERE id = ?", {newHead, accountId});
    transaction.commit();
    // A stale client keeps its base, so its next "head" brings what others did meanwhile (never its own
    // changes); otherwise it has seen everything up to its own iteration. The server's changes come
    // after that, so they reach the sender too.
    reply.iteration = stale ? base : (work.wroteSender() ? work.senderIteration() : head);
  } catch (const StorageError& e) {
    logStorageError("save", e);
    reply = Save{};
    reply.status = Status::Unavailable;
  }
  return reply;
}

SyncStore::Status SyncStore::proveDevice(int64_t accountId, const std::string& device, int64_t at,
                                         int64_t forgetBefore) {
  try {
    SqlDatabase::Lease c = database_->acquire();
    c->query(
        "INSERT INTO proven_devices (account_id, device, proven_at) VALUES (?, ?, ?) "
        "ON CONFLICT (account_id, device) DO UPDATE SET proven_at = excluded.proven_at",
        {accountId, device, at});
    c->query("DELETE FROM proven_devices WHERE account_id = ? AND proven_at < ?", {accountId, forgetBefore});
    return Status::Ok;
  } catch (const StorageError& e) {
    logStorageError("proveDevice", e);
    return Status::Unavailable;
  }
}

SyncStore::Status SyncStore::deviceProven(int64_t accountId, const std::string& device, int64_t since,
                                          bool& proven) {
  try {
    SqlDatabase::Lease c = database_->acquire();
    proven = !c->query("SELECT 1 FROM proven_devices WHERE account_id = ? AND device = ? AND proven_at >= ?",
                       {accountId, device, since})
                  .empty();
    return Status::Ok;
  } catch (const StorageError& e) {
    logStorageError("deviceProven", e);
    return Status::Unavailable;
  }
}

}  // namespace tessal::server
