// The template engine over a report-like template: one loop over 10,000 and 100,000 items (maps with
// name, date, duration, cost and kind), two expressions through filters and one if/else per item.
// bench/template_vs_jinja2.py runs this and Python's jinja2 over the same data and prints the ratio; with
// TESSAL_TEMPLATE_BENCH_DUMP=<file> the output for the first 50 items is written there for it to compare.
// BM_TemplateUnclosedLine shows that a hostile template costs time in proportion to its length.
#include "Decimal.h"
#include "GXTemplateEngine.h"
#include "ICUTemplateMatcher.h"
#include "RXRegex.h"
#include "RZDate.h"
#include "WTReportFilters.h"

#include <benchmark/benchmark.h>

#include <QFile>

#include <cstdlib>

namespace {

const QString kTemplate = QStringLiteral(
    "{% for item in items %}<tr><td>{{ item.date | date_format: \"yyyy-MM-dd\" }}</td>"
    "<td>{{ item.duration | digiclock }}</td>"
    "{% if item.kind equalsstring time %}<td>{{ item.name }}</td>{% else %}<td>{{ item.cost }}</td>{% /if "
    "%}</tr>\n"
    "{% /for %}");

// 2024-01-01 00:00:00 UTC, one item an hour from there.
constexpr double kFirstDate = 1704067200.0;

QVariantMap variables(int count) {
  QVariantList items;
  items.reserve(count);
  for (int i = 0; i < count; ++i) {
    items.append(QVariantMap{
        {QStringLiteral("name"), QStringLiteral("Item %1").arg(i)},
        {QStringLiteral("date"), QVariant::fromValue(Date::fromSeconds(kFirstDate + 3600.0 * i))},
        {QStringLiteral("duration"), i % 600},
        {QStringLiteral("cost"), QVariant::fromValue(*Decimal::fromString(QStringLiteral("%1.25").arg(i)))},
        {QStringLiteral("kind"), i % 3 == 0 ? QStringLiteral("expense") : QStringLiteral("time")},
    });
  }
  return {{QStringLiteral("items"), items}};
}

struct Renderer {
  GXTemplateEngine engine;
  Renderer() {
    engine.setMatcher(ICUTemplateMatcher::matcherWithTemplateEngine(&engine));
    engine.loadFilter(std::make_shared<WTReportFilters>());
  }
  QString render(const QVariantMap& vars) { return engine.processTemplate(kTemplate, vars); }
};

void dumpSampleOnce() {
  static bool done = false;
  const char* path = std::getenv("TESSAL_TEMPLATE_BENCH_DUMP");
  if (done || !path) return;
  done = true;
  Renderer renderer;
  QFile file(QString::fromLocal8Bit(path));
  if (file.open(QIODevice::WriteOnly | QIODevice::Truncate))
    file.write(renderer.render(variables(50)).toUtf8());
}

void BM_TemplateReport(benchmark::State& state) {
  // The same zone as the comparison script's jinja2 side.
  RZDate::setDefaultTimeZone(QStringLiteral("Europe/Berlin"));
  dumpSampleOnce();
  const QVariantMap vars = variables(int(state.range(0)));
  Renderer renderer;
  const std::uint64_t compilesBefore = RXRegex::compileCount();
  qsizetype length = 0;
  for (auto _ : state) {
    const QString output = renderer.render(vars);
    length = output.size();
    benchmark::DoNotOptimize(output.constData());
  }
  state.counters["items"] = double(state.range(0));
  state.counters["output_chars"] = double(length);
  state.counters["pattern_compiles"] = double(RXRegex::compileCount() - compilesBefore);
  state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(BM_TemplateReport)->Arg(10000)->Arg(100000)->Unit(benchmark::kMillisecond);

// A hostile line: start and filter delimiters without an end. A search that fails from each of them
// would cost the cube of the line's length; the matcher's start positions keep it linear.
void BM_TemplateUnclosedLine(benchmark::State& state) {
  const QString text = QStringLiteral("{{x|").repeated(state.range(0));
  Renderer renderer;
  for (auto _ : state) benchmark::DoNotOptimize(renderer.engine.processTemplate(text, {}).size());
  state.SetBytesProcessed(state.iterations() * text.size() * 2);
}
BENCHMARK(BM_TemplateUnclosedLine)->Arg(2000)->Arg(20000)->Unit(benchmark::kMillisecond);

}  // namespace
