#include "WTSingleInstance.h"
#include "TessalLogging.h"

#include <QJsonDocument>
#include <QLocalServer>
#include <QLocalSocket>

namespace {

using Client = WTSingleInstanceClient;
// Longer lines are no request of ours: the connection is dropped rather than its bytes kept.
constexpr qint64 kMaxLine = 64 * 1024;

}  // namespace

WTSingleInstance::WTSingleInstance(const QString& serverPath, QObject* parent)
    : QObject(parent), client_(serverPath), path_(client_.serverPath()) {}

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

void WTSingleInstance::acceptConnections() {
  while (QLocalSocket* socket = server_->nextPendingConnection()) {
    connect(socket, &QLocalSocket::disconnected, socket, &QObject::deleteLater);
    connect(socket, &QLocalSocket::readyRead, this, [this, socket] {
      if (!socket->canReadLine()) {
        if (socket->bytesAvailable() > kMaxLine) socket->abort();
        return;
      }
      const QByteArray line = socket->readLine(kMaxLine + 1);
      if (line == Client::kReopen || line == Client::kPing) {
        socket->write(Client::kAcknowledged);
        socket->flush();
        if (line == Client::kReopen) emit reopenRequested();
      } else if (line.startsWith(Client::kRun) && requestHandler_) {
        const QJsonDocument request = QJsonDocument::fromJson(line.mid(Client::kRun.size()));
        if (request.isObject()) {
          socket->write(QJsonDocument(requestHandler_(request.object())).toJson(QJsonDocument::Compact) +
                        '\n');
          socket->flush();
        }
      }
      socket->disconnectFromServer();
    });
  }
}
