#include "ChangeSet.h"

#include <algorithm>
#include <array>
#include <unordered_set>

namespace tessal::server {

namespace SyncSchema {

namespace {
constexpr std::array<std::string_view, 8> kEntities = {"WTClient", "WTProject", "WTTask", "WTTime",
                                                       "WTFlat",   "WTExpense", "WTNote", "WTToDo"};
constexpr size_t kMaxIdentityLength = 200;

bool hasControlCharacter(std::string_view text) {
  return std::any_of(text.begin(), text.end(),
                     [](char c) { return static_cast<unsigned char>(c) < 0x20 || c == 0x7f; });
}
}  // namespace

std::optional<std::string_view> entityOf(std::string_view uuid) {
  if (uuid.size() > kMaxIdentityLength || hasControlCharacter(uuid)) return std::nullopt;
  // NAME@ENTITY with one "@": the client takes the text after the last "@" as the entity, and a name
  // holding another "@" ("a@@WTTask") would name something else elsewhere.
  const size_t at = uuid.find('@');
  if (at == std::string_view::npos || at == 0 || uuid.find('@', at + 1) != std::string_view::npos)
    return std::nullopt;
  const std::string_view entity = uuid.substr(at + 1);
  for (const std::string_view known : kEntities) {
    if (known == entity) return known;
  }
  return std::nullopt;
}

std::optional<OwnerLink> ownerLink(std::string_view entity) {
  if (entity == "WTProject") return OwnerLink{"client", "WTClient", DeleteRule::Nullify};
  if (entity == "WTTask") return OwnerLink{"project", "WTProject", DeleteRule::Cascade};
  if (entity == "WTClient" || entity.empty()) return std::nullopt;
  return OwnerLink{"task", "WTTask", DeleteRule::Cascade};  // every kind of item
}

bool deletesWhatItOwns(std::string_view entity) {
  return entity == "WTProject" || entity == "WTTask";
}

}  // namespace SyncSchema

namespace {

constexpr size_t kMaxFieldNameLength = 100;

bool isScalar(const JsonValue& value) {
  return !value.isArray() && !value.isObject();
}

bool isIdentityOf(const JsonValue& value, std::string_view entity) {
  return value.isString() && SyncSchema::entityOf(value.text()) == entity;
}

// Checks one field of a record and converts it; false (with `reason`) for a bad one. Sets `skip` for a
// field that is valid but not stored.
bool readField(const std::string& uuid, std::string_view entity, const std::string& name,
               const JsonValue& value, FieldChange& out, bool& skip, std::string& reason) {
  skip = false;
  if (name.empty() || name.size() > kMaxFieldNameLength ||
      std::any_of(name.begin(), name.end(), [](char c) { return static_cast<unsigned char>(c) < 0x20; })) {
    reason = "bad field name in " + uuid;
    return false;
  }
  if (name == "uuid") {
    if (!value.isString() || value.text() != uuid) {
      reason = "the uuid field of " + uuid + " names another record";
      return false;
    }
    skip = true;
    return true;
  }
  if ((entity == "WTClient" && name == "projects") || (entity == "WTTask" && name == "items")) {
    reason = "the unordered relationship " + name + " of " + uuid + " travels through its to-one side";
    return false;
  }
  out.field = name;
  out.ref.clear();
  const std::optional<SyncSchema::OwnerLink> owner = SyncSchema::ownerLink(entity);
  if (owner && name == owner->key) {
    if (!value.isNull() && !isIdentityOf(value, owner->ownerEntity)) {
      reason =
          "the " + name + " of " + uuid + " must name a " + std::string(owner->ownerEntity) + " or be null";
      return false;
    }
    if (value.isString()) out.ref = value.text();
  } else if (entity == SyncSchema::kOrderedEntity && name == SyncSchema::kOrderedKey) {
    if (!value.isArray() ||
        !std::all_of(value.elements().begin(), value.elements().end(),
                     [](const JsonValue& e) { return isIdentityOf(e, SyncSchema::kOrderedMemberEntity); })) {
      reason = "the tasks of " + uuid + " must be a list of task identities";
      return false;
    }
  } else if (value.isObject() ||
             (value.isArray() && !std::all_of(value.elements().begin(), value.elements().end(), isScalar))) {
    reason = "the value of " + name + " in " + uuid + " is neither a plain value nor a list of plain values";
    return false;
  }
  out.value = value.dump();
  return true;
}

bool readSection(const JsonValue& section, const char* name, std::vector<RecordChange>& out,
                 std::string& reason) {
  if (!section.isObject()) {
    reason = std::string("\"") + name + "\" must be an object";
    return false;
  }
  out.reserve(section.members().size());
  for (const auto& [uuid, values] : section.members()) {
    const std::optional<std::string_view> entity = SyncSchema::entityOf(uuid);
    if (!entity) {
      reason = "\"" + uuid + "\" is not a record identity";
      return false;
    }
    if (!values.isObject()) {
      reason = "the values of " + uuid + " must be an object";
      return false;
    }
    RecordChange change{uuid, std::string(*entity), {}};
    change.fields.reserve(values.members().size());
    for (const auto& [field, value] : values.members()) {
      FieldChange converted;
      bool skip = false;
      if (!readField(uuid, *entity, field, value, converted, skip, reason)) return false;
      if (!skip) change.fields.push_back(std::move(converted));
    }
    out.push_back(std::move(change));
  }
  return true;
}

}  // namespace

std::optional<ChangeSet> readChangeSet(const JsonValue& data, std::string& reason) {
  if (!data.isObject()) {
    reason = "\"data\" must be an object";
    return std::nullopt;
  }
  ChangeSet changes;
  for (const auto& [name, section] : data.members()) {
    if (name == "i") {
      if (!readSection(section, "i", changes.inserted, reason)) return std::nullopt;
    } else if (name == "u") {
      if (!readSection(section, "u", changes.updated, reason)) return std::nullopt;
    } else if (name == "x") {
      if (!section.isArray()) {
        reason = "\"x\" must be a list";
        return std::nullopt;
      }
      std::unordered_set<std::string_view> seen;
      for (const JsonValue& uuid : section.elements()) {
        if (!uuid.isString() || !SyncSchema::entityOf(uuid.text())) {
          reason = "\"x\" holds something that is not a record identity";
          return std::nullopt;
        }
        if (seen.insert(uuid.text()).second) changes.deleted.push_back(uuid.text());
      }
    } else {
      reason = "unknown section \"" + name + "\" in \"data\"";
      return std::nullopt;
    }
  }
  return changes;
}

}  // namespace tessal::server
