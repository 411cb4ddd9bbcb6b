#include "SimClient.h"

#include "ChangeSet.h"
#include "ServerTestSupport.h"

#include <algorithm>
#include <cstdlib>
#include <iostream>

namespace servertest {

using tessal::server::appendJsonString;
using tessal::server::JsonValue;

namespace {

// TESSAL_SIM_TRACE=text prints every request and reply that mentions the text (a replay aid).
void trace(const std::string& who, const std::string& what, const std::string& text) {
  static const char* filter = std::getenv("TESSAL_SIM_TRACE");
  if (filter && text.find(filter) != std::string::npos)
    std::cerr << who << " " << what << ": " << text << "\n";
}

std::string ownerKeyOf(const std::string& entity) {
  if (entity == "WTClient") return {};
  if (entity == "WTProject") return "client";
  if (entity == "WTTask") return "project";
  return "task";
}

// The to-many side an owner keeps for a child of this entity.
std::string inverseKeyOf(const std::string& entity) {
  if (entity == "WTProject") return "projects";
  if (entity == "WTTask") return "tasks";
  return "items";
}

std::string quoted(const std::string& text) {
  std::string out;
  appendJsonString(out, text);
  return out;
}

std::string jsonList(const std::vector<std::string>& uuids) {
  std::string out = "[";
  for (size_t i = 0; i < uuids.size(); ++i) {
    if (i) out += ',';
    appendJsonString(out, uuids[i]);
  }
  return out + "]";
}

std::string dumpSection(const SimJournal::Section& section) {
  std::string out = "{";
  bool firstRecord = true;
  for (const auto& [uuid, values] : section) {
    if (!firstRecord) out += ',';
    firstRecord = false;
    appendJsonString(out, uuid);
    out += ":{";
    bool first = true;
    for (const auto& [key, value] : values) {
      if (!first) out += ',';
      first = false;
      appendJsonString(out, key);
      out += ':' + value;
    }
    out += '}';
  }
  return out + "}";
}

}  // namespace

std::string SimJournal::dump() const {
  return "{\"i\":" + dumpSection(i) + ",\"u\":" + dumpSection(u) + ",\"x\":" + jsonList(x) + "}";
}

void SimJournal::update(Section& section, const std::map<std::string, std::optional<std::string>>& values,
                        const std::string& uuid) {
  auto& entry = section[uuid];
  for (const auto& [key, value] : values) {
    if (value) entry[key] = *value;
  }
  std::erase(x, uuid);
}

SimClient::SimClient(std::string name, std::string device, std::string user, std::string password,
                     std::function<int()> port)
    : name_(std::move(name)),
      device_(std::move(device)),
      user_(std::move(user)),
      password_(std::move(password)),
      port_(std::move(port)) {}

std::vector<std::string> SimClient::recordsOf(const std::function<bool(const std::string&)>& accept) const {
  std::vector<std::string> uuids;
  for (const auto& [uuid, record] : records_) {
    if (accept(record.entity)) uuids.push_back(uuid);
  }
  return uuids;
}

// --- the store ---

void SimClient::markChanged(const std::string& uuid, const std::string& key) {
  auto found = records_.find(uuid);
  if (found != records_.end()) found->second.changed.insert(key);
}

std::string SimClient::insert(const std::string& entity, const std::string& owner, int index) {
  const std::string uuid = name_ + "-" + std::to_string(++counter_) + "@" + entity;
  SimRecord& record = records_[uuid];
  record.entity = entity;
  record.inserted = true;
  if (!owner.empty()) changeOwner(uuid, owner, index);
  return uuid;
}

void SimClient::setValue(const std::string& uuid, const std::string& key,
                         const std::optional<std::string>& json) {
  SimRecord& record = records_.at(uuid);
  if (json) {
    record.attrs[key] = *json;
  } else {
    record.attrs.erase(key);
  }
  record.changed.insert(key);
}

void SimClient::setOwner(const std::string& uuid, const std::string& owner, int index) {
  changeOwner(uuid, owner, index);
}

void SimClient::remove(const std::string& uuid) {
  deleteRecord(uuid);
}

void SimClient::changeOwner(const std::string& uuid, const std::string& owner, int index) {
  SimRecord& record = records_.at(uuid);
  trace(name_, "files", uuid + " under " + owner + " (was " + record.owner + ")");
  const std::string old = record.owner;
  if (old == owner && index < 0) return;
  const bool ordered = record.entity == "WTTask";
  auto positionIn = [&](const std::string& project) {
    if (!ordered || project.empty() || !records_.count(project)) return -1L;
    const auto& tasks = records_.at(project).tasks;
    const auto at = std::find(tasks.begin(), tasks.end(), uuid);
    return at == tasks.end() ? -1L : static_cast<long>(at - tasks.begin());
  };
  const long oldIndex = positionIn(old);
  if (ordered && !old.empty() && records_.count(old)) std::erase(records_.at(old).tasks, uuid);
  record.owner = owner;
  if (ordered && !owner.empty()) {
    auto& tasks = records_.at(owner).tasks;
    const size_t at = index < 0 || static_cast<size_t>(index) > tasks.size() ? tasks.size() : index;
    tasks.insert(tasks.begin() + static_cast<long>(at), uuid);
  }
  if (old == owner && oldIndex == positionIn(owner)) return;
  markChanged(uuid, ownerKeyOf(record.entity));
  const std::string inverse = inverseKeyOf(record.entity);
  if (!old.empty()) markChanged(old, inverse);
  if (!owner.empty() && owner != old) markChanged(owner, inverse);
}

void SimClient::deleteRecord(const std::string& uuid) {
  auto found = records_.find(uuid);
  if (found == records_.end()) return;
  trace(name_, "deletes", uuid + " under " + found->second.owner);
  const std::string entity = found->second.entity;
  auto childrenOf = [&](const std::string& childEntityKey) {
    std::vector<std::string> children;
    for (const auto& [child, record] : records_) {
      if (record.owner == uuid && ownerKeyOf(record.entity) == childEntityKey) children.push_back(child);
    }
    return children;
  };
  if (entity == "WTClient") {
    // Projects outlive their client.
    for (const std::string& project : childrenOf("client")) changeOwner(project, "", -1);
  } else if (entity == "WTProject") {
    for (const std::string& task : std::vector<std::string>(found->second.tasks)) deleteRecord(task);
    changeOwner(uuid, "", -1);
  } else if (entity == "WTTask") {
    for (const std::string& item : childrenOf("task")) deleteRecord(item);
    changeOwner(uuid, "", -1);
  } else {
    changeOwner(uuid, "", -1);
  }
  if (!records_.at(uuid).inserted) deletedSinceSave_.push_back(uuid);
  records_.erase(uuid);
}

SimRecord* SimClient::findOrCreate(const std::string& uuid) {
  auto found = records_.find(uuid);
  if (found != records_.end()) return &found->second;
  const std::optional<std::string_view> entity = tessal::server::SyncSchema::entityOf(uuid);
  if (!entity) return nullptr;
  SimRecord& record = records_[uuid];
  record.entity = std::string(*entity);
  return &record;
}

std::map<std::string, std::optional<std::string>> SimClient::changedValues(const std::string& uuid,
                                                                           const SimRecord& record) {
  std::map<std::string, std::optional<std::string>> values;
  const std::string ownerKey = ownerKeyOf(record.entity);
  auto add = [&](const std::string& key) {
    if (!ownerKey.empty() && key == ownerKey) {
      values[key] = record.owner.empty() ? "null" : quoted(record.owner);
    } else if (key == "tasks" && record.entity == "WTProject") {
      values[key] = jsonList(record.tasks);
    } else if (key == "projects" || key == "items") {
      values[key] = std::nullopt;  // unordered: travels through the to-one side
    } else {
      auto attr = record.attrs.find(key);
      // A cleared value is journaled as null, so other devices clear it too.
      values[key] = attr == record.attrs.end() ? "null" : attr->second;
    }
  };
  if (record.inserted) {
    values["uuid"] = quoted(uuid);
    for (const auto& [key, value] : record.attrs) values[key] = value;
    if (!record.owner.empty()) add(ownerKey);
    for (const std::string& key : record.changed) {
      if (key == "tasks" || key == "projects" || key == "items") add(key);
    }
    return values;
  }
  for (const std::string& key : record.changed) add(key);
  return values;
}

void SimClient::save() {
  for (auto& [uuid, record] : records_) {
    if (record.inserted) {
      journal_.update(journal_.i, changedValues(uuid, record), uuid);
    } else if (!record.changed.empty()) {
      journal_.update(journal_.i.count(uuid) ? journal_.i : journal_.u, changedValues(uuid, record), uuid);
    }
    record.inserted = false;
    record.changed.clear();
  }
  for (const std::string& uuid : deletedSinceSave_) journal_.x.push_back(uuid);
  deletedSinceSave_.clear();
}

// --- the sync manager ---

bool SimClient::pendingDelete(const std::string& uuid) const {
  return std::find(journal_.x.begin(), journal_.x.end(), uuid) != journal_.x.end();
}

void SimClient::applyValue(const std::string& uuid, const std::string& key, const JsonValue& value) {
  const std::string entity = records_.at(uuid).entity;
  const std::string ownerKey = ownerKeyOf(entity);
  if (key == "uuid") return;
  if (!ownerKey.empty() && key == ownerKey) {
    if (value.isNull()) {
      changeOwner(uuid, "", -1);
    } else if (value.isString() && !pendingDelete(value.text()) && findOrCreate(value.text())) {
      changeOwner(uuid, value.text(), -1);
    }
    return;
  }
  if (entity == "WTProject" && key == "tasks") {
    int index = 0;
    for (const JsonValue& task : value.elements()) {
      if (pendingDelete(task.text()) || !findOrCreate(task.text())) continue;
      changeOwner(task.text(), uuid, index++);
    }
    return;
  }
  SimRecord& record = records_.at(uuid);
  if (value.isNull()) {
    record.attrs.erase(key);
  } else {
    record.attrs[key] = value.dump();
  }
}

void SimClient::mergeSection(const JsonValue& changes, SimJournal::Section& section) {
  for (const auto& [uuid, values] : changes.members()) {
    // A delete still waiting to be sent wins: the record is neither re-created nor changed.
    if (pendingDelete(uuid) || !findOrCreate(uuid)) continue;
    auto pending = section.find(uuid);
    std::optional<std::map<std::string, std::string>> left;
    if (pending != section.end()) left = pending->second;
    for (const auto& [key, value] : values.members()) {
      applyValue(uuid, key, value);
      if (left) left->erase(key);  // the server's value wins over a pending local one
    }
    if (pending != section.end()) {
      if (left->empty()) {
        section.erase(uuid);
      } else {
        section[uuid] = *left;
      }
    }
  }
}

void SimClient::merge(const JsonValue& result) {
  if (const JsonValue* i = result.find("i")) mergeSection(*i, journal_.i);
  if (const JsonValue* u = result.find("u")) mergeSection(*u, journal_.u);
  std::set<std::string> listed;
  if (const JsonValue* x = result.find("x")) {
    for (const JsonValue& uuid : x->elements()) listed.insert(uuid.text());
    for (const JsonValue& uuid : x->elements()) deleteRecord(uuid.text());
  }
  // The merge is saved with the journal detached: none of it is journaled, except what the local
  // cascade deleted beyond the server's list. Those records were filed under a deleted owner here
  // only (a move or insert not sent yet); the server must delete them too, or a later merge that
  // drops the pending move would leave them gone on this device alone.
  for (const std::string& uuid : deletedSinceSave_) {
    if (!listed.count(uuid)) journal_.x.push_back(uuid);
  }
  for (auto& [uuid, record] : records_) {
    record.changed.clear();
    record.inserted = false;
  }
  deletedSinceSave_.clear();
}

void SimClient::send(const std::string& action, int64_t iteration, bool withData) {
  body_ =
      requestBody(user_, password_, action, iteration, device_, withData ? journal_.dump() : std::string());
  action_ = action;
  if (withData) sent_ = journal_;
  state_ = State::Built;
}

void SimClient::poll() {
  if (state_ == State::Idle) send("head", journal_.iteration, false);
}

void SimClient::deliver(Delivery how) {
  if (state_ != State::Built) return;
  if (how == Delivery::LoseRequest) {
    state_ = State::Failed;
    return;
  }
  trace(name_, how == Delivery::Normal ? "sends" : "sends (lost)", body_);
  const Reply reply = post(port_(), "/sync/tessal/sync.php", body_);
  trace(name_, how == Delivery::LoseReply ? "gets (lost)" : "gets", reply.body);
  if (how == Delivery::LoseReply || reply.status == 0) {
    state_ = State::Failed;
    return;
  }
  reply_ = reply.body;
  state_ = State::Answered;
}

void SimClient::handleIncoming() {
  const State state = state_;
  state_ = State::Idle;
  if (state != State::Answered) return;  // a failure: the next poll retries
  const std::optional<JsonValue> reply = JsonValue::parse(reply_);
  if (!reply || (!reply->isObject() && !reply->isArray())) return;  // not JSON: a transport failure
  handleReply(*reply);
}

void SimClient::handleReply(const JsonValue& reply) {
  if (!reply.isObject()) {
    errors_.push_back(name_ + ": reply is not an object: " + reply.dump());
    return;
  }
  const JsonValue* iteration = reply.find("iteration");
  if (reply.find("error")) {
    const JsonValue* code = reply.find("code");
    if (!code || code->integerValue() != 4) {
      errors_.push_back(name_ + ": Sync Error " + reply.dump());
      return;
    }
    // Code 4 below iteration 1: "Head iteration problem"; the journal waits for the next poll.
    if (!iteration || iteration->integerValue().value_or(0) < 1) return;
    errors_.push_back(name_ + ": code 4 with a positive iteration would skip changes: " + reply.dump());
    return;
  }
  if (!iteration || !iteration->integerValue()) {
    errors_.push_back(name_ + ": Iteration not received: " + reply.dump());
    return;
  }
  const int64_t n = *iteration->integerValue();
  const JsonValue* action = reply.find("action");
  const std::string actionText = action && action->isString() ? action->text() : "";
  if (actionText == "head") {
    save();  // local edits are journaled before server changes arrive
    const JsonValue* result = reply.find("result");
    if (result) merge(*result);
    const JsonValue* i = result ? result->find("i") : nullptr;
    const JsonValue* x = result ? result->find("x") : nullptr;
    lastHeadWasEmpty_ = (!i || i->members().empty()) && (!x || x->elements().empty());
    // The iteration moves to the merged head at once, also when a save follows.
    journal_.iteration = n;
    if (journal_.hasChanges()) {
      savedInCycle_ = true;
      send("save", n, true);
    }
  } else if (actionText == "save") {
    // Only what that request sent and nobody changed since is done.
    for (auto [sentSection, section] : {std::pair{&sent_.i, &journal_.i}, std::pair{&sent_.u, &journal_.u}}) {
      for (const auto& [uuid, values] : *sentSection) {
        if (sentSection == &sent_.i) ackedInserts_.insert(uuid);
        auto entry = section->find(uuid);
        if (entry == section->end()) continue;
        for (const auto& [key, value] : values) {
          auto now = entry->second.find(key);
          if (now != entry->second.end() && now->second == value) entry->second.erase(now);
        }
        if (entry->second.empty()) section->erase(entry);
      }
    }
    for (const std::string& uuid : sent_.x) {
      std::erase(journal_.x, uuid);
      ackedDeletes_.insert(uuid);
    }
    journal_.iteration = n;
  } else {
    errors_.push_back(name_ + ": reply with action \"" + actionText + "\"");
  }
}

bool SimClient::syncOnce() {
  while (!idle()) {
    if (hasOutgoing()) deliver(Delivery::Normal);
    if (hasIncoming()) handleIncoming();
  }
  save();
  lastHeadWasEmpty_ = false;
  savedInCycle_ = false;
  poll();
  while (!idle()) {
    if (hasOutgoing()) deliver(Delivery::Normal);
    if (hasIncoming()) handleIncoming();
  }
  return lastHeadWasEmpty_ && !savedInCycle_ && !journal_.hasChanges();
}

// --- comparing with the server ---

ServerState fetchServerState(int port, const std::string& user, const std::string& password) {
  ServerState state;
  const Reply reply = post(port, "/sync/tessal/sync.php", requestBody(user, password, "head", 0, "observer"));
  const JsonValue* result = reply["result"];
  EXPECT_TRUE(result) << reply.body;
  if (!result) return state;
  for (const auto& [uuid, fields] : result->find("i")->members()) {
    auto& record = state.records[uuid];
    for (const auto& [key, value] : fields.members()) {
      if (!value.isNull()) record[key] = value.dump();
    }
  }
  for (const JsonValue& uuid : result->find("x")->elements()) state.deleted.insert(uuid.text());
  return state;
}

std::vector<std::string> differences(const SimClient& client, const ServerState& server) {
  std::vector<std::string> lines;
  for (const auto& [uuid, record] : client.records()) {
    if (!server.records.count(uuid)) lines.push_back(client.name() + " has " + uuid + ", the server has not");
  }
  for (const auto& [uuid, fields] : server.records) {
    auto found = client.records().find(uuid);
    if (found == client.records().end()) {
      lines.push_back(client.name() + " lacks " + uuid);
      continue;
    }
    const SimRecord& record = found->second;
    std::map<std::string, std::string> local = record.attrs;
    const std::string ownerKey = ownerKeyOf(record.entity);
    if (!record.owner.empty()) local[ownerKey] = quoted(record.owner);
    if (!record.tasks.empty()) local["tasks"] = jsonList(record.tasks);
    std::map<std::string, std::string> remote = fields;
    if (remote.count("tasks") && remote["tasks"] == "[]") remote.erase("tasks");
    for (const auto& [key, value] : remote) {
      auto mine = local.find(key);
      if (mine == local.end() || mine->second != value) {
        lines.push_back(client.name() + " " + uuid + "." + key + ": " +
                        (mine == local.end() ? std::string("(none)") : mine->second) + ", server " + value);
      }
    }
    for (const auto& [key, value] : local) {
      if (!remote.count(key))
        lines.push_back(client.name() + " " + uuid + "." + key + ": " + value + ", server (none)");
    }
  }
  return lines;
}

}  // namespace servertest
