#pragma once

#include <QStringList>
#include <QTextStream>

// Tracking from the shell; none of these needs a display.
//
//   tessal start|stop|status ...  (WTTimerCommands.h says what each does)
//     start and stop are carried out by the desktop copy while it runs, so that the store keeps one
//     writer and its window shows the change at once; otherwise the command changes the store itself,
//     holding the store's writer lock meanwhile. status reads the store directly either way.
//
//   tessal log [--range RANGE] [--project NAME]
//     The time entries of a range (the words of `tessal export`; today by default), one a line with date,
//     times, project, task, duration and cost, then the range's totals.
//
//   tessal list tasks|projects|clients [--project NAME] [--client NAME] [--qualified]
//     The names there are, one a line, each once, sorted: for pickers and shell completion. The filters
//     narrow the tasks to those of the named projects and clients, and the projects to the named client's.
//     --qualified names tasks "PROJECT › TASK", which start and stop take too.
int runListCommand(const QStringList& arguments, QTextStream& out, QTextStream& err);
int runTrackCommand(const QString& command, const QStringList& arguments, QTextStream& out, QTextStream& err);
int runLogCommand(const QStringList& arguments, QTextStream& out, QTextStream& err);
