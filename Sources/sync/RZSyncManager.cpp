#include "RZSyncManager.h"

#include "Decimal.h"
#include "KeyPath.h"
#include "RZSyncErrorPresenter.h"
#include "RZSyncJSON.h"
#include "RZSyncKeptWork.h"
#include "RZSyncReply.h"
#include "RZSyncTwins.h"
#include "SettingsKeys.h"
#include "TessalLogging.h"
#include "UserDefaults.h"
#include "WTClient.h"
#include "WTItem.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTTask.h"

#include <QColor>
#include <QCryptographicHash>
#include <QSysInfo>
#include <QUuid>
#include <QtDebug>

#include <algorithm>

namespace {

const QString kInserted = QStringLiteral("i");
const QString kUpdated = QStringLiteral("u");
const QString kDeleted = QStringLiteral("x");
const QString kHead = QStringLiteral("head");
const QString kSave = QStringLiteral("save");

// The integer value of a JSON value (numbers, numeric text); none for anything else.
std::optional<qint64> integerValue(const QVariant& value) {
  if (value.typeId() == QMetaType::LongLong) return value.toLongLong();
  if (value.typeId() == QMetaType::Bool) return value.toBool() ? 1 : 0;
  if (const std::optional<Decimal> decimal = Decimal::fromVariant(value)) return decimal->toInt64();
  return std::nullopt;
}

// How a key of an entity travels.
enum class KeyKind { Plain, Date, Decimal, Color, ToOne, Ordered, Unordered };

KeyKind keyKind(WTEntity entity, const QString& key) {
  const WTKeyDescriptor* declared = WTObject::keyTable(entity).find(key);
  switch (declared ? declared->type : WTKeyType::Other) {
    case WTKeyType::Date:
      return KeyKind::Date;
    case WTKeyType::Decimal:
      return KeyKind::Decimal;
    case WTKeyType::Color:
      return KeyKind::Color;
    case WTKeyType::ToOne:
      return KeyKind::ToOne;
    case WTKeyType::Ordered:
      return KeyKind::Ordered;
    case WTKeyType::Unordered:
      return KeyKind::Unordered;
    default:
      return KeyKind::Plain;
  }
}

std::optional<WTEntity> entityOfUuid(const QString& uuid) {
  return WTEntities::fromName(uuid.section(u'@', -1));
}

bool isEmptyChangeSet(const QVariantMap& changes) {
  return changes.value(kInserted).toMap().isEmpty() && changes.value(kUpdated).toMap().isEmpty() &&
         changes.value(kDeleted).toList().isEmpty();
}

}  // namespace

RZSyncManager::RZSyncManager(WTObjectContext* context, QObject* parent)
    : QObject(parent),
      context_(context),
      track_(
          std::make_unique<RZSyncTrack>(context ? context->store() : nullptr, RZSyncTrack::Loading::Whole)),
      network_(new RZSyncNetwork(QUrl(), this, this)),
      logPresenter_(std::make_unique<RZSyncLogErrorPresenter>()) {
  Q_ASSERT_X(context, "RZSyncManager", "line 252: a sync manager needs an object context");
  presenter_ = logPresenter_.get();
  timer_.setSingleShot(true);
  connect(&timer_, &QTimer::timeout, this, &RZSyncManager::sync);
  network_->setUrl(configuredEndpoint());

  // One identity per installation, kept with the user's settings beside the machine it was made on:
  // settings copied to another machine, alone or with the store, name the first one's, and the server
  // would hold back that machine's records as this one's own. Settings that name no machine keep theirs.
  QString device;
  if (UserDefaults* defaults = userDefaults()) {
    device = defaults->stringForKey(SettingsKeys::kSyncDevice);
    const QString machine = QString::fromLatin1(
        QCryptographicHash::hash(QSysInfo::machineUniqueId() + "tessal", QCryptographicHash::Sha256)
            .toHex()
            .left(32));
    const QString madeOn = defaults->stringForKey(SettingsKeys::kSyncDeviceMachine);
    if (device.isEmpty() || (!madeOn.isEmpty() && madeOn != machine)) {
      device = QUuid::createUuid().toString(QUuid::WithoutBraces);
      defaults->setValue(SettingsKeys::kSyncDevice, device);
    }
    if (madeOn != machine) defaults->setValue(SettingsKeys::kSyncDeviceMachine, machine);
  } else {
    device = QUuid::createUuid().toString(QUuid::WithoutBraces);
  }
  network_->setDevice(device);

  if (context_) {
    context_->setChangeJournal(track_.get());
    attached_ = true;
  }
  fileNotifications();
}

RZSyncManager::~RZSyncManager() {
  removeNotifications();
  // As disableSync, without telling anyone about a manager that is going away.
  timer_.stop();
  syncEnabled_ = false;
  if (context_ && context_->changeJournal() == track_.get()) context_->setChangeJournal(nullptr);
}

void RZSyncManager::setErrorPresenter(RZSyncErrorPresenter* presenter) {
  presenter_ = presenter ? presenter : logPresenter_.get();
}

UserDefaults* RZSyncManager::userDefaults() const {
  return context_ ? context_->userDefaults() : nullptr;
}

QUrl RZSyncManager::endpointURL(const QString& server) {
  QString text = server.trimmed();
  if (text.isEmpty()) return {};
  if (!text.contains(QLatin1String("://"))) text.prepend(QLatin1String("https://"));
  QUrl url(text, QUrl::StrictMode);
  const QString scheme = url.scheme().toLower();
  if (!url.isValid() || url.host().isEmpty() ||
      (scheme != QLatin1String("https") && scheme != QLatin1String("http")) || url.hasQuery() ||
      url.hasFragment()) {
    return {};
  }
  QString path = url.path();
  while (path.endsWith(u'/')) path.chop(1);
  url.setPath(path + QLatin1String(kEndpointPath));
  return url;
}

QUrl RZSyncManager::configuredEndpoint() const {
  const UserDefaults* defaults = userDefaults();
  return defaults ? endpointURL(defaults->stringForKey(SettingsKeys::kSyncServer)) : QUrl();
}

void RZSyncManager::fileNotifications() {
  Q_ASSERT_X(context_, "RZSyncManager", "line 252: no object context to observe");
  if (!context_) return;
  saveConnection_ =
      connect(context_, &WTObjectContext::didSave, this, &RZSyncManager::managedObjectContextDidSave);
}

void RZSyncManager::removeNotifications() {
  disconnect(saveConnection_);
}

void RZSyncManager::managedObjectContextDidSave() {
  qCDebug(lcSync, "--- did save ---");
  if (syncEnabled_) rescheduleTimer(intervals_.afterSaveMs);
}

void RZSyncManager::writeTrack(bool logFailure) {
  const Result<void> written = track_->write();
  if (!written && logFailure)
    qCWarning(lcSync).noquote()
        << QStringLiteral("Error writing JSON Data - %1").arg(written.error().message);
}

void RZSyncManager::sync() {
  timer_.stop();
  if (network_->networkAction() == RZSyncNetwork::Idle) {
    // The address may have changed in the preferences since the last poll.
    network_->setUrl(configuredEndpoint());
    post({}, kHead, track_->iteration());
  }
  if (syncEnabled_ && !networkError_) rescheduleTimer(intervals_.pollMs);
}

void RZSyncManager::rescheduleTimer(int milliseconds) {
  timer_.stop();
  timer_.start(milliseconds);
}

void RZSyncManager::enableSync() {
  syncEnabled_ = true;
  sync();
  emit syncStatusDidChange();
}

void RZSyncManager::disableSync() {
  timer_.stop();
  syncEnabled_ = false;
  emit syncStatusDidChange();
}

void RZSyncManager::post(const QVariantMap& data, const QString& action, qint64 iteration) {
  network_->postJSONObject(action == kSave ? QVariant(data) : QVariant(), action, iteration);
  // Remember what is on its way only when it left: without credentials or address nothing is sent.
  if (network_->networkAction() != RZSyncNetwork::Idle)
    inFlight_ = {action, action == kSave ? data : QVariantMap()};
}

void RZSyncManager::postChanges(qint64 iteration) {
  bool complete = true;
  const QVariantMap data = track_->dictionary(intervals_.recordsPerSave, &complete);
  post(data, kSave, iteration);
  if (network_->networkAction() != RZSyncNetwork::Idle) inFlight_.complete = complete;
}

void RZSyncManager::syncNetworkReceivedJSONObject(RZSyncNetwork* network, const QVariant& object) {
  const Result<RZSyncReply> parsed = RZSyncReply::fromJSON(object);
  if (!parsed) {
    if (object.typeId() != QMetaType::QVariantMap || !object.toMap().contains(QStringLiteral("iteration")))
      qCWarning(lcSync, "Iteration not received");
    // Nothing of it is taken: the journal keeps its iteration and changes, and the poll is retried.
    qCWarning(lcSync).noquote() << parsed.error().message;
    return syncNetworkDidFailWithError(network, parsed.error().message);
  }
  const RZSyncReply& reply = parsed.value();
  const Request answered = std::exchange(inFlight_, {});
  RZSyncExchange exchange{answered.action, RZSyncExchange::Outcome::Answered, false, {}};

  if (reply.error) {
    if (reply.code != 4) {
      const QString message = QStringLiteral("%1 - (Code: %2)").arg(*reply.error).arg(reply.code);
      disableSync();  // first: nothing polls again while the refusal is on screen
      presenter_->presentSyncError(message);
      exchange.outcome = RZSyncExchange::Outcome::Refused;
      exchange.message = message;
      return finish(exchange);
    }
    // Code 4: the save was not taken as it stood. With an iteration, send the journal again claiming
    // it; without one (below 1), keep the journal for the next poll, which fetches what was missing.
    const qint64 base = reply.iteration.value_or(0);
    if (base < 1) {
      qCDebug(lcSync, "Head iteration problem");
    } else {
      postChanges(base);
    }
    endFailureRun();
    return finish(exchange);
  }

  const qint64 iteration = *reply.iteration;
  if (reply.action == kHead) {
    exchange.receivedChanges = !isEmptyChangeSet(reply.result);
    mergeHead(reply.result, iteration);
  } else {
    // Only what this request carried is confirmed; the user may have gone on editing meanwhile.
    if (answered.action == kSave) track_->removeSentChanges(answered.data);
    track_->setIteration(iteration);
    writeTrack(false);
    if (answered.action == kSave && !answered.complete && track_->hasChanges()) {
      endFailureRun();
      finish(exchange);
      return postChanges(iteration);
    }
  }
  endFailureRun();
  finish(exchange);
}

void RZSyncManager::mergeHead(const QVariantMap& result, qint64 iteration) {
  // Local edits are journaled before the server's changes arrive.
  const Result<void> saved = saveHandler_ ? saveHandler_() : context_->save();
  if (!saved) {
    qCWarning(lcSync).noquote() << saved.error().message;
    return;
  }

  // The merge is not the user's to undo.
  context_->processPendingChanges();
  context_->undoManager().disableRegistration();
  mergeWithDictionary(result);
  context_->processPendingChanges();
  context_->undoManager().enableRegistration();

  // Caught up with this head once the merge is saved, whatever becomes of the save below: a refused or
  // lost save must not make the next poll deliver the same changes again over edits made since.
  track_->setIteration(iteration);
  // Saved unjournaled, since the server's changes are not local ones, but with what the merge changed in
  // the journal and the iteration, in the same transaction (a failed save reads them back as they were).
  track_->setRecordsSaves(false);
  attached_ = false;
  const Result<void> mergedSave = context_->save();
  track_->setRecordsSaves(true);
  attached_ = true;
  if (!mergedSave) {
    qCWarning(lcSync).noquote() << mergedSave.error().message;
    return;
  }
  // A merge that changed no record has its journal rows still to write.
  writeTrack(true);
  if (track_->hasChanges()) postChanges(iteration);
}

void RZSyncManager::endFailureRun() {
  if (!std::exchange(networkError_, false)) return;
  presenter_->networkRecovered();
  // Polling stopped with the failure; a good reply resumes it.
  if (syncEnabled_ && !timer_.isActive()) rescheduleTimer(intervals_.pollMs);
}

void RZSyncManager::finish(RZSyncExchange exchange) {
  emit exchangeDidFinish(exchange);
}

void RZSyncManager::syncNetworkDidFailWithError(RZSyncNetwork*, const QString& error) {
  const Request answered = std::exchange(inFlight_, {});
  // The run is marked before it is shown: a box waits for the user while polls and saves go on failing,
  // and each would have stacked a box of its own.
  if (!std::exchange(networkError_, true)) presenter_->presentNetworkError(error);
  if (syncEnabled_) rescheduleTimer(intervals_.retryMs);
  finish({answered.action, RZSyncExchange::Outcome::Failed, false, error});
}

QString RZSyncManager::named(const WTObject& record) {
  if (const auto* item = dynamic_cast<const WTItem*>(&record))
    return tr("an item of “%1”").arg(item->task() ? item->task()->name() : QString());
  return QStringLiteral("“%1”").arg(record.valueForKey(QStringLiteral("name")).toString());
}

namespace {

// A value the user sets: not a task order, which follows the tasks added and moved.
bool isOwnEdit(const WTObject& record, const QString& key) {
  const WTKeyDescriptor* described = record.keyTable().find(key);
  return described && described->type != WTKeyType::Ordered;
}

}  // namespace

bool RZSyncManager::changedHere(const WTObject& record) const {
  const QVariantMap changes = track_->entry(RZSyncTrack::Section::Updated, record.uuid());
  return std::any_of(changes.keyBegin(), changes.keyEnd(),
                     [&](const QString& key) { return isOwnEdit(record, key); });
}

QString RZSyncManager::recordsNamed(const QSet<QString>& uuids, qsizetype* count) const {
  QStringList names;
  for (const QString& uuid : uuids)
    if (const WTObject* record = context_->objectWithUUID(uuid, false)) names << named(*record);
  return listed(names, count);
}

QString RZSyncManager::listed(QStringList names, qsizetype* count) {
  names.removeDuplicates();
  names.sort();
  *count = names.size();
  QString listed = names.mid(0, 3).join(QStringLiteral(", "));
  if (names.size() > 3) listed = tr("%1 and %n more", nullptr, int(names.size() - 3)).arg(listed);
  return listed;
}

void RZSyncManager::mergeWithDictionary(const QVariantMap& changes) {
  // Deletions waiting to be sent win: the merge neither brings those records back nor changes them, and
  // files nothing under them (the server takes what is filed there with them once the deletion arrives).
  const QStringList pendingList = track_->deletedIds();
  const QSet<QString> pending(pendingList.begin(), pendingList.end());
  QSet<QString> deletedThere;
  for (const QVariant& uuid : changes.value(kDeleted).toList()) deletedThere.insert(uuid.toString());
  RZSyncKeptWork kept(*context_, *track_, deletedThere);
  kept.noteServerCopies(changes.value(kInserted).toMap());
  QHash<QString, QString> replaced;
  mergeWithDictionary(changes, kInserted, pending, &replaced);
  mergeWithDictionary(changes, kUpdated, pending, &replaced);
  qsizetype count = 0;
  QStringList replacedNames;
  for (const auto& [uuid, typed] : replaced.asKeyValueRange()) {
    // By the name the user knows it by here, when that was what the other device changed, and the name
    // it has now (an item's own, not its task's).
    if (const WTObject* record = context_->objectWithUUID(uuid, false)) {
      const QString now = record->valueForKey(QStringLiteral("name")).toString();
      const QString current = now.isEmpty() ? named(*record) : QStringLiteral("“%1”").arg(now);
      replacedNames << (typed.isEmpty() ? named(*record) : tr("“%1” (now %2)").arg(typed, current));
    }
  }
  if (const QString names = listed(replacedNames, &count); count > 0) {
    presenter_->presentMergeNotice(
        tr("Changes replaced by another device’s"),
        count == 1 ? tr("A change made here to %1 was replaced by one made on another device.").arg(names)
                   : tr("Changes made here to %1 were replaced by ones made on another device.").arg(names));
  }
  const QVariantMap inserted = changes.value(kInserted).toMap();
  const RZSyncTwins::Outcome twins =
      RZSyncTwins(*context_, *track_).fold(QSet<QString>(inserted.keyBegin(), inserted.keyEnd()));
  if (const QString names = recordsNamed(twins.apart, &count); count > 0) {
    presenter_->presentMergeNotice(
        tr("Records made on both devices"),
        tr("%1: made on this device and on another before they synced, billing differently; both are kept.")
            .arg(names));
  }
  if (const QString names = recordsNamed(twins.carried, &count); count > 0) {
    presenter_->presentMergeNotice(
        tr("Records made on both devices"),
        tr("%1: made on this device and on another before they synced, each is one record now, with the "
           "values set here.")
            .arg(names));
  }
  QStringList lost;  // records whose changes here go with them
  for (const QVariant& uuid : changes.value(kDeleted).toList()) {
    if (uuid.typeId() != QMetaType::QString) continue;
    WTObject* object = context_->objectWithUUID(uuid, false);
    if (object && changedHere(*object)) lost << named(*object);
    // What is still pending for a record the server deleted has nothing left to change there.
    track_->forget(uuid.toString());
    if (object) deleteMerged(object, deletedThere, kept, &lost);
  }
  if (const QString message = kept.message(); !message.isEmpty())
    presenter_->presentMergeNotice(tr("Work kept from a deletion elsewhere"), message);
  if (const QString message = kept.serverCopiesMessage(); !message.isEmpty())
    presenter_->presentMergeNotice(tr("Work kept from a deletion"), message);
  if (const QString names = listed(lost, &count); count > 0) {
    presenter_->presentMergeNotice(
        tr("Changes gone with a deletion elsewhere"),
        count == 1 ? tr("A change made here to %1 went with a record deleted on another device.").arg(names)
                   : tr("Changes made here to %1 went with records deleted on another device.").arg(names));
  }
}

void RZSyncManager::deleteMerged(WTObject* object, const QSet<QString>& deletedThere, RZSyncKeptWork& kept,
                                 QStringList* lost) {
  QList<WTObject*> gone{object};
  for (qsizetype i = 0; i < gone.size(); ++i) {
    if (auto* project = dynamic_cast<WTProject*>(gone[i])) {
      for (WTTask* task : project->tasks()) gone.append(task);
    } else if (auto* task = dynamic_cast<WTTask*>(gone[i])) {
      for (WTItem* item : task->items()) gone.append(item);
    }
  }
  // Taking work the other device never saw out of its deletion loses nothing; deleting it again is one
  // click.
  kept.keepFrom(gone);
  QStringList uuids;
  for (WTObject* record : gone) {
    uuids.append(record->uuid());
    if (record != object && changedHere(*record)) *lost << named(*record);
  }
  context_->deleteObject(object);
  // The deletion here takes the record's tasks and items with it. One of them may be filed under it here
  // only (moved there, not sent yet): the server still has it elsewhere, so its deletion is journaled
  // and goes out with the next save. Until then no merge brings it back.
  for (const QString& uuid : uuids) {
    if (!deletedThere.contains(uuid)) track_->deleteObjectWithId(uuid);
  }
}

void RZSyncManager::mergeWithDictionary(const QVariantMap& changes, const QString& key,
                                        const QSet<QString>& pending, QHash<QString, QString>* replaced) {
  const RZSyncTrack::Section section =
      key == kInserted ? RZSyncTrack::Section::Inserted : RZSyncTrack::Section::Updated;
  const QVariantMap entries = changes.value(key).toMap();
  for (auto it = entries.begin(); it != entries.end(); ++it) {
    const QString& uuid = it.key();
    if (pending.contains(uuid)) continue;
    WTObject* object = context_->objectWithUUID(uuid, true);
    if (!object) continue;  // not the identity of a record
    QVariantMap local = track_->entry(section, uuid);
    const QVariantMap values = it.value().toMap();
    const auto json = [](const QVariant& v) { return RZSyncJSON::write(v, RZSyncJSON::Style::Compact); };
    for (auto value = values.begin(); value != values.end(); ++value) {
      // The server's value wins over a pending local one; the user is told when it is another value.
      const QVariant mine = local.take(value.key());
      if (value.key() == QLatin1String("uuid")) continue;
      bool skip = false;
      const QVariant merged = mergedValue(object, value.key(), value.value(), pending, &skip);
      if (skip) continue;
      if (!object->setValue(value.key(), merged)) {
        qCDebug(lcSync).noquote() << QStringLiteral("Sync: %1 takes no value %2 for %3")
                                         .arg(uuid,
                                              QString::fromUtf8(RZSyncJSON::write(
                                                  value.value(), RZSyncJSON::Style::Compact)),
                                              value.key());
      }
      if (mine.isValid() && isOwnEdit(*object, value.key()) &&
          json(mine) !=
              json(RZSyncTrack::transformedValue(object->valueForKey(value.key())).value_or(QVariant()))) {
        QString& typed = (*replaced)[uuid];
        if (value.key() == QLatin1String("name")) typed = mine.toString();
      }
    }
    if (!local.isEmpty() || track_->entries(section).contains(uuid)) track_->setEntry(section, uuid, local);
  }
}

QVariant RZSyncManager::mergedValue(WTObject* object, const QString& key, const QVariant& value,
                                    const QSet<QString>& pending, bool* skip) {
  if (!value.isValid()) return {};
  // The record a uuid names, made if missing; `ok` is false for a record that is being deleted here, or
  // one of another entity than the relationship holds (which is not made).
  auto record = [&](const QVariant& uuid, WTEntity expected, bool* ok) -> WTObject* {
    *ok = false;
    if (uuid.typeId() != QMetaType::QString || pending.contains(uuid.toString())) return nullptr;
    if (entityOfUuid(uuid.toString()) != expected) return nullptr;
    *ok = true;
    return context_->objectWithUUID(uuid, true);
  };
  switch (keyKind(object->entity(), key)) {
    case KeyKind::Date:
      if (const std::optional<qint64> seconds =
              value.typeId() == QMetaType::QString ? std::nullopt : integerValue(value)) {
        return QVariant::fromValue(Date::fromSeconds(double(*seconds)));
      }
      return value;
    case KeyKind::Decimal:
      return value;
    case KeyKind::Color: {
      const QColor color = QColor::fromString(value.toString());
      return color.isValid() ? QVariant(color) : QVariant();
    }
    case KeyKind::ToOne: {
      const WTEntity owner = object->entity() == WTEntity::Project ? WTEntity::Client
                             : object->entity() == WTEntity::Task  ? WTEntity::Project
                                                                   : WTEntity::Task;
      bool ok = false;
      WTObject* related = record(value, owner, &ok);
      if (!ok) {
        // Not under an owner that is being deleted here: the server follows the owner's delete rule
        // for it once the deletion arrives, and tells every device.
        *skip = true;
        return {};
      }
      return related ? KeyPath::variantFromObject(related) : QVariant();
    }
    case KeyKind::Ordered: {
      QVariantList members;
      for (const QVariant& uuid : value.toList()) {
        bool ok = false;
        if (WTObject* member = record(uuid, WTEntity::Task, &ok))
          members.append(KeyPath::variantFromObject(member));
      }
      return members;
    }
    case KeyKind::Unordered:
      *skip = true;
      return {};
    case KeyKind::Plain:
      // Integers and flags arrive as JSON integers; a number written with a fraction still counts.
      if (value.metaType() == QMetaType::fromType<Decimal>()) return qint64(value.value<Decimal>().toInt64());
      return value;
  }
  return value;
}
