#include "RZSyncNetwork.h"

#include "RZSyncJSON.h"
#include "TessalLogging.h"

#include <QNetworkAccessManager>
#include <QNetworkReply>
#include <QNetworkRequest>
#include <QtDebug>

RZSyncNetwork::RZSyncNetwork(const QUrl& url, RZSyncNetworkDelegate* delegate, QObject* parent)
    : QObject(parent), url_(url), delegate_(delegate), manager_(new QNetworkAccessManager(this)) {}

RZSyncNetwork::~RZSyncNetwork() {
  if (reply_) {
    reply_->disconnect(this);
    reply_->abort();
  }
}

QString RZSyncNetwork::user() {
  if (!user_.isEmpty()) return user_;
  return credentialDelegate_ ? credentialDelegate_->syncNetworkRequestsUser(this) : QString();
}

QString RZSyncNetwork::password() {
  if (!password_.isEmpty()) return password_;
  return credentialDelegate_ ? credentialDelegate_->syncNetworkRequestsPassword(this) : QString();
}

bool RZSyncNetwork::hasCredentials() {
  return !user().trimmed().isEmpty() && !password().trimmed().isEmpty();
}

void RZSyncNetwork::postJSONObject(const QVariant& data, const QString& action, qint64 iteration) {
  Q_ASSERT_X(networkAction_ == Idle, "RZSyncNetwork", "line 41: a request is already in flight");
  if (networkAction_ != Idle) {
    qCWarning(lcSync, "RZSyncNetwork: a request is already in flight; the new one is refused");
    return;
  }
  // QString::trimmed drops white space and line breaks alike.
  const QString user = this->user().trimmed();
  const QString password = this->password().trimmed();
  if (user.isEmpty() || password.isEmpty() || !url_.isValid()) return;

  QVariantMap body{{QStringLiteral("user"), user},
                   {QStringLiteral("password"), password},
                   {QStringLiteral("action"), action},
                   {QStringLiteral("iteration"), iteration}};
  if (!device_.isEmpty()) body.insert(QStringLiteral("device"), device_);
  if (data.isValid()) body.insert(QStringLiteral("data"), data);
  const QByteArray bytes = RZSyncJSON::write(body, RZSyncJSON::Style::Pretty);

  QNetworkRequest request(url_);
  request.setTransferTimeout(timeoutMs_);
  // The body carries the password: it goes to the configured address and nowhere a redirect points.
  request.setAttribute(QNetworkRequest::RedirectPolicyAttribute, QNetworkRequest::ManualRedirectPolicy);
  request.setRawHeader("Accept", "application/json");
  request.setRawHeader("Content-Type", "application/json");
  request.setRawHeader("Content-Length", QByteArray::number(bytes.size()));
  QNetworkReply* reply = manager_->post(request, bytes);
  if (!reply) return;
  reply_ = reply;
  responseData_.clear();
  networkAction_ = Busy;
  connect(reply, &QNetworkReply::metaDataChanged, this, &RZSyncNetwork::replyMetaDataChanged);
  connect(reply, &QNetworkReply::redirected, this, &RZSyncNetwork::replyMetaDataChanged);
  connect(reply, &QNetworkReply::readyRead, this, &RZSyncNetwork::replyReadyRead);
  connect(reply, &QNetworkReply::finished, this, &RZSyncNetwork::replyFinished);
}

void RZSyncNetwork::replyMetaDataChanged() {
  // A new response (after a redirect, say) starts the body over.
  responseData_.clear();
  if (!reply_) return;
  const QVariant length = reply_->header(QNetworkRequest::ContentLengthHeader);
  if (length.isValid() && length.toLongLong() > maxReplyBytes_) refuseOversizedReply();
}

void RZSyncNetwork::replyReadyRead() {
  if (!reply_) return;
  responseData_.append(reply_->readAll());
  if (responseData_.size() > maxReplyBytes_) refuseOversizedReply();
}

void RZSyncNetwork::refuseOversizedReply() {
  // Counted as it arrives, whatever the headers claimed: no answer of this protocol is that large.
  QNetworkReply* reply = std::exchange(reply_, nullptr);
  reply->disconnect(this);
  reply->abort();
  reply->deleteLater();
  responseData_.clear();
  networkAction_ = Idle;
  const QString error = QStringLiteral("The server's reply is larger than %1 bytes.").arg(maxReplyBytes_);
  qCWarning(lcSync).noquote() << error;
  if (delegate_) delegate_->syncNetworkDidFailWithError(this, error);
}

void RZSyncNetwork::replyFinished() {
  QNetworkReply* reply = reply_;
  if (!reply) return;
  if (reply->isOpen()) responseData_.append(reply->readAll());
  reply_ = nullptr;
  reply->deleteLater();
  networkAction_ = Idle;

  // Any HTTP answer counts as a reply whatever its status: an error page fails at parsing below, and a
  // JSON body is the server's word. Only a failure to get an answer at all is a transport failure.
  const bool answered = reply->attribute(QNetworkRequest::HttpStatusCodeAttribute).isValid();
  if (reply->error() != QNetworkReply::NoError && !answered) {
    QString error = reply->errorString();
    // An address without a scheme is taken as https; a server on plain HTTP answers the handshake with
    // what no TLS library can read.
    if (reply->error() == QNetworkReply::SslHandshakeFailedError)
      error += QStringLiteral(" (if the server speaks plain HTTP, its address starts with “http://”)");
    // The delegate says it where a person sees it; the log keeps the detail only for debugging.
    qCDebug(lcSync).noquote() << QStringLiteral("Connection failed: %1").arg(error);
    responseData_.clear();
    if (delegate_) delegate_->syncNetworkDidFailWithError(this, error);
    return;
  }

  const QByteArray body = std::exchange(responseData_, {});
  const int status = reply->attribute(QNetworkRequest::HttpStatusCodeAttribute).toInt();
  if (status >= 300 && status < 400) {
    // Never followed (see postJSONObject), whatever its body says.
    const QString target = reply->header(QNetworkRequest::LocationHeader).toUrl().toString();
    const QString error =
        QStringLiteral("The server answered HTTP %1, a redirect to %2, which is not followed.")
            .arg(status)
            .arg(target.isEmpty() ? QStringLiteral("nowhere") : target);
    qCWarning(lcSync).noquote() << error;
    if (delegate_) delegate_->syncNetworkDidFailWithError(this, error);
    return;
  }
  QString error;
  const std::optional<QVariant> object = RZSyncJSON::parse(body, &error, maxReplyValues_);
  if (object && RZSyncJSON::isContainer(*object)) {
    if (delegate_) delegate_->syncNetworkReceivedJSONObject(this, *object);
    return;
  }
  if (object) error = QStringLiteral("The reply is not a JSON object or array.");
  if (status != 200) {
    // A plain-text answer (a proxy's or the server's "try again later") says more than the parser.
    QString text = QString::fromUtf8(body).simplified().left(200);
    // A bare "404" says no more than the status.
    if (text == QString::number(status)) text.clear();
    if (text.isEmpty() && status == 404) text = QStringLiteral("there is no sync service at this address");
    error = QStringLiteral("The server answered HTTP %1: %2").arg(status).arg(text.isEmpty() ? error : text);
  }
  if (delegate_) delegate_->syncNetworkDidFailWithError(this, error);
}
