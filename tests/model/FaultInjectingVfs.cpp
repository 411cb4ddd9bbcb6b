#include "FaultInjectingVfs.h"

#include <sqlite3.h>

#include <cstring>

namespace FaultInjectingVfs {
namespace {

struct State {
  bool armed = false;
  Operation kind = Operation::Write;
  int remaining = 0;  // operations of `kind` until the one that fails
  bool persistent = false;
  bool fired = false;
};
State state;

sqlite3_vfs* base = nullptr;
sqlite3_vfs vfs;

// Our file: the base VFS's file follows it in the same allocation.
struct File {
  sqlite3_file handle;
  sqlite3_file* real;
};

sqlite3_file* real(sqlite3_file* file) {
  return reinterpret_cast<File*>(file)->real;
}

bool shouldFail(Operation kind) {
  if (!state.armed || state.kind != kind) return false;
  if (state.fired && state.persistent) return true;
  if (state.fired || --state.remaining > 0) return false;
  state.fired = true;
  return true;
}

int xClose(sqlite3_file* f) {
  return real(f)->pMethods->xClose(real(f));
}
int xRead(sqlite3_file* f, void* buffer, int amount, sqlite3_int64 offset) {
  return real(f)->pMethods->xRead(real(f), buffer, amount, offset);
}
int xWrite(sqlite3_file* f, const void* buffer, int amount, sqlite3_int64 offset) {
  if (shouldFail(Operation::Write)) return SQLITE_IOERR_WRITE;
  return real(f)->pMethods->xWrite(real(f), buffer, amount, offset);
}
int xTruncate(sqlite3_file* f, sqlite3_int64 size) {
  return real(f)->pMethods->xTruncate(real(f), size);
}
int xSync(sqlite3_file* f, int flags) {
  if (shouldFail(Operation::Sync)) return SQLITE_IOERR_FSYNC;
  return real(f)->pMethods->xSync(real(f), flags);
}
int xFileSize(sqlite3_file* f, sqlite3_int64* size) {
  return real(f)->pMethods->xFileSize(real(f), size);
}
int xLock(sqlite3_file* f, int level) {
  return real(f)->pMethods->xLock(real(f), level);
}
int xUnlock(sqlite3_file* f, int level) {
  return real(f)->pMethods->xUnlock(real(f), level);
}
int xCheckReservedLock(sqlite3_file* f, int* out) {
  return real(f)->pMethods->xCheckReservedLock(real(f), out);
}
int xFileControl(sqlite3_file* f, int op, void* arg) {
  return real(f)->pMethods->xFileControl(real(f), op, arg);
}
int xSectorSize(sqlite3_file* f) {
  return real(f)->pMethods->xSectorSize(real(f));
}
int xDeviceCharacteristics(sqlite3_file* f) {
  return real(f)->pMethods->xDeviceCharacteristics(real(f));
}
int xShmMap(sqlite3_file* f, int region, int size, int extend, void volatile** out) {
  return real(f)->pMethods->xShmMap(real(f), region, size, extend, out);
}
int xShmLock(sqlite3_file* f, int offset, int n, int flags) {
  return real(f)->pMethods->xShmLock(real(f), offset, n, flags);
}
void xShmBarrier(sqlite3_file* f) {
  real(f)->pMethods->xShmBarrier(real(f));
}
int xShmUnmap(sqlite3_file* f, int deleteFlag) {
  return real(f)->pMethods->xShmUnmap(real(f), deleteFlag);
}
int xFetch(sqlite3_file* f, sqlite3_int64 offset, int amount, void** out) {
  return real(f)->pMethods->xFetch(real(f), offset, amount, out);
}
int xUnfetch(sqlite3_file* f, sqlite3_int64 offset, void* pointer) {
  return real(f)->pMethods->xUnfetch(real(f), offset, pointer);
}

// Version 3 methods; the unix VFS's files all offer shared memory and memory mapping.
const sqlite3_io_methods kMethods = {
    3,
    xClose,
    xRead,
    xWrite,
    xTruncate,
    xSync,
    xFileSize,
    xLock,
    xUnlock,
    xCheckReservedLock,
    xFileControl,
    xSectorSize,
    xDeviceCharacteristics,
    xShmMap,
    xShmLock,
    xShmBarrier,
    xShmUnmap,
    xFetch,
    xUnfetch,
};

int xOpen(sqlite3_vfs*, sqlite3_filename name, sqlite3_file* file, int flags, int* outFlags) {
  auto* ours = reinterpret_cast<File*>(file);
  ours->real = reinterpret_cast<sqlite3_file*>(ours + 1);
  ours->real->pMethods = nullptr;
  const int code = base->xOpen(base, name, ours->real, flags, outFlags);
  if (code != SQLITE_OK || !ours->real->pMethods) {
    if (ours->real->pMethods) ours->real->pMethods->xClose(ours->real);
    file->pMethods = nullptr;
    return code == SQLITE_OK ? SQLITE_CANTOPEN : code;
  }
  if (ours->real->pMethods->iVersion < 3) {
    ours->real->pMethods->xClose(ours->real);
    file->pMethods = nullptr;
    return SQLITE_CANTOPEN;
  }
  file->pMethods = &kMethods;
  return SQLITE_OK;
}

int xDelete(sqlite3_vfs*, const char* name, int syncDir) {
  return base->xDelete(base, name, syncDir);
}
int xAccess(sqlite3_vfs*, const char* name, int flags, int* out) {
  return base->xAccess(base, name, flags, out);
}
int xFullPathname(sqlite3_vfs*, const char* name, int size, char* out) {
  return base->xFullPathname(base, name, size, out);
}
void* xDlOpen(sqlite3_vfs*, const char* name) {
  return base->xDlOpen(base, name);
}
void xDlError(sqlite3_vfs*, int size, char* out) {
  base->xDlError(base, size, out);
}
void (*xDlSym(sqlite3_vfs*, void* handle, const char* symbol))(void) {
  return base->xDlSym(base, handle, symbol);
}
void xDlClose(sqlite3_vfs*, void* handle) {
  base->xDlClose(base, handle);
}
int xRandomness(sqlite3_vfs*, int size, char* out) {
  return base->xRandomness(base, size, out);
}
int xSleep(sqlite3_vfs*, int microseconds) {
  return base->xSleep(base, microseconds);
}
int xCurrentTime(sqlite3_vfs*, double* out) {
  return base->xCurrentTime(base, out);
}
int xGetLastError(sqlite3_vfs*, int size, char* out) {
  return base->xGetLastError(base, size, out);
}
int xCurrentTimeInt64(sqlite3_vfs*, sqlite3_int64* out) {
  return base->xCurrentTimeInt64(base, out);
}

}  // namespace

const char* name() {
  static const bool registered = [] {
    base = sqlite3_vfs_find(nullptr);
    std::memset(&vfs, 0, sizeof vfs);
    vfs.iVersion = 2;
    vfs.szOsFile = int(sizeof(File)) + base->szOsFile;
    vfs.mxPathname = base->mxPathname;
    vfs.zName = "tessal-faults";
    vfs.xOpen = xOpen;
    vfs.xDelete = xDelete;
    vfs.xAccess = xAccess;
    vfs.xFullPathname = xFullPathname;
    vfs.xDlOpen = xDlOpen;
    vfs.xDlError = xDlError;
    vfs.xDlSym = xDlSym;
    vfs.xDlClose = xDlClose;
    vfs.xRandomness = xRandomness;
    vfs.xSleep = xSleep;
    vfs.xCurrentTime = xCurrentTime;
    vfs.xGetLastError = xGetLastError;
    vfs.xCurrentTimeInt64 = xCurrentTimeInt64;
    return sqlite3_vfs_register(&vfs, 0) == SQLITE_OK;
  }();
  return registered ? vfs.zName : nullptr;
}

void arm(Operation kind, int n, bool persistent) {
  state = {true, kind, n, persistent, false};
}

void disarm() {
  state = {};
}

bool fired() {
  return state.fired;
}

}  // namespace FaultInjectingVfs
