#include "SignUpPage.h"

#include <cctype>

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
    case PasswordAuthenticator::SignUp::PasswordTooLong:
      return page(400, kTitle, formHtml(email, "The password is too long: at most 1024 bytes."));
    case PasswordAuthenticator::SignUp::Exists:
      return page(409, kTitle, formHtml(email, "There already is an account for this address."));
    case PasswordAuthenticator::SignUp::Unavailable:
      break;
  }
  return page(503, kTitle, formHtml(email, "The account could not be stored; please try again later."));
}

namespace {

int hexDigit(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

std::string decodeComponent(const std::string& text) {
  std::string out;
  out.reserve(text.size());
  for (size_t i = 0; i < text.size(); ++i) {
    if (text[i] == '+') {
      out += ' ';
    } else if (text[i] == '%' && i + 2 < text.size() && hexDigit(text[i + 1]) >= 0 &&
               hexDigit(text[i + 2]) >= 0) {
      out += static_cast<char>(hexDigit(text[i + 1]) * 16 + hexDigit(text[i + 2]));
      i += 2;
    } else {
      out += text[i];
    }
  }
  return out;
}

// "host[:port]" of an absolute URL, lower-cased; empty when it has none.
std::string authorityOf(const std::string& url) {
  const size_t scheme = url.find("://");
  if (scheme == std::string::npos) return {};
  const size_t start = scheme + 3;
  std::string authority = url.substr(start, url.find_first_of("/?#", start) - start);
  for (char& c : authority) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return authority;
}

}  // namespace

std::unordered_map<std::string, std::string> parseForm(const std::string& body) {
  std::unordered_map<std::string, std::string> fields;
  size_t start = 0;
  while (start <= body.size()) {
    size_t end = body.find('&', start);
    if (end == std::string::npos) end = body.size();
    const std::string pair = body.substr(start, end - start);
    const size_t equals = pair.find('=');
    if (!pair.empty())
      fields.emplace(decodeComponent(pair.substr(0, equals)),
                     equals == std::string::npos ? std::string() : decodeComponent(pair.substr(equals + 1)));
    start = end + 1;
  }
  return fields;
}

bool SignUpPage::admit(const std::string& client) {
  const auto now = std::chrono::steady_clock::now();
  std::lock_guard lock(mutex_);
  if (attempts_.size() > 100000) attempts_.clear();  // flooded with addresses: forget rather than grow
  std::deque<std::chrono::steady_clock::time_point>& times = attempts_[client];
  while (!times.empty() && times.front() + window <= now) times.pop_front();
  if (static_cast<int>(times.size()) >= maxPerWindow) return false;
  times.push_back(now);
  return true;
}

HttpReply SignUpPage::submit(const HttpRequest& request) {
  const std::string host = authorityOf("http://" + request.header("host"));
  std::string origin = request.header("origin");
  if (origin.empty()) origin = request.header("referer");
  // Browsers name the page a form was sent from; a form without either header is no browser's.
  if (origin == "null" || (!origin.empty() && authorityOf(origin) != host))
    return textReply(403, "Accounts are created from this server's own page only.");
  const std::string type = request.header("content-type");
  if (type.rfind("application/x-www-form-urlencoded", 0) != 0 || !request.query.empty())
    return textReply(415, "Send the form's fields in a url-encoded request body.");
  if (!admit(clientAddress(request))) {
    HttpReply reply =
        page(429, kTitle, formHtml({}, "Too many sign-ups from your address; please try again later."));
    reply.headers.emplace_back("Retry-After", std::to_string(window.count()));
    return reply;
  }
  const auto fields = parseForm(request.body);
  auto field = [&](const char* name) {
    auto found = fields.find(name);
    return found == fields.end() ? std::string() : found->second;
  };
  return submit(field("email"), field("password"), field("password2"));
}

}  // namespace tessal::server
