#pragma once

#include "SyncStore.h"

#include <array>
#include <chrono>
#include <cstdint>
#include <functional>
#include <future>
#include <mutex>
#include <optional>
#include <semaphore>
#include <string>
#include <unordered_map>

namespace tessal::server {

// Checks e-mail and password of every request.
//
// Passwords are stored as Argon2id hashes (libsodium's crypto_pwhash_str). A verification costs tens of
// milliseconds and megabytes on purpose, while a device polls every five seconds with its password, so
// a success is remembered for a bounded time under a keyed hash of the credentials (the key is random
// per process): a poll then costs a hash and a lookup, and a changed password stops working when the
// entry expires.
//
// Failed attempts lock the address they come from (not the account) for a time that doubles with each
// consecutive failure; while it is locked no verification runs for requests from there. So guesses
// slow down the guesser and nobody else. A device that proved the password is recorded in the storage
// (a digest of its id, with the time), so that every server over the storage lets it past a lock on
// its address and verifies it, also after a restart or a night offline: a stranger sharing the
// owner's address (or a proxy that does not name clients) cannot shut the owner out. Such a device's
// own failures (a password changed elsewhere) lock only that device.
// A verification never waits for a free slot: when all are taken the request is told to come back.
class PasswordAuthenticator {
 public:
  struct Options {
    std::chrono::milliseconds successLifetime = std::chrono::minutes(10);
    // How long a device that proved the password passes a lock on its address after it last did.
    std::chrono::seconds proofLifetime = std::chrono::hours(24 * 30);
    std::chrono::milliseconds firstLock = std::chrono::seconds(1);  // after the first failure
    std::chrono::milliseconds longestLock = std::chrono::minutes(5);
    int concurrentVerifications = 2;  // bounds the memory Argon2id takes under load
    // The clock (tests move it instead of waiting).
    std::function<std::chrono::steady_clock::time_point()> now = [] {
      return std::chrono::steady_clock::now();
    };
  };

  explicit PasswordAuthenticator(SyncStore& store) : PasswordAuthenticator(store, Options{}) {}
  PasswordAuthenticator(SyncStore& store, Options options);

  enum class Verdict {
    Accepted,
    Rejected,     // unknown address or wrong password
    Locked,       // too many failures from there; `retryAfter` tells how long
    Unavailable,  // the storage failed
    Busy,         // every verification slot is taken; try again shortly
  };
  struct Outcome {
    Verdict verdict = Verdict::Rejected;
    int64_t accountId = 0;
    std::chrono::seconds retryAfter{0};
  };

  // `email` is normalised here (see normaliseEmail); `password` is taken trimmed of white space.
  // `address` is the client's (clientAddress()); `device` the id the request names, or empty.
  Outcome authenticate(const std::string& email, const std::string& password, const std::string& address,
                       const std::string& device);

  // Creates an account. Fails with a reason for an address that is not one, a password shorter than 8
  // characters or longer than 1024 bytes, or an address already taken.
  enum class SignUp { Created, BadEmail, BadPassword, PasswordTooLong, Exists, Unavailable };
  SignUp createAccount(const std::string& email, const std::string& password);

  // The Argon2id hash of a password in libsodium's string form; none when out of memory.
  static std::optional<std::string> hashPassword(const std::string& password);
  // Lower-cased and trimmed; none unless it looks like an address (one "@" with text on both sides, no
  // white space or control characters, at most 254 bytes).
  static std::optional<std::string> normaliseEmail(const std::string& email);
  // Trimmed of white space and line breaks at both ends, as the client sends it.
  static std::string trimmed(const std::string& text);

 private:
  using Digest = std::array<unsigned char, 32>;
  struct DigestHash {
    size_t operator()(const Digest& d) const;
  };
  struct Remembered {
    int64_t accountId;
    std::chrono::steady_clock::time_point expires;
  };
  struct Failures {
    int count = 0;
    std::chrono::steady_clock::time_point lockedUntil;
  };

  Digest credentialDigest(const std::string& email, const std::string& password) const;
  void recordFailure(const std::string& key, std::chrono::steady_clock::time_point now);
  // Whether the failures under `key` lock it now; sets the outcome's verdict and wait when they do.
  bool lockedOut(const std::string& key, std::chrono::steady_clock::time_point now, Outcome& outcome) const;
  bool isProven(int64_t accountId, const std::string& device);
  // Records in the storage that `device` proved the password, unless this process just did.
  void prove(int64_t accountId, const std::string& device, const std::string& deviceKey);

  SyncStore& store_;
  Options options_;
  std::array<unsigned char, 32> key_{};
  std::counting_semaphore<64> verifications_;

  std::mutex mutex_;
  std::unordered_map<Digest, Remembered, DigestHash> remembered_;
  std::unordered_map<Digest, std::shared_future<bool>, DigestHash> inFlight_;  // verifications running
  // By address group, or by account and device for a proven device.
  std::unordered_map<std::string, Failures> failures_;
  // When each device's proof was last written by this process: one write per successLifetime.
  std::unordered_map<std::string, std::chrono::steady_clock::time_point> proofsWritten_;
};

}  // namespace tessal::server
