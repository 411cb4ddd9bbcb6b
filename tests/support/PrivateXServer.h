#pragma once
// An X server (Xvfb) of one test's own, for tests that need a real display.
#include <QProcess>
#include <QProcessEnvironment>
#include <QStandardPaths>
#include <QString>
#include <QStringList>

// Xvfb chooses a free display number itself and tells it on its output (-displayfd), so tests that run
// side by side never guess the same number, nor connect to a server another test is about to stop.
class PrivateXServer {
 public:
  explicit PrivateXServer(const QString& screen = QStringLiteral("1280x800x24")) {
    if (QStandardPaths::findExecutable(QStringLiteral("Xvfb")).isEmpty()) return;
    server_.start(QStringLiteral("Xvfb"),
                  {QStringLiteral("-displayfd"), QStringLiteral("1"), QStringLiteral("-screen"),
                   QStringLiteral("0"), screen, QStringLiteral("-nolisten"), QStringLiteral("tcp")});
    if (!server_.waitForStarted(5000)) return;
    // The number is written once the server listens.
    QByteArray said;
    while (!said.contains('\n') && server_.waitForReadyRead(15000)) said += server_.readAllStandardOutput();
    const QString number = QString::fromLatin1(said).trimmed();
    if (!number.isEmpty()) display_ = QStringLiteral(":") + number;
  }
  ~PrivateXServer() {
    server_.kill();
    server_.waitForFinished(5000);
  }
  PrivateXServer(const PrivateXServer&) = delete;
  PrivateXServer& operator=(const PrivateXServer&) = delete;

  bool running() const { return !display_.isEmpty(); }
  QString display() const { return display_; }
  // The caller's environment with DISPLAY set to this server.
  QProcessEnvironment environment() const {
    QProcessEnvironment environment = QProcessEnvironment::systemEnvironment();
    environment.insert(QStringLiteral("DISPLAY"), display_);
    return environment;
  }
  // Runs xdotool on this display; what it printed, or an empty string when it failed or hung.
  QString xdotool(const QStringList& arguments) const {
    QProcess process;
    process.setProcessEnvironment(environment());
    process.start(QStringLiteral("xdotool"), arguments);
    if (!process.waitForFinished(10000)) {
      process.kill();
      process.waitForFinished();
      return {};
    }
    return QString::fromUtf8(process.readAllStandardOutput()).trimmed();
  }

 private:
  QProcess server_;
  QString display_;
};
