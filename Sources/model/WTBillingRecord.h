#pragma once

#include "WTObject.h"
#include "WTRoundingRule.h"

#include <optional>

// A client, a project or a task: a record that sets how the time entries under it are billed. The
// rounding rule's minutes and mode are each inherited from the record above where this one sets none,
// as rates are (a task from its project, a project from its client, a client from the preferences).
class WTBillingRecord : public WTObject {
 public:
  // The rule's minutes set on the record itself (0 or none inherits).
  std::optional<int> roundingMinutes() const;
  void setRoundingMinutes(const std::optional<int>& minutes);
  // "up", "nearest", "down", or a null text to inherit; other text changes nothing.
  QString roundingMode() const { return roundingMode_; }
  void setRoundingMode(const QString& mode);
  // The rule in force: the record's own minutes and mode, each else what the record above bills by.
  WTRoundingRule roundingRule() const {
    return roundingRuleFromAbove().refinedBy(roundingMinutes_, roundingMode_);
  }
  // What the record inherits while it sets nothing itself: its owner's rule, else the preferences'.
  virtual WTRoundingRule roundingRuleFromAbove() const;

  // The sums over the items under the record: raw minutes and cost, and what is billed of them (each
  // item's billed amount rounded once, in the currency of the record's client, else the preferences').
  virtual int duration() const = 0;
  virtual Decimal cost() const = 0;
  virtual QString billingCurrency() const = 0;
  virtual int billedDuration() const = 0;
  virtual Decimal billedCost() const = 0;

 protected:
  using WTObject::WTObject;
  // objectKeys() and the rule's stored keys; "roundingRule" depends on the record's own keys, and a
  // subclass refines it with the keys of the record above.
  static const WTKeyTable& billingKeys();

 private:
  std::optional<qint64> roundingMinutes_;
  QString roundingMode_;
};
