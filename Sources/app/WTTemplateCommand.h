#pragma once

#include <QStringList>
#include <QTextStream>

// `tessal template TEMPLATE_FILE [--vars VARS.json]`, for report authors to preview a template.
// `arguments` are those after "template". Renders the file with the standard markers and filters plus the
// report filters ("digiclock", "decimal") over the variables of the JSON object in VARS.json (objects as
// maps, arrays as lists, strings, integers, other numbers as Decimal, booleans; null is absent).
// Writes the output to `out` exactly as produced and each error the engine reports to `err` as one line
// "error CODE: MESSAGE", in the order reported.
// Returns 0 when a result was produced, 1 when there was none (the template could not be read), 2 for a
// usage error, a missing file or variables that are not a JSON object (one line naming the file on `err`).
int runTemplateCommand(const QStringList& arguments, QTextStream& out, QTextStream& err);
