#include "WTSingleInstance.h"
#include "TessalLogging.h"

#include <QDeadlineTimer>
#include <QDir>
#include <QJsonDocument>
#include <QLocalServer>
#include <QLocalSocket>
#include <QStandardPaths>

namespace {

const QByteArray kReopen = "reopen\n";
const QByteArray kPing = "ping\n";
const QByteArray kAcknowledged = "ok\n";
// "run " and a request as one line of compact JSON; the answer is one such line too.
const QByteArray kRun = "run ";
// Longer lines are no request of ours: the connection is dropped rather than its bytes kept.
constexpr qint64 kMaxLine = 64 * 1024;

QByteArray jsonLine(const QJsonObject& object) {
  return QJsonDocument(object).toJson(QJsonDocument::Compact) + '\n';
}

QString defaultPath() {
  QString folder = QStandardPaths::writableLocation(QStandardPaths::RuntimeLocation);
  if (folder.isEmpty()) {
    // No private runtime folder: a shared one, so the user's name keeps users apart.
    return QDir::tempPath() + QStringLiteral("/tessal-") +
           qEnvironmentVariable("USER", QStringLiteral("user")) + QStringLiteral(".socket");
  }
  return folder + QStringLiteral("/tessal.socket");
}

}  // namespace

WTSingleInstance::WTSingleInstance(const QString& serverPath, QObject* parent)
    : QObject(parent), path_(serverPath.isEmpty() ? defaultPath() : serverPath) {}

WTSingleInstance::~WTSingleInstance() {
  if (server_) server_->close();
}

bool WTSingleInstance::isListening() const {
  return server_ && server_->isListening();
}

bool WTSingleInstance::start(bool bringRunningCopyForward) {
  if (isListening()) return true;
  if (notifyRunningInstance(2000, bringRunningCopyForward)) return false;
  // Nobody answers: whatever socket file is there was left by a copy that is gone.
  QLocalServer::removeServer(path_);
  server_ = new QLocalServer(this);
  server_->setSocketOptions(QLocalServer::UserAccessOption);
  if (!server_->listen(path_)) {
    // Another copy may have won the race to listen a moment ago.
    if (notifyRunningInstance(2000, bringRunningCopyForward)) return false;
    qCWarning(lcApp, "Could not listen on %s: %s", qPrintable(path_), qPrintable(server_->errorString()));
    return true;  // run unguarded rather than not at all
  }
  connect(server_, &QLocalServer::newConnection, this, &WTSingleInstance::acceptConnections);
  return true;
}

bool WTSingleInstance::notifyRunningInstance(int timeoutMs, bool reopen) const {
  QLocalSocket socket;
  socket.connectToServer(path_);
  // A socket left by a copy that died refuses the connection; one that is accepted has a live copy
  // behind it, even one too busy to answer soon (a long save): that copy keeps the store.
  if (!socket.waitForConnected(timeoutMs)) return false;
  socket.write(reopen ? kReopen : kPing);
  if (socket.waitForBytesWritten(timeoutMs)) {
    while (socket.bytesAvailable() < kAcknowledged.size() && socket.waitForReadyRead(timeoutMs)) {
    }
  }
  return true;
}

WTSingleInstance::Forwarded WTSingleInstance::sendRequest(const QJsonObject& request, int replyTimeoutMs) const {
  Forwarded forwarded;
  QLocalSocket socket;
  socket.connectToServer(path_);
  if (!socket.waitForConnected(2000)) return forwarded;
  forwarded.reached = true;
  socket.write(kRun + jsonLine(request));
  const QDeadlineTimer deadline(replyTimeoutMs);
  if (!socket.waitForBytesWritten(replyTimeoutMs)) return forwarded;
  while (!socket.canReadLine()) {
    if (deadline.hasExpired() || socket.state() != QLocalSocket::ConnectedState ||
        !socket.waitForReadyRead(int(deadline.remainingTime())))
      break;
  }
  if (!socket.canReadLine()) return forwarded;
  const QJsonDocument reply = QJsonDocument::fromJson(socket.readLine());
  if (reply.isObject()) forwarded.reply = reply.object();
  return forwarded;
}

void WTSingleInstance::acceptConnections() {
  while (QLocalSocket* socket = server_->nextPendingConnection()) {
    connect(socket, &QLocalSocket::disconnected, socket, &QObject::deleteLater);
    connect(socket, &QLocalSocket::readyRead, this, [this, socket] {
      if (!socket->canReadLine()) {
        if (socket->bytesAvailable() > kMaxLine) socket->abort();
        return;
      }
      const QByteArray line = socket->readLine(kMaxLine + 1);
      if (line == kReopen || line == kPing) {
        socket->write(kAcknowledged);
        socket->flush();
        if (line == kReopen) emit reopenRequested();
      } else if (line.startsWith(kRun) && requestHandler_) {
        const QJsonDocument request = QJsonDocument::fromJson(line.mid(kRun.size()));
        if (request.isObject()) {
          socket->write(jsonLine(requestHandler_(request.object())));
          socket->flush();
        }
      }
      socket->disconnectFromServer();
    });
  }
}
