#include "RZSyncTrack.h"

#include "Date.h"
#include "KeyPath.h"
#include "RZSyncJSON.h"
#include "TessalLogging.h"
#include "WTObject.h"

#include <QDateTime>
#include <QFile>
#include <QFileInfo>
#include <QtDebug>

#include <fcntl.h>
#include <unistd.h>
#include <cerrno>
#include <cmath>
#include <cstring>

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

QString systemError(const QString& what, const QString& path) {
  return QStringLiteral("%1 %2: %3").arg(what, path, QString::fromLocal8Bit(std::strerror(errno)));
}

}  // namespace

RZSyncTrack::RZSyncTrack(const QString& path) {
  load(path);
}

void RZSyncTrack::load(const QString& path) {
  QFile file(path);
  if (path.isEmpty() || !file.exists()) return;

  QString problem;
  QByteArray bytes;
  if (!file.open(QIODevice::ReadOnly)) {
    problem = file.errorString();
  } else {
    bytes = file.readAll();
    if (file.error() != QFileDevice::NoError) problem = file.errorString();
    file.close();
  }

  if (problem.isEmpty()) {
    if (std::optional<RZSyncTrack> track = fromJSON(bytes, &problem)) {
      iteration_ = track->iteration_;
      inserted_ = std::move(track->inserted_);
      updated_ = std::move(track->updated_);
      deleted_ = std::move(track->deleted_);
      return;
    }
  }

  qCWarning(lcSync).noquote() << QStringLiteral("Can not parse json - %1").arg(problem);
  // Whatever the file holds may be someone's unsent work: keep it where a person can find it.
  QString aside = path + QStringLiteral(".corrupt");
  for (int n = 2; QFileInfo::exists(aside); ++n) aside = path + QStringLiteral(".corrupt.%1").arg(n);
  if (!QFile::rename(path, aside)) {
    qCWarning(lcSync).noquote() << QStringLiteral("Could not move the unreadable journal %1 aside").arg(path);
  }
}

std::optional<RZSyncTrack> RZSyncTrack::fromJSON(QByteArrayView text, QString* problem) {
  QString reason;
  RZSyncTrack track;
  const std::optional<QVariant> root = RZSyncJSON::parse(text, &reason);
  if (root && root->typeId() != QMetaType::QVariantMap)
    reason = QStringLiteral("the journal is not a JSON object");
  if (root && reason.isEmpty()) {
    const QVariantMap top = root->toMap();
    const QVariant number = top.value(QStringLiteral("iteration"));
    const QVariant changes = top.value(QStringLiteral("track"));
    if (number.typeId() == QMetaType::LongLong) {
      track.iteration_ = number.toLongLong();
    } else if (number.isValid()) {
      reason = QStringLiteral("\"iteration\" is not an integer");
    }
    if (reason.isEmpty() && changes.isValid()) {
      const QVariantMap sections = changes.toMap();
      if (changes.typeId() != QMetaType::QVariantMap ||
          !readEntries(sections.value(kInserted), track.inserted_) ||
          !readEntries(sections.value(kUpdated), track.updated_) ||
          !readDeleted(sections.value(kDeleted), track.deleted_)) {
        reason = QStringLiteral("\"track\" is not a change dictionary");
      }
    }
  }
  if (reason.isEmpty()) return track;
  if (problem) *problem = reason;
  return std::nullopt;
}

Result<void> RZSyncTrack::writeToFile(const QString& path) const {
  QVariantMap top;
  top.insert(QStringLiteral("iteration"), iteration_);
  // The sections as they are, not copied: the same text as dictionary() gives.
  top.insert(QStringLiteral("track"),
             QVariantMap{{kInserted, QVariant::fromValue(RZSyncJSON::ObjectOfObjects{&inserted_})},
                         {kUpdated, QVariant::fromValue(RZSyncJSON::ObjectOfObjects{&updated_})},
                         {kDeleted, QVariant(deleted_)}});

  const QByteArray target = QFile::encodeName(path);
  QByteArray temporary = target + ".XXXXXX";
  const int fd = ::mkstemp(temporary.data());
  if (fd < 0) return Error{1, systemError(QStringLiteral("Cannot create a file beside"), path)};
  auto fail = [&](const QString& what) {
    Error error{1, systemError(what, path)};
    ::close(fd);
    ::unlink(temporary.constData());
    return error;
  };
  // Written as it is made: a journal of many changes never lies in memory twice, as values and as text.
  bool failed = false;
  auto writeOut = [&](QByteArray& bytes) {
    qsizetype written = 0;
    while (!failed && written < bytes.size()) {
      const ssize_t n = ::write(fd, bytes.constData() + written, size_t(bytes.size() - written));
      if (n < 0 && errno == EINTR) continue;
      if (n <= 0) failed = true;
      written += n;
    }
    bytes.resize(0);  // the room stays for the next piece
  };
  RZSyncJSON::write(top, RZSyncJSON::Style::Pretty, writeOut);
  QByteArray end("\n");
  writeOut(end);
  if (failed) return fail(QStringLiteral("Cannot write"));
  // The data must be on disk before the name points at it, or a crash could leave an empty journal.
  if (::fsync(fd) != 0) return fail(QStringLiteral("Cannot sync"));
  if (::close(fd) != 0) {
    Error error{1, systemError(QStringLiteral("Cannot close"), path)};
    ::unlink(temporary.constData());
    return error;
  }
  if (::rename(temporary.constData(), target.constData()) != 0) {
    Error error{1, systemError(QStringLiteral("Cannot replace"), path)};
    ::unlink(temporary.constData());
    return error;
  }
  // And the rename itself must survive a crash.
  const QByteArray folder = QFile::encodeName(QFileInfo(path).absolutePath());
  if (const int dir = ::open(folder.constData(), O_RDONLY | O_DIRECTORY); dir >= 0) {
    ::fsync(dir);
    ::close(dir);
  }
  return {};
}

void RZSyncTrack::resetChanges() {
  inserted_.clear();
  updated_.clear();
  deleted_.clear();
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
  QVariantMap& entry = entriesFor(section)[uuid];
  for (auto it = values.begin(); it != values.end(); ++it) {
    if (std::optional<QVariant> transformed = transformedValue(it.value()))
      entry.insert(it.key(), *transformed);
  }
  deleted_.removeAll(uuid);
}

void RZSyncTrack::updateValues(const QVariantMap& values, const QString& uuid) {
  updateValues(values, uuid, inserted_.contains(uuid) ? Section::Inserted : Section::Updated);
}

void RZSyncTrack::insertValues(const QVariantMap& values, const QString& uuid) {
  // Only when the log is shown: an import reports thousands of records here.
  if (lcSync().isDebugEnabled()) {
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

void RZSyncTrack::deleteObjectWithId(const QString& uuid) {
  if (uuid.isEmpty()) return;
  qCDebug(lcSync).noquote() << QStringLiteral("DELETE(%1)").arg(uuid);
  if (!deleted_.contains(uuid)) deleted_.append(uuid);
}

QVariantMap RZSyncTrack::dictionary() const {
  return {{kInserted, entriesVariant(inserted_)},
          {kUpdated, entriesVariant(updated_)},
          {kDeleted, QVariant(deleted_)}};
}

void RZSyncTrack::setEntry(Section section, const QString& uuid, const QVariantMap& values) {
  if (values.isEmpty()) {
    entriesFor(section).remove(uuid);
  } else {
    entriesFor(section).insert(uuid, values);
  }
}

void RZSyncTrack::forget(const QString& uuid) {
  inserted_.remove(uuid);
  updated_.remove(uuid);
  deleted_.removeAll(uuid);
}

void RZSyncTrack::removeSentChanges(const QVariantMap& sent) {
  for (const Section section : {Section::Inserted, Section::Updated}) {
    const QVariantMap sentEntries = sent.value(section == Section::Inserted ? kInserted : kUpdated).toMap();
    Entries& entries = entriesFor(section);
    for (auto sentEntry = sentEntries.begin(); sentEntry != sentEntries.end(); ++sentEntry) {
      auto current = entries.find(sentEntry.key());
      if (current == entries.end()) continue;
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
    deleted_.removeAll(uuid.toString());
    retired_.insert(uuid.toString());
  }
}
