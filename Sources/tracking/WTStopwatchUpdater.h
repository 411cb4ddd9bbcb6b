#pragma once

#include "Date.h"
#include "WTTrackingAlert.h"

#include <QList>
#include <QObject>
#include <QSet>
#include <QTimer>

#include <functional>
#include <optional>

class UserDefaults;
class WTIdleSource;
class WTLauncherEntry;
class WTObject;
class WTObjectContext;
class WTSleepMonitor;
class WTTime;

// Keeps running time entries alive on screen. One tick every 5 seconds for the life of the application,
// and one at once whenever the set of running entries changes: it offers to take idle time off the
// running timers, totals them, lets each refresh its minute count, sets the badge, schedules the next
// tick and announces stopwatchDidUpdate. Sleep stops the ticking and waking ticks at once; the time
// asleep counts as idle. At quitting it asks whether to stop the running timers.
//
// Wiring (the application delegate): make it over the context once the store is attached, hand it the
// idle source, the alert presenter, the sleep monitor, the launcher entry and the save callback, call
// start(), and call applicationWillTerminate() from the window's Quit and sessionWillEnd() from
// QGuiApplication::commitDataRequest. Destroy it before the context. Main thread only.
class WTStopwatchUpdater : public QObject {
  Q_OBJECT
 public:
  static constexpr int kTickMilliseconds = 5000;
  // A tick this much later than it was due means the machine slept without telling us.
  static constexpr double kUnannouncedSleepSeconds = 60.0;

  // None of the arguments is owned; `context` and `defaults` must outlive the updater. `idle` may be null
  // (no idle time is known then: -1), as may `presenter` (then no question is asked: the default button
  // stands).
  WTStopwatchUpdater(WTObjectContext* context, UserDefaults* defaults, WTIdleSource* idle,
                     WTTrackingAlertPresenter* presenter, QObject* parent = nullptr);
  ~WTStopwatchUpdater() override;

  // Optional parts, set before start(). The monitor's and the entry's lifetimes are the caller's.
  void setSleepMonitor(WTSleepMonitor* monitor);
  void setLauncherEntry(WTLauncherEntry* entry) { launcherEntry_ = entry; }
  // Saves the context the way the delegate does (committing an edit in progress); returns success.
  void setSaveCallback(std::function<bool()> save) { save_ = std::move(save); }

  // Finds the running entries of the store and ticks for the first time.
  void start();

  // The running entries, in the order they started running.
  const QList<WTTime*>& times() const { return times_; }
  // Minutes of the running entries summed at the last tick.
  qint64 totalActiveDuration() const { return totalActiveDuration_; }
  // The running total as duration text ("01:15"), empty when nothing runs.
  QString badgeLabel() const { return badgeLabel_; }
  // `base` with the running total after a dash ("Tessal — 01:15"), or `base` alone when nothing runs.
  QString windowTitle(const QString& base) const;
  // Whether a tick is pending (false while asleep, before start() and inside a tick).
  bool isTicking() const { return timer_.isActive(); }

 public slots:
  // One tick.
  void update();
  // Sleep is coming: no tick until waking; remembers when sleep began.
  void receiveSleepNote(const QString& name);
  // Awake again: ticks at once, counting the time asleep as idle.
  void receiveWakeNote(const QString& name);
  // The quit prompt: with timers running, asks whether to stop them; "Stop" stops every one and saves.
  void applicationWillTerminate();
  // The session is ending: no question can be asked, so the timers stay running and are saved so.
  void sessionWillEnd();

 signals:
  // After every tick; read times() and totalActiveDuration() from the updater.
  void stopwatchDidUpdate(WTStopwatchUpdater* updater);
  // When badgeLabel() changed (empty: the badge went away).
  void badgeDidChange(const QString& label);

 private:
  void processIdleTime();
  void updateBadge();
  void objectValueDidChange(WTObject* object, const QString& key);
  void objectsDidChange(const QList<WTObject*>& inserted, const QList<WTObject*>& updated,
                        const QList<WTObject*>& deleted);
  void noteCandidate(WTObject* object);
  void scheduleReconcile();
  // Brings times() in line with the entries that changed; returns whether the set changed, and sets
  // `moved` when an entry that runs on changed (its start, and so its minutes).
  bool reconcile(bool* moved = nullptr);
  // The running entries' total and the badge, as a tick sets them.
  void sumRunningTimes();

  WTObjectContext* context_;
  UserDefaults* defaults_;
  WTIdleSource* idle_;
  WTTrackingAlertPresenter* presenter_;
  WTSleepMonitor* sleepMonitor_ = nullptr;
  WTLauncherEntry* launcherEntry_ = nullptr;
  std::function<bool()> save_;

  QTimer timer_;
  QList<WTTime*> times_;
  QSet<WTTime*> candidates_;
  bool reconcileScheduled_ = false;
  bool started_ = false;
  bool alertOpen_ = false;
  qint64 totalActiveDuration_ = 0;
  QString badgeLabel_;
  // The number of running timers the launcher's entry last showed.
  qsizetype launcherCount_ = 0;
  // When the pending tick is due; a tick far later than this found an unannounced sleep.
  std::optional<Date> tickDue_;
  std::optional<Date> scheduledAt_;
  // When the machine went to sleep, until the idle check after waking has used it.
  std::optional<Date> sleepBegan_;
};
