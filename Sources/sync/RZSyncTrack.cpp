#include "RZSyncTrack.h"

#include "Date.h"
#include "KeyPath.h"
#include "RZSyncJSON.h"
#include "TessalLogging.h"
#include "WTObject.h"
#include "WTObjectContext.h"

#include <QDateTime>
#include <QFile>
#include <QFileInfo>
#include <QtDebug>

#include <algorithm>
#include <cmath>
#include <functional>

namespace {

const QString kInserted = QStringLiteral("i");
const QString kUpdated = QStringLiteral("u");
const QString kDeleted = QStringLiteral("x");

// Reads one section ("i" or "u") of a track: uuid -> object of values. False when it has another shape.
bool readEntries(const QVariant& value, RZSyncTrack::Entries& entries) {
  if (!value.isValid()) return true;
  if (value.typeId() != QMetaType::QVariantMap) return false;
  const QVariantMap map = value.toMap();
  for (auto it = map.begin(); it != map.end(); ++it) {
    if (it.value().typeId() != QMetaType::QVariantMap) return false;
    entries.insert(it.key(), it.value().toMap());
  }
  return true;
}

bool readDeleted(const QVariant& value, QStringList& deleted) {
  if (!value.isValid()) return true;
  if (value.typeId() != QMetaType::QVariantList) return false;
  for (const QVariant& element : value.toList()) {
    if (element.typeId() != QMetaType::QString) return false;
    if (!deleted.contains(element.toString())) deleted.append(element.toString());
  }
  return true;
}

QVariantMap entriesVariant(const RZSyncTrack::Entries& entries) {
  QVariantMap map;
  for (auto it = entries.begin(); it != entries.end(); ++it) map.insert(it.key(), it.value());
  return map;
}

constexpr char kInsertedRow = 'i';
constexpr char kUpdatedRow = 'u';

QByteArray entryText(const QVariantMap& values) {
  return RZSyncJSON::write(QVariant(values), RZSyncJSON::Style::Compact);
}

// An entry's values from its row; none (logged) for a row that is not a JSON object.
std::optional<QVariantMap> entryValues(const QString& uuid, const QByteArray& text) {
  QString problem;
  const std::optional<QVariant> parsed = RZSyncJSON::parse(text, &problem);
  if (parsed && parsed->typeId() == QMetaType::QVariantMap) return parsed->toMap();
  qCWarning(lcSync).noquote()
      << QStringLiteral("The journal entry of %1 cannot be read: %2").arg(uuid, problem);
  return std::nullopt;
}

// `path` + `suffix`, or with a number added when that name is taken.
QString freeName(const QString& path, const QString& suffix) {
  QString name = path + suffix;
  for (int n = 2; QFileInfo::exists(name); ++n) name = path + suffix + QStringLiteral(".%1").arg(n);
  return name;
}

}  // namespace

RZSyncTrack::RZSyncTrack(WTStore* store, Loading loading)
    : lastDeletion_(-1), store_(store), onDemand_(loading == Loading::OnDemand) {
  if (!onDemand_) {
    readWhole();
    return;
  }
  // Nothing pending (as after a sync): no record's rows need reading.
  const Result<bool> empty = store_ ? store_->journalIsEmpty() : Result<bool>(true);
  nothingStored_ = empty && empty.value();
  if (nothingStored_) lastDeletion_ = 0;
}

void RZSyncTrack::readWhole() {
  inserted_.clear();
  updated_.clear();
  deleted_.clear();
  deletionOrder_.clear();
  iteration_ = 0;
  lastDeletion_ = 0;
  if (!store_) return;
  const Result<void> read = store_->readJournal(
      [&](const QString& uuid, char section, const QByteArray& changes) {
        if (std::optional<QVariantMap> values = entryValues(uuid, changes))
          (section == kInsertedRow ? inserted_ : updated_).insert(uuid, std::move(*values));
      },
      [&](const QString& uuid, qint64 order) {
        deleted_.append(uuid);
        deletionOrder_.insert(uuid, order);
        lastDeletion_ = std::max(lastDeletion_, order);
      },
      &iteration_);
  if (!read) qCWarning(lcSync).noquote() << read.error().message;
}

void RZSyncTrack::take(const QString& uuid, const WTStore::JournalRecord& record) {
  for (const auto& [section, text] :
       {std::pair{Section::Inserted, &record.inserted}, std::pair{Section::Updated, &record.updated}}) {
    if (text->isNull()) continue;
    if (std::optional<QVariantMap> values = entryValues(uuid, *text))
      entriesFor(section).insert(uuid, *values);
  }
  if (record.deletion >= 0) {
    deleted_.append(uuid);
    deletionOrder_.insert(uuid, record.deletion);
  }
}

void RZSyncTrack::fetch(const QString& uuid) {
  if (!onDemand_ || !store_ || cleared_ || fetched_.contains(uuid)) return;
  if (nothingStored_ && !flushed_.contains(uuid)) return;
  fetched_.insert(uuid);
  const Result<WTStore::JournalRecord> record = store_->journalRecord(uuid);
  if (!record) {
    qCWarning(lcSync).noquote() << record.error().message;
    return;
  }
  take(uuid, record.value());
}

void RZSyncTrack::touch(const QString& uuid) {
  fetch(uuid);
  if (changed_.contains(uuid)) return;
  changed_.insert(uuid, {inserted_.contains(uuid), updated_.contains(uuid), deletionOrder_.value(uuid, -1)});
}

void RZSyncTrack::addDeletion(const QString& uuid) {
  if (deletionOrder_.contains(uuid)) return;
  if (lastDeletion_ < 0) {
    const Result<qint64> last = store_ ? store_->lastJournalDeletion() : Result<qint64>(0);
    lastDeletion_ = last ? last.value() : 0;
    if (!last) qCWarning(lcSync).noquote() << last.error().message;
  }
  deleted_.append(uuid);
  deletionOrder_.insert(uuid, ++lastDeletion_);
}

void RZSyncTrack::removeDeletion(const QString& uuid) {
  if (deletionOrder_.remove(uuid)) deleted_.removeAll(uuid);
}

Result<void> RZSyncTrack::writeChanges(WTStore::JournalWriter& writer) {
  Result<void> written;
  if (cleared_ && !std::exchange(clearWritten_, true)) written = writer.clear();
  if (written && iterationChanged_) written = writer.setIteration(iteration_);
  // In order: rows inserted by key fill the table's pages one after another.
  QStringList uuids = changed_.keys();
  std::sort(uuids.begin(), uuids.end());
  for (auto it = uuids.cbegin(); written && it != uuids.cend(); ++it) {
    const QString& uuid = *it;
    const Stored stored = changed_.value(uuid);
    // A row is written where the entry is, removed where it was and is no more.
    for (const auto& [row, entries, was] : {std::tuple{kInsertedRow, &inserted_, stored.inserted},
                                            std::tuple{kUpdatedRow, &updated_, stored.updated}}) {
      const auto entry = entries->constFind(uuid);
      if (entry != entries->constEnd()) {
        written = writer.setEntry(uuid, row, entryText(entry.value()));
      } else if (was) {
        written = writer.setEntry(uuid, row, QByteArray());
      }
      if (!written) break;
    }
    const qint64 deletion = deletionOrder_.value(uuid, -1);
    if (written && deletion != stored.deletion) written = writer.setDeletion(uuid, deletion);
  }
  if (!written) return written;
  // What is written need not be held on demand: should the record be reported again, its rows are read
  // back (the save's own transaction sees them). A large save so never holds all its entries at once.
  for (auto it = changed_.constBegin(); it != changed_.constEnd(); ++it) {
    if (onDemand_) {
      inserted_.remove(it.key());
      updated_.remove(it.key());
      fetched_.remove(it.key());
    }
    if (!flushed_.contains(it.key())) flushed_.insert(it.key(), it.value());
  }
  changed_.clear();
  return written;
}

void RZSyncTrack::saveEnded(bool written) {
  // Each record as its rows were before the save: the first time it was written in it.
  QHash<QString, Stored> changed = std::exchange(flushed_, {});
  for (auto it = changed_.constBegin(); it != changed_.constEnd(); ++it)
    if (!changed.contains(it.key())) changed.insert(it.key(), it.value());
  changed_.clear();
  const bool cleared = std::exchange(cleared_, false);
  const bool wroteNew = std::exchange(wroteNew_, false);
  const bool everything = std::exchange(iterationChanged_, false) || cleared;
  clearWritten_ = false;
  if (written && (!changed.isEmpty() || wroteNew)) nothingStored_ = false;
  if (written || !store_) return;
  // Nothing of it reached the rows: what changed is read back from them (on demand, when next needed).
  if (everything) {
    if (!onDemand_) return readWhole();
    inserted_.clear(), updated_.clear(), deleted_.clear(), deletionOrder_.clear(), fetched_.clear();
    return;
  }
  for (auto it = changed.constBegin(); it != changed.constEnd(); ++it) {
    const QString& uuid = it.key();
    inserted_.remove(uuid);
    updated_.remove(uuid);
    removeDeletion(uuid);
    fetched_.remove(uuid);
    if (onDemand_) continue;
    const Result<WTStore::JournalRecord> record = store_->journalRecord(uuid);
    if (record) take(uuid, record.value());
  }
}

Result<void> RZSyncTrack::write() {
  if (!store_ || (changed_.isEmpty() && !cleared_ && !iterationChanged_)) return {};
  const Result<void> written =
      store_->writeJournal([this](WTStore::JournalWriter& writer) { return writeChanges(writer); });
  saveEnded(written.ok());
  return written;
}

Result<void> RZSyncTrack::journalEveryRecord(WTObjectContext& context) {
  resetChanges();
  setIteration(0);
  iterationChanged_ = true;
  for (WTObject* object :
       context.fetchObjectsForEntityName(QStringLiteral("WTObject")).value_or(QList<WTObject*>()))
    updateValues(object->setValues(), object->uuid(), Section::Updated);
  return write();
}

QString RZSyncTrack::legacyFilePath(const QString& storePath) {
  const QFileInfo store(storePath);
  return store.path() + u'/' + store.completeBaseName() + QStringLiteral(".sync");
}

Result<std::unique_ptr<WTStore>> RZSyncTrack::openStore(const QString& path, const char* vfs,
                                                        WTStore::Check check,
                                                        WTStore::LogOnClose logOnClose) {
  const QString file = legacyFilePath(path);
  bool imported = false;
  Result<std::unique_ptr<WTStore>> store = WTStore::open(
      path, vfs, check,
      [&](WTStore::JournalWriter& writer) -> Result<void> {
        if (!QFileInfo::exists(file)) return {};
        RZSyncTrack legacy;
        QString problem;
        if (!legacy.readFile(file, &problem)) {
          qCWarning(lcSync).noquote() << QStringLiteral("Can not parse json - %1").arg(problem);
          // Whatever the file holds may be someone's unsent work: keep it where a person can find it.
          if (!QFile::rename(file, freeName(file, QStringLiteral(".corrupt"))))
            qCWarning(lcSync).noquote()
                << QStringLiteral("Could not move the unreadable journal %1 aside").arg(file);
          return {};
        }
        imported = true;
        return legacy.writeChanges(writer);
      },
      logOnClose);
  if (store && imported) {
    // The journal is in the store now; the file stays, under another name, for whoever looks for it.
    if (!QFile::rename(file, freeName(file, QStringLiteral(".migrated"))))
      qCWarning(lcSync).noquote()
          << QStringLiteral("Could not rename the journal %1, which is in the data file now").arg(file);
  } else if (store && QFileInfo::exists(file)) {
    // Set aside, not deleted, so that it is said once rather than at every opening.
    const QString aside = freeName(file, QStringLiteral(".ignored"));
    if (QFile::rename(file, aside))
      qCWarning(lcSync).noquote() << QStringLiteral(
                                         "Ignoring %1 (kept as %2): the journal is kept in the data file now")
                                         .arg(file, aside);
    else
      qCWarning(lcSync).noquote()
          << QStringLiteral("Ignoring %1: the journal is kept in the data file now").arg(file);
  }
  return store;
}

std::optional<RZSyncTrack::FileContents> RZSyncTrack::fromJSON(QByteArrayView text, QString* problem) {
  QString reason;
  FileContents contents;
  const std::optional<QVariant> root = RZSyncJSON::parse(text, &reason);
  if (root && root->typeId() != QMetaType::QVariantMap)
    reason = QStringLiteral("the journal is not a JSON object");
  if (root && reason.isEmpty()) {
    const QVariantMap top = root->toMap();
    const QVariant number = top.value(QStringLiteral("iteration"));
    const QVariant track = top.value(QStringLiteral("track"));
    if (number.typeId() == QMetaType::LongLong) {
      contents.iteration = number.toLongLong();
    } else if (number.isValid()) {
      reason = QStringLiteral("\"iteration\" is not an integer");
    }
    if (reason.isEmpty() && track.isValid()) {
      const QVariantMap changes = track.toMap();
      if (track.typeId() != QMetaType::QVariantMap ||
          !readEntries(changes.value(kInserted), contents.inserted) ||
          !readEntries(changes.value(kUpdated), contents.updated) ||
          !readDeleted(changes.value(kDeleted), contents.deleted)) {
        reason = QStringLiteral("\"track\" is not a change dictionary");
      }
    }
  }
  if (reason.isEmpty()) return contents;
  if (problem) *problem = reason;
  return std::nullopt;
}

bool RZSyncTrack::readFile(const QString& path, QString* problemOut) {
  QFile file(path);
  QString problem;
  QByteArray bytes;
  if (!file.open(QIODevice::ReadOnly)) {
    problem = file.errorString();
  } else {
    bytes = file.readAll();
    if (file.error() != QFileDevice::NoError) problem = file.errorString();
    file.close();
  }

  std::optional<FileContents> contents;
  if (problem.isEmpty()) contents = fromJSON(bytes, &problem);
  if (!problem.isEmpty()) {
    *problemOut = problem;
    return false;
  }
  // Read as if every value had just been journaled here.
  setIteration(contents->iteration);
  for (const Section section : {Section::Inserted, Section::Updated}) {
    const Entries& read = section == Section::Inserted ? contents->inserted : contents->updated;
    for (auto it = read.begin(); it != read.end(); ++it) {
      touch(it.key());
      entriesFor(section).insert(it.key(), it.value());
    }
  }
  for (const QString& uuid : contents->deleted) {
    touch(uuid);
    addDeletion(uuid);
  }
  return true;
}

void RZSyncTrack::resetChanges() {
  inserted_.clear();
  updated_.clear();
  deleted_.clear();
  deletionOrder_.clear();
  fetched_.clear();
  changed_.clear();
  cleared_ = true;
}

std::optional<QVariant> RZSyncTrack::transformedValue(const QVariant& value) {
  // A cleared value travels as null: the server stores it, and the other devices clear theirs.
  if (!value.isValid() || value.isNull()) return QVariant();
  if (value.metaType() == QMetaType::fromType<Date>()) {
    return qint64(std::trunc(value.value<Date>().secondsSince1970()));
  }
  if (value.metaType() == QMetaType::fromType<QDateTime>()) {
    return qint64(std::trunc(Date::fromQDateTime(value.toDateTime()).secondsSince1970()));
  }
  if (KeyValueCoding* object = KeyPath::objectFromVariant(value)) {
    const auto* record = dynamic_cast<const RZSyncObject*>(object);
    return record ? QVariant(record->uuid()) : QVariant();
  }
  // Plain to-many sets travel through their to-one side.
  if (value.metaType() == QMetaType::fromType<WTUnorderedRelationship>()) return std::nullopt;
  if (value.metaType() == QMetaType::fromType<WTOrderedRelationship>()) {
    QVariantList uuids;
    for (const WTObject* member : value.value<WTOrderedRelationship>().objects) uuids.append(member->uuid());
    return uuids;
  }
  if (value.typeId() == QMetaType::QColor) {
    const QString text = WTObject::colorText(value);
    return text.isNull() ? QVariant() : QVariant(text);
  }
  return value;
}

void RZSyncTrack::updateValues(const QVariantMap& values, const QString& uuid, Section section) {
  touch(uuid);
  QVariantMap& entry = entriesFor(section)[uuid];
  for (auto it = values.begin(); it != values.end(); ++it) {
    if (std::optional<QVariant> transformed = transformedValue(it.value()))
      entry.insert(it.key(), *transformed);
  }
  removeDeletion(uuid);
}

void RZSyncTrack::updateValues(const QVariantMap& values, const QString& uuid) {
  fetch(uuid);
  updateValues(values, uuid, inserted_.contains(uuid) ? Section::Inserted : Section::Updated);
}

void RZSyncTrack::insertValues(const QVariantMap& values, const QString& uuid) {
  // Only when the log is shown: an import reports thousands of records here.
  if (TessalLogging::keepsDiary() && lcSync().isDebugEnabled()) {
    QVariantMap logged;
    for (auto it = values.begin(); it != values.end(); ++it)
      if (std::optional<QVariant> transformed = transformedValue(it.value()))
        logged.insert(it.key(), *transformed);
    qCDebug(lcSync).noquote() << QStringLiteral("INSERT(%1) %2")
                                     .arg(uuid, QString::fromUtf8(
                                                    RZSyncJSON::write(logged, RZSyncJSON::Style::Compact)));
  }
  updateValues(values, uuid, Section::Inserted);
}

Result<void> RZSyncTrack::insertNew(const WTObject& record, WTStore::JournalWriter& writer) {
  // What the journal was told of it otherwise is merged with the rest.
  if (!onDemand_ || changed_.contains(record.uuid()) || flushed_.contains(record.uuid()))
    return WTChangeJournal::insertNew(record, writer);
  // Emptied rows are emptied before anything is written to them.
  if (cleared_ && !std::exchange(clearWritten_, true)) {
    if (Result<void> emptied = writer.clear(); !emptied) return emptied;
  }
  RZSyncJSON::CompactObject entry;
  record.visitReportedValues([&](const QString& key, const QVariant& value) {
    if (std::optional<QVariant> transformed = transformedValue(value)) entry.add(key, *transformed);
  });
  const QByteArray text = entry.take();
  if (TessalLogging::keepsDiary() && lcSync().isDebugEnabled())
    qCDebug(lcSync).noquote() << QStringLiteral("INSERT(%1) %2").arg(record.uuid(), QString::fromUtf8(text));
  wroteNew_ = true;
  return writer.setEntry(record.uuid(), kInsertedRow, text);
}

void RZSyncTrack::deleteObjectWithId(const QString& uuid) {
  if (uuid.isEmpty()) return;
  if (TessalLogging::keepsDiary()) qCDebug(lcSync).noquote() << QStringLiteral("DELETE(%1)").arg(uuid);
  touch(uuid);
  addDeletion(uuid);
}

QVariantMap RZSyncTrack::dictionary() const {
  return {{kInserted, entriesVariant(inserted_)},
          {kUpdated, entriesVariant(updated_)},
          {kDeleted, QVariant(deleted_)}};
}

QVariantMap RZSyncTrack::dictionary(qsizetype records, bool* complete) const {
  QVariantMap inserted, updated;
  QStringList deleted;
  QSet<QString> taken;
  std::function<bool(const QString&, bool)> include;
  // A project's order goes with the tasks it lists: the server keeps an order to the tasks it knows, so
  // tasks sent after it would lose their places.
  const std::function<void(const QVariantMap&)> takeListed = [&](const QVariantMap& values) {
    for (const QVariant& value : values)
      if (value.typeId() == QMetaType::QVariantList)
        for (const QVariant& listed : value.toList()) include(listed.toString(), true);
  };
  include = [&](const QString& uuid, bool listed) {
    if (taken.contains(uuid)) return true;
    if (!listed && taken.size() >= records) return false;
    if (listed && !inserted_.contains(uuid) && !updated_.contains(uuid)) return true;
    taken.insert(uuid);
    for (const auto& [entries, out] : {std::pair{&inserted_, &inserted}, std::pair{&updated_, &updated}}) {
      if (const auto it = entries->constFind(uuid); it != entries->constEnd()) {
        out->insert(uuid, *it);
        takeListed(*it);
      }
    }
    return true;
  };
  bool all = true;
  for (const Entries* entries : {&inserted_, &updated_})
    for (auto it = entries->constBegin(); it != entries->constEnd(); ++it)
      all = include(it.key(), false) && all;
  // Deletions keep their order, and a record's deletion goes with its entries.
  for (const QString& uuid : deleted_) {
    if (taken.contains(uuid) || include(uuid, false))
      deleted.append(uuid);
    else
      all = false;
  }
  if (complete) *complete = all;
  return {{kInserted, inserted}, {kUpdated, updated}, {kDeleted, QVariant(deleted)}};
}

void RZSyncTrack::setEntry(Section section, const QString& uuid, const QVariantMap& values) {
  touch(uuid);
  if (values.isEmpty()) {
    entriesFor(section).remove(uuid);
  } else {
    entriesFor(section).insert(uuid, values);
  }
}

void RZSyncTrack::forget(const QString& uuid) {
  touch(uuid);
  inserted_.remove(uuid);
  updated_.remove(uuid);
  removeDeletion(uuid);
}

void RZSyncTrack::removeSentChanges(const QVariantMap& sent) {
  for (const Section section : {Section::Inserted, Section::Updated}) {
    const QVariantMap sentEntries = sent.value(section == Section::Inserted ? kInserted : kUpdated).toMap();
    Entries& entries = entriesFor(section);
    for (auto sentEntry = sentEntries.begin(); sentEntry != sentEntries.end(); ++sentEntry) {
      auto current = entries.find(sentEntry.key());
      if (current == entries.end()) continue;
      touch(sentEntry.key());
      const QVariantMap sentValues = sentEntry.value().toMap();
      for (auto value = sentValues.begin(); value != sentValues.end(); ++value) {
        auto pending = current->find(value.key());
        if (pending != current->end() && RZSyncJSON::sameValue(pending.value(), value.value()))
          current->erase(pending);
      }
      const QVariantMap remaining = current.value();
      entries.erase(current);
      if (remaining.isEmpty()) continue;
      if (section == Section::Inserted) {
        // Edits made while the insertion was on its way: the record exists on the server now.
        QVariantMap& update = updated_[sentEntry.key()];
        for (auto value = remaining.begin(); value != remaining.end(); ++value)
          update.insert(value.key(), value.value());
      } else {
        updated_.insert(sentEntry.key(), remaining);
      }
    }
  }
  for (const QVariant& uuid : sent.value(kDeleted).toList()) {
    if (deletionOrder_.contains(uuid.toString())) {
      touch(uuid.toString());
      removeDeletion(uuid.toString());
    }
    retired_.insert(uuid.toString());
  }
}
