#pragma once

// Real parts for the sync tests: a scripted HTTP server on 127.0.0.1 and a client over a real store file.
#include "Decimal.h"
#include "LogCapture.h"
#include "RZSyncErrorPresenter.h"
#include "RZSyncJSON.h"
#include "RZSyncManager.h"
#include "UserDefaults.h"
#include "WTObjectContext.h"
#include "WTStore.h"

#include <gtest/gtest.h>

#include <QCoreApplication>
#include <QDeadlineTimer>
#include <QEventLoop>
#include <QPointer>
#include <QTcpServer>
#include <QTcpSocket>
#include <QTemporaryDir>
#include <QTest>
#include <QTimer>

#include <functional>
#include <memory>
#include <utility>

namespace synctest {

// Runs the event loop until `done` holds or `ms` pass, looking after every batch (qWaitFor sleeps).
inline bool waitUntil(const std::function<bool()>& done, int ms = 5000) {
  const QDeadlineTimer deadline(ms);
  QTimer wake;  // no batch of events ever waits longer than this
  wake.start(20);
  for (; !done(); QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete)) {
    if (deadline.hasExpired()) return false;
    QCoreApplication::processEvents(QEventLoop::WaitForMoreEvents);
  }
  return true;
}

inline Decimal dec(const char* text) {
  return *Decimal::fromString(QString::fromLatin1(text));
}
inline QVariant money(const char* text) {
  return QVariant::fromValue(dec(text));
}
inline std::string compact(const QVariant& value) {
  return RZSyncJSON::write(value, RZSyncJSON::Style::Compact).toStdString();
}

struct HttpRequest {
  QByteArray method, path, body;
  QMap<QByteArray, QByteArray> headers;  // names in lower case
  QVariantMap json() const { return RZSyncJSON::parse(body).value_or(QVariant()).toMap(); }
};

// Records each request and answers the handler's raw bytes; an empty answer holds it until answerHeld().
class LoopbackHttpServer {
 public:
  using Handler = std::function<QByteArray(const HttpRequest&)>;
  LoopbackHttpServer() {
    EXPECT_TRUE(server_.listen(QHostAddress::LocalHost, 0));
    QObject::connect(&server_, &QTcpServer::newConnection, [this] {
      while (QTcpSocket* socket = server_.nextPendingConnection()) {
        QObject::connect(socket, &QTcpSocket::readyRead, socket, [this, socket] { read(socket); });
        QObject::connect(socket, &QTcpSocket::disconnected, socket, &QObject::deleteLater);
      }
    });
  }

  QString address() const { return QStringLiteral("http://127.0.0.1:%1").arg(server_.serverPort()); }
  QUrl url(const QString& path = QString::fromLatin1(RZSyncManager::kEndpointPath)) const {
    return QUrl(address() + path);
  }

  Handler handler = [](const HttpRequest&) { return json(QVariantMap{}); };
  QList<HttpRequest> requests;

  bool hasHeld() const { return !held_.isEmpty(); }
  // Answers the oldest held request; false when none is held (or its client gave up).
  bool answerHeld(const QByteArray& answer) {
    QPointer<QTcpSocket> socket = held_.isEmpty() ? nullptr : held_.takeFirst();
    if (socket) reply(socket, answer);
    return socket;
  }
  // Closes the oldest held request's connection without an answer.
  void dropHeld() {
    if (QPointer<QTcpSocket> socket = held_.isEmpty() ? nullptr : held_.takeFirst()) socket->abort();
  }

  static QByteArray json(const QVariant& value, int status = 200) {
    return raw(RZSyncJSON::write(value, RZSyncJSON::Style::Compact), status);
  }
  static QByteArray raw(const QByteArray& body, int status = 200, const QByteArray& type = "application/json",
                        const QByteArray& extraHeaders = {}) {
    return "HTTP/1.1 " + QByteArray::number(status) + " X\r\nContent-Type: " + type +
           "\r\nContent-Length: " + QByteArray::number(body.size()) + "\r\nConnection: close\r\n" +
           extraHeaders + "\r\n" + body;
  }

 private:
  void read(QTcpSocket* socket) {
    QByteArray& buffer = buffers_[socket];
    buffer += socket->readAll();
    const qsizetype end = buffer.indexOf("\r\n\r\n");
    if (end < 0) return;
    HttpRequest request;
    const QList<QByteArray> lines = buffer.left(end).split('\n');
    const QList<QByteArray> first = lines.value(0).trimmed().split(' ');
    request.method = first.value(0);
    request.path = first.value(1);
    for (const QByteArray& line : lines.mid(1)) {
      if (const qsizetype colon = line.indexOf(':'); colon > 0)
        request.headers.insert(line.left(colon).trimmed().toLower(), line.mid(colon + 1).trimmed());
    }
    const qsizetype length = request.headers.value("content-length").toLongLong();
    if (buffer.size() < end + 4 + length) return;
    request.body = buffer.mid(end + 4, length);
    buffer.remove(0, end + 4 + length);
    requests.append(request);
    const QByteArray answer = handler(request);
    answer.isEmpty() ? held_.append(socket) : reply(socket, answer);
  }
  static void reply(QTcpSocket* socket, const QByteArray& answer) {
    socket->write(answer);
    socket->flush();
    socket->disconnectFromHost();
  }

  QTcpServer server_;
  QHash<QTcpSocket*, QByteArray> buffers_;
  QList<QPointer<QTcpSocket>> held_;
};

// The protocol's replies: a change set, a head bringing one, a confirmed save, a refusal.
inline QVariantMap changeSet(const QVariantMap& inserted = {}, const QVariantMap& updated = {},
                             const QStringList& deleted = {}) {
  return {{"i", inserted}, {"u", updated}, {"x", deleted}};
}
inline QByteArray headReply(qint64 iteration, const QVariantMap& result = changeSet()) {
  return LoopbackHttpServer::json(
      QVariantMap{{"action", "head"}, {"iteration", iteration}, {"result", result}});
}
inline QByteArray saveReply(qint64 iteration) {
  return LoopbackHttpServer::json(QVariantMap{{"action", "save"}, {"iteration", iteration}});
}
inline QByteArray errorReply(const QString& message, qint64 code, const QVariant& iteration = {}) {
  QVariantMap reply{{"error", message}, {"code", code}};
  if (iteration.isValid()) reply.insert("iteration", iteration);
  return LoopbackHttpServer::json(reply);
}

class RecordingPresenter final : public RZSyncErrorPresenter {
 public:
  void presentSyncError(const QString& message) override { syncErrors.append(message), answer(); }
  void presentNetworkError(const QString& message) override { networkErrors.append(message), answer(); }
  void networkRecovered() override { ++recoveries; }
  void presentMergeNotice(const QString&, const QString& message) override { mergeNotices.append(message); }
  QStringList syncErrors, networkErrors, mergeNotices;
  int recoveries = 0;
  int answersAfterMs = 0;  // as a modal box: events, timers among them, go on until the user answers

 private:
  // A box shown over a box is recorded without waiting again: the test ends, failing, rather than nest.
  void answer() {
    if (answersAfterMs <= 0 || std::exchange(answering_, true)) return;
    QEventLoop loop;
    QTimer::singleShot(answersAfterMs, &loop, &QEventLoop::quit);
    loop.exec();
    answering_ = false;
  }
  bool answering_ = false;
};

// One installation in its own folder, syncing off; credentials come from its user defaults.
class SyncClient final : public RZSyncNetworkCredentialDelegate {
 public:
  SyncClient(const QString& server, const QString& user = QStringLiteral("ann@example.org"),
             const QString& password = QStringLiteral("secret-password")) {
    EXPECT_TRUE(dir.isValid());
    defaults = std::make_unique<UserDefaults>(dir.filePath(QStringLiteral("settings.conf")));
    defaults->setValue(QStringLiteral("WTSyncServer"), server);
    defaults->setValue(QStringLiteral("WTSyncUser"), user);
    defaults->setValue(QStringLiteral("WTSyncPassword"), password);
    open();
  }
  ~SyncClient() override { close(); }
  QString syncNetworkRequestsUser(RZSyncNetwork*) override { return defaults->stringForKey("WTSyncUser"); }
  QString syncNetworkRequestsPassword(RZSyncNetwork*) override {
    return defaults->stringForKey("WTSyncPassword");
  }

  void open() {
    context = std::make_unique<WTObjectContext>(defaults.get());
    auto store = WTStore::open(storePath());
    EXPECT_TRUE(store.ok() && context->attachStore(std::move(store.value())).ok());
    manager = std::make_unique<RZSyncManager>(context.get());
    manager->syncNetwork()->setCredentialDelegate(this);
    manager->setErrorPresenter(&presenter);
  }
  // Drops manager and context as quitting does (nothing unsaved is saved).
  void close() { manager.reset(), context.reset(); }
  void reopen() { close(), open(); }

  QString storePath() const { return dir.filePath(QStringLiteral("Tessal.sqlite")); }
  RZSyncTrack& track() const { return *manager->syncTrack(); }
  RZSyncNetwork& network() const { return *manager->syncNetwork(); }
  bool idle() const { return network().networkAction() == RZSyncNetwork::Idle; }
  void save() {
    const Result<void> saved = context->save();
    EXPECT_TRUE(saved.ok()) << saved.error().message.toStdString();
  }
  // One poll, waiting for it and for any save it sends; false when it did not finish in time.
  bool syncOnce(int ms = 10000) {
    manager->sync();
    return waitUntil([this] { return idle(); }, ms);
  }
  template <class T>
  T* find(const QString& uuid) const {
    return dynamic_cast<T*>(context->objectWithUUID(uuid, false));
  }

  QTemporaryDir dir;
  std::unique_ptr<UserDefaults> defaults;
  std::unique_ptr<WTObjectContext> context;
  std::unique_ptr<RZSyncManager> manager;
  RecordingPresenter presenter;
};

// The journal as the store file holds it, read through a connection of its own.
struct StoredJournal {
  explicit StoredJournal(const QString& storePath)
      : store(std::move(WTStore::openReadOnly(storePath, WTStore::Check::Header).value())),
        track(store.get(), RZSyncTrack::Loading::Whole) {}
  std::unique_ptr<WTStore> store;
  RZSyncTrack track;
};
// The same as one line: "iteration {changes}".
inline std::string storedJournal(const QString& storePath) {
  const StoredJournal stored(storePath);
  return std::to_string(stored.track.iteration()) + ' ' + compact(stored.track.dictionary());
}

// A stored value in journal form (an item's own rate, not its task's; a task order as uuids).
inline QVariant storedValue(const WTObject* object, const QString& key) {
  const std::optional<Decimal> rate = key == QLatin1String("rate") ? object->storedRate() : std::nullopt;
  QVariant value = key == QLatin1String("rate") ? (rate ? QVariant::fromValue(*rate) : QVariant())
                                                : object->valueForKey(key);
  if (key == QLatin1String("tasks")) {
    QVariantList uuids;
    for (const QVariant& task : value.toList())
      uuids.append(RZSyncTrack::transformedValue(task).value_or(QVariant()));
    value = uuids;
  }
  return RZSyncTrack::transformedValue(value).value_or(QVariant());
}

// A record's stored values as one line of JSON; without the uuid and unset values when `setOnly`.
inline std::string journalValues(const WTObject* object, bool setOnly = false) {
  QVariantMap values;
  QStringList keys = object->storedKeys();
  if (object->entity() == WTEntity::Project) keys << QStringLiteral("tasks");
  for (const QString& key : keys) {
    const QVariant v = storedValue(object, key);
    const bool unset =
        !v.isValid() || v.isNull() || (v.typeId() == QMetaType::Bool && !v.toBool()) ||
        (v.canConvert<QVariantList>() && v.typeId() != QMetaType::QString && v.toList().isEmpty()) ||
        (v.typeId() == QMetaType::QString && v.toString().isEmpty()) || key == "uuid";
    if (!setOnly || !unset) values.insert(key, v);
  }
  return compact(values);
}

// Every record of a store, a line each: uuid and journal values. Stores in step give the same text.
inline std::string snapshot(WTObjectContext& context) {
  QStringList lines;
  for (WTObject* object : context.fetchObjectsForEntityName("WTObject").value_or(QList<WTObject*>()))
    lines.append(object->uuid() + ' ' + QString::fromStdString(journalValues(object)));
  lines.sort();
  return lines.join('\n').toStdString();
}

// One record's set values, as one line; "(none)" when missing.
inline std::string storedRecord(WTObjectContext& context, const QString& uuid) {
  const WTObject* object = context.objectWithUUID(uuid, false);
  return object ? journalValues(object, true) : "(none)";
}

}  // namespace synctest
