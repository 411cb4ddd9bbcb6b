#pragma once

#include "Result.h"

#include <QStringList>
#include <QTextStream>

// Copies of the store from the shell; neither needs a display.
//
//   tessal backup [FILE]
//     Copies the store, as it stands, into FILE (never over an existing file), or into the Backups
//     folder beside the store under a name with the date and time; prints the copy's path. The desktop
//     copy may be running.
//
//   tessal restore FILE
//     Puts a copy back: refused while the desktop copy runs; the copy is checked before anything is
//     replaced; the replaced store stays beside it under a name with ".replaced-" and the time (see
//     WTStoreSetup::restoreBackup).
int runBackupCommand(const QStringList& arguments, QTextStream& out, QTextStream& err);
int runRestoreCommand(const QStringList& arguments, QTextStream& out, QTextStream& err);

// When `error` says the store cannot be opened for damage, what to say besides: the newest good copy
// and the command that puts it back; otherwise nothing.
QString damagedStoreAdvice(const Error& error);
// Says that the store could not be opened, with that advice; gives exit status 1.
int storeFailure(QTextStream& err, const Error& error);
