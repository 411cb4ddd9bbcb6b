#pragma once

#include "WTItem.h"

// A time entry: a timer while `running`, otherwise the span from `startDate` to `endDate`.
class WTTime final : public WTItem {
  WT_ENTITY_CLASS(WTTime, Time)
 public:
  explicit WTTime(WTObjectContext* context) : WTItem(WTEntity::Time, context) {}

  std::optional<Date> endDate() const { return endDate_; }
  // Stores the end and tells the task its duration changed.
  void setEndDate(const std::optional<Date>& date);
  bool running() const { return running_; }
  // Starting clears the end; stopping stamps it with now unless one is set; the task is told either way.
  void setRunning(bool running);

  // Minute boundaries crossed between start and end (now while running), both cut to the minute.
  int duration() const override;
  // The duration rounded by the rule (a running entry as it stands now).
  int billedDurationWithRule(const WTRoundingRule& rule) const override { return rule.apply(duration()); }
  // Makes the entry last `minutes` from its start.
  void setDuration(int minutes);
  // Makes the entry last `minutes` up to its end: the start moves. For time already spent, which ends
  // when it is entered.
  void setDurationKeepingEnd(int minutes);
  // Moves the entry to the day of `date`, keeping hour and minute (seconds dropped) and its length.
  void setDate(const std::optional<Date>& date) override;
  // Where setDate(date) puts the start: on the day of `date`, at its hour and minute, no seconds.
  Date startOnDayOf(const Date& date) const;
  // Whether on the day of `date` the entry would be time already spent: over by now, or a running one
  // begun. On a later day it would bill time not spent yet, or a running one count down from a start
  // still to come.
  bool isSpentOnDayOf(const Date& date) const;
  // The start time as "HH:mm".
  QString title() const override;

  // Refreshes observers of a running entry when its minute count moved since the last look; returns
  // whether it did.
  bool peek();
  std::optional<int> lastDuration() const { return lastDuration_; }

 protected:
  void awakeFromInsert() override;
  void storedValueDidChange(const QString& key) override;

 private:
  std::optional<Date> endDate_;
  std::optional<int> lastDuration_;
  bool running_ = false;
};
