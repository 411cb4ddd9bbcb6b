#pragma once

#include "HttpListener.h"
#include "PasswordAuthenticator.h"
#include "SyncService.h"

#include <chrono>
#include <deque>
#include <mutex>
#include <string>
#include <unordered_map>

namespace tessal::server {

// The page "/sync/tessal/signup.php": a plain form (e-mail address, password twice) that creates an
// account. Plain HTML without scripts, so it works in any browser and in the application's sheet.
class SignUpPage {
 public:
  explicit SignUpPage(PasswordAuthenticator& authenticator) : authenticator_(authenticator) {}

  // The empty form.
  HttpReply form() const;
  // Handles the submitted form: 201 with a confirmation, or 400/409/503 with the form again and the
  // reason on it. The address is kept in the form; the passwords are not.
  HttpReply submit(const std::string& email, const std::string& password, const std::string& repeated);

  // A POST of the form as it arrives: refused with 403 when a browser says it comes from another site
  // (Origin, or Referer without it, naming a host other than Host), with 415 unless the fields are a
  // url-encoded body (never the query, which ends up in logs and histories), and with 429 past
  // `maxPerWindow` attempts from one client address within `window`. The address is the peer's, or,
  // when the peer is a reverse proxy on loopback, the last one it names in X-Forwarded-For.
  HttpReply submit(const HttpRequest& request);

  int maxPerWindow = 5;
  std::chrono::seconds window{600};

 private:
  bool admit(const std::string& client);

  PasswordAuthenticator& authenticator_;
  std::mutex mutex_;
  std::unordered_map<std::string, std::deque<std::chrono::steady_clock::time_point>> attempts_;
};

// The fields of an application/x-www-form-urlencoded text; a repeated name keeps its first value.
std::unordered_map<std::string, std::string> parseForm(const std::string& body);

// `text` with &, <, >, " and ' replaced by character references.
std::string escapeHtml(const std::string& text);

}  // namespace tessal::server
