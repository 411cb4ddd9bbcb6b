#include "WTBackupCommand.h"

#include "UserDefaults.h"
#include "WTCommandArguments.h"
#include "WTSingleInstanceClient.h"
#include "WTStore.h"
#include "WTStoreBackup.h"
#include "WTStoreSetup.h"
#include "WTStoreSnapshot.h"
#include "WTStoreWriterLock.h"
#include "WTTask.h"
#include "WTTime.h"

#include <QDateTime>
#include <QDir>
#include <QFileInfo>

using WTCommandArguments::failure;

namespace {

// A command holds the writer lock for milliseconds; the desktop copy for good (and is asked first).
constexpr int kWriterWaitMs = 10000;

QString positional(const QStringList& arguments, bool required, QString* problem) {
  if (arguments.size() > 1)
    *problem = QStringLiteral("unexpected argument '%1'").arg(arguments[1]);
  else if (required && arguments.isEmpty())
    *problem = QStringLiteral("name the backup file to restore");
  else if (!arguments.isEmpty() && arguments[0].startsWith(u'-'))
    *problem = QStringLiteral("unknown option '%1'").arg(arguments[0]);
  return arguments.value(0);
}

// The tasks whose timers run in the store at `path`, by their labels; none where it cannot be read (a
// damaged store is what a restore is for).
QStringList runningTasks(const QString& path) {
  if (!QFileInfo::exists(path)) return {};
  auto defaults = std::make_unique<UserDefaults>();
  WTStoreSetup::registerDefaults(*defaults);
  const Result<std::unique_ptr<WTStoreSnapshot>> snapshot =
      WTStoreSnapshot::open(path, std::move(defaults), WTStore::Records::Timers);
  if (!snapshot) return {};
  QStringList labels;
  for (const WTTime* time : snapshot.value()->context().fetch<WTTime>(
           [](const WTTime* time) { return time->running() && time->task(); }))
    labels << WTNamedRecords::label(*time->task());
  labels.sort();
  labels.removeDuplicates();
  return labels;
}

}  // namespace

int runBackupCommand(const QStringList& arguments, QTextStream& out, QTextStream& err) {
  QString problem;
  const QString file = positional(arguments, false, &problem);
  if (!problem.isEmpty()) return WTCommandArguments::usage(err, "usage: tessal backup [FILE]\n", problem);
  const QString store = WTStoreSetup::storePath();
  // A folder takes the copy under the name the backups folder would give it.
  const QString named = WTStoreBackup::manualPath(store, QDateTime::currentDateTime());
  const QString target =
      file.isEmpty() ? WTStoreBackup::unusedPath(named)
      : QFileInfo(file).isDir()
          ? WTStoreBackup::unusedPath(QDir(file).absoluteFilePath(QFileInfo(named).fileName()))
          : QFileInfo(file).absoluteFilePath();
  if (const Result<void> copied = WTStoreBackup::copy(store, target); !copied)
    return failure(err, copied.error().message);
  out << target << '\n';
  out.flush();
  return 0;
}

int runRestoreCommand(const QStringList& arguments, QTextStream& out, QTextStream& err) {
  QString problem;
  const QString file = positional(arguments, true, &problem);
  if (!problem.isEmpty()) return WTCommandArguments::usage(err, "usage: tessal restore FILE\n", problem);
  // Nothing, not even the data folder, is made for a copy that is not there.
  if (!QFileInfo(file).isFile())
    return failure(err,
                   QStringLiteral("There is no data file at “%1”.").arg(QFileInfo(file).absoluteFilePath()));
  // The desktop copy keeps the store open and would go on saving into the replaced file.
  if (WTSingleInstanceClient().notifyRunningInstance(2000, false))
    return failure(err,
                   QStringLiteral("Tessal is running; quit it to restore a backup. Nothing was changed."));
  const QString store = WTStoreSetup::storePath();
  QDir().mkpath(QFileInfo(store).path());
  WTStoreWriterLock lock(store);
  if (!lock.lock(kWriterWaitMs))
    return failure(
        err, QStringLiteral("the data file is busy (%1 is held); nothing was changed").arg(lock.filePath()));
  // A running timer's time would stay behind in the replaced file, and the timer would be gone.
  auto noTimerRuns = [&]() -> Result<void> {
    const QStringList running = runningTasks(store);
    if (running.isEmpty()) return {};
    return Error{WTStore::WriteFailed,
                 QStringLiteral("%1 %2 running: stop the timer first (`tessal stop`), or the time it tracks "
                                "stays in the replaced data file. Nothing was changed.")
                     .arg(running.join(QStringLiteral(", ")),
                          running.size() == 1 ? QStringLiteral("is") : QStringLiteral("are"))};
  };
  UserDefaults defaults;
  WTStoreSetup::registerDefaults(defaults);
  const Result<QString> restored =
      WTStoreSetup::restoreBackup(QFileInfo(file).absoluteFilePath(), defaults, noTimerRuns);
  if (!restored) return failure(err, restored.error().message);
  out << "Restored " << QFileInfo(file).absoluteFilePath() << ".\n";
  if (!restored.value().isEmpty()) out << "The replaced data file is kept as " << restored.value() << ".\n";
  out.flush();
  return 0;
}

QString damagedStoreAdvice(const Error& error) {
  if (error.code != WTStore::Damaged && error.code != WTStore::NotAStore) return {};
  const QString copy = WTStoreBackup::newestGoodCopy(WTStoreSetup::storePath());
  if (copy.isEmpty())
    return QStringLiteral("There is no good backup in %1.")
        .arg(WTStoreBackup::folder(WTStoreSetup::storePath()));
  return QStringLiteral(
             "The newest good backup is %1; `tessal restore '%1'` puts it back (the damaged file is kept).")
      .arg(copy);
}

int storeFailure(QTextStream& err, const Error& error) {
  const QString advice = damagedStoreAdvice(error);
  return failure(
      err, advice.isEmpty() ? error.message : error.message + u'\n' + QStringLiteral("tessal: ") + advice);
}
