#include "WTStopwatchUpdater.h"

#include "DurationText.h"
#include "KeyPath.h"
#include "SettingsKeys.h"
#include "TessalLogging.h"
#include "UserDefaults.h"
#include "WTIdleSource.h"
#include "WTLauncherEntry.h"
#include "WTObjectContext.h"
#include "WTSleepMonitor.h"
#include "WTTask.h"
#include "WTTime.h"

#include <QDebug>

#include <algorithm>

namespace {

// Translations may carry the minutes as "%ld" (as the text came from), "%d" or "%1"; the English text
// carries none and is shown as it is.
QString formatIdleMessage(QString format, qint64 minutes) {
  const QString number = QString::number(minutes);
  for (const char* placeholder : {"%ld", "%d", "%1"}) {
    const QString token = QLatin1String(placeholder);
    if (format.contains(token)) return format.replace(token, number);
  }
  return format;
}

}  // namespace

WTStopwatchUpdater::WTStopwatchUpdater(WTObjectContext* context, UserDefaults* defaults, WTIdleSource* idle,
                                       WTTrackingAlertPresenter* presenter, QObject* parent)
    : QObject(parent), context_(context), defaults_(defaults), idle_(idle), presenter_(presenter) {
  timer_.setSingleShot(true);
  timer_.setInterval(kTickMilliseconds);
  connect(&timer_, &QTimer::timeout, this, &WTStopwatchUpdater::update);
  connect(context_, &WTObjectContext::objectValueDidChange, this, &WTStopwatchUpdater::objectValueDidChange);
  connect(context_, &WTObjectContext::objectsDidChange, this, &WTStopwatchUpdater::objectsDidChange);
}

WTStopwatchUpdater::~WTStopwatchUpdater() {
  timer_.stop();
}

void WTStopwatchUpdater::setSleepMonitor(WTSleepMonitor* monitor) {
  if (sleepMonitor_) disconnect(sleepMonitor_, nullptr, this, nullptr);
  sleepMonitor_ = monitor;
  if (!monitor) return;
  connect(monitor, &WTSleepMonitor::willSleep, this, &WTStopwatchUpdater::receiveSleepNote);
  connect(monitor, &WTSleepMonitor::didWake, this, &WTStopwatchUpdater::receiveWakeNote);
}

void WTStopwatchUpdater::start() {
  times_ = context_->fetch<WTTime>([](const WTTime* time) { return time->running(); });
  std::sort(times_.begin(), times_.end(), [](const WTTime* a, const WTTime* b) {
    return a->startDate().value_or(Date()) < b->startDate().value_or(Date());
  });
  candidates_.clear();
  started_ = true;
  update();
}

QString WTStopwatchUpdater::windowTitle(const QString& base) const {
  if (badgeLabel_.isEmpty()) return base;
  return base + QStringLiteral(" — ") + badgeLabel_;
}

void WTStopwatchUpdater::update() {
  timer_.stop();
  const Date now = Date::now();
  // A pending tick that comes a minute or more late slept through a suspend nobody announced (a paused
  // virtual machine, no logind): the machine was last seen awake when that tick was scheduled.
  if (tickDue_ && now.timeIntervalSince(*tickDue_) > kUnannouncedSleepSeconds && !sleepBegan_) {
    sleepBegan_ = scheduledAt_;
  }
  tickDue_.reset();
  scheduledAt_.reset();

  processIdleTime();

  sumRunningTimes();
  timer_.start();
  scheduledAt_ = Date::now();
  tickDue_ = scheduledAt_->addingSeconds(kTickMilliseconds / 1000.0);
  emit stopwatchDidUpdate(this);
}

void WTStopwatchUpdater::sumRunningTimes() {
  QVariantList entries;
  entries.reserve(times_.size());
  for (WTTime* time : std::as_const(times_)) entries.append(KeyPath::variantFromObject(time));
  totalActiveDuration_ = KeyPath::valueForKeyPath(entries, u"@sum.duration").toLongLong();

  for (WTTime* time : QList<WTTime*>(times_)) time->peek();

  updateBadge();
}

void WTStopwatchUpdater::processIdleTime() {
  // An alert already open answers for this idle period; a tick that runs meanwhile (the set of running
  // entries changed) asks nothing more.
  if (alertOpen_) return;
  const std::optional<Date> sleepBegan = std::exchange(sleepBegan_, std::nullopt);
  if (times_.isEmpty() || !defaults_ || !defaults_->boolForKey(SettingsKeys::kShouldIdle)) return;

  const qint64 minutes = std::clamp<qint64>(defaults_->integerForKey(SettingsKeys::kIdleTime), -1, 1000000);
  const qint64 threshold = minutes > 0 ? minutes * 60 : 300;

  const Date now = Date::now();
  qint64 idleSeconds = idle_ ? idle_->idleSeconds() : -1;
  // Idle counters restart when the lid opens: the night asleep counts as idle all the same.
  if (sleepBegan) idleSeconds = std::max(idleSeconds, qint64(now.timeIntervalSince(*sleepBegan)));
  if (idleSeconds < threshold) return;

  const Date idleStart = now.addingSeconds(-double(idleSeconds));
  if (!presenter_) return;
  const WTTrackingAlert alert{
      formatIdleMessage(tr("Idle time"), idleSeconds / 60),
      tr("Would you like to substract the idle time and restart the timers?"),
      tr("No"),
      tr("Yes"),
  };
  alertOpen_ = true;
  const WTTrackingAlertAnswer answer = presenter_->runAlert(alert);
  alertOpen_ = false;
  if (answer != WTTrackingAlertAnswer::Alternate) return;

  // The entries may have changed while the question was open.
  reconcile();
  QList<WTTask*> tasks;
  for (WTTime* time : QList<WTTime*>(times_)) {
    const std::optional<Date> start = time->startDate();
    if (!start || !(*start < idleStart)) continue;
    time->setRunning(false);
    time->setEndDate(idleStart);
    if (time->task() && !tasks.contains(time->task())) tasks.append(time->task());
  }
  for (WTTask* task : std::as_const(tasks)) {
    auto* time = WTTime::insertNewObject(context_);
    time->setTask(task);
    time->setRunning(true);
  }
  reconcile();
}

void WTStopwatchUpdater::updateBadge() {
  const QString label = times_.isEmpty() ? QString()
                                         : DurationText::stringWithMinutes(std::int32_t(std::clamp<qint64>(
                                               totalActiveDuration_, INT32_MIN, INT32_MAX)));
  // The launcher's entry carries one piece of information, the number of running timers, and is sent
  // only when that number changes: never for the minutes, and not at start with nothing running, since a
  // launcher starts with no count.
  if (launcherEntry_ && times_.size() != launcherCount_) {
    launcherCount_ = times_.size();
    launcherEntry_->update(launcherCount_);
  }
  if (label == badgeLabel_) return;
  badgeLabel_ = label;
  emit badgeDidChange(label);
}

void WTStopwatchUpdater::receiveSleepNote(const QString& name) {
  qCDebug(lcTracking).noquote() << QStringLiteral("receiveSleepNote: %1").arg(name);
  timer_.stop();
  tickDue_.reset();
  scheduledAt_.reset();
  if (!sleepBegan_) sleepBegan_ = Date::now();
}

void WTStopwatchUpdater::receiveWakeNote(const QString& name) {
  qCDebug(lcTracking).noquote() << QStringLiteral("receiveSleepNote: %1").arg(name);
  update();
}

void WTStopwatchUpdater::applicationWillTerminate() {
  reconcile();
  if (times_.isEmpty() || !presenter_) return;
  const WTTrackingAlert alert{
      tr("Running Timer"),
      tr("Would you like to stop the running timers before quitting?"),
      tr("Stop"),
      tr("Keep running"),
  };
  if (presenter_->runAlert(alert) != WTTrackingAlertAnswer::Default) return;
  for (WTTime* time : QList<WTTime*>(times_)) time->setRunning(false);
  reconcile();
  // A failed save is the delegate's to report at quitting; the entries are stopped in memory either way.
  if (save_) save_();
}

void WTStopwatchUpdater::sessionWillEnd() {
  reconcile();
  if (!times_.isEmpty() && save_) save_();
}

void WTStopwatchUpdater::objectValueDidChange(WTObject* object, const QString& key) {
  if (object->entity() == WTEntity::Time && key == QLatin1String("running")) noteCandidate(object);
}

void WTStopwatchUpdater::objectsDidChange(const QList<WTObject*>& inserted, const QList<WTObject*>& updated,
                                          const QList<WTObject*>& deleted) {
  for (const QList<WTObject*>* list : {&inserted, &updated, &deleted}) {
    for (WTObject* object : *list) {
      if (object->entity() == WTEntity::Time) noteCandidate(object);
    }
  }
}

void WTStopwatchUpdater::noteCandidate(WTObject* object) {
  candidates_.insert(static_cast<WTTime*>(object));
  scheduleReconcile();
}

void WTStopwatchUpdater::scheduleReconcile() {
  if (reconcileScheduled_) return;
  reconcileScheduled_ = true;
  // Once the present event has finished changing things, so that a burst of changes gives one tick.
  QMetaObject::invokeMethod(
      this,
      [this] {
        reconcileScheduled_ = false;
        bool moved = false;
        if (reconcile(&moved) && started_) {
          update();
        } else if (moved && started_) {
          sumRunningTimes();
          emit stopwatchDidUpdate(this);
        }
      },
      Qt::QueuedConnection);
}

bool WTStopwatchUpdater::reconcile(bool* moved) {
  if (candidates_.isEmpty()) return false;
  const QSet<WTTime*> candidates = std::exchange(candidates_, {});
  bool changed = false;
  for (WTTime* time : candidates) {
    // A deleted entry is no longer the context's under its identity, whether or not it was ever saved.
    const bool running = time->running() && context_->objectWithUUID(time->uuid()) == time;
    const qsizetype index = times_.indexOf(time);
    if (running && index < 0) {
      times_.append(time);
      changed = true;
    } else if (!running && index >= 0) {
      times_.removeAt(index);
      changed = true;
    } else if (running && moved) {
      *moved = true;  // its start may have moved: what it adds up to shows now, not at the next tick
    }
  }
  return changed;
}
