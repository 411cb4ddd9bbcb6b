#pragma once

#include "PasswordAuthenticator.h"
#include "SyncService.h"

#include <string>

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

 private:
  PasswordAuthenticator& authenticator_;
};

// `text` with &, <, >, " and ' replaced by character references.
std::string escapeHtml(const std::string& text);

}  // namespace tessal::server
