// `tessal start` and `tessal stop` as whole processes, the way a key binding runs them, on a store of
// 200,000 items: once changing the store themselves, once handing the change to a running desktop copy.
#include "LargeStore.h"

#include <benchmark/benchmark.h>

#include <QDir>
#include <QElapsedTimer>
#include <QFile>
#include <QProcess>
#include <QTemporaryDir>
#include <QThread>

#include <memory>

namespace {

constexpr int kCommandStoreItems = 200000;

// One installation with a store of 200,000 items, its own folders, and no display.
class CommandInstallation {
 public:
  static CommandInstallation& instance() {
    static CommandInstallation installation;
    return installation;
  }
  QProcessEnvironment environment() const {
    QProcessEnvironment environment = QProcessEnvironment::systemEnvironment();
    environment.insert("XDG_DATA_HOME", home_.filePath("data"));
    environment.insert("XDG_CONFIG_HOME", home_.filePath("config"));
    environment.insert("XDG_RUNTIME_DIR", home_.filePath("runtime"));
    for (const char* name : {"DISPLAY", "WAYLAND_DISPLAY", "DBUS_SESSION_BUS_ADDRESS"}) environment.remove(name);
    return environment;
  }
  // Runs tessal to its end; false when it failed.
  bool run(const QStringList& arguments) const {
    QProcess process;
    process.setProcessEnvironment(environment());
    process.start(QString::fromUtf8(TESSAL_EXE), arguments);
    return process.waitForFinished(60000) && process.exitStatus() == QProcess::NormalExit && process.exitCode() == 0;
  }
  QString runtimeFolder() const { return home_.filePath("runtime"); }

 private:
  CommandInstallation() {
    for (const char* sub : {"data/Tessal2", "config", "runtime"}) QDir(home_.path()).mkpath(QString::fromLatin1(sub));
    QFile::setPermissions(home_.filePath("runtime"), QFile::ReadOwner | QFile::WriteOwner | QFile::ExeOwner);
    bench::writeStore(home_.filePath("data/Tessal2/Tessal.sqlite"), kCommandStoreItems);
  }
  QTemporaryDir home_;
};

void startAndStop(benchmark::State& state, const CommandInstallation& here) {
  for (auto _ : state) {
    if (!here.run({"start", "Task 250"}) || !here.run({"stop"})) {
      state.SkipWithError("tessal start or stop failed");
      break;
    }
  }
  state.SetLabel("one start and one stop: two processes");
}

void BM_StartAndStopOnTheStoreItself(benchmark::State& state) {
  startAndStop(state, CommandInstallation::instance());
}
BENCHMARK(BM_StartAndStopOnTheStoreItself)->Unit(benchmark::kMillisecond)->Iterations(20)->UseRealTime();

void BM_StartAndStopThroughTheDesktopCopy(benchmark::State& state) {
  const CommandInstallation& here = CommandInstallation::instance();
  QProcess desktop;
  QProcessEnvironment environment = here.environment();
  environment.insert("QT_QPA_PLATFORM", "offscreen");
  desktop.setProcessEnvironment(environment);
  desktop.start(QString::fromUtf8(TESSAL_EXE), {});
  // Ready once it listens (its socket appears) and has read the store (the first command then answers).
  QElapsedTimer waited;
  waited.start();
  while (!QFile::exists(here.runtimeFolder() + "/tessal.socket") && waited.elapsed() < 30000) QThread::msleep(20);
  here.run({"stop"});
  startAndStop(state, here);
  desktop.kill();
  desktop.waitForFinished();
}
BENCHMARK(BM_StartAndStopThroughTheDesktopCopy)->Unit(benchmark::kMillisecond)->Iterations(20)->UseRealTime();

}  // namespace
