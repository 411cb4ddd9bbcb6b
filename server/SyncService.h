#pragma once

#include "PasswordAuthenticator.h"
#include "SyncStore.h"

#include <algorithm>
#include <cstdint>
#include <semaphore>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace tessal::server {

// An HTTP answer, independent of the HTTP library.
struct HttpReply {
  int status = 200;
  std::string body;
  std::string contentType = "application/json";
  std::vector<std::pair<std::string, std::string>> headers;
};

// The sync protocol: one JSON request in, one JSON reply out. Documented in server/README.md.
//
// Threads: every HTTP worker calls handle() at the same time, with no lock of the listener held. It
// keeps no state: what it must remember between requests (the last head sent to each device) is in
// the storage, so several server processes over one database answer alike. Password checks lock
// inside PasswordAuthenticator; storage calls lock nothing here (see SyncStore).
class SyncService {
 public:
  // The "code" of an error reply.
  enum ErrorCode {
    kMalformedRequest = 1,  // not JSON, not an object, a member missing or of the wrong type
    kWrongCredentials = 2,  // unknown e-mail address or wrong password
    kUnknownAction = 3,     // "action" is neither "head" nor "save"
    kFetchHeadFirst = 4,    // with "iteration" 0: the save was not applied; poll "head", then save again
    kBadChangeSet = 5,      // the "data" of a save is not a valid change set; nothing was stored
    kRequestTooLarge = 6,   // the body is over the server's limit
  };

  // At most `concurrentHeads` heads that bring changes are built at once (see fullHeads_).
  SyncService(SyncStore& store, PasswordAuthenticator& authenticator, int concurrentHeads = 4)
      : store_(store), authenticator_(authenticator), fullHeads_(std::clamp(concurrentHeads, 1, 64)) {}

  // Answers one POST to "/sync/tessal/sync.php". Failures the client should simply retry (storage
  // unavailable, account locked after failed attempts) are plain-text 503 and 429 answers with
  // "Retry-After"; every other outcome is a JSON object with status 200. `client` is what failed
  // sign-ins are counted against (addressGroup(clientAddress(request))).
  HttpReply handle(std::string_view body, const std::string& client);

  // The JSON error reply {"error": message, "code": code} (with "iteration": 0 for code 4).
  static HttpReply errorReply(int code, const std::string& message, int status = 200);

 private:
  HttpReply head(int64_t accountId, int64_t base, const std::string& device);
  HttpReply save(int64_t accountId, int64_t base, const std::string& device, const JsonValue* data);

  SyncStore& store_;
  PasswordAuthenticator& authenticator_;
  // A head that brings changes is built in memory, and a large account's first one takes tens of
  // megabytes: readers asking for it over and over would otherwise take as many of those as there are
  // workers. Like a password verification it never waits for a slot (503 with Retry-After instead);
  // the poll with nothing new needs none.
  std::counting_semaphore<64> fullHeads_;
};

}  // namespace tessal::server
