#include "WTQtKeychain.h"

#include <qt6keychain/keychain.h>

#include <QEventLoop>
#include <QTimer>

namespace {

struct JobOutcome {
  bool finished = false;
  QKeychain::Error error = QKeychain::NoError;
  QString message;
  QString text;
};

// Starts `job` and waits for it. The job deletes itself when it finishes, even after the timeout:
// deleting it earlier would pull it from under a D-Bus call still in flight.
JobOutcome run(QKeychain::Job* job, int timeoutMs) {
  JobOutcome outcome;
  QEventLoop loop;
  job->setAutoDelete(true);
  // The loop is the connection's context, so a late answer finds nobody listening.
  QObject::connect(job, &QKeychain::Job::finished, &loop, [&](QKeychain::Job* done) {
    outcome.finished = true;
    outcome.error = done->error();
    outcome.message = done->errorString();
    if (auto* read = qobject_cast<QKeychain::ReadPasswordJob*>(done)) outcome.text = read->textData();
    loop.quit();
  });
  QTimer::singleShot(timeoutMs, &loop, &QEventLoop::quit);
  job->start();
  if (!outcome.finished) loop.exec(QEventLoop::ExcludeUserInputEvents);
  return outcome;
}

Error errorOf(const JobOutcome& outcome, int timeoutMs) {
  if (!outcome.finished)
    return {WTKeychain::Unavailable,
            QStringLiteral("The secret service did not answer within %1 seconds").arg(timeoutMs / 1000)};
  if (outcome.error == QKeychain::EntryNotFound) return {WTKeychain::EntryNotFound, outcome.message};
  return {WTKeychain::Unavailable, outcome.message};
}

}  // namespace

WTQtKeychain::WTQtKeychain(const QString& service, int timeoutMilliseconds)
    : service_(service), timeoutMs_(timeoutMilliseconds) {}

Result<QString> WTQtKeychain::readPassword(const QString& key) {
  auto* job = new QKeychain::ReadPasswordJob(service_);
  job->setKey(key);
  const JobOutcome outcome = run(job, timeoutMs_);
  if (outcome.finished && outcome.error == QKeychain::NoError) return outcome.text;
  return errorOf(outcome, timeoutMs_);
}

Result<void> WTQtKeychain::writePassword(const QString& key, const QString& password) {
  auto* job = new QKeychain::WritePasswordJob(service_);
  job->setKey(key);
  job->setTextData(password);
  const JobOutcome outcome = run(job, timeoutMs_);
  if (outcome.finished && outcome.error == QKeychain::NoError) return {};
  return errorOf(outcome, timeoutMs_);
}

Result<void> WTQtKeychain::deletePassword(const QString& key) {
  auto* job = new QKeychain::DeletePasswordJob(service_);
  job->setKey(key);
  const JobOutcome outcome = run(job, timeoutMs_);
  if (outcome.finished && (outcome.error == QKeychain::NoError || outcome.error == QKeychain::EntryNotFound))
    return {};
  return errorOf(outcome, timeoutMs_);
}
