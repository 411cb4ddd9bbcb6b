#pragma once

#include <QString>

// One writer per store file across processes. The desktop copy holds the lock while it runs; a command
// holds it while it changes the store itself. It is a kernel lock (flock) on a file beside the store, so
// it goes with the process that held it however that process ends, and nothing is ever left to clean up.
class WTStoreWriterLock {
 public:
  // The lock of the store at `storePath`; its file is the store's path with ".lock" added.
  explicit WTStoreWriterLock(const QString& storePath);
  ~WTStoreWriterLock();

  WTStoreWriterLock(const WTStoreWriterLock&) = delete;
  WTStoreWriterLock& operator=(const WTStoreWriterLock&) = delete;

  QString filePath() const { return path_; }

  // Takes the lock when nobody holds it; never waits. False also when the lock file cannot be made (the
  // store's folder is missing or not writable).
  bool tryLock();
  // Takes the lock, waiting up to `timeoutMs` for its holder to let go.
  bool lock(int timeoutMs);
  void unlock();

 private:
  QString path_;
  int fd_ = -1;
};
