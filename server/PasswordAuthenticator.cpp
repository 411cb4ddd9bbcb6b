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

int64_t unixSeconds(std::chrono::system_clock::time_point time) {
  return std::chrono::duration_cast<std::chrono::seconds>(time.time_since_epoch()).count();
}

// What the storage keeps of a device's id: a leaked table names no device that could pass a lock.
std::string deviceDigest(const std::string& device) {
  unsigned char digest[32];
  crypto_generichash(digest, sizeof digest, reinterpret_cast<const unsigned char*>(device.data()),
                     device.size(), nullptr, 0);
  static const char kHex[] = "0123456789abcdef";
  std::string text;
  for (unsigned char byte : digest) text += {kHex[byte >> 4], kHex[byte & 15]};
  return text;
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

void PasswordAuthenticator::recordFailure(const std::string& key, std::chrono::steady_clock::time_point now) {
  std::lock_guard lock(mutex_);
  if (failures_.size() >= kMaxFailures) {
    std::erase_if(failures_,
                  [&](const auto& entry) { return entry.second.lockedUntil + options_.longestLock < now; });
    // Flooded with addresses: forgetting is better than growing without bound.
    if (failures_.size() >= kMaxFailures) failures_.clear();
  }
  Failures& failures = failures_[key];
  // A failure long after the last one starts a new series.
  if (failures.count > 0 && now > failures.lockedUntil + options_.longestLock) failures.count = 0;
  ++failures.count;
  auto lock_time = options_.firstLock;
  for (int i = 1; i < failures.count && lock_time < options_.longestLock; ++i) lock_time *= 2;
  failures.lockedUntil = now + std::min(lock_time, options_.longestLock);
}

bool PasswordAuthenticator::lockedOut(const std::string& key, std::chrono::steady_clock::time_point now,
                                      Outcome& outcome) const {
  auto found = failures_.find(key);
  if (found == failures_.end() || found->second.lockedUntil <= now) return false;
  const auto left = std::chrono::ceil<std::chrono::seconds>(found->second.lockedUntil - now);
  outcome.verdict = Verdict::Locked;
  outcome.retryAfter = std::max(left, std::chrono::seconds(1));
  return true;
}

bool PasswordAuthenticator::isProven(int64_t accountId, const std::string& device) {
  bool proven = false;
  const auto since = std::chrono::system_clock::now() - options_.proofLifetime;
  return store_.deviceProven(accountId, deviceDigest(device), unixSeconds(since), proven) ==
             SyncStore::Status::Ok &&
         proven;
}

void PasswordAuthenticator::prove(int64_t accountId, const std::string& device,
                                  const std::string& deviceKey) {
  const auto now = options_.now();
  {
    std::lock_guard lock(mutex_);
    auto written = proofsWritten_.find(deviceKey);
    if (written != proofsWritten_.end() && now < written->second + options_.successLifetime) return;
    if (proofsWritten_.size() >= kMaxRemembered) proofsWritten_.clear();
    proofsWritten_[deviceKey] = now;
  }
  const auto wallClock = std::chrono::system_clock::now();
  // Not written (the storage failed): the device is simply not proven on the other servers yet.
  if (store_.proveDevice(accountId, deviceDigest(device), unixSeconds(wallClock),
                         unixSeconds(wallClock - options_.proofLifetime)) != SyncStore::Status::Ok) {
    std::lock_guard lock(mutex_);
    proofsWritten_.erase(deviceKey);
  }
}

PasswordAuthenticator::Outcome PasswordAuthenticator::authenticate(const std::string& email,
                                                                   const std::string& password,
                                                                   const std::string& address,
                                                                   const std::string& device) {
  Outcome outcome;
  const std::optional<std::string> normalised = normaliseEmail(email);
  const std::string secret = trimmed(password);
  if (!normalised || secret.empty() || secret.size() > kMaxPasswordBytes) return outcome;

  const Digest digest = credentialDigest(*normalised, secret);
  const std::string addressKey = "address " + address;
  const std::string deviceKey = device.empty() ? std::string() : "device " + *normalised + '\n' + device;
  Outcome addressLock;
  {
    const auto now = options_.now();
    std::lock_guard lock(mutex_);
    auto found = remembered_.find(digest);
    if (found != remembered_.end() && found->second.expires > now) {
      outcome.verdict = Verdict::Accepted;
      outcome.accountId = found->second.accountId;
    } else if (!deviceKey.empty() && lockedOut(deviceKey, now, outcome)) {
      return outcome;  // only a proven device's failures lock it
    } else {
      lockedOut(addressKey, now, addressLock);
    }
  }
  if (outcome.verdict == Verdict::Accepted) {
    if (!device.empty()) prove(outcome.accountId, device, deviceKey);
    return outcome;
  }

  SyncStore::Account account;
  const SyncStore::Status status = store_.findAccount(*normalised, account);
  if (status == SyncStore::Status::Unavailable) {
    outcome.verdict = Verdict::Unavailable;
    return outcome;
  }
  const bool known = status == SyncStore::Status::Ok;
  // Only a device that proved the password passes a lock on its address; the storage is asked only
  // then, and when a verification fails, so that polls do not pay for it.
  std::optional<bool> proven;
  if (addressLock.verdict == Verdict::Locked) {
    proven = known && !device.empty() && isProven(account.id, device);
    if (!*proven) return addressLock;
  }
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
    // An owner's device with a stale password (changed on another device) slows down only itself.
    if (!proven) proven = known && !device.empty() && isProven(account.id, device);
    recordFailure(*proven ? deviceKey : addressKey, now);
    outcome.verdict = Verdict::Rejected;
    return outcome;
  }
  {
    std::lock_guard lock(mutex_);
    if (remembered_.size() >= kMaxRemembered) {
      std::erase_if(remembered_, [&](const auto& entry) { return entry.second.expires <= now; });
      if (remembered_.size() >= kMaxRemembered) remembered_.clear();
    }
    remembered_[digest] = Remembered{account.id, now + options_.successLifetime};
    if (!deviceKey.empty()) failures_.erase(deviceKey);
  }
  if (!device.empty()) prove(account.id, device, deviceKey);
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
