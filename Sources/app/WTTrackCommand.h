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
int runTrackCommand(const QString& command, const QStringList& arguments, QTextStream& out, QTextStream& err);
int runLogCommand(const QStringList& arguments, QTextStream& out, QTextStream& err);
