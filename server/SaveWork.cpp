#include "SaveWork.h"

#include "JsonValue.h"

#include <algorithm>
#include <unordered_map>
#include <unordered_set>

namespace tessal::server {

namespace {

// The device of changes the server makes itself (cascaded deletes, cleared owners, the task order):
// every device, including the one whose save caused them, must receive them.
const std::string kServerDevice;

}  // namespace

void SaveWork::applyRecord(const RecordChange& change) {
  const RecordState state = stateOf(change.uuid);
  // A deleted record stays deleted: nothing written to it after its deletion is kept.
  if (state == RecordState::Deleted) return;
  if (state == RecordState::Unknown) {
    c_.query("INSERT INTO records (account_id, uuid, created_iter, created_device) VALUES (?, ?, ?, ?)",
             {account_, change.uuid, senderIteration_, device_});
    wroteSender_ = true;
  }
  if (change.fields.empty()) return;
  std::unordered_map<std::string, std::pair<std::string, std::string>> current;  // name -> value, ref
  for (const SqlRow& row : c_.query("SELECT name, value, ref FROM fields WHERE account_id = ? AND uuid = ?",
                                    {account_, change.uuid})) {
    current.emplace(row.text(0), std::make_pair(row.text(1), row.text(2)));
  }
  const std::optional<SyncSchema::OwnerLink> owner = SyncSchema::ownerLink(change.entity);
  for (const FieldChange& field : change.fields) {
    auto found = current.find(field.field);
    // An equal value changes nothing: resends and echoes of a value do not churn iterations.
    if (found != current.end() && found->second.first == field.value) continue;
    const std::string oldRef = found != current.end() ? found->second.second : std::string();
    writeField(change.uuid, field.field, field.value, field.ref, senderIteration_, device_);
    wroteSender_ = true;
    if (owner && field.field == owner->key) {
      ownerWrites_.push_back({change.uuid, change.entity});
      if (change.entity == SyncSchema::kOrderedMemberEntity) {
        touch(oldRef);
        touch(field.ref);
      }
    }
    if (change.entity == SyncSchema::kOrderedEntity && field.field == SyncSchema::kOrderedKey)
      touch(change.uuid);
  }
}

void SaveWork::applyDelete(const std::string& uuid) {
  if (stateOf(uuid) == RecordState::Deleted) return;
  tombstone(uuid, senderIteration_, device_);
  wroteSender_ = true;
}

// The server's own consequences of the save, at the iteration after the sender's.
void SaveWork::settle() {
  // A record filed under an owner that is deleted follows the owner's delete rule.
  for (const auto& [uuid, entity] : ownerWrites_) {
    if (stateOf(uuid) != RecordState::Live) continue;
    const std::optional<SyncSchema::OwnerLink> link = SyncSchema::ownerLink(entity);
    const std::vector<SqlRow> rows = c_.query(
        "SELECT ref FROM fields WHERE account_id = ? AND uuid = ? AND name = ?", {account_, uuid, link->key});
    if (rows.empty() || rows[0].isNull(0)) continue;
    if (stateOf(rows[0].text(0)) == RecordState::Deleted) followOwnerDeletion(uuid, *link);
  }
  // Deleting an owner reaches everything filed under it, level by level.
  while (!deleteQueue_.empty()) {
    const std::string owner = std::move(deleteQueue_.back());
    deleteQueue_.pop_back();
    for (const SqlRow& row :
         c_.query("SELECT uuid, name FROM fields WHERE account_id = ? AND ref = ?", {account_, owner})) {
      const std::optional<std::string_view> entity = SyncSchema::entityOf(row.text(0));
      const std::optional<SyncSchema::OwnerLink> link =
          entity ? SyncSchema::ownerLink(*entity) : std::nullopt;
      if (link && row.text(1) == link->key) followOwnerDeletion(row.text(0), *link);
    }
  }
  for (const std::string& project : touchedProjects_) normaliseTaskOrder(project);
}

SaveWork::RecordState SaveWork::stateOf(const std::string& uuid) {
  const std::vector<SqlRow> rows =
      c_.query("SELECT deleted_iter FROM records WHERE account_id = ? AND uuid = ?", {account_, uuid});
  if (rows.empty()) return RecordState::Unknown;
  return rows[0].isNull(0) ? RecordState::Live : RecordState::Deleted;
}

void SaveWork::touch(const std::string& project) {
  if (!project.empty()) touchedProjects_.insert(project);
}

void SaveWork::writeField(const std::string& uuid, const std::string& name, const std::string& value,
                          const std::string& ref, int64_t iteration, const std::string& device) {
  c_.query(
      "INSERT INTO fields (account_id, uuid, name, value, ref, iter, device) VALUES (?, ?, ?, ?, ?, ?, ?) "
      "ON CONFLICT (account_id, uuid, name) DO UPDATE SET value = excluded.value, ref = excluded.ref, "
      "iter = excluded.iter, device = excluded.device",
      {account_, uuid, name, value, ref.empty() ? SqlParam(nullptr) : SqlParam(ref), iteration, device});
}

// Deletes a record for good: its tombstone stays, every field goes.
void SaveWork::tombstone(const std::string& uuid, int64_t iteration, const std::string& device) {
  // By the record's own fields (its key), the reference filtered here: "ref IS NOT NULL" in the query
  // lets SQLite walk the index of every reference in the account instead, once for each deletion.
  if (SyncSchema::entityOf(uuid) == SyncSchema::kOrderedMemberEntity) {
    for (const SqlRow& row :
         c_.query("SELECT ref FROM fields WHERE account_id = ? AND uuid = ?", {account_, uuid}))
      if (!row.isNull(0)) touch(row.text(0));
  }
  c_.query(
      "INSERT INTO records (account_id, uuid, created_iter, created_device, deleted_iter, deleted_device) "
      "VALUES (?, ?, NULL, '', ?, ?) "
      "ON CONFLICT (account_id, uuid) DO UPDATE SET deleted_iter = excluded.deleted_iter, "
      "deleted_device = excluded.deleted_device",
      {account_, uuid, iteration, device});
  c_.query("DELETE FROM fields WHERE account_id = ? AND uuid = ?", {account_, uuid});
  deleteQueue_.push_back(uuid);
}

void SaveWork::followOwnerDeletion(const std::string& uuid, const SyncSchema::OwnerLink& link) {
  if (link.rule == SyncSchema::DeleteRule::Cascade) {
    tombstone(uuid, serverIteration_, kServerDevice);
  } else {
    writeField(uuid, std::string(link.key), "null", {}, serverIteration_, kServerDevice);
  }
  wroteServer_ = true;
}

// Keeps a project's "tasks" equal to the tasks filed under it: entries of tasks filed elsewhere or
// deleted drop out (every client drops them as it applies the move or the delete, so this needs no
// new iteration); tasks filed under it but missing from the list are appended, which clients must
// be told, so the list is sent again as the server's change.
void SaveWork::normaliseTaskOrder(const std::string& project) {
  if (stateOf(project) != RecordState::Live) return;
  std::vector<std::pair<int64_t, std::string>> members;
  for (const SqlRow& row :
       c_.query("SELECT uuid, iter FROM fields WHERE account_id = ? AND ref = ? AND name = ?",
                {account_, project, SyncSchema::kOrderedMemberKey})) {
    members.emplace_back(row.integer(1), row.text(0));
  }
  std::sort(members.begin(), members.end());
  std::unordered_set<std::string> memberSet;
  for (const auto& member : members) memberSet.insert(member.second);

  const std::vector<SqlRow> stored =
      c_.query("SELECT value FROM fields WHERE account_id = ? AND uuid = ? AND name = ?",
               {account_, project, SyncSchema::kOrderedKey});
  std::vector<std::string> listed;
  if (!stored.empty()) {
    if (const std::optional<JsonValue> value = JsonValue::parse(stored[0].text(0))) {
      for (const JsonValue& element : value->elements()) listed.push_back(element.text());
    }
  }
  std::vector<std::string> kept;
  std::unordered_set<std::string> seen;
  for (const std::string& task : listed) {
    if (memberSet.count(task) && seen.insert(task).second) kept.push_back(task);
  }
  const size_t keptCount = kept.size();
  for (const auto& member : members) {
    if (!seen.count(member.second)) kept.push_back(member.second);
  }
  if (kept == listed || (stored.empty() && kept.empty())) return;
  std::string json = "[";
  for (size_t i = 0; i < kept.size(); ++i) {
    if (i) json += ',';
    appendJsonString(json, kept[i]);
  }
  json += ']';
  if (kept.size() == keptCount) {
    c_.query("UPDATE fields SET value = ? WHERE account_id = ? AND uuid = ? AND name = ?",
             {json, account_, project, SyncSchema::kOrderedKey});
  } else {
    writeField(project, std::string(SyncSchema::kOrderedKey), json, {}, serverIteration_, kServerDevice);
    wroteServer_ = true;
  }
}

}  // namespace tessal::server
