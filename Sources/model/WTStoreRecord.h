#pragma once

#include "Date.h"
#include "Decimal.h"

#include <QString>

#include <optional>

// One stored record as the store file holds it: every entity shares one row shape, and the columns an
// entity does not use stay empty. Relationships are held by the owner's uuid; a project's ordered tasks
// by each task's `position` within its project.
struct WTStoreRecord {
  QString uuid;
  QString entity;  // "WTClient", "WTProject", "WTTask", "WTTime", "WTFlat", "WTExpense", "WTNote", "WTToDo"

  // Every record.
  QString name;   // null when never set
  QString notes;  // null when never set
  std::optional<Decimal> rate;
  QString color;  // "#aarrggbb", or null when none
  bool archived = false;

  // WTClient.
  QString addressBookUID;
  QString totalsUID;
  QString currency;  // ISO 4217 code, null when none
  QString address;

  // WTClient, WTProject and WTTask.
  std::optional<qint64> roundingMinutes;
  QString roundingMode;  // "up", "nearest", "down", null when none

  // WTProject.
  QString clientUuid;

  // WTTask.
  QString projectUuid;
  int position = 0;
  std::optional<Decimal> budget;  // WTProject too

  // Items.
  QString taskUuid;
  std::optional<Date> startDate;
  std::optional<Date> endDate;     // WTTime
  bool running = false;            // WTTime
  std::optional<qint64> minutes;   // WTFlat
  std::optional<Decimal> expense;  // WTExpense
  bool completed = false;          // WTToDo
  QString importId;                // where an imported item came from, null when typed here

  friend bool operator==(const WTStoreRecord&, const WTStoreRecord&) = default;
};
