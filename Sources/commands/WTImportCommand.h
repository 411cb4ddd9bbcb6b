#pragma once

#include "WTTimerCommands.h"

#include <QString>
#include <QStringList>

class QTimeZone;
class WTObjectContext;

// tessal import FILE [--format NAME] [--dry-run] [--tz ZONE] [--stop-running] [--tags FIELDS]
//   Reads another tracker's export (WTImportFormats names them; told by the content unless --format
//   names one), tells what it would make and find (WTImport::preview), and, unless --dry-run, makes it:
//   one save for all of it. A file with a row that cannot be read imports nothing and names every such
//   row. Times without a zone of their own are in ZONE, else the shell's. --tags says what a
//   timewarrior entry's leading tags are ("project" by default; e.g. "client,project,task").
namespace WTImportCommand {

QString usageLine();
// The arguments' problem, or an empty text.
QString problem(const QStringList& arguments);
// The arguments with FILE made absolute, so that the desktop copy finds the same file.
QStringList absolute(const QStringList& arguments);
// Whether the command may make records (not a dry run).
bool makesRecords(const QStringList& arguments);
// Carries the import out on `context`; saving is the caller's. `zone` is the shell's.
WTCommandOutcome run(WTObjectContext& context, const QStringList& arguments, const QTimeZone& zone);

}  // namespace WTImportCommand
