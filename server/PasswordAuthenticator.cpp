#include "PasswordAuthenticator.h"

#include <sodium.h>

#include <algorithm>
#include <cstring>
#include <mutex>

namespace tessal::server {

namespace {

constexpr size_t kMaxRemembered = 100000;
constexpr size_t kMaxFailures = 100000;
constexpr size_t kMinPasswordCharacters = 8;
constexpr size_t kMaxPasswordBytes = 1024;

bool isSpace(char c) {
  return c == ' ' || c == '\t' || c == '\n' || c == '\r' || c == '\v' || c == '\f';
}

// Unknown addresses cost a verification too, so timing does not tell which addresses have accounts.
const std::string& decoyHash() {
  static std::once_flag once;
  static std::string hash;
  std::call_once(once, [] { hash = PasswordAuthenticator::hashPassword("decoy password").value_or(""); });
  return hash;
}

}  // namespace

size_t PasswordAuthenticator::DigestHash::operator()(const Digest& d) const {
  size_t value = 0;
  std::memcpy(&value, d.data(), sizeof value);
  return value;
}

PasswordAuthenticator::PasswordAuthenticator(SyncStore& store, Options options)
    : store_(store), options_(options), verifications_(std::clamp(options.concurrentVerifications, 1, 64)) {
  if (sodium_init() < 0) std::abort();  // no random source: nothing here could be trusted
  randombytes_buf(key_.data(), key_.size());
}

std::string PasswordAuthenticator::trimmed(const std::string& text) {
  size_t begin = 0, end = text.size();
  while (begin < end && isSpace(text[begin])) ++begin;
  while (end > begin && isSpace(text[end - 1])) --end;
  return text.substr(begin, end - begin);
}

std::optional<std::string> PasswordAuthenticator::normaliseEmail(const std::string& email) {
  std::string address = trimmed(email);
  if (address.empty() || address.size() > 254) return std::nullopt;
  for (char& c : address) {
    if (static_cast<unsigned char>(c) <= 0x20 || c == 0x7f) return std::nullopt;
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  }
  const size_t at = address.find('@');
  if (at == std::string::npos || at == 0 || at + 1 == address.size() ||
      address.find('@', at + 1) != std::string::npos) {
    return std::nullopt;
  }
  return address;
}

std::optional<std::string> PasswordAuthenticator::hashPassword(const std::string& password) {
  if (sodium_init() < 0) return std::nullopt;
  char hash[crypto_pwhash_STRBYTES];
  if (crypto_pwhash_str(hash, password.data(), password.size(), crypto_pwhash_OPSLIMIT_INTERACTIVE,
                        crypto_pwhash_MEMLIMIT_INTERACTIVE) != 0) {
    return std::nullopt;
  }
  return std::string(hash);
}

PasswordAuthenticator::Digest PasswordAuthenticator::credentialDigest(const std::string& email,
                                                                      const std::string& password) const {
  std::string message = email;
  message.push_back('\0');
  message += password;
  Digest digest{};
  crypto_generichash(digest.data(), digest.size(), reinterpret_cast<const unsigned char*>(message.data()),
                     message.size(), key_.data(), key_.size());
  sodium_memzero(message.data(), message.size());
  return digest;
}

void PasswordAuthenticator::recordFailure(const std::string& email,
                                          std::chrono::steady_clock::time_point now) {
  std::lock_guard lock(mutex_);
  if (failures_.size() >= kMaxFailures) {
    std::erase_if(failures_,
                  [&](const auto& entry) { return entry.second.lockedUntil + options_.longestLock < now; });
    // Flooded with addresses: forgetting is better than growing without bound.
    if (failures_.size() >= kMaxFailures) failures_.clear();
  }
  Failures& failures = failures_[email];
  // A failure long after the last one starts a new series.
  if (failures.count > 0 && now > failures.lockedUntil + options_.longestLock) failures.count = 0;
  ++failures.count;
  auto lock_time = options_.firstLock;
  for (int i = 1; i < failures.count && lock_time < options_.longestLock; ++i) lock_time *= 2;
  failures.lockedUntil = now + std::min(lock_time, options_.longestLock);
}

PasswordAuthenticator::Outcome PasswordAuthenticator::authenticate(const std::string& email,
                                                                   const std::string& password) {
  Outcome outcome;
  const std::optional<std::string> address = normaliseEmail(email);
  const std::string secret = trimmed(password);
  if (!address || secret.empty() || secret.size() > kMaxPasswordBytes) return outcome;

  const Digest digest = credentialDigest(*address, secret);
  auto lockedOut = [&](std::chrono::steady_clock::time_point now) {
    auto found = failures_.find(*address);
    if (found == failures_.end() || found->second.lockedUntil <= now) return false;
    const auto left = std::chrono::ceil<std::chrono::seconds>(found->second.lockedUntil - now);
    outcome.verdict = Verdict::Locked;
    outcome.retryAfter = std::max(left, std::chrono::seconds(1));
    return true;
  };
  bool owner = false;
  {
    const auto now = options_.now();
    std::lock_guard lock(mutex_);
    auto found = remembered_.find(digest);
    if (found != remembered_.end() && found->second.expires > now) {
      outcome.verdict = Verdict::Accepted;
      outcome.accountId = found->second.accountId;
      owners_[digest] = now + options_.ownerLifetime;
      return outcome;
    }
    auto proven = owners_.find(digest);
    owner = proven != owners_.end() && proven->second > now;
    if (!owner && lockedOut(now)) return outcome;
  }

  SyncStore::Account account;
  const SyncStore::Status status = store_.findAccount(*address, account);
  if (status == SyncStore::Status::Unavailable) {
    outcome.verdict = Verdict::Unavailable;
    return outcome;
  }
  const bool known = status == SyncStore::Status::Ok;
  // The same credentials arriving together (one owner's devices after a restart) share one
  // verification. A new one never waits for a slot: waiting would hold the request's worker, and a flood
  // of guesses would then hold them all.
  std::optional<std::promise<bool>> verifying;
  std::shared_future<bool> shared;
  {
    std::lock_guard lock(mutex_);
    auto running = inFlight_.find(digest);
    if (running != inFlight_.end()) {
      shared = running->second;
    } else if (verifications_.try_acquire()) {
      verifying.emplace();
      shared = verifying->get_future().share();
      inFlight_.emplace(digest, shared);
    } else {
      outcome.verdict = Verdict::Busy;
      return outcome;
    }
  }
  if (verifying) {
    const std::string& hash = known ? account.passwordHash : decoyHash();
    const bool verified = crypto_pwhash_str_verify(hash.c_str(), secret.data(), secret.size()) == 0 && known;
    verifications_.release();
    {
      std::lock_guard lock(mutex_);
      inFlight_.erase(digest);
    }
    verifying->set_value(verified);
  }
  const bool good = shared.get();
  if (!verifying && !good) {
    outcome.verdict = Verdict::Rejected;  // the one who verified recorded the failure
    return outcome;
  }

  const auto now = options_.now();
  if (!good) {
    // An owner's stale password (changed on another device) fails like anyone's, but its failures do
    // not lock the account for the others.
    if (!owner) recordFailure(*address, now);
    outcome.verdict = Verdict::Rejected;
    return outcome;
  }
  std::lock_guard lock(mutex_);
  if (remembered_.size() >= kMaxRemembered) {
    std::erase_if(remembered_, [&](const auto& entry) { return entry.second.expires <= now; });
    if (remembered_.size() >= kMaxRemembered) remembered_.clear();
  }
  if (owners_.size() >= kMaxRemembered) {
    std::erase_if(owners_, [&](const auto& entry) { return entry.second <= now; });
    if (owners_.size() >= kMaxRemembered) owners_.clear();
  }
  remembered_[digest] = Remembered{account.id, now + options_.successLifetime};
  owners_[digest] = now + options_.ownerLifetime;
  failures_.erase(*address);
  outcome.verdict = Verdict::Accepted;
  outcome.accountId = account.id;
  return outcome;
}

PasswordAuthenticator::SignUp PasswordAuthenticator::createAccount(const std::string& email,
                                                                   const std::string& password) {
  const std::optional<std::string> address = normaliseEmail(email);
  if (!address) return SignUp::BadEmail;
  const std::string secret = trimmed(password);
  // Characters, not bytes: UTF-8 continuation bytes do not count.
  const size_t characters = static_cast<size_t>(std::count_if(
      secret.begin(), secret.end(), [](char c) { return (static_cast<unsigned char>(c) & 0xc0) != 0x80; }));
  if (secret.size() > kMaxPasswordBytes) return SignUp::PasswordTooLong;
  if (characters < kMinPasswordCharacters) return SignUp::BadPassword;
  verifications_.acquire();
  const std::optional<std::string> hash = hashPassword(secret);
  verifications_.release();
  if (!hash) return SignUp::Unavailable;
  switch (store_.createAccount(*address, *hash)) {
    case SyncStore::Status::Ok:
      return SignUp::Created;
    case SyncStore::Status::Exists:
      return SignUp::Exists;
    default:
      return SignUp::Unavailable;
  }
}

}  // namespace tessal::server
