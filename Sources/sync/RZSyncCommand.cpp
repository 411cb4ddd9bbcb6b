#include "RZSyncCommand.h"

#include "RZSyncManager.h"

#include <QEventLoop>
#include <QTimer>

int runSyncCommand(RZSyncManager& manager, const QStringList& arguments, QTextStream& out, QTextStream& err) {
  int timeoutSeconds = 120;
  QString problem;
  for (qsizetype i = 0; problem.isEmpty() && i < arguments.size(); ++i) {
    if (arguments[i] != QLatin1String("--timeout")) {
      problem = QStringLiteral("unexpected “%1”").arg(arguments[i]);
      continue;
    }
    bool ok = false;
    timeoutSeconds = i + 1 < arguments.size() ? arguments[++i].toInt(&ok) : 0;
    if (!ok || timeoutSeconds < 1)
      problem = QStringLiteral("--timeout takes a whole number of seconds, 1 or more");
  }
  if (!problem.isEmpty()) {
    err << "tessal: " << problem << "\nusage: tessal sync [--timeout SECONDS]\n";
    err.flush();
    return 2;
  }

  RZSyncNetwork& network = *manager.syncNetwork();
  const QUrl endpoint = manager.configuredEndpoint();
  if (!endpoint.isValid()) {
    err << "No sync server is set: enter its address in Tessal's Preferences (Edit › Preferences…), or "
           "without a desktop under \"WTSyncServer\" in the settings file.\n";
    err.flush();
    return 1;
  }
  if (!network.hasCredentials()) {
    err << "No sync account is set: enter it in Tessal's Preferences (Edit › Preferences…), or without a "
           "desktop under \"WTSyncUser\" and \"WTSyncPassword\" in the settings file.\n";
    err.flush();
    return 1;
  }

  QEventLoop loop;
  int exitCode = 0;
  QString message;
  auto stop = [&](int code, const QString& text) {
    exitCode = code;
    message = text;
    loop.exit(code);
  };
  // Polls again as soon as an exchange is over, until one finds nothing to send and nothing to receive.
  const QMetaObject::Connection connection = QObject::connect(
      &manager, &RZSyncManager::exchangeDidFinish, &loop, [&](const RZSyncExchange& exchange) {
        switch (exchange.outcome) {
          case RZSyncExchange::Outcome::Refused:
            return stop(1, QStringLiteral("The server refused: %1").arg(exchange.message));
          case RZSyncExchange::Outcome::Failed:
            return stop(1,
                        QStringLiteral("Sync with %1 failed: %2").arg(endpoint.toString(), exchange.message));
          case RZSyncExchange::Outcome::Answered:
            break;
        }
        if (network.networkAction() != RZSyncNetwork::Idle) return;  // a save follows
        RZSyncTrack* track = manager.syncTrack();
        if (exchange.action == QLatin1String("head") && !exchange.receivedChanges && track &&
            !track->hasChanges()) {
          return stop(0, QStringLiteral("In step with %1 at iteration %2.")
                             .arg(endpoint.toString())
                             .arg(track->iteration()));
        }
        QTimer::singleShot(0, &manager, [&manager] { manager.sync(); });
      });
  QTimer::singleShot(timeoutSeconds * 1000, &loop, [&] {
    stop(1, QStringLiteral("Not in step with the server after %1 seconds.").arg(timeoutSeconds));
  });
  // A request of the manager's own may be on its way; its answer then starts the loop above.
  if (network.networkAction() == RZSyncNetwork::Idle)
    QTimer::singleShot(0, &manager, [&manager] { manager.sync(); });
  loop.exec();
  QObject::disconnect(connection);

  if (exitCode == 0) {
    out << message << '\n';
    out.flush();
  } else {
    err << message << '\n';
    err.flush();
  }
  return exitCode;
}
