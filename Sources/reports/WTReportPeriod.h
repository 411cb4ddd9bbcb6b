#pragma once

#include "Decimal.h"
#include "KeyPath.h"
#include "RZDate.h"

#include <QList>
#include <QVariant>

#include <memory>
#include <unordered_map>

class WTClient;
class WTItem;
class WTObject;
class WTProject;
class WTTask;

// The billing period of a report: the items that start on or after its first instant and before the next
// period begins (an entry starting at midnight on the 1st belongs to the new month only, so consecutive
// reports never bill it twice), and the clients, projects and tasks as the template sees them over it.
//
// Those are views: they answer the keys of their record, except that their item lists hold only the
// period's items and their totals ("duration", "cost", "billedDuration", "billedCost") are sums over
// those, each item billed as its record bills it; a project lists only the tasks with a valued item in the
// period, a client only such projects. Items and day or month groups are the records themselves. A view is
// made on first request and lives as long as the period; one record has one view, so `task.project` is the
// view that lists the task.
class WTReportPeriod {
 public:
  explicit WTReportPeriod(const RZDate::Range& bounds);
  ~WTReportPeriod();
  WTReportPeriod(const WTReportPeriod&) = delete;
  WTReportPeriod& operator=(const WTReportPeriod&) = delete;

  const RZDate::Range& bounds() const { return bounds_; }
  bool contains(const WTItem* item) const;
  // The items of `items` that lie in the period, in their order.
  QList<WTItem*> filtered(const QList<WTItem*>& items) const;

  // The template's "period": "begin" (the first day, at its start) and "end" (the last day, at its start,
  // so a date format shows the day the period ends on).
  QVariantMap variable() const;

  // The view of a record (null for null); `viewOfProject` is null for a project with nothing valued in
  // the period.
  const KeyValueCoding* viewOfClient(WTClient* client);
  const KeyValueCoding* viewOfProject(WTProject* project);
  const KeyValueCoding* viewOfTask(WTTask* task);

  class View;
  class TaskView;
  class ProjectView;
  class ClientView;

 private:
  template <class Kind, class Record>
  Kind* view(Record* record);
  TaskView* taskView(WTTask* task);
  ProjectView* projectView(WTProject* project);

  RZDate::Range bounds_;
  std::unordered_map<const WTObject*, std::unique_ptr<View>> views_;
};
