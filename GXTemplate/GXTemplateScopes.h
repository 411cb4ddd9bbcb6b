#pragma once

#include "GXBlockInfo.h"
#include "GXTemplateValue.h"

#include <QString>
#include <QStringList>
#include <QVariant>
#include <QVariantMap>

#include <array>
#include <unordered_map>
#include <vector>

// The variables a template run sees: the run's own, the engine's globals, and the frames of the open
// blocks (held by the engine in its block stack, innermost last). A name is looked up by its first
// component in the run's variables, then the globals, then the frames from the innermost outward; the rest
// of it is a key path from there. Owned by one engine, on its thread.
//
// A name read again before any variable may have changed (a value set, a loop going round, a block with
// values closing, a new run) gives what it gave before: records are not asked twice for the same key path
// in a row. The engine, which owns the frames, says when one closes (blockClosing); it opens them empty.
class GXTemplateScopes {
 public:
  // A variable name split at ".", kept across runs (templates repeat the same few names), with the
  // version of the run's variables and globals in which its first component was found in neither, and
  // the value last read.
  struct Name {
    QStringList components;
    quint64 absentFromRootsVersion = 0;
    // Good while the values' version is memoVersion: a row that tests a value with "if" and then writes
    // it reads it once.
    quint64 memoVersion = 0;
    QVariant memo;
  };

  explicit GXTemplateScopes(std::vector<GXBlockInfo>& blocks) : blocks_(blocks) {}
  GXTemplateScopes(const GXTemplateScopes&) = delete;
  GXTemplateScopes& operator=(const GXTemplateScopes&) = delete;

  void setGlobal(const QString& key, const QVariant& value);
  void addGlobals(const QVariantMap& entries);
  QVariant global(const QString& key) const { return globals_.value(key); }

  // A new run over a copy of `variables`. Names read by the last run may be forgotten, so nothing of
  // theirs may be held across this call.
  void beginRun(const QVariantMap& variables);
  const QVariantMap& runVariables() const { return runVariables_; }
  // The innermost block is about to be dropped from the stack.
  void blockClosing() {
    if (!blocks_.back().vars.isEmpty()) ++valuesVersion_;
  }

  // The split form of `variable`, kept until a later run begins.
  Name& nameOf(const QString& variable);
  // The value of `name` (the split form of `variable`); null when there is none.
  QVariant read(Name& name, const QString& variable) {
    if (name.memoVersion != valuesVersion_) {
      name.memo = resolve(name, variable, nullptr);
      name.memoVersion = valuesVersion_;
    }
    return name.memo;
  }

  // As the engine's functions of the same names describe them.
  QVariant valueForVariable(const QString& variable);
  void setValue(const QVariant& value, const QString& variable, bool forceCurrentStackFrame);
  QVariant* variableInInnermostBlock(const QString& name);

 private:
  struct Step;
  struct Place;

  QVariant lookUp(const QString& variable, Place* place);
  QVariant resolve(Name& name, const QString& variable, Place* place);
  void assign(const Place& place, const QVariant& value);
  // The frame whose entry for the name's first component is found first, and that entry; null if none.
  QVariantMap* rootFor(Name& name, const QVariant** entry);

  std::vector<GXBlockInfo>& blocks_;
  QVariantMap globals_;
  QVariantMap runVariables_;
  std::unordered_map<QString, Name, GXTemplateValue::StringHash> names_;
  // The names last asked for, each in a slot chosen by the address of its text: a run asks for the same
  // name through the same argument of the same marker again and again, and comparing a short text costs
  // less than hashing it. A slot's text is compared whole, so an address used again by another text
  // finds nothing wrong.
  struct Recent {
    QString text;
    Name* name = nullptr;
  };
  std::array<Recent, 64> recent_;
  // Moves on whenever a variable may have changed: a value set, a block with values closed, a run begun.
  quint64 valuesVersion_ = 1;
  // Moves on whenever the run's variables or the globals may have gained a key.
  quint64 rootKeysVersion_ = 1;
};
