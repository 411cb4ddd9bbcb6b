#pragma once

#include <QByteArray>
#include <QJsonObject>
#include <QString>

#include <optional>

// The side of the one-copy-per-user socket a command needs: whether the desktop copy runs, and handing it
// a request to carry out. Plain local-socket calls, so that a command loads no network library; the
// desktop's listening side (WTSingleInstance) speaks the same lines.
class WTSingleInstanceClient {
 public:
  // The lines on the socket. A request is "run " and one line of compact JSON; so is its answer.
  static inline const QByteArray kReopen = "reopen\n";
  static inline const QByteArray kPing = "ping\n";
  static inline const QByteArray kAcknowledged = "ok\n";
  static inline const QByteArray kRun = "run ";

  // `serverPath` empty: defaultPath().
  explicit WTSingleInstanceClient(const QString& serverPath = {});

  // "$XDG_RUNTIME_DIR/tessal.socket" (the temporary folder without a runtime folder, with the user's
  // name in it there).
  static QString defaultPath();
  QString serverPath() const { return path_; }

  // Asks the running copy to come forward (or, with `reopen` false, only whether it is there). True when
  // a copy is there: it accepted the connection, whether or not it acknowledged within `timeoutMs`.
  bool notifyRunningInstance(int timeoutMs = 2000, bool reopen = true) const;

  // Carries out a request in the running copy: sends it and waits up to `replyTimeoutMs` for the reply.
  // `reached` is false when no copy listens (nothing was sent); `reply` is empty when the copy took the
  // request but gave no answer in time or could not carry out requests.
  struct Forwarded {
    bool reached = false;
    std::optional<QJsonObject> reply;
  };
  Forwarded sendRequest(const QJsonObject& request, int replyTimeoutMs) const;

 private:
  QString path_;
};
