#pragma once

#include "WTSingleInstanceClient.h"

#include <QJsonObject>
#include <QObject>
#include <QString>

#include <functional>
#include <optional>

class QLocalServer;

// Keeps the application to one running copy per user. The first copy listens on a local socket in the
// user's runtime folder; a later copy finds it there, asks it to come forward and then leaves without
// touching the store. The running copy also carries out requests sent to it (the shell's commands
// that change data, through WTSingleInstanceClient), so that the store keeps one writer.
class WTSingleInstance : public QObject {
  Q_OBJECT
 public:
  // `serverPath` empty: "$XDG_RUNTIME_DIR/tessal.socket" (the temporary folder without a runtime
  // folder), with the user's name in it there.
  explicit WTSingleInstance(const QString& serverPath = {}, QObject* parent = nullptr);
  ~WTSingleInstance() override;

  QString serverPath() const { return path_; }

  // Tries to become the running copy. Returns false when another copy answers; that copy has then
  // been asked to bring its window forward, unless `bringRunningCopyForward` is false (a command-line
  // run that only needs to know). A socket left behind by a copy that died is taken over.
  bool start(bool bringRunningCopyForward = true);
  bool isListening() const;

  // The client side, as a command sees it (WTSingleInstanceClient).
  bool notifyRunningInstance(int timeoutMs = 2000, bool reopen = true) const {
    return client_.notifyRunningInstance(timeoutMs, reopen);
  }
  using Forwarded = WTSingleInstanceClient::Forwarded;
  Forwarded sendRequest(const QJsonObject& request, int replyTimeoutMs) const {
    return client_.sendRequest(request, replyTimeoutMs);
  }

  // What answers requests in this copy, on its thread, between events; without one a request is closed
  // unanswered.
  using RequestHandler = std::function<QJsonObject(const QJsonObject& request)>;
  void setRequestHandler(RequestHandler handler) { requestHandler_ = std::move(handler); }

 signals:
  // Another copy was started: the window should come forward.
  void reopenRequested();

 private:
  void acceptConnections();

  WTSingleInstanceClient client_;
  QString path_;
  QLocalServer* server_ = nullptr;
  RequestHandler requestHandler_;
};
