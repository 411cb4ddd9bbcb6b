#include "WTSingleInstanceClient.h"

#include <QDeadlineTimer>
#include <QDir>
#include <QFile>
#include <QJsonDocument>
#include <QStandardPaths>

#include <cerrno>
#include <cstring>

#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

namespace {

// One connection to the listening copy; closed when it goes.
class Connection {
 public:
  // A socket left by a copy that died refuses the connection; one that is accepted has a live copy
  // behind it, even one too busy to answer soon (a long save): that copy keeps the store.
  explicit Connection(const QString& path) {
    const QByteArray name = QFile::encodeName(path);
    sockaddr_un address{};
    if (name.size() >= qsizetype(sizeof(address.sun_path))) return;
    address.sun_family = AF_UNIX;
    std::memcpy(address.sun_path, name.constData(), size_t(name.size()));
    fd_ = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (fd_ < 0) return;
    int result;
    do {
      result = ::connect(fd_, reinterpret_cast<const sockaddr*>(&address), sizeof(address));
    } while (result < 0 && errno == EINTR);
    if (result < 0) close();
  }
  ~Connection() { close(); }
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;

  bool connected() const { return fd_ >= 0; }

  bool write(const QByteArray& bytes, const QDeadlineTimer& deadline) {
    qsizetype written = 0;
    while (written < bytes.size()) {
      if (!wait(POLLOUT, deadline)) return false;
      const ssize_t n =
          ::send(fd_, bytes.constData() + written, size_t(bytes.size() - written), MSG_NOSIGNAL);
      if (n < 0 && errno == EINTR) continue;
      if (n <= 0) return false;
      written += n;
    }
    return true;
  }

  // Reads until `enough` says the bytes so far suffice, the peer closes or the deadline passes.
  template <typename Enough>
  QByteArray read(const QDeadlineTimer& deadline, Enough enough) {
    QByteArray bytes;
    char buffer[4096];
    while (!enough(bytes) && wait(POLLIN, deadline)) {
      const ssize_t n = ::recv(fd_, buffer, sizeof(buffer), 0);
      if (n < 0 && errno == EINTR) continue;
      if (n <= 0) break;
      bytes.append(buffer, n);
    }
    return bytes;
  }

 private:
  bool wait(short events, const QDeadlineTimer& deadline) {
    pollfd entry{fd_, events, 0};
    for (;;) {
      const int result = ::poll(&entry, 1, int(deadline.remainingTime()));
      if (result < 0 && errno == EINTR) continue;
      return result > 0 && (entry.revents & (events | POLLHUP)) != 0;
    }
  }
  void close() {
    if (fd_ >= 0) ::close(fd_);
    fd_ = -1;
  }

  int fd_ = -1;
};

}  // namespace

WTSingleInstanceClient::WTSingleInstanceClient(const QString& serverPath)
    : path_(serverPath.isEmpty() ? defaultPath() : serverPath) {}

QString WTSingleInstanceClient::defaultPath() {
  QString folder = QStandardPaths::writableLocation(QStandardPaths::RuntimeLocation);
  if (folder.isEmpty()) {
    // No private runtime folder: a shared one, so the user's name keeps users apart.
    return QDir::tempPath() + QStringLiteral("/tessal-") +
           qEnvironmentVariable("USER", QStringLiteral("user")) + QStringLiteral(".socket");
  }
  return folder + QStringLiteral("/tessal.socket");
}

bool WTSingleInstanceClient::notifyRunningInstance(int timeoutMs, bool reopen) const {
  Connection connection(path_);
  if (!connection.connected()) return false;
  const QDeadlineTimer deadline(timeoutMs);
  if (connection.write(reopen ? kReopen : kPing, deadline))
    connection.read(deadline, [](const QByteArray& bytes) { return bytes.size() >= kAcknowledged.size(); });
  return true;
}

WTSingleInstanceClient::Forwarded WTSingleInstanceClient::sendRequest(const QJsonObject& request,
                                                                      int replyTimeoutMs) const {
  Forwarded forwarded;
  Connection connection(path_);
  if (!connection.connected()) return forwarded;
  forwarded.reached = true;
  const QDeadlineTimer deadline(replyTimeoutMs);
  if (!connection.write(kRun + QJsonDocument(request).toJson(QJsonDocument::Compact) + '\n', deadline))
    return forwarded;
  const QByteArray bytes =
      connection.read(deadline, [](const QByteArray& bytes) { return bytes.contains('\n'); });
  const qsizetype end = bytes.indexOf('\n');
  if (end < 0) return forwarded;
  const QJsonDocument reply = QJsonDocument::fromJson(bytes.left(end));
  if (reply.isObject()) forwarded.reply = reply.object();
  return forwarded;
}
