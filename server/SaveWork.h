#pragma once

#include "ChangeSet.h"
#include "SqlDatabase.h"

#include <cstdint>
#include <set>
#include <string>
#include <vector>

namespace tessal::server {

// One save's work: everything it writes in one transaction, on a connection that holds the account's
// lock (SyncStore::save). The sender's changes go in at the iteration after the head, the server's own
// consequences of them at the one after that.
class SaveWork {
 public:
  SaveWork(SqlConnection& c, int64_t account, int64_t head, std::string device)
      : c_(c),
        account_(account),
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

  SqlConnection& c_;
  int64_t account_;
  int64_t senderIteration_;
  int64_t serverIteration_;
  std::string device_;
  bool wroteSender_ = false;
  bool wroteServer_ = false;
  std::vector<OwnerWrite> ownerWrites_;
  std::vector<std::string> deleteQueue_;
  std::set<std::string> touchedProjects_;
};

}  // namespace tessal::server
