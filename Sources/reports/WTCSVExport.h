#pragma once

#include "Result.h"
#include "WTRangePredicate.h"

#include <QList>
#include <QString>
#include <QVariant>

class WTItem;
class WTObjectContext;
class WTProject;
class WTTime;

// The CSV texts of the reports and of the exports, shared by the windows and the commands.
// The report's and the time-entry CSV quote every field and write a double quote inside a field as
// backslash-quote (quotes are not doubled: the files are read back by tools that expect exactly this),
// without a header line. The spreadsheet CSV is the other kind: RFC 4180, for spreadsheets and scripts.
namespace WTCSVExport {

// What an export writes: today's time entries (the default), or the spreadsheet with a header.
enum class Format { Times, Spreadsheet };

// "" for a null value; otherwise the value's text with every '"' replaced by '\"'.
QString escapedString(const QVariant& text);

// The report's CSV at `mode` 0–3: at 0 one line per task (project, task, duration, cost); at 1–3 one line
// per entry of the report's item lists (project, task, date, duration, cost), dated "yyyy-MM-dd HH:mm",
// "yyyy-MM-dd" or "yyyy-MM". Projects in the given order, tasks in their own. Empty without projects.
// With a `period`, the report's lines over it (see WTReportGenerator::setPeriod).
QString reportCSV(const QList<WTProject*>& projects, int mode,
                  const std::optional<RZDate::Range>& period = {});

// Seven columns per entry (project, task, task rate, name, start and end as short dates, minutes),
// sorted by project name, task title, flat period start and start time.
QString timesCSV(QList<WTTime*> times);

// Writes `text` in UTF-8 to `path`, all or nothing (the old file stays until the new one is complete).
Result<void> writeTextAtomically(const QString& path, const QString& text);

// The export: logs "Exporting N items to: PATH", then writes timesCSV of the matching entries atomically.
// Returns the number of entries written.
Result<int> exportTimes(const WTObjectContext& context, const WTItemPredicate& predicate,
                        const WTProject* project, const QString& path);

// The spreadsheet's columns, in order, as its header row names them.
const QStringList& spreadsheetColumns();

// The time entries, flat fees and expenses of `context` that `predicate` accepts (all when it is empty)
// and, when `project` is given, that belong to it; in no particular order.
QList<WTItem*> billableItemsMatching(const WTObjectContext& context, const WTItemPredicate& predicate,
                                     const WTProject* project = nullptr);

// The header row and one row per item (notes and to-dos bill nothing and are left out), sorted by client,
// project and task name, then date. Fields are separated by ',' and rows end in CR LF; a field is quoted
// only when it holds a comma, a quote, a CR or an LF, and its quotes are then doubled. Dates and times
// are local, with ASCII digits whatever the locale: yyyy-MM-dd, HH:MM (start and end of time entries
// only; no end while running), durations H:MM (none for an expense). Rate and amount are plain numbers
// with '.' and no grouping; the amount is the billed one, with the currency's minor unit.
QString spreadsheetCSV(QList<WTItem*> items);

// As exportTimes, with the spreadsheet CSV of billableItemsMatching.
Result<int> exportSpreadsheet(const WTObjectContext& context, const WTItemPredicate& predicate,
                              const WTProject* project, const QString& path);

}  // namespace WTCSVExport
