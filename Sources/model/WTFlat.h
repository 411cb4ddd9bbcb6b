#pragma once

#include "WTItem.h"

// A flat fee, counted as a fixed number of minutes.
class WTFlat final : public WTItem {
  WT_ENTITY_CLASS(WTFlat, Flat)
 public:
  explicit WTFlat(WTObjectContext* context) : WTItem(WTEntity::Flat, context) {}

  std::optional<qint64> minutes() const { return minutes_; }
  // Stores the minutes and tells the task its duration changed.
  void setMinutes(const std::optional<qint64>& minutes);
  int duration() const override { return static_cast<int>(minutes_.value_or(0)); }

 protected:
  void storedValueDidChange(const QString& key) override;

 private:
  std::optional<qint64> minutes_;
};
