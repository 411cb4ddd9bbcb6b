#pragma once

#include "JsonValue.h"

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tessal::server {

// What the server knows of Tessal's records: entity names and the three owning relationships. It needs
// no more than that to keep deletes, owners and the task order consistent; every other field is an
// opaque value that is stored and handed on.
namespace SyncSchema {

enum class DeleteRule {
  Cascade,  // deleting the owner deletes the record (a project's tasks, a task's items)
  Nullify,  // deleting the owner clears the field (a client's projects outlive it)
};

struct OwnerLink {
  std::string_view key;          // the record's field that names its owner
  std::string_view ownerEntity;  // the entity that field must name
  DeleteRule rule;
};

// The entity a record identity names: the text after its last "@", when that is a concrete entity
// (WTClient, WTProject, WTTask, WTTime, WTFlat, WTExpense, WTNote, WTToDo) and the identity is otherwise
// well formed (some text before the "@", at most 200 bytes, no control characters). None otherwise.
std::optional<std::string_view> entityOf(std::string_view uuid);

// The owning relationship of an entity; none for clients.
std::optional<OwnerLink> ownerLink(std::string_view entity);

// Whether deleting a record of the entity deletes what is filed under it (projects, tasks).
bool deletesWhatItOwns(std::string_view entity);

// The ordered to-many side the server keeps consistent: a project's "tasks".
inline constexpr std::string_view kOrderedEntity = "WTProject";
inline constexpr std::string_view kOrderedKey = "tasks";
inline constexpr std::string_view kOrderedMemberEntity = "WTTask";
inline constexpr std::string_view kOrderedMemberKey = "project";

}  // namespace SyncSchema

// One field of a record as it will be stored.
struct FieldChange {
  std::string field;
  std::string value;  // compact JSON text, numbers exactly as received
  std::string ref;    // the owner's identity when this is the owner field and not null; else empty
};

struct RecordChange {
  std::string uuid;
  std::string entity;
  std::vector<FieldChange> fields;
};

// The checked "data" of a "save": the journal's "i", "u" and "x".
struct ChangeSet {
  std::vector<RecordChange> inserted;
  std::vector<RecordChange> updated;
  std::vector<std::string> deleted;  // without repeats
};

// Checks a change set and converts it for storage. A good one is an object with no members but "i",
// "u" and "x" (each optional): "i" and "u" map record identities to objects of fields, "x" lists
// identities. Field values are null (a cleared value), booleans, numbers, strings or arrays of those;
// an owner field holds null or the identity of a record of the owner's entity; a project's "tasks"
// lists task identities; a "uuid" field must repeat the record's own identity (it is not stored); the
// unordered to-many sides ("projects" of a client, "items" of a task) are refused. On a bad change set
// returns none and sets `reason`.
std::optional<ChangeSet> readChangeSet(const JsonValue& data, std::string& reason);

}  // namespace tessal::server
