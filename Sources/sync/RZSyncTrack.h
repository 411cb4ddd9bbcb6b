#pragma once

#include "Result.h"
#include "WTChangeJournal.h"

#include <QHash>
#include <QMap>
#include <QSet>
#include <QString>
#include <QStringList>
#include <QVariant>

#include <memory>
#include <optional>

class WTObjectContext;

// The change journal: which records were inserted ("i"), updated ("u") or deleted ("x") here since the
// server last confirmed a save, with their values in JSON form, keyed by uuid; and the server iteration
// this client has caught up with. Its rows live in the store file (WTStore::JournalWriter): a save writes
// the rows of the records it reports in its own transaction, and every other change (a confirmed save, a
// merge, the iteration) is written as the rows it touches, never the whole journal.
//
// Values go in through transformedValue: dates as whole seconds since 1970, records as their uuid,
// ordered relationships as arrays of uuids, unordered relationships not at all, a cleared value as
// null, colours as "#AARRGGBB" text, decimals exactly.
class RZSyncTrack final : public WTChangeJournal {
 public:
  enum class Section { Inserted, Updated };  // "i" and "u"
  // uuid -> key -> JSON value. Unordered: an import journals a hundred thousand records one by one.
  using Entries = QHash<QString, QVariantMap>;

  // How much of the store's journal is held in memory: all of it (the sync manager's, which sends and
  // merges it), or only the entries of the records a save reports, read as they are reported (a
  // command's: saving a few records never reads the rest). Everything that reads the journal as a whole
  // (dictionary, entries, hasChanges) answers for what is held.
  enum class Loading { Whole, OnDemand };

  // An empty journal at iteration 0, in memory only (written wherever a save it is attached to goes).
  RZSyncTrack() = default;
  // The journal rows of `store` (not owned; it must outlive this). Rows that cannot be read are logged
  // and the journal starts empty; they stay in the file.
  RZSyncTrack(WTStore* store, Loading loading);

  // Where an older version kept the journal, a file of its own: "Tessal.sync" beside "Tessal.sqlite".
  static QString legacyFilePath(const QString& storePath);
  // What such a file's text holds ({"iteration", "track"}); none, with the reason in `problem`, when the
  // text is not a journal.
  struct FileContents {
    qint64 iteration = 0;
    Entries inserted, updated;
    QStringList deleted;  // each once
  };
  static std::optional<FileContents> fromJSON(QByteArrayView text, QString* problem = nullptr);
  // Opens the store for writing (see WTStore::open). The opening that brings an older file up to date
  // reads the journal file beside it into the store's journal in the same transaction (a file that
  // cannot be read as a journal is logged, "Can not parse json - %@", and kept aside as ".corrupt", a
  // number added when that name is taken, and nothing is imported), then renames it to ".migrated"
  // (numbered the same way): nothing in it is ever lost. A journal file beside a store that is up to date
  // already is ignored, and logged.
  static Result<std::unique_ptr<WTStore>> openStore(
      const QString& path, const char* vfs = nullptr, WTStore::Check check = WTStore::Check::WholeFile,
      WTStore::LogOnClose logOnClose = WTStore::LogOnClose::Fold);

  // Writes what changed since the last write, in a transaction of its own. On failure the journal is
  // read back from the rows it changed, which are as they were.
  Result<void> write();
  // Journals every record of `context` (every record loaded) as updated with all its stored values,
  // forgets every other pending change, sets the iteration to 0 and writes it all at once: for a store
  // that has been replaced as a whole, so that the server hears of all of it again.
  Result<void> journalEveryRecord(WTObjectContext& context);
  // While off, saves report nothing to this journal but still write its changed rows: the merge saves
  // the server's changes, which are not local ones, together with what it changed in the journal.
  void setRecordsSaves(bool records) { recordsSaves_ = records; }

  // Forgets every change; keeps the iteration.
  void resetChanges();

  // One attribute value in its JSON form (a null QVariant for a cleared value, JSON null); none for
  // values that are not journaled (unordered relationships).
  static std::optional<QVariant> transformedValue(const QVariant& value);

  // Merges transformed values into the entry of `uuid` in `section` (made if missing, even when every
  // value is dropped); a later value of a key replaces the earlier one. The uuid is no longer deleted.
  void updateValues(const QVariantMap& values, const QString& uuid, Section section);
  // Into "i" while "i" holds the uuid (an insertion changed before it was sent stays an insertion),
  // else into "u".
  void updateValues(const QVariantMap& values, const QString& uuid) override;
  // Logs "INSERT(%@) %@" and merges into "i".
  void insertValues(const QVariantMap& values, const QString& uuid) override;
  // A journal read on demand writes the entry at once, as insertValues would have it written; one held
  // whole keeps it in memory as insertValues does.
  Result<void> insertNew(const WTObject& record, WTStore::JournalWriter& writer) override;
  // Logs "DELETE(%@)" and adds the uuid to "x" (once); an empty uuid is ignored. Entries under "i" and
  // "u" stay: the server receives both.
  void deleteObjectWithId(const QString& uuid) override;
  // The deletions the server confirmed while this journal was in memory: the server keeps a deletion for
  // good and drops everything sent later under the identity.
  bool isRetired(const QString& uuid) const override { return recordsSaves_ && retired_.contains(uuid); }
  bool recordsSaves() const override { return recordsSaves_; }
  Result<void> writeChanges(WTStore::JournalWriter& writer) override;
  void saveEnded(bool written) override;

  bool hasChanges() const { return !inserted_.isEmpty() || !updated_.isEmpty() || !deleted_.isEmpty(); }
  qint64 iteration() const { return iteration_; }
  void setIteration(qint64 iteration) {
    iterationChanged_ = iterationChanged_ || iteration != iteration_;
    iteration_ = iteration;
  }

  // The change dictionary {"i": {uuid: values}, "u": {uuid: values}, "x": [uuid]} as a JSON value: the
  // "data" of a save. A copy; change the journal through the operations here. With `records`, the
  // changes of at most that many records (a record's entries and deletion go together); `complete` says
  // whether that is all of them.
  QVariantMap dictionary() const;
  QVariantMap dictionary(qsizetype records, bool* complete) const;

  // Direct access to the sections, for the merge.
  const Entries& entries(Section section) const {
    return section == Section::Inserted ? inserted_ : updated_;
  }
  // The pending values of `uuid` in `section`; empty when none.
  QVariantMap entry(Section section, const QString& uuid) const { return entries(section).value(uuid); }
  // Replaces the entry; an empty map removes the uuid from the section.
  void setEntry(Section section, const QString& uuid, const QVariantMap& values);
  const QStringList& deletedIds() const { return deleted_; }
  bool isPendingDeletion(const QString& uuid) const { return deletionOrder_.contains(uuid); }
  // Drops every pending change of `uuid`: its entries under "i" and "u" and its place in "x".
  void forget(const QString& uuid);

  // Forgets what a confirmed save sent (`sent` is the dictionary() of that request): each value that is
  // still the same as sent, and each deletion sent, whose identity is retired from then on. Values changed
  // since stay pending; what remains of a confirmed insertion moves to "u", since the server now has the
  // record.
  void removeSentChanges(const QVariantMap& sent);

 private:
  // What the rows of a changed record held before it changed.
  struct Stored {
    bool inserted = false, updated = false;
    qint64 deletion = -1;
  };

  Entries& entriesFor(Section section) { return section == Section::Inserted ? inserted_ : updated_; }
  // Reads the rows of `uuid` into memory, once, when they are read on demand.
  void fetch(const QString& uuid);
  // Before `uuid` changes: its rows are held and it is written with the next write.
  void touch(const QString& uuid);
  void addDeletion(const QString& uuid);
  void removeDeletion(const QString& uuid);
  void take(const QString& uuid, const WTStore::JournalRecord& record);
  void readWhole();
  // Reads a journal file; false when it cannot be read as one (then this is unchanged).
  bool readFile(const QString& path, QString* problem);

  qint64 iteration_ = 0;
  Entries inserted_;
  Entries updated_;
  QStringList deleted_;                   // in order
  QHash<QString, qint64> deletionOrder_;  // each pending deletion's place in its rows
  qint64 lastDeletion_ = 0;               // -1: not read yet
  QSet<QString> retired_;

  WTStore* store_ = nullptr;
  bool onDemand_ = false;
  bool nothingStored_ = false;  // on demand: the rows held nothing when read
  bool recordsSaves_ = true;
  QSet<QString> fetched_;
  // Changed since the last write.
  QHash<QString, Stored> changed_;
  // Written already in the save under way (a large save writes its rows as the records are reported).
  QHash<QString, Stored> flushed_;
  bool cleared_ = false;
  bool wroteNew_ = false;      // insertNew wrote rows in the save under way
  bool clearWritten_ = false;  // the rows were emptied in the save under way
  bool iterationChanged_ = false;
};
