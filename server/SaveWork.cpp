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
      if (!link || row.text(1) != link->key) continue;
      // Deletes win over what the sender knew, not over work it never saw filed there.
      if (link->rule == SyncSchema::DeleteRule::Cascade && filedUnseen(row.text(0), *link) &&
          keepUnderCopy(row.text(0), *link, owner))
        continue;
      followOwnerDeletion(row.text(0), *link);
    }
  }
  orderCopiedProjects();
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
  c_.query(
      "INSERT INTO records (account_id, uuid, created_iter, created_device, deleted_iter, deleted_device) "
      "VALUES (?, ?, NULL, '', ?, ?) "
      "ON CONFLICT (account_id, uuid) DO UPDATE SET deleted_iter = excluded.deleted_iter, "
      "deleted_device = excluded.deleted_device",
      {account_, uuid, iteration, device});
  const std::optional<std::string_view> entity = SyncSchema::entityOf(uuid);
  if (entity && SyncSchema::deletesWhatItOwns(*entity)) {
    // Its values last as long as the save: work filed under it that the sender never saw goes to a copy.
    // The reference is filtered here, not in the query: "ref IS NOT NULL" there lets SQLite walk the
    // index of every reference in the account, once for each deletion.
    std::vector<StoredField>& values = goneValues_[uuid];
    for (const SqlRow& row :
         c_.query("DELETE FROM fields WHERE account_id = ? AND uuid = ? RETURNING name, value, ref",
                  {account_, uuid})) {
      values.push_back({row.text(0), row.text(1), row.isNull(2) ? std::string() : row.text(2)});
      if (*entity == SyncSchema::kOrderedMemberEntity) touch(values.back().ref);
    }
  } else {
    c_.query("DELETE FROM fields WHERE account_id = ? AND uuid = ?", {account_, uuid});
  }
  deleteQueue_.push_back(uuid);
}

bool SaveWork::filedUnseen(const std::string& uuid, const SyncSchema::OwnerLink& link) {
  if (base_ + 1 >= senderIteration_) return false;  // the sender had seen everything
  // By the record's key: asking the reference index for columns it does not hold makes SQLite scan every
  // field of the account instead, once for each deletion.
  const std::vector<SqlRow> rows =
      c_.query("SELECT iter, device FROM fields WHERE account_id = ? AND uuid = ? AND name = ?",
               {account_, uuid, std::string(link.key)});
  return !rows.empty() && rows[0].integer(0) > base_ && rows[0].integer(0) < senderIteration_ &&
         rows[0].text(1) != device_;
}

bool SaveWork::keepUnderCopy(const std::string& uuid, const SyncSchema::OwnerLink& link,
                             const std::string& owner) {
  const std::string copy = copyOf(owner);
  if (copy.empty()) return false;
  std::string value;
  appendJsonString(value, copy);
  writeField(uuid, std::string(link.key), value, copy, serverIteration_, kServerDevice);
  if (link.ownerEntity == SyncSchema::kOrderedEntity) touch(copy);
  wroteServer_ = true;
  return true;
}

std::string SaveWork::copyOf(const std::string& original) {
  if (const auto made = copies_.find(original); made != copies_.end()) return made->second;
  const auto gone = goneValues_.find(original);
  if (gone == goneValues_.end()) return {};  // deleted by an earlier save: nothing is left to copy
  const std::string_view entity = *SyncSchema::entityOf(original);
  const std::optional<SyncSchema::OwnerLink> link = SyncSchema::ownerLink(entity);
  std::vector<StoredField> values = gone->second;
  for (StoredField& field : values) {
    // Filed where the original was, or under its owner's copy when that owner goes too.
    if (!link || field.name != link->key || field.ref.empty() || stateOf(field.ref) != RecordState::Deleted)
      continue;
    if (link->rule == SyncSchema::DeleteRule::Nullify) {
      field.ref.clear();
      field.value = "null";
      continue;
    }
    field.ref = copyOf(field.ref);
    if (field.ref.empty()) return {};
    field.value.clear();
    appendJsonString(field.value, field.ref);
  }
  const std::string copy = copyIdentity(original, entity);
  c_.query("INSERT INTO records (account_id, uuid, created_iter, created_device) VALUES (?, ?, ?, ?)",
           {account_, copy, serverIteration_, kServerDevice});
  for (const StoredField& field : values) {
    // The copy's order is written once its tasks are known (orderCopiedProjects).
    if (entity == SyncSchema::kOrderedEntity && field.name == SyncSchema::kOrderedKey) continue;
    writeField(copy, field.name, field.value, field.ref, serverIteration_, kServerDevice);
    if (entity == SyncSchema::kOrderedMemberEntity) touch(field.ref);
  }
  copies_.emplace(original, copy);
  wroteServer_ = true;
  return copy;
}

std::string SaveWork::copyIdentity(const std::string& original, std::string_view entity) {
  // Readable, and new: no client makes a "~", and a record is deleted once, at one iteration. The prefix is
  // cut so that copies of copies stay well within an identity's 200 bytes.
  std::string prefix = original.substr(0, std::min(original.rfind('@'), size_t(120)));
  const std::string suffix = "~" + std::to_string(serverIteration_);
  for (int n = 1;; ++n) {
    std::string copy =
        prefix + suffix + (n > 1 ? "." + std::to_string(n) : std::string()) + "@" + std::string(entity);
    if (stateOf(copy) == RecordState::Unknown) return copy;
  }
}

void SaveWork::orderCopiedProjects() {
  for (const auto& [original, copy] : copies_) {
    if (SyncSchema::entityOf(original) != SyncSchema::kOrderedEntity) continue;
    std::string order = "[";
    for (const StoredField& field : goneValues_[original]) {
      if (field.name != SyncSchema::kOrderedKey) continue;
      const std::optional<JsonValue> tasks = JsonValue::parse(field.value);
      for (const JsonValue& task : tasks ? tasks->elements() : std::vector<JsonValue>()) {
        const auto copied = copies_.find(task.text());
        if (order.size() > 1) order += ',';
        appendJsonString(order, copied != copies_.end() ? copied->second : task.text());
      }
    }
    order += ']';
    // The tasks deleted drop out and those filed under the copy and not listed are appended as usual.
    writeField(copy, std::string(SyncSchema::kOrderedKey), order, {}, serverIteration_, kServerDevice);
    touch(copy);
  }
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
