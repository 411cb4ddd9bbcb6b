#include "WTStoreWriterLock.h"

#include <QDeadlineTimer>
#include <QFile>
#include <QThread>

#include <cerrno>
#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

WTStoreWriterLock::WTStoreWriterLock(const QString& storePath) : path_(storePath + QStringLiteral(".lock")) {}

WTStoreWriterLock::~WTStoreWriterLock() {
  unlock();
}

bool WTStoreWriterLock::tryLock() {
  if (fd_ >= 0) return true;
  const int fd = ::open(QFile::encodeName(path_).constData(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
  if (fd < 0) return false;
  int result;
  do {
    result = ::flock(fd, LOCK_EX | LOCK_NB);
  } while (result != 0 && errno == EINTR);
  if (result != 0) {
    ::close(fd);
    return false;
  }
  fd_ = fd;
  return true;
}

bool WTStoreWriterLock::lock(int timeoutMs) {
  const QDeadlineTimer deadline(timeoutMs);
  // Holders keep it for milliseconds (a command) or for good (a desktop copy): polling finds the first
  // soon enough and gives up on the second, where a blocking wait could not be bounded.
  while (!tryLock()) {
    if (deadline.hasExpired()) return false;
    QThread::msleep(5);
  }
  return true;
}

void WTStoreWriterLock::unlock() {
  if (fd_ < 0) return;
  ::close(fd_);  // closing the last descriptor releases the lock
  fd_ = -1;
}
