#pragma once

#include "ChangeSet.h"
#include "SqlDatabase.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

namespace tessal::server {

// The synchronised data of every account and the accounts themselves, over SQLite or PostgreSQL.
//
// Each account keeps the current state of its records, not a log: per record its creation and, once
// deleted, its tombstone; per field its value, the iteration that wrote it and the device that did.
// The account's head is the last iteration written. server/README.md explains why this converges.
//
// Threads and processes: the HTTP workers call it at the same time (SyncService for head, save and
// currentHead; PasswordAuthenticator for findAccount and createAccount, on behalf of the sync and
// sign-up pages); the "adduser" command calls it from its only thread; and several server processes
// may share one PostgreSQL database. So it keeps no state of its own and takes no lock of its own:
// each call leases a connection from SqlDatabase's pool (whose mutex is held only to take or give back
// an idle connection) and runs on it alone, and the storage decides every order. save() is one write
// transaction in which saves of one account queue on the account's row (PostgreSQL: SELECT ... FOR
// UPDATE) or on the file's write lock (SQLite: BEGIN IMMEDIATE, which queues saves of every account for
// up to 10 s), so iterations are handed out one after the other without gaps whichever process asks.
// A head() that remembers what it sent a device holds the account's row shared (PostgreSQL: FOR SHARE)
// or the write lock (SQLite) while it reads and remembers, so a save of the account lands either
// wholly before the reply or after the device's iteration is on record. The poll with nothing new and
// a head without a device read without waiting: SQLite runs in WAL mode, PostgreSQL reads its snapshot.
class SyncStore {
 public:
  // Opens (and on first use sets up) the storage at `location` (see SqlDatabase::open). None with
  // `error` set when it cannot.
  static std::unique_ptr<SyncStore> open(const std::string& location, std::string& error);

  SqlDatabase::Kind kind() const { return database_->kind(); }

  enum class Status {
    Ok,
    Exists,       // createAccount: the address is taken
    NotFound,     // findAccount: no such account
    Unavailable,  // the storage failed; nothing was changed
  };

  struct Account {
    int64_t id = 0;
    std::string passwordHash;  // Argon2id, in libsodium's string form
  };

  // Stores a new account under an already normalised address.
  Status createAccount(const std::string& email, const std::string& passwordHash);
  Status findAccount(const std::string& email, Account& account);

  struct Head {
    Status status = Status::Ok;
    // currentHead: the iteration last sent to the device in a head reply; -1 when none was.
    int64_t lastSent = -1;
    int64_t iteration = 0;
    // The change set for the reply's "result", as JSON text: every live record with a field or a
    // creation newer than the base written by another device, under both "i" and "u", and the
    // identities deleted since under "x".
    std::string result;
  };
  // What `device` has not seen since iteration `base`. An empty device is a client that names none: it
  // gets every change. A base above the head (a client of another history) gets the whole state. The
  // reply's iteration is remembered as the one last sent to the device, in the same transaction.
  Head head(int64_t accountId, int64_t base, const std::string& device);

  struct Save {
    Status status = Status::Ok;
    bool refused = false;    // not applied: the client must fetch a "head" first (code 4, iteration 0)
    bool overtaken = false;  // refused because the device was sent a newer head since `base`
    int64_t iteration = 0;   // for the reply: the client's new base
  };
  // Applies a change set that `device` made on top of iteration `base`, in one transaction. A base
  // below the head last sent to the device is a request overtaken by a later one: refused.
  Save save(int64_t accountId, int64_t base, const std::string& device, const ChangeSet& changes);

  // The account's head and the one last sent to `device` (in `lastSent`), without a transaction: the
  // poll with nothing new costs this one read. Only `status`, `iteration` and `lastSent` are set.
  Head currentHead(int64_t accountId, const std::string& device);

  // Devices that proved their account's password, so that every server over this storage lets them
  // past a lock on their address (PasswordAuthenticator), also after a restart. `device` is a digest
  // of the device's id; times are Unix seconds. Recording a proof forgets the account's proofs older
  // than `forgetBefore`.
  Status proveDevice(int64_t accountId, const std::string& device, int64_t at, int64_t forgetBefore);
  // Whether `device` proved the password at `since` or later.
  Status deviceProven(int64_t accountId, const std::string& device, int64_t since, bool& proven);

 private:
  explicit SyncStore(std::unique_ptr<SqlDatabase> database) : database_(std::move(database)) {}
  void createSchema();

  std::unique_ptr<SqlDatabase> database_;
};

}  // namespace tessal::server
