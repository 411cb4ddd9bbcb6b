#pragma once

#include "WTItem.h"

// A to-do: pending until completed, then booked on the day it was completed.
class WTToDo final : public WTItem {
  WT_ENTITY_CLASS(WTToDo, ToDo)
 public:
  explicit WTToDo(WTObjectContext* context) : WTItem(WTEntity::ToDo, context) {}

  bool completed() const { return completed_; }
  // Stores the flag; nothing else follows (the caller dates the item when it wants to).
  void setCompleted(bool completed);

  QVariant valueForKey(const QString& key) const override;
  bool setValue(const QString& key, const QVariant& value) override;
  QStringList storedKeys() const override;

 protected:
  QVariant primitiveValue(const QString& key) const override;
  bool writePrimitive(const QString& key, const QVariant& value) override;
  void readRecord(const WTStoreRecord& record) override;
  void writeRecord(WTStoreRecord& record) const override;

 private:
  bool completed_ = false;
};
