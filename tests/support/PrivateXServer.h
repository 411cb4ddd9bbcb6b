#pragma once
// An X server (Xvfb) of one test's own, for tests that need a real display.
#include <QProcess>
#include <QProcessEnvironment>
#include <QStandardPaths>
#include <QString>
#include <QStringList>

// Xvfb picks a free display itself (-displayfd), so tests side by side never share one.
class PrivateXServer {
 public:
  explicit PrivateXServer(const QString& screen = QStringLiteral("1280x800x24")) {
    if (QStandardPaths::findExecutable(QStringLiteral("Xvfb")).isEmpty()) return;
    server_.start("Xvfb", {"-displayfd", "1", "-screen", "0", screen, "-nolisten", "tcp"});
    if (!server_.waitForStarted(5000)) return;
    // The number is written once the server listens.
    QByteArray said;
    while (!said.contains('\n') && server_.waitForReadyRead(15000)) said += server_.readAllStandardOutput();
    if (!said.trimmed().isEmpty()) display_ = ":" + QString::fromLatin1(said).trimmed();
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
    environment.insert("DISPLAY", display_);
    return environment;
  }
  // Runs xdotool on this display; what it printed, or an empty string when it failed or hung.
  QString xdotool(const QStringList& arguments) const {
    QProcess process;
    process.setProcessEnvironment(environment());
    process.start("xdotool", arguments);
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
