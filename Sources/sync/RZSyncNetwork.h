#pragma once

#include <QByteArray>
#include <QObject>
#include <QPointer>
#include <QString>
#include <QUrl>
#include <QVariant>

#include <cstddef>

class QNetworkAccessManager;
class QNetworkReply;
class RZSyncNetwork;

// Receives the outcome of each request, on the main thread, after the client is idle again (so it may
// send the next request from inside the call).
class RZSyncNetworkDelegate {
 public:
  virtual ~RZSyncNetworkDelegate() = default;
  // The reply parsed as JSON: always a QVariantMap or a QVariantList (see RZSyncJSON.h).
  virtual void syncNetworkReceivedJSONObject(RZSyncNetwork* network, const QVariant& object) = 0;
  // The transport failed, or the reply was not a JSON object or array. `error` describes it.
  virtual void syncNetworkDidFailWithError(RZSyncNetwork* network, const QString& error) = 0;
};

// Supplies the account when the client's own fields are empty (the application delegate reads the
// user defaults "WTSyncUser" and "WTSyncPassword"). An empty answer means none.
class RZSyncNetworkCredentialDelegate {
 public:
  virtual ~RZSyncNetworkCredentialDelegate() = default;
  virtual QString syncNetworkRequestsUser(RZSyncNetwork* network) = 0;
  virtual QString syncNetworkRequestsPassword(RZSyncNetwork* network) = 0;
};

// Sends one JSON request at a time to the sync endpoint and hands the parsed reply, or the failure, to
// its delegate. Main thread only; neither delegate is owned.
class RZSyncNetwork : public QObject {
  Q_OBJECT
 public:
  enum NetworkAction { Idle = 0, Busy = 1 };

  RZSyncNetwork(const QUrl& url, RZSyncNetworkDelegate* delegate, QObject* parent = nullptr);
  ~RZSyncNetwork() override;

  QUrl url() const { return url_; }
  void setUrl(const QUrl& url) { url_ = url; }
  void setDelegate(RZSyncNetworkDelegate* delegate) { delegate_ = delegate; }
  void setCredentialDelegate(RZSyncNetworkCredentialDelegate* delegate) { credentialDelegate_ = delegate; }

  // The explicit account fields when set (not empty), else the credential delegate's answer, else empty.
  QString user();
  QString password();
  void setUser(const QString& user) { user_ = user; }
  void setPassword(const QString& password) { password_ = password; }
  // Both user and password are non-empty once trimmed of white space and line breaks.
  bool hasCredentials();

  // The installation's identity, sent as "device" with every request when not empty, so the server
  // does not send this installation its own changes back.
  QString device() const { return device_; }
  void setDevice(const QString& device) { device_ = device; }

  // How long a request may wait for the next byte before it fails; 60 seconds unless changed.
  void setTimeoutMilliseconds(int milliseconds) { timeoutMs_ = milliseconds; }

  // Sends {"user", "password", "action", "iteration", "device", "data"} (no "data" when `data` is null).
  // Sending while a request is in flight is a programming error: check networkAction() first. Without
  // credentials, or without a valid url, nothing is sent and the delegate hears nothing.
  void postJSONObject(const QVariant& data, const QString& action, qint64 iteration);
  // Idle (0), or Busy (1) while a request is in flight.
  int networkAction() const { return networkAction_; }

  // A reply larger than this fails the exchange and is not read further (64 MiB unless changed).
  static constexpr qsizetype kMaxReplyBytes = qsizetype(64) << 20;
  void setMaxReplyBytes(qsizetype bytes) { maxReplyBytes_ = bytes; }
  // A reply of more JSON values than this fails the exchange before it is built (see RZSyncJSON::parse).
  // The largest honest reply is a first "head" of a large account: the benchmarks' 100,550 records with
  // every value set come to about 1.1 million values (a record's object and its at most ten values).
  // Twice that leaves room, and caps what 64 MiB of tiny containers can become at about 250 MB.
  static constexpr std::size_t kMaxReplyValues = 2'000'000;
  void setMaxReplyValues(std::size_t values) { maxReplyValues_ = values; }

 private:
  void replyMetaDataChanged();
  void replyReadyRead();
  void replyFinished();
  void refuseOversizedReply();

  QUrl url_;
  RZSyncNetworkDelegate* delegate_;
  RZSyncNetworkCredentialDelegate* credentialDelegate_ = nullptr;
  QString user_;
  QString password_;
  QString device_;
  int timeoutMs_ = 60000;
  qsizetype maxReplyBytes_ = kMaxReplyBytes;
  std::size_t maxReplyValues_ = kMaxReplyValues;
  int networkAction_ = Idle;
  QNetworkAccessManager* manager_;
  QPointer<QNetworkReply> reply_;
  QByteArray responseData_;
};
