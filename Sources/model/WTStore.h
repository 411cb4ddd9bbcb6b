#pragma once

#include "Result.h"
#include "WTStoreRecord.h"

#include <QString>
#include <QStringList>

#include <functional>
#include <future>
#include <memory>
#include <vector>

struct sqlite3;
struct sqlite3_stmt;

// The one store file: every record in one SQLite table, written in WAL mode with full syncing, one
// transaction per save. The sync's journal of unsent changes lives in the same file (see JournalWriter),
// so that a save and the journal entries of what it changed are written in that one transaction. The schema
// version lives in PRAGMA user_version; a file written by an older version is migrated in order when opened.
// A file that is not a store, is damaged or was written by a newer version is refused without being changed
// in any way.
class WTStore {
 public:
  static constexpr int kSchemaVersion = 6;
  // The oldest version a reader that may not migrate still reads: versions 2 and 3 only added indexes,
  // and the columns version 4 added read as none from an older file.
  static constexpr int kOldestReadableVersion = 1;

  enum ErrorCode {
    OpenFailed = 1,
    NotAStore = 2,
    NewerVersion = 3,
    MigrationFailed = 4,
    ReadFailed = 5,
    WriteFailed = 6,
    Damaged = 7
  };

  // How much of an existing file is checked for damage, and when. Damage anywhere would otherwise only
  // show in a failed save, after the file had been changed. WholeFile checks all of it before the file
  // is accepted. WholeFileBeforeSaving (the desktop copy) checks all of it on a thread of its own while
  // the records load, and the first save waits for the verdict: a damaged file is refused before
  // anything is written, and the window does not wait for the check. A command that reads or changes a
  // few records, and reports a failed save at once, checks the header.
  enum class Check { WholeFile, WholeFileBeforeSaving, Header };
  // What closing does with the write-ahead log. A process that saves once and ends (a command) keeps a
  // short log as it is instead of folding it into the file, which costs two more waits for the disk on
  // every command. The log is as durable as the file. A log kept is read whole by the next process that
  // opens the file, so once it has grown past kLogFramesKeptOnClose pages the close folds it in after
  // all. Folding in costs that command two more waits for the disk and the next save a fresh log, and a
  // kept page costs every opening about two microseconds: a megabyte (some twenty starts or stops)
  // balances the two.
  enum class LogOnClose { Fold, KeepWhileShort };
  static constexpr int kLogFramesKeptOnClose = 256;

  // The journal's rows, which the store keeps without knowing what they mean: per record its pending
  // changes as the text of a JSON object, in section 'i' (inserted) or 'u' (updated); the pending
  // deletions in the order they were made; and the server iteration. Written only inside a transaction:
  // a save's (saveFrom), or writeJournal's.
  class JournalWriter {
   public:
    // Sets the changes of `uuid` in `section`; a null text removes them.
    Result<void> setEntry(const QString& uuid, char section, const QByteArray& changes);
    // Puts the deletion of `uuid` at place `order` (older deletions have smaller ones); a negative order
    // removes it.
    Result<void> setDeletion(const QString& uuid, qint64 order);
    Result<void> setIteration(qint64 iteration);
    // Removes every entry and deletion; the iteration stays.
    Result<void> clear();

   private:
    friend class WTStore;
    explicit JournalWriter(WTStore& store) : store_(store) {}
    Result<void> step(int statement, const QString& uuid, char section, const QByteArray& text,
                      qint64 number);
    WTStore& store_;
  };
  using JournalStep = std::function<Result<void>(JournalWriter&)>;

  // Reads a journal an older version kept in a file of its own into the journal rows, inside the
  // transaction that brings the file to the version that holds them; called only then. An error leaves
  // the file as it was (the opening fails).
  using JournalImport = JournalStep;

  // Opens the store at `path`, creating the file (not its folder) when missing. The error's message
  // names the file and says what is wrong, ready to show to the user. `vfs` names the SQLite VFS to
  // use; none for the default (tests pass one that injects faults).
  static Result<std::unique_ptr<WTStore>> open(const QString& path, const char* vfs = nullptr,
                                               Check check = Check::WholeFile,
                                               const JournalImport& import = {},
                                               LogOnClose logOnClose = LogOnClose::Fold);
  // Opens an existing store for reading only, beside a process that may be writing it: nothing is
  // created, migrated or changed, and save() fails. A file that holds no records yet reads as empty; one
  // written by a version older than kOldestReadableVersion is refused (the application updates it).
  static Result<std::unique_ptr<WTStore>> openReadOnly(const QString& path, Check check = Check::WholeFile);
  ~WTStore();

  WTStore(const WTStore&) = delete;
  WTStore& operator=(const WTStore&) = delete;

  QString path() const { return path_; }

  enum class Records {
    All,
    // The clients, projects and tasks, and of the items only the running time entries: all that starting
    // and stopping timers needs, read in a fraction of the time a large store takes to read whole.
    Timers,
    // The clients, projects and tasks, and the items of the tasks named in the load (none when it names
    // none): what a report or an export of some projects needs.
    ItemsOfTasks,
    // The running time entries and the tasks whose name is one the load gives (compared as
    // WTObject::sameName compares), each task with its project and client and with every other task of
    // that project, so that a project read holds all its tasks in their order. Starting, stopping and the
    // status of timers need no more when the name finds its task; the other owners are never read.
    RunningAndNamed
  };

  // Reads every record (or those `which` names), handing each to `sink` in no particular order. The sink
  // may move out of the record it is given.
  // `keys` are the uuids of the tasks whose items Records::ItemsOfTasks reads, or the task names
  // Records::RunningAndNamed looks for; other loads ignore them.
  Result<void> loadAll(const std::function<void(WTStoreRecord&&)>& sink, Records which = Records::All,
                       const QStringList& keys = {});

  // Writes the given records (inserted or replaced whole) and removes the deleted ones, all in one
  // transaction: after a failure nothing of this save is in the file and the store stays usable.
  Result<void> save(const std::vector<WTStoreRecord>& records, const QStringList& deletedUuids);
  // The same, with the records handed out one at a time (none: no more), each valid until the next is
  // asked for: a save of many records never holds all their rows at once.
  using RecordSource = std::function<const WTStoreRecord*()>;
  // `journal`, when given, writes the journal rows of this save after its records, in its transaction: an
  // error there undoes the whole save.
  Result<void> saveFrom(const RecordSource& records, const QStringList& deletedUuids,
                        const JournalStep& journal = {});

  // Changes the journal rows alone, in a transaction of their own.
  Result<void> writeJournal(const JournalStep& step);
  // The journal rows of one record: its sections' texts (null when absent) and the place of its pending
  // deletion (-1: none).
  struct JournalRecord {
    QByteArray inserted, updated;
    qint64 deletion = -1;
  };
  Result<JournalRecord> journalRecord(const QString& uuid);
  // Every journal row: each entry to `entry`, the deletions in order to `deletion`, and the iteration.
  Result<void> readJournal(
      const std::function<void(const QString& uuid, char section, const QByteArray& changes)>& entry,
      const std::function<void(const QString& uuid, qint64 order)>& deletion, qint64* iteration);
  // The largest place a pending deletion holds; 0 when there is none.
  Result<qint64> lastJournalDeletion();
  // Whether the journal holds no entry and no deletion (as after a sync).
  Result<bool> journalIsEmpty();

 private:
  WTStore(QString path, sqlite3* db);
  static Result<std::unique_ptr<WTStore>> open(const QString& path, const char* vfs, bool readOnly,
                                               Check check, const JournalImport& import,
                                               LogOnClose logOnClose);
  void keepLogWhileShort();
  // Maps the file for a read of many pages.
  void readInPlace();
  // The journal's statements, prepared on first use: a command that never saves never needs them.
  enum JournalStatement {
    SetEntry,
    RemoveEntry,
    SetDeletion,
    RemoveDeletion,
    SetIteration,
    ClearEntries,
    ClearDeletions,
    ReadRecord,
    ReadEntries,
    ReadDeletions,
    ReadIteration,
    LastDeletion,
    IsEmpty,
    kJournalStatements
  };
  sqlite3_stmt* journalStatement(int which, int* code);
  sqlite3_stmt* loadStatement(int which, int* code);
  Result<void> loadRunningAndNamed(const std::function<void(WTStoreRecord&&)>& sink,
                                   const QStringList& names);
  // The one number a journal statement answers.
  Result<qint64> journalNumber(int which);
  Error readError(int code) const;
  Result<void> prepareStatements(bool writing);
  Error writeError(int code) const;
  Error namelessError() const;

  QString path_;
  sqlite3* db_ = nullptr;
  // The whole-file check running beside the loading (true: damage found); consumed by the first save.
  std::future<bool> damageCheck_;
  bool damaged_ = false;
  sqlite3_stmt* begin_ = nullptr;
  sqlite3_stmt* commit_ = nullptr;
  sqlite3_stmt* rollback_ = nullptr;
  sqlite3_stmt* replace_ = nullptr;
  sqlite3_stmt* remove_ = nullptr;
  // The loads' statements (WTStoreLoads.cpp), prepared on first use.
  static constexpr int kLoadStatements = 6;
  sqlite3_stmt* load_[kLoadStatements] = {};
  bool shaped_ = false;  // the file has the tables this version reads: the statements were prepared
  sqlite3_stmt* journal_[kJournalStatements] = {};
};
