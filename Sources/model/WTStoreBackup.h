#pragma once

#include "Result.h"

#include <QDate>
#include <QDateTime>
#include <QString>

#include <functional>
#include <future>

struct sqlite3;

// Copies of the store file, kept in "Backups" beside it. A copy is made with SQLite's online backup, so
// it is consistent even while another connection writes, and it is one self-contained file (no log
// beside it), readable by the owner only. Copies are named by when they were made:
//   Tessal-YYYY-MM-DD.sqlite                     the day's copy the desktop copy makes (the newest 7 kept)
//   Tessal-YYYY-MM-DD-HHMMSS.sqlite              `tessal backup`
//   Tessal-YYYY-MM-DD-HHMMSS-version-N.sqlite    the file as version N wrote it, before it was migrated
// Only the daily copies are removed again; the others stay until the user removes them.
namespace WTStoreBackup {

constexpr int kDailyCopiesKept = 7;

// "Backups" in the store's folder; not created.
QString folder(const QString& storePath);
// A new copy's path in folder(storePath), named for `now` (and, before a migration, the old version).
QString manualPath(const QString& storePath, const QDateTime& now);
QString dailyPath(const QString& storePath, const QDate& day);
QString beforeMigrationPath(const QString& storePath, const QDateTime& now, int version);
// `path`, or when that is taken the first free one of its name with "-2", "-3", ... before ".sqlite".
QString unusedPath(const QString& path);

// Copies what is committed in the store at `storePath` (its log included) to `target`, whose folder is
// made when missing. `target` appears whole or not at all; an existing one is refused and left alone.
Result<void> copy(const QString& storePath, const QString& target);
// The same from a connection already open on the store (before a migration changes the file).
Result<void> copy(sqlite3* db, const QString& target);

// Whether `path` holds a whole store this version can open: a Tessal store, of a version not newer than
// this program's, and PRAGMA integrity_check says ok. The error says what is wrong, naming the file.
Result<void> check(const QString& path);

// Removes the daily copies beyond the newest `keep` from `folder`.
void prune(const QString& folder, int keep = kDailyCopiesKept);

// The newest copy in folder(storePath) that passes check(); empty when there is none.
QString newestGoodCopy(const QString& storePath);

// Puts the copy at `backup` in place of the store at `storePath`, after checking it: nothing changes
// when the check fails. The store's files (the log too) are renamed, never deleted, to a name with
// ".replaced-" and the time; that name is returned (empty when there was no store). `mayReplace`, asked
// once the copy has passed, may still refuse with its reason. The caller makes sure nobody has the store
// open.
Result<QString> restore(const QString& backup, const QString& storePath,
                        const std::function<Result<void>()>& mayReplace = {});

// The day's copy, made once a day after the first save, on a thread of its own with its own connection:
// the saving thread never waits for it. Failures are logged (tessal.store) and tried again on a later
// save. Waits for a copy in progress when it goes.
class Daily {
 public:
  explicit Daily(QString storePath) : storePath_(std::move(storePath)) {}
  ~Daily();
  Daily(const Daily&) = delete;
  Daily& operator=(const Daily&) = delete;

  // Called after each save: starts the day's copy unless it is there (or being made).
  void storeDidSave(const QDate& today = QDate::currentDate());
  // Waits for a copy in progress; for tests and for going away.
  void wait();

 private:
  QString storePath_;
  QDate done_;
  std::future<bool> running_;
};

}  // namespace WTStoreBackup
