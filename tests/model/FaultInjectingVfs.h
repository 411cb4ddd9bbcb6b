#pragma once

// A SQLite VFS that passes everything to the default VFS and, once armed, fails the N-th write or sync
// of any file (database, log or journal) with an I/O error, in the manner of SQLite's own fault tests.
namespace FaultInjectingVfs {

enum class Operation { Write, Sync };

// Registers the VFS (once; not as the default) and returns its name for sqlite3_open_v2 / WTStore::open.
const char* name();

// From now on counts the operations of `kind`; the `n`-th fails (n >= 1), and with `persistent` every
// later one too, until disarm(). Counting starts at zero on every call.
void arm(Operation kind, int n, bool persistent = false);
void disarm();

// Whether an armed fault has been injected since the last arm().
bool fired();

}  // namespace FaultInjectingVfs
