#pragma once

// A keychain in memory for tests: what the secret service would hold, and a switch that makes it
// behave like a desktop without one (every call answers Unavailable, as WTQtKeychain does then).
#include "WTKeychain.h"

#include <QMap>
#include <QString>

class MemoryKeychain final : public WTKeychain {
 public:
  Result<QString> readPassword(const QString& key) override {
    ++reads;
    if (!available) return Error{Unavailable, QStringLiteral("no secret service")};
    if (!entries.contains(key)) return Error{EntryNotFound, QStringLiteral("not found")};
    return entries.value(key);
  }
  Result<void> writePassword(const QString& key, const QString& password) override {
    ++writes;
    if (!available) return Error{Unavailable, QStringLiteral("no secret service")};
    entries.insert(key, password);
    return {};
  }
  Result<void> deletePassword(const QString& key) override {
    if (!available) return Error{Unavailable, QStringLiteral("no secret service")};
    entries.remove(key);
    return {};
  }

  bool available = true;
  QMap<QString, QString> entries;
  int reads = 0;
  int writes = 0;
};

// A keychain a test keeps looking at after a store has taken it over.
class SharedKeychain final : public WTKeychain {
 public:
  explicit SharedKeychain(MemoryKeychain& target) : target_(target) {}
  Result<QString> readPassword(const QString& key) override { return target_.readPassword(key); }
  Result<void> writePassword(const QString& key, const QString& password) override {
    return target_.writePassword(key, password);
  }
  Result<void> deletePassword(const QString& key) override { return target_.deletePassword(key); }

 private:
  MemoryKeychain& target_;
};
