// `tessal import` as a whole process: 100,000 rows of a toggl file into the store of 100,000 items, its
// preview, and the same file again (every entry already there). Peak memory is the largest of the
// processes so far (the children's maximum resident size).
#include "LargeStore.h"

#include <benchmark/benchmark.h>

#include <QDir>
#include <QFile>
#include <QProcess>
#include <QTemporaryDir>
#include <QTimeZone>

#include <sys/resource.h>

namespace {

constexpr int kRows = 100000;

class ImportInstallation {
 public:
  static ImportInstallation& instance() {
    static ImportInstallation installation;
    return installation;
  }
  QString storePath() const { return home_.filePath("data/Tessal2/Tessal.sqlite"); }
  QString file() const { return home_.filePath("toggl.csv"); }
  // The store as it was before any import, and no changes waiting to be sent (as after a sync).
  void resetStore() const {
    for (const char* suffix : {"", "-wal", "-shm"}) QFile::remove(storePath() + QLatin1String(suffix));
    QFile::copy(bench::LargeStore::instance().path(), storePath());
  }
  bool run(const QStringList& arguments) const {
    QProcess process;
    QProcessEnvironment environment = QProcessEnvironment::systemEnvironment();
    environment.insert("XDG_DATA_HOME", home_.filePath("data"));
    environment.insert("XDG_CONFIG_HOME", home_.filePath("config"));
    environment.insert("XDG_RUNTIME_DIR", home_.filePath("runtime"));
    environment.insert("TZ", "Europe/Berlin");
    for (const char* name : {"DISPLAY", "WAYLAND_DISPLAY", "DBUS_SESSION_BUS_ADDRESS"})
      environment.remove(name);
    process.setProcessEnvironment(environment);
    process.start(QString::fromUtf8(TESSAL_EXE), arguments);
    return process.waitForFinished(120000) && process.exitStatus() == QProcess::NormalExit &&
           process.exitCode() == 0;
  }

 private:
  ImportInstallation() {
    for (const char* sub : {"data/Tessal2", "config", "runtime"})
      QDir(home_.path()).mkpath(QString::fromLatin1(sub));
    QFile::setPermissions(home_.filePath("runtime"), QFile::ReadOwner | QFile::WriteOwner | QFile::ExeOwner);
    QFile out(file());
    out.open(QIODevice::WriteOnly);
    QByteArray text =
        "User,Email,Client,Project,Task,Description,Billable,Start date,Start time,End date,End time,"
        "Duration,Tags,Amount (EUR)\n";
    const QDateTime first(QDate(2020, 1, 1), QTime(8, 0), QTimeZone("Europe/Berlin"));
    for (int i = 0; i < kRows; ++i) {
      const QDateTime start = first.addSecs(qint64(i) * 3600);
      const QDateTime end = start.addSecs(45 * 60);
      text += QStringLiteral(
                  "Ana,ana@example.org,Client %1,Project %2,Task %3,\"Work, item %4\",%5,%6,%7,%8,%9,"
                  "00:45:00,web,60.00\n")
                  .arg(i % 20)
                  .arg(i % 100)
                  .arg(i % 400)
                  .arg(i)
                  .arg(i % 10 ? "Yes" : "No")
                  .arg(start.toString(u"yyyy-MM-dd"), start.toString(u"HH:mm:ss"),
                       end.toString(u"yyyy-MM-dd"), end.toString(u"HH:mm:ss"))
                  .toUtf8();
      if (text.size() > (1 << 20)) {
        out.write(text);
        text.clear();
      }
    }
    out.write(text);
  }
  QTemporaryDir home_;
};

void report(benchmark::State& state) {
  rusage usage{};
  getrusage(RUSAGE_CHILDREN, &usage);
  state.counters["peak_MB"] = double(usage.ru_maxrss) / 1024.0;
}

void BM_ImportTogglIntoLargeStore(benchmark::State& state) {
  const ImportInstallation& here = ImportInstallation::instance();
  for (auto _ : state) {
    state.PauseTiming();
    here.resetStore();
    state.ResumeTiming();
    if (!here.run({"import", here.file()})) {
      state.SkipWithError("tessal import failed");
      break;
    }
  }
  report(state);
  state.SetLabel("100,000 rows into 100,000 items, whole process");
}
BENCHMARK(BM_ImportTogglIntoLargeStore)->Unit(benchmark::kMillisecond)->Iterations(3)->UseRealTime();

void BM_ImportPreview(benchmark::State& state) {
  const ImportInstallation& here = ImportInstallation::instance();
  here.resetStore();
  for (auto _ : state) {
    if (!here.run({"import", here.file(), "--dry-run"})) {
      state.SkipWithError("tessal import --dry-run failed");
      break;
    }
  }
  report(state);
}
BENCHMARK(BM_ImportPreview)->Unit(benchmark::kMillisecond)->Iterations(3)->UseRealTime();

// The journal still holds the first import's entries, as it does until the next sync.
void BM_ImportAgainAddsNothing(benchmark::State& state) {
  const ImportInstallation& here = ImportInstallation::instance();
  here.resetStore();
  if (!here.run({"import", here.file()})) state.SkipWithError("the first import failed");
  for (auto _ : state) {
    if (!here.run({"import", here.file()})) {
      state.SkipWithError("tessal import failed");
      break;
    }
  }
  report(state);
}
BENCHMARK(BM_ImportAgainAddsNothing)->Unit(benchmark::kMillisecond)->Iterations(3)->UseRealTime();

}  // namespace
