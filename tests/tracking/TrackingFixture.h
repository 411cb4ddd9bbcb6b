#pragma once

#include "ModelFixture.h"
#include "WTIdleSource.h"
#include "WTStopwatchUpdater.h"
#include "WTTrackingAlert.h"

#include <QCoreApplication>
#include <QElapsedTimer>

#include <deque>
#include <functional>
#include <memory>
#include <ostream>
#include <vector>

// Failures show texts as text.
inline void PrintTo(const QString& text, std::ostream* os) {
  *os << '"' << text.toStdString() << '"';
}

// Answers alerts from a queue (Default when it runs dry) and remembers every alert it was shown.
class ScriptedPresenter final : public WTTrackingAlertPresenter {
 public:
  WTTrackingAlertAnswer runAlert(const WTTrackingAlert& alert) override {
    shown.push_back(alert);
    if (whileOpen) whileOpen();
    const WTTrackingAlertAnswer answer = answers.empty() ? WTTrackingAlertAnswer::Default : answers.front();
    if (!answers.empty()) answers.pop_front();
    return answer;
  }
  // The `index`th alert shown: "title | text | default button | alternate button".
  std::string said(size_t index) const {
    const WTTrackingAlert& a = shown.at(index);
    return QStringList{a.messageText, a.informativeText, a.defaultButton, a.alternateButton}
        .join(" | ")
        .toStdString();
  }
  std::vector<WTTrackingAlert> shown;
  std::deque<WTTrackingAlertAnswer> answers;
  // Runs while the alert is "open", as a dialog's nested event loop would let other things happen.
  std::function<void()> whileOpen;
};

// The system's idle seconds as the test sets them.
class SetIdleSource final : public WTIdleSource {
 public:
  qint64 idleSeconds() override { return ++asked, seconds; }
  qint64 seconds = 0;
  int asked = 0;
};

// The real model over a real store file, the updater over it with a fixed clock.
class TrackingTest : public ModelTest {
 protected:
  void SetUp() override {
    ModelTest::SetUp();
    setNow(berlin(2026, 3, 2, 12, 0, 30));
    updater = std::make_unique<WTStopwatchUpdater>(context.get(), defaults.get(), &idle, &presenter);
    QObject::connect(updater.get(), &WTStopwatchUpdater::stopwatchDidUpdate,
                     [this](WTStopwatchUpdater*) { ++ticks; });
  }
  void TearDown() override {
    updater.reset();
    ModelTest::TearDown();
  }
  // Lets queued work (the context's end of turn, the updater's reaction) run.
  static void settle() {
    for (int i = 0; i < 3; ++i) QCoreApplication::processEvents();
  }
  // The updater's running set once the turn's queued work has run.
  QList<WTTime*> runningNow() {
    settle();
    return updater->times();
  }
  // What the ticker shows: "TICKS ticks, N running, badge "LABEL", ticking|stopped".
  std::string ticker() const {
    return QStringLiteral("%1 ticks, %2 running, badge \"%3\", %4")
        .arg(ticks)
        .arg(updater->times().size())
        .arg(updater->badgeLabel(), updater->isTicking() ? "ticking" : "stopped")
        .toStdString();
  }
  void advance(double seconds) { clockNow = clockNow.addingSeconds(seconds); }
  void turnIdleHandlingOn(int minutes) {
    defaults->setValue("WTShouldIdle", true);
    defaults->setValue("WTIdleTime", minutes);
  }
  WTTime* startTimer(WTTask* task, Date start) {
    auto* time = makeItem<WTTime>(task, start);
    time->setRunning(true);
    return time;
  }
  // Ten tasks "T0".."T9"; Tn's last entry ended n hours after 1 March, so T9 ended last. T1 and T4 run.
  void makeTenTasks() {
    for (int n = 0; n < 10; ++n) {
      tasks.append(makeTask(nullptr, QStringLiteral("T%1").arg(n)));
      makeTime(tasks.last(), berlin(2026, 3, 1, n), berlin(2026, 3, 1, n, 30));
    }
    startTimer(tasks[1], berlin(2026, 3, 2, 11));
    startTimer(tasks[4], berlin(2026, 3, 2, 11, 30));
    settle();
  }

  SetIdleSource idle;
  ScriptedPresenter presenter;
  std::unique_ptr<WTStopwatchUpdater> updater;
  int ticks = 0;
  QList<WTTask*> tasks;  // made by makeTenTasks()
};
