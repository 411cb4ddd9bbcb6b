#pragma once

#include "ChangeSet.h"
#include "SqlDatabase.h"

#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <unordered_map>
#include <vector>

namespace tessal::server {

// One save's work: everything it writes in one transaction, on a connection that holds the account's
// lock (SyncStore::save). The sender's changes go in at the iteration after the head, the server's own
// consequences of them at the one after that.
class SaveWork {
 public:
  // `base` is the iteration the sender's changes build on.
  SaveWork(SqlConnection& c, int64_t account, int64_t base, int64_t head, std::string device)
      : c_(c),
        account_(account),
        base_(base),
        senderIteration_(head + 1),
        serverIteration_(head + 2),
        device_(std::move(device)) {}

  bool wroteSender() const { return wroteSender_; }
  bool wroteServer() const { return wroteServer_; }
  int64_t senderIteration() const { return senderIteration_; }
  int64_t serverIteration() const { return serverIteration_; }

  void applyRecord(const RecordChange& change);
  void applyDelete(const std::string& uuid);
  // The server's own consequences of the save, at the iteration after the sender's.
  void settle();

 private:
  enum class RecordState { Unknown, Live, Deleted };
  struct StoredField {
    std::string name;
    std::string value;  // JSON text
    std::string ref;    // the owner an owner field names; else empty
  };
  struct OwnerWrite {
    std::string uuid;
    std::string entity;
  };

  RecordState stateOf(const std::string& uuid);
  void touch(const std::string& project);
  void writeField(const std::string& uuid, const std::string& name, const std::string& value,
                  const std::string& ref, int64_t iteration, const std::string& device);
  void tombstone(const std::string& uuid, int64_t iteration, const std::string& device);
  void followOwnerDeletion(const std::string& uuid, const SyncSchema::OwnerLink& link);
  void normaliseTaskOrder(const std::string& project);
  // Whether another device filed `uuid` under its owner after the sender's base.
  bool filedUnseen(const std::string& uuid, const SyncSchema::OwnerLink& link);
  // Files `uuid` under a copy of `owner`, which this save deletes; false when no copy can be made.
  bool keepUnderCopy(const std::string& uuid, const SyncSchema::OwnerLink& link, const std::string& owner);
  // A new record with the values `original` had before this save deleted it, filed under a copy of its own
  // owner when that goes too; empty when its values are gone.
  std::string copyOf(const std::string& original);
  std::string copyIdentity(const std::string& original, std::string_view entity);
  // A copied project lists its tasks in the original's order, copied tasks by their copies.
  void orderCopiedProjects();

  SqlConnection& c_;
  int64_t account_;
  int64_t base_;
  int64_t senderIteration_;
  int64_t serverIteration_;
  std::string device_;
  bool wroteSender_ = false;
  bool wroteServer_ = false;
  std::vector<OwnerWrite> ownerWrites_;
  std::vector<std::string> deleteQueue_;
  std::set<std::string> touchedProjects_;
  // The values of the projects and tasks this save deleted, and the copies made of them, by identity.
  std::unordered_map<std::string, std::vector<StoredField>> goneValues_;
  std::map<std::string, std::string> copies_;
};

}  // namespace tessal::server
