// The report window's costs over the shared 100,000-item store: rendering every project's report with the
// built-in template at the level of every valuable item, and writing a report of about fifty pages as PDF.
#include "LargeStore.h"

#include "UserDefaults.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTReportGenerator.h"
#include "WTReportWindowController.h"

#include <benchmark/benchmark.h>

#include <QFile>
#include <QTemporaryDir>

#include <sys/resource.h>

namespace {

struct OpenLargeStore {
  QTemporaryDir dir;
  UserDefaults defaults{dir.filePath("settings.conf")};
  WTObjectContext context{&defaults};
  OpenLargeStore() {
    auto store = WTStore::open(bench::LargeStore::instance().path());
    if (!store.ok() || !context.attachStore(std::move(store.value())).ok()) qFatal("the benchmark store did not open");
  }
};

double peakResidentMegabytes() {
  rusage usage{};
  getrusage(RUSAGE_SELF, &usage);
  return double(usage.ru_maxrss) / 1024.0;
}

void BM_RenderReportOf100000ItemsAtEveryItem(benchmark::State& state) {
  OpenLargeStore data;
  const QList<WTProject*> projects = data.context.fetch<WTProject>();
  qsizetype length = 0;
  for (auto _ : state) {
    WTReportGenerator generator(projects, 1);
    const WTReport report = generator.render();
    length = report.html.size();
    benchmark::DoNotOptimize(length);
  }
  state.counters["html_chars"] = double(length);
  // The whole process's peak: the store, the records and the report text at once.
  state.counters["peak_rss_MB"] = peakResidentMegabytes();
}
BENCHMARK(BM_RenderReportOf100000ItemsAtEveryItem)->Unit(benchmark::kMillisecond)->Iterations(3);

void BM_WriteReportOfFiftyPagesAsPdf(benchmark::State& state) {
  OpenLargeStore data;
  // Two projects at the level of every item: about 4,000 lines, some fifty A4 pages.
  QList<WTProject*> projects = data.context.fetch<WTProject>().mid(0, 2);
  WTReportWindowController window(&data.context);
  window.setProjects(projects);
  window.setMode(1);
  const QString path = data.dir.filePath("report.pdf");
  for (auto _ : state) {
    if (!window.savePDFToFile(path).ok()) state.SkipWithError("the PDF was not written");
  }
  QFile pdf(path);
  pdf.open(QIODevice::ReadOnly);
  const QByteArray bytes = pdf.readAll();
  state.counters["pages"] = double(bytes.count("/Type /Page\n") + bytes.count("/Type /Page ") + bytes.count("/Type /Page>"));
}
BENCHMARK(BM_WriteReportOfFiftyPagesAsPdf)->Unit(benchmark::kMillisecond)->Iterations(3);

}  // namespace
