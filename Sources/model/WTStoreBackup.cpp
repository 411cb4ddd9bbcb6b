#include "WTStoreBackup.h"

#include "TessalLogging.h"
#include "WTStore.h"

#include <QCoreApplication>
#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QRegularExpression>

#include <sqlite3.h>

#include <chrono>

#include <fcntl.h>
#include <unistd.h>

namespace WTStoreBackup {

namespace {

constexpr int kApplicationId = 0x5473736c;  // "Tssl", as WTStore writes it
constexpr int kBusyTimeoutMs = 2000;

QString tr(const char* text) {
  return QCoreApplication::translate("WTStoreBackup", text);
}

QString reason(sqlite3* db, int code) {
  return QString::fromUtf8(db ? sqlite3_errmsg(db) : sqlite3_errstr(code));
}

// The daily copies sort by name as by day.
const QRegularExpression& dailyName() {
  static const QRegularExpression pattern(QStringLiteral("^Tessal-\\d{4}-\\d{2}-\\d{2}\\.sqlite$"));
  return pattern;
}

void syncFolder(const QString& folder) {
  const int fd = ::open(QFile::encodeName(folder).constData(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (fd < 0) return;
  ::fsync(fd);
  ::close(fd);
}

// Copies every page of the source connection's main database into a new file at `temporary`, then leaves
// it a file of its own: the copy takes the source's log mode along, and a copy in WAL mode would need
// a log beside it to be read.
int copyPages(sqlite3* source, const QString& temporary) {
  // Made here, for the owner alone: SQLite makes its files after the umask, and its rollback journal
  // takes the database file's mode.
  const int fd =
      ::open(QFile::encodeName(temporary).constData(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
  if (fd < 0) return SQLITE_CANTOPEN;
  ::close(fd);
  sqlite3* target = nullptr;
  int code = sqlite3_open_v2(QFile::encodeName(temporary).constData(), &target,
                             SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOMUTEX, nullptr);
  if (code == SQLITE_OK) code = sqlite3_exec(target, "PRAGMA synchronous = FULL", nullptr, nullptr, nullptr);
  if (code == SQLITE_OK) {
    sqlite3_backup* backup = sqlite3_backup_init(target, "main", source, "main");
    if (!backup) {
      code = sqlite3_errcode(target);
    } else {
      // One step: the source is read in one transaction, so the copy is one moment of the store.
      do {
        code = sqlite3_backup_step(backup, -1);
        if (code == SQLITE_BUSY || code == SQLITE_LOCKED) sqlite3_sleep(20);
      } while (code == SQLITE_BUSY || code == SQLITE_LOCKED);
      const int finished = sqlite3_backup_finish(backup);
      code = code == SQLITE_DONE ? finished : code;
    }
  }
  if (code == SQLITE_OK)
    code = sqlite3_exec(target, "PRAGMA journal_mode = DELETE", nullptr, nullptr, nullptr);
  sqlite3_close(target);
  return code;
}

}  // namespace

QString folder(const QString& storePath) {
  return QFileInfo(storePath).absolutePath() + QStringLiteral("/Backups");
}

QString manualPath(const QString& storePath, const QDateTime& now) {
  return folder(storePath) + now.toString(u"'/Tessal-'yyyy-MM-dd-HHmmss'.sqlite'");
}

QString dailyPath(const QString& storePath, const QDate& day) {
  return folder(storePath) + day.toString(u"'/Tessal-'yyyy-MM-dd'.sqlite'");
}

QString beforeMigrationPath(const QString& storePath, const QDateTime& now, int version) {
  return folder(storePath) + now.toString(u"'/Tessal-'yyyy-MM-dd-HHmmss") +
         QStringLiteral("-version-%1.sqlite").arg(version);
}

QString unusedPath(const QString& path) {
  const QString stem = path.endsWith(QLatin1String(".sqlite")) ? path.chopped(7) : path;
  const QString extension = path.mid(stem.size());
  QString free = path;
  for (int n = 2; QFileInfo::exists(free) || QFileInfo(free).isSymLink(); ++n)
    free = stem + QStringLiteral("-%1").arg(n) + extension;
  return free;
}

Result<void> copy(sqlite3* db, const QString& target) {
  const QFileInfo file(target);
  if (file.exists() || file.isSymLink())
    return Error{WTStore::WriteFailed, tr("“%1” exists already; nothing was written.").arg(target)};
  const bool folderIsNew = !QFileInfo::exists(file.absolutePath());
  if (!QDir().mkpath(file.absolutePath()))
    return Error{WTStore::WriteFailed, tr("The folder “%1” could not be made.").arg(file.absolutePath())};
  // The copies are as private as the store.
  if (folderIsNew)
    QFile::setPermissions(file.absolutePath(), QFile::ReadOwner | QFile::WriteOwner | QFile::ExeOwner);
  const QString temporary = target + QStringLiteral(".part");
  QFile::remove(temporary);  // what an interrupted copy left
  const int code = copyPages(db, temporary);
  if (code != SQLITE_OK || !QFile::rename(temporary, target)) {
    QFile::remove(temporary);
    QFile::remove(temporary + QStringLiteral("-journal"));
    return Error{
        WTStore::WriteFailed,
        tr("The data could not be copied to “%1”: %2.").arg(target, QString::fromUtf8(sqlite3_errstr(code)))};
  }
  syncFolder(file.absolutePath());
  return {};
}

Result<void> copy(const QString& storePath, const QString& target) {
  if (!QFileInfo(storePath).isFile())
    return Error{WTStore::OpenFailed, tr("There is no data file at “%1”.").arg(storePath)};
  sqlite3* db = nullptr;
  int code = sqlite3_open_v2(QFile::encodeName(storePath).constData(), &db,
                             SQLITE_OPEN_READONLY | SQLITE_OPEN_NOMUTEX, nullptr);
  Result<void> copied;
  if (code == SQLITE_OK) {
    sqlite3_busy_timeout(db, kBusyTimeoutMs);
    copied = copy(db, target);
  } else {
    copied = Error{WTStore::OpenFailed,
                   tr("The data file “%1” could not be opened: %2.").arg(storePath, reason(db, code))};
  }
  sqlite3_close(db);
  return copied;
}

Result<void> check(const QString& path) {
  if (!QFileInfo(path).isFile())
    return Error{WTStore::OpenFailed, tr("There is no data file at “%1”.").arg(path)};
  sqlite3* db = nullptr;
  int code = sqlite3_open_v2(QFile::encodeName(path).constData(), &db,
                             SQLITE_OPEN_READONLY | SQLITE_OPEN_NOMUTEX, nullptr);
  qint64 applicationId = 0, version = 0;
  QByteArray verdict;
  auto read = [&](const char* sql, auto&& take) {
    sqlite3_stmt* statement = nullptr;
    if (code == SQLITE_OK) code = sqlite3_prepare_v2(db, sql, -1, &statement, nullptr);
    if (code == SQLITE_OK) {
      code = sqlite3_step(statement);
      if (code == SQLITE_ROW) take(statement), code = SQLITE_OK;
    }
    sqlite3_finalize(statement);
  };
  if (code == SQLITE_OK) sqlite3_busy_timeout(db, kBusyTimeoutMs);
  read("PRAGMA application_id", [&](sqlite3_stmt* s) { applicationId = sqlite3_column_int64(s, 0); });
  read("PRAGMA user_version", [&](sqlite3_stmt* s) { version = sqlite3_column_int64(s, 0); });
  const int opened = code;
  if (opened == SQLITE_OK && applicationId == kApplicationId && version >= 1 &&
      version <= WTStore::kSchemaVersion) {
    read("PRAGMA integrity_check(1)",
         [&](sqlite3_stmt* s) { verdict = reinterpret_cast<const char*>(sqlite3_column_text(s, 0)); });
  }
  sqlite3_close(db);
  if ((opened & 0xff) == SQLITE_NOTADB || (opened == SQLITE_OK && applicationId != kApplicationId))
    return Error{WTStore::NotAStore, tr("“%1” is not a Tessal data file.").arg(path)};
  if (opened == SQLITE_OK && version > WTStore::kSchemaVersion)
    return Error{WTStore::NewerVersion, tr("“%1” was written by a newer version of Tessal.").arg(path)};
  if ((opened & 0xff) == SQLITE_CORRUPT || (opened == SQLITE_OK && version < 1) ||
      ((code == SQLITE_OK || (code & 0xff) == SQLITE_CORRUPT) && verdict != "ok"))
    return Error{WTStore::Damaged, tr("“%1” is damaged.").arg(path)};
  if (code != SQLITE_OK)
    return Error{WTStore::OpenFailed,
                 tr("“%1” could not be read: %2.").arg(path, QString::fromUtf8(sqlite3_errstr(code)))};
  return {};
}

void prune(const QString& folderPath, int keep) {
  QStringList daily = QDir(folderPath).entryList(QDir::Files, QDir::Name | QDir::Reversed);
  daily.removeIf([](const QString& name) { return !dailyName().match(name).hasMatch(); });
  for (qsizetype i = keep; i < daily.size(); ++i) {
    if (!QFile::remove(folderPath + u'/' + daily[i]))
      qCWarning(lcStore, "Could not remove the old copy %s", qUtf8Printable(daily[i]));
  }
}

QString newestGoodCopy(const QString& storePath) {
  const QDir dir(folder(storePath));
  // Newest first, whatever made them: by the time each was written.
  const QFileInfoList copies =
      dir.entryInfoList({QStringLiteral("Tessal-*.sqlite")}, QDir::Files, QDir::Time);
  for (const QFileInfo& file : copies)
    if (check(file.absoluteFilePath())) return file.absoluteFilePath();
  return {};
}

Result<QString> restore(const QString& backup, const QString& storePath,
                        const std::function<Result<void>()>& mayReplace) {
  if (const Result<void> checked = check(backup); !checked) return checked.error();
  if (mayReplace) {
    if (const Result<void> allowed = mayReplace(); !allowed) return allowed.error();
  }
  // The copy is made beside the store first: the store is replaced only by a whole file.
  const QString incoming = storePath + QStringLiteral(".restoring");
  QFile::remove(incoming);
  if (const Result<void> copied = copy(backup, incoming); !copied) return copied.error();
  QString aside;
  if (QFileInfo::exists(storePath)) {
    const QString base = storePath + QDateTime::currentDateTime().toString(u"'.replaced-'yyyy-MM-dd-HHmmss");
    aside = base;
    for (int n = 2; QFileInfo::exists(aside); ++n) aside = base + QStringLiteral("-%1").arg(n);
    // The log holds saves the file may not have yet: it goes with the file, under the matching name.
    for (const QString& suffix : {QString(), QStringLiteral("-wal"), QStringLiteral("-shm")}) {
      if (QFileInfo::exists(storePath + suffix) && !QFile::rename(storePath + suffix, aside + suffix)) {
        QFile::remove(incoming);
        return Error{
            WTStore::WriteFailed,
            tr("The data file “%1” could not be moved aside; nothing was restored.").arg(storePath + suffix)};
      }
    }
  }
  if (!QFile::rename(incoming, storePath)) {
    return Error{
        WTStore::WriteFailed,
        tr("The copy could not be put in place of “%1”; the old data file is “%2”.").arg(storePath, aside)};
  }
  syncFolder(QFileInfo(storePath).absolutePath());
  return aside;
}

Daily::~Daily() {
  wait();
}

void Daily::wait() {
  if (running_.valid()) running_.get();
}

void Daily::storeDidSave(const QDate& today) {
  if (running_.valid()) {
    // A copy still being made is not waited for; the next save looks again.
    if (running_.wait_for(std::chrono::seconds(0)) != std::future_status::ready) return;
    if (!running_.get()) done_ = QDate();  // failed: the next save tries again
  }
  if (done_ == today) return;
  done_ = today;
  const QString target = dailyPath(storePath_, today);
  if (QFileInfo::exists(target)) return;
  running_ = std::async(std::launch::async, [store = storePath_, target] {
    const Result<void> copied = copy(store, target);
    if (!copied) {
      qCWarning(lcStore, "The day's copy of the data was not made: %s",
                qUtf8Printable(copied.error().message));
      return false;
    }
    qCDebug(lcStore, "Copied the data to %s", qUtf8Printable(target));
    prune(folder(store));
    return true;
  });
}

}  // namespace WTStoreBackup
