#pragma once

#include "Result.h"
#include "WTRangePredicate.h"

#include <QList>
#include <QString>
#include <QVariant>

class WTObjectContext;
class WTProject;
class WTTime;

// The CSV texts of the reports and of the time-entry export, shared by the windows and the commands.
// Every field is quoted; a double quote inside a field becomes backslash-quote (quotes are not doubled:
// the files are read back by tools that expect exactly this). No header line.
namespace WTCSVExport {

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

}  // namespace WTCSVExport
