#include "WTQtKeychain.h"

#include <qt6keychain/keychain.h>

#include <QFileInfo>
#include <QTimer>

#include <memory>

struct WTQtKeychain::Outcome {
  Error error;  // code 0: done
  QString text;
};

namespace {

// A unix socket address whose file is missing reaches nobody; any other address may reach a bus.
bool addressMayReachABus(const QString& address) {
  const QString path = QStringLiteral("path=");
  if (!address.startsWith(QLatin1String("unix:"))) return true;
  for (const QString& part : address.mid(5).split(u',')) {
    if (part.startsWith(path)) return QFileInfo::exists(part.mid(path.size()));
  }
  return true;
}

// QtKeychain runs its jobs one after another, in the whole process: the number of them that timed out
// and have not ended since.
int stuckJobs = 0;

Error errorOf(const QKeychain::Job& job) {
  if (job.error() == QKeychain::EntryNotFound) return {WTKeychain::EntryNotFound, job.errorString()};
  return {WTKeychain::Unavailable, job.errorString()};
}

}  // namespace

WTQtKeychain::WTQtKeychain(const QString& service, int timeoutMilliseconds)
    : service_(service), timeoutMs_(timeoutMilliseconds), receiver_(std::make_unique<QObject>()) {}

WTQtKeychain::~WTQtKeychain() = default;

bool WTQtKeychain::sessionBusReachable() {
  const QString addresses = qEnvironmentVariable("DBUS_SESSION_BUS_ADDRESS");
  if (addresses.isEmpty()) {
    const QString runtime = qEnvironmentVariable("XDG_RUNTIME_DIR");
    return !runtime.isEmpty() && QFileInfo::exists(runtime + QStringLiteral("/bus"));
  }
  for (const QString& address : addresses.split(u';', Qt::SkipEmptyParts)) {
    if (addressMayReachABus(address)) return true;
  }
  return false;
}

void WTQtKeychain::run(QKeychain::Job* job, std::function<void(const Outcome&)> done) {
  if (!sessionBusReachable()) {
    delete job;
    return done({{NoSession, QStringLiteral("No session bus")}, {}});
  }
  if (stuckJobs > 0) {
    delete job;
    return done(
        {{Unavailable, QStringLiteral("The secret service has not answered an earlier request")}, {}});
  }
  // The job deletes itself when it finishes, even after the timeout: deleting it earlier would pull it
  // from under a D-Bus call still in flight.
  job->setAutoDelete(true);
  struct State {
    bool answered = false;
    bool timedOut = false;
  };
  auto state = std::make_shared<State>();
  // Whoever made it, a job that timed out holds up every later one until it ends.
  QObject::connect(job, &QKeychain::Job::finished, job, [state] {
    if (state->timedOut) --stuckJobs;
  });
  auto* timer = new QTimer(receiver_.get());
  timer->setSingleShot(true);
  QObject::connect(job, &QKeychain::Job::finished, receiver_.get(),
                   [state, timer, done](QKeychain::Job* job) {
                     if (state->answered) return;
                     state->answered = true;
                     timer->deleteLater();
                     Outcome outcome;
                     if (job->error() != QKeychain::NoError) outcome.error = errorOf(*job);
                     if (auto* read = qobject_cast<QKeychain::ReadPasswordJob*>(job))
                       outcome.text = read->textData();
                     done(outcome);
                   });
  QObject::connect(timer, &QTimer::timeout, receiver_.get(), [this, state, timer, done] {
    if (state->answered) return;
    state->answered = state->timedOut = true;
    ++stuckJobs;
    timer->deleteLater();
    done({{Unavailable,
           QStringLiteral("The secret service did not answer within %1 seconds").arg(timeoutMs_ / 1000.0)},
          {}});
  });
  timer->start(timeoutMs_);
  job->start();
}

void WTQtKeychain::readPassword(const QString& key, ReadHandler done) {
  auto* job = new QKeychain::ReadPasswordJob(service_);
  job->setKey(key);
  run(job, [done](const Outcome& outcome) {
    if (outcome.error.code != 0) return done(outcome.error);
    done(outcome.text);
  });
}

void WTQtKeychain::writePassword(const QString& key, const QString& password, DoneHandler done) {
  auto* job = new QKeychain::WritePasswordJob(service_);
  job->setKey(key);
  job->setTextData(password);
  run(job, [done](const Outcome& outcome) {
    if (outcome.error.code != 0) return done(outcome.error);
    done({});
  });
}

void WTQtKeychain::deletePassword(const QString& key, DoneHandler done) {
  auto* job = new QKeychain::DeletePasswordJob(service_);
  job->setKey(key);
  run(job, [done](const Outcome& outcome) {
    if (outcome.error.code != 0 && outcome.error.code != EntryNotFound) return done(outcome.error);
    done({});
  });
}
