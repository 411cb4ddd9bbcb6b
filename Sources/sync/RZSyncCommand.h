#pragma once

#include <QStringList>
#include <QTextStream>

class RZSyncManager;

// `tessal sync [--timeout SECONDS]`, for headless machines, scripts and tests: exchanges with the
// server until this installation is in step with it, that is until its journal is empty and a "head"
// brings nothing new. `arguments` are those after "sync"; the manager is the application's, over its
// context and journal (the delegate makes it).
//
// Writes one line to `out` when in step ("In step with SERVER at iteration N."). Returns 0 then; 1 when
// syncing cannot succeed (no server address or account set, the server refused, no usable answer, or
// not in step within the time limit, 120 seconds unless given), with one line on `err` saying why; 2 for
// a usage error. Runs the event loop of the QCoreApplication that must exist.
int runSyncCommand(RZSyncManager& manager, const QStringList& arguments, QTextStream& out, QTextStream& err);
