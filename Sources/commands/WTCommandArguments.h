#pragma once

#include <QCommandLineParser>
#include <QString>
#include <QStringList>
#include <QTextStream>

class WTObjectContext;

// What the commands share in reading their arguments and saying what went wrong, in one voice:
// "tessal: PROBLEM" on stderr.
namespace WTCommandArguments {

// Writes the problem (when there is one) and the usage line; gives exit status 2.
int usage(QTextStream& err, const char* usageLine, const QString& problem);
// Writes the message; gives exit status 1.
int failure(QTextStream& err, const QString& message);
// Parses `arguments` (those after the command's name) for options that each take one value, given at
// most once; nothing else is allowed. Gives the problem, or an empty text.
QString parse(QCommandLineParser& parser, const QStringList& arguments, const QStringList& options);
// The problem of a "--client" without the "--project" it tells apart from its namesakes, or an empty text.
QString clientWithoutProject(const QCommandLineParser& parser);
// Whether `a` comes before `b` in a list of names shown to the user (their language's order). One collator
// serves the whole process and goes with it: QString::localeAwareCompare keeps one per thread, which a
// process without an application object never gives back.
bool sortsBefore(const QString& a, const QString& b);
// Writes `text` to `out` a slice at a time. Handed to the stream whole, a year's report is first copied
// into the stream's buffer and then encoded in one piece: some 17 MB of memory touched for nothing.
void writeText(QTextStream& out, QStringView text);
// Ends the process with `status` once a command is done: its output is flushed and `context`'s store
// closed, as any end would, but the records are not freed one by one, since the system takes the
// process's memory back whole. Only for a process that runs one command.
[[noreturn]] void endProcess(int status, QTextStream& out, QTextStream& err, WTObjectContext& context);

}  // namespace WTCommandArguments
