#pragma once

// A simulated Tessal client for driving the real server: the journal, the reply handling and the merge
// of the sync manager as the application implements them (with the changes that make a "save" reply
// clear only what it sent, move the iteration right after a merged "head", send a device id, let a
// pending delete win in the merge, journal a cleared value as null, and journal what the merge's local
// cascade deletes beyond the server's list; see server/README.md), over an in-memory store that
// follows the model's relationship rules (projects outlive their client, tasks and items go with
// their owner, a project keeps its tasks in order). Requests are built, sent and answered in separate
// steps so a test can interleave edits and other clients, and lose requests or replies.
#include "JsonValue.h"

#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <vector>

namespace servertest {

struct SimRecord {
  std::string entity;
  std::map<std::string, std::string> attrs;  // JSON text; a cleared value is absent
  std::string owner;                         // the owner's identity, or empty
  std::vector<std::string> tasks;            // a project's tasks, in order
  std::set<std::string> changed;             // keys changed since the last local save
  bool inserted = false;                     // made here and not saved yet
};

// The change journal: values as JSON text.
struct SimJournal {
  using Section = std::map<std::string, std::map<std::string, std::string>>;
  int64_t iteration = 0;
  Section i, u;
  std::vector<std::string> x;

  bool hasChanges() const { return !i.empty() || !u.empty() || !x.empty(); }
  std::string dump() const;
  // Merges values into a section; a value of none (an unordered relationship) adds nothing but the
  // entry. Removes the identity from "x".
  void update(Section& section, const std::map<std::string, std::optional<std::string>>& values,
              const std::string& uuid);
};

class SimClient {
 public:
  enum class Delivery { Normal, LoseRequest, LoseReply };

  // `device` empty: a client that sends no device. `port` is asked at every request (the server may
  // have been restarted elsewhere).
  SimClient(std::string name, std::string device, std::string user, std::string password,
            std::function<int()> port);

  // Edits by the user; identities are "<name>-<n>@<entity>". An owner may be empty.
  std::string insert(const std::string& entity, const std::string& owner, int index = -1);
  void setValue(const std::string& uuid, const std::string& key, const std::optional<std::string>& json);
  void setOwner(const std::string& uuid, const std::string& owner, int index = -1);
  void remove(const std::string& uuid);
  // The autosave: reports every change to the journal.
  void save();

  // The network, one step at a time.
  bool idle() const { return state_ == State::Idle; }
  bool hasOutgoing() const { return state_ == State::Built; }
  bool hasIncoming() const { return state_ == State::Answered || state_ == State::Failed; }
  void poll();                 // builds a "head" when idle
  void deliver(Delivery how);  // sends the built request
  void handleIncoming();       // handles the reply or the failure
  // Polls and handles until idle again, losing nothing. Returns false when a head brought changes or
  // a save was needed (so the client was not yet in step).
  bool syncOnce();

  const std::string& name() const { return name_; }
  const std::map<std::string, SimRecord>& records() const { return records_; }
  const SimJournal& journal() const { return journal_; }
  // Errors the user would have seen ("Sync Error" replies, unexpected shapes); a correct server leaves
  // this empty.
  const std::vector<std::string>& errors() const { return errors_; }
  // Identities whose insertion / deletion a save reply acknowledged.
  const std::set<std::string>& acknowledgedInserts() const { return ackedInserts_; }
  const std::set<std::string>& acknowledgedDeletes() const { return ackedDeletes_; }
  // Live records of an entity, for choosing what to edit.
  std::vector<std::string> recordsOf(const std::function<bool(const std::string& entity)>& accept) const;

 private:
  enum class State { Idle, Built, Answered, Failed };

  void markChanged(const std::string& uuid, const std::string& key);
  void changeOwner(const std::string& uuid, const std::string& owner, int index);
  void deleteRecord(const std::string& uuid);
  SimRecord* findOrCreate(const std::string& uuid);
  std::map<std::string, std::optional<std::string>> changedValues(const std::string& uuid,
                                                                  const SimRecord& record);
  bool pendingDelete(const std::string& uuid) const;
  void merge(const tessal::server::JsonValue& result);
  void mergeSection(const tessal::server::JsonValue& changes, SimJournal::Section& section);
  void applyValue(const std::string& uuid, const std::string& key, const tessal::server::JsonValue& value);
  void handleReply(const tessal::server::JsonValue& reply);
  void send(const std::string& action, int64_t iteration, bool withData);

  std::string name_, device_, user_, password_;
  std::function<int()> port_;
  int counter_ = 0;
  std::map<std::string, SimRecord> records_;
  std::vector<std::string> deletedSinceSave_;
  SimJournal journal_;

  State state_ = State::Idle;
  std::string body_;
  std::string action_;
  SimJournal sent_;  // what the "save" in flight carries
  std::string reply_;
  bool lastHeadWasEmpty_ = false;
  bool savedInCycle_ = false;

  std::vector<std::string> errors_;
  std::set<std::string> ackedInserts_, ackedDeletes_;
};

// The account as a device that never synced sees it: live records by identity with their fields.
struct ServerState {
  std::map<std::string, std::map<std::string, std::string>> records;  // JSON text, nulls left out
  std::set<std::string> deleted;
};
ServerState fetchServerState(int port, const std::string& user, const std::string& password);

// Differences between a client's store and the server's state, one line each; empty when equal.
std::vector<std::string> differences(const SimClient& client, const ServerState& server);

}  // namespace servertest
