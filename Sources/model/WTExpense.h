#pragma once

#include "WTItem.h"

// An expense: costs its amount whatever the rate.
class WTExpense final : public WTItem {
  WT_ENTITY_CLASS(WTExpense, Expense)
 public:
  explicit WTExpense(WTObjectContext* context) : WTItem(WTEntity::Expense, context) {}

  std::optional<Decimal> expense() const { return expense_; }
  // Stores the amount and tells the task its cost changed.
  void setExpense(const std::optional<Decimal>& amount);
  Decimal cost() const override { return expense_.value_or(Decimal()); }
  Decimal costAtRate(const Decimal&) const override { return cost(); }
  Decimal billedCostWith(const WTRoundingRule&, const Decimal&, int places) const override {
    return cost().rounded(places);
  }

 protected:
  void storedValueDidChange(const QString& key) override;

 private:
  std::optional<Decimal> expense_;
};
