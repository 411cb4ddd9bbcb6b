#pragma once

// A keychain in memory that answers at once; `available` false answers Unavailable, as without a service.
#include "WTKeychain.h"

#include <QMap>
#include <QString>

class MemoryKeychain final : public WTKeychain {
 public:
  void readPassword(const QString& key, ReadHandler done) override {
    ++reads;
    if (!available) return done(Error{Unavailable, QStringLiteral("no secret service")});
    if (!entries.contains(key)) return done(Error{EntryNotFound, QStringLiteral("not found")});
    done(entries.value(key));
  }
  void writePassword(const QString& key, const QString& password, DoneHandler done) override {
    ++writes;
    if (!available) return done(Error{Unavailable, QStringLiteral("no secret service")});
    entries.insert(key, password);
    done({});
  }
  void deletePassword(const QString& key, DoneHandler done) override {
    if (!available) return done(Error{Unavailable, QStringLiteral("no secret service")});
    entries.remove(key);
    done({});
  }

  bool available = true;
  QMap<QString, QString> entries;
  int reads = 0, writes = 0;
};

// A keychain a test keeps looking at after a store has taken it over.
class SharedKeychain final : public WTKeychain {
 public:
  explicit SharedKeychain(MemoryKeychain& target) : target_(target) {}
  void readPassword(const QString& key, ReadHandler done) override {
    target_.readPassword(key, std::move(done));
  }
  void writePassword(const QString& key, const QString& password, DoneHandler done) override {
    target_.writePassword(key, password, std::move(done));
  }
  void deletePassword(const QString& key, DoneHandler done) override {
    target_.deletePassword(key, std::move(done));
  }

 private:
  MemoryKeychain& target_;
};
