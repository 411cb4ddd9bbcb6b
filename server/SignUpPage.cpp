#include "SignUpPage.h"

namespace tessal::server {

namespace {

HttpReply page(int status, const std::string& title, const std::string& content) {
  HttpReply reply;
  reply.status = status;
  reply.contentType = "text/html; charset=utf-8";
  reply.headers.emplace_back("Cache-Control", "no-store");
  reply.headers.emplace_back("X-Frame-Options", "DENY");
  reply.body = R"(<!DOCTYPE html>
<html lang="en">
<head>
<meta charset="utf-8">
<meta name="viewport" content="width=device-width, initial-scale=1">
<title>)" + escapeHtml(title) +
               R"(</title>
<style>
body { font-family: sans-serif; max-width: 28em; margin: 2em auto; padding: 0 1em; }
label { display: block; margin-top: 1em; }
input { width: 100%; box-sizing: border-box; padding: 0.4em; }
button { margin-top: 1.5em; padding: 0.5em 1.5em; }
.error { color: #b00020; }
</style>
</head>
<body>
<h1>)" + escapeHtml(title) +
               "</h1>\n" + content + "</body>\n</html>\n";
  return reply;
}

std::string formHtml(const std::string& email, const std::string& message) {
  std::string html;
  if (!message.empty()) html += "<p class=\"error\">" + escapeHtml(message) + "</p>\n";
  html += R"(<p>Create an account to keep Tessal in step on all your computers.</p>
<form method="post" action="/sync/tessal/signup.php">
<label for="email">E-mail address</label>
<input id="email" name="email" type="email" autocomplete="email" required value=")" +
          escapeHtml(email) + R"(">
<label for="password">Password (at least 8 characters)</label>
<input id="password" name="password" type="password" autocomplete="new-password" minlength="8" required>
<label for="password2">Password again</label>
<input id="password2" name="password2" type="password" autocomplete="new-password" minlength="8" required>
<button type="submit">Create account</button>
</form>
)";
  return html;
}

constexpr const char* kTitle = "Tessal sync account";

}  // namespace

std::string escapeHtml(const std::string& text) {
  std::string out;
  out.reserve(text.size());
  for (const char c : text) {
    switch (c) {
      case '&':
        out += "&amp;";
        break;
      case '<':
        out += "&lt;";
        break;
      case '>':
        out += "&gt;";
        break;
      case '"':
        out += "&quot;";
        break;
      case '\'':
        out += "&#39;";
        break;
      default:
        out += c;
    }
  }
  return out;
}

HttpReply SignUpPage::form() const {
  return page(200, kTitle, formHtml({}, {}));
}

HttpReply SignUpPage::submit(const std::string& email, const std::string& password,
                             const std::string& repeated) {
  if (password != repeated) return page(400, kTitle, formHtml(email, "The two passwords differ."));
  switch (authenticator_.createAccount(email, password)) {
    case PasswordAuthenticator::SignUp::Created: {
      const std::string address = PasswordAuthenticator::normaliseEmail(email).value_or(email);
      return page(201, "Account created",
                  "<p>The account <strong>" + escapeHtml(address) +
                      "</strong> is ready. Enter this address and your password in Tessal's preferences and "
                      "start syncing.</p>\n");
    }
    case PasswordAuthenticator::SignUp::BadEmail:
      return page(400, kTitle, formHtml(email, "That is not an e-mail address."));
    case PasswordAuthenticator::SignUp::BadPassword:
      return page(400, kTitle, formHtml(email, "The password needs at least 8 characters."));
    case PasswordAuthenticator::SignUp::Exists:
      return page(409, kTitle, formHtml(email, "There already is an account for this address."));
    case PasswordAuthenticator::SignUp::Unavailable:
      break;
  }
  return page(503, kTitle, formHtml(email, "The account could not be stored; please try again later."));
}

}  // namespace tessal::server
