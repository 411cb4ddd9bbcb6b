#include "SyncService.h"

#include <algorithm>

namespace tessal::server {

namespace {

constexpr size_t kMaxDeviceLength = 128;
// A client's save carries the changes of at most 5,000 records, some tens of thousands of values; a
// million, about 100 MB parsed, leaves room for a project of very many tasks and bounds what one body
// of tiny values can cost (32 MiB of "0," would otherwise be 16 million values, 1.5 GB).
constexpr size_t kMaxRequestValues = 1'000'000;

HttpReply retryLater(int status, const std::string& message, std::chrono::seconds after) {
  HttpReply reply;
  reply.status = status;
  reply.contentType = "text/plain; charset=utf-8";
  reply.body = message + "\n";
  reply.headers.emplace_back("Retry-After", std::to_string(after.count()));
  return reply;
}

HttpReply unavailable() {
  return retryLater(503, "The sync service cannot reach its storage; try again later.",
                    std::chrono::seconds(15));
}

// A string member, or none when absent; `ok` turns false when present but not a string.
const std::string* stringMember(const JsonValue& request, std::string_view name, bool& ok) {
  const JsonValue* value = request.find(name);
  if (!value) return nullptr;
  if (!value->isString()) {
    ok = false;
    return nullptr;
  }
  return &value->text();
}

}  // namespace

HttpReply SyncService::errorReply(int code, const std::string& message, int status) {
  HttpReply reply;
  reply.status = status;
  reply.body = "{\"error\":";
  appendJsonString(reply.body, message);
  reply.body += ",\"code\":" + std::to_string(code);
  // Code 4 always names iteration 0: the client then keeps its journal and polls "head" first. A
  // positive iteration would make it resend its journal claiming that iteration, skipping whatever
  // others saved before it.
  if (code == kFetchHeadFirst) reply.body += ",\"iteration\":0";
  reply.body += "}";
  return reply;
}

HttpReply SyncService::handle(std::string_view body, const std::string& client) {
  std::string reason;
  const std::optional<JsonValue> request = JsonValue::parse(body, &reason, 16, kMaxRequestValues);
  if (!request) return errorReply(kMalformedRequest, "The request is not valid JSON: " + reason);
  if (!request->isObject()) return errorReply(kMalformedRequest, "The request is not a JSON object.");

  bool ok = true;
  const std::string* user = stringMember(*request, "user", ok);
  const std::string* password = stringMember(*request, "password", ok);
  const std::string* action = stringMember(*request, "action", ok);
  const std::string* device = stringMember(*request, "device", ok);
  if (!ok || !user || !password || !action) {
    return errorReply(kMalformedRequest,
                      "The request needs the strings \"user\", \"password\" and \"action\".");
  }
  const JsonValue* iterationValue = request->find("iteration");
  const std::optional<int64_t> iteration = iterationValue ? iterationValue->integerValue() : std::nullopt;
  if (!iteration || *iteration < 0) {
    return errorReply(kMalformedRequest, "The request needs \"iteration\", an integer of 0 or more.");
  }
  // An empty device is the same as none: such a client gets every change, its own included.
  const std::string deviceId = device ? *device : std::string();
  if (deviceId.size() > kMaxDeviceLength || std::any_of(deviceId.begin(), deviceId.end(), [](char c) {
        return static_cast<unsigned char>(c) < 0x20 || c == 0x7f;
      })) {
    return errorReply(kMalformedRequest, "\"device\" must be a short printable text.");
  }

  const PasswordAuthenticator::Outcome login =
      authenticator_.authenticate(*user, *password, client, deviceId);
  switch (login.verdict) {
    case PasswordAuthenticator::Verdict::Accepted:
      break;
    case PasswordAuthenticator::Verdict::Rejected:
      return errorReply(kWrongCredentials, "Wrong e-mail address or password.");
    case PasswordAuthenticator::Verdict::Locked:
      return retryLater(429, "Too many failed sign-in attempts from your address; try again later.",
                        login.retryAfter);
    case PasswordAuthenticator::Verdict::Unavailable:
      return unavailable();
    case PasswordAuthenticator::Verdict::Busy:
      return retryLater(503, "The sync service is busy checking passwords; try again shortly.",
                        std::chrono::seconds(1));
  }

  if (*action == "head") return head(login.accountId, *iteration, deviceId);
  if (*action == "save") return save(login.accountId, *iteration, deviceId, request->find("data"));
  return errorReply(kUnknownAction, "Unknown action \"" + *action + "\".");
}

HttpReply SyncService::head(int64_t accountId, int64_t base, const std::string& device) {
  HttpReply reply;
  // The poll with nothing new, by far the most common request, costs one indexed read; it writes only
  // when the device's last head on record is another.
  SyncStore::Head head = store_.currentHead(accountId, device);
  if (head.status != SyncStore::Status::Ok) return unavailable();
  if (base == head.iteration && (device.empty() || head.lastSent == head.iteration)) {
    head.result = R"({"i":{},"u":{},"x":[]})";
  } else {
    if (!fullHeads_.try_acquire()) {
      return retryLater(503, "The sync service is busy sending changes; try again shortly.",
                        std::chrono::seconds(1));
    }
    head = store_.head(accountId, base, device);
    fullHeads_.release();
    if (head.status != SyncStore::Status::Ok) return unavailable();
  }
  const int64_t iteration = head.iteration;
  const std::string& result = head.result;
  reply.body.reserve(result.size() + 48);
  reply.body = "{\"action\":\"head\",\"iteration\":" + std::to_string(iteration) + ",\"result\":";
  reply.body += result;
  reply.body += '}';
  return reply;
}

HttpReply SyncService::save(int64_t accountId, int64_t base, const std::string& device,
                            const JsonValue* data) {
  if (!data) return errorReply(kBadChangeSet, "A save needs \"data\", the change set.");
  std::string reason;
  const std::optional<ChangeSet> changes = readChangeSet(*data, reason);
  if (!changes) return errorReply(kBadChangeSet, "Bad change set: " + reason);
  const SyncStore::Save outcome = store_.save(accountId, base, device, *changes);
  if (outcome.status != SyncStore::Status::Ok) return unavailable();
  if (outcome.overtaken) {
    return errorReply(kFetchHeadFirst,
                      "This device was already sent a newer iteration; poll \"head\" first.");
  }
  if (outcome.refused) {
    return errorReply(kFetchHeadFirst,
                      "The server has changes this save is not based on; poll \"head\" first.");
  }
  HttpReply reply;
  reply.body = "{\"action\":\"save\",\"iteration\":" + std::to_string(outcome.iteration) + "}";
  return reply;
}

}  // namespace tessal::server
