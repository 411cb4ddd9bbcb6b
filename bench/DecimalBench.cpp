// Decimal money arithmetic: the cost of 100,000 items (rate * minutes / 60, summed) and the single
// operations it is made of, with typical money values and with full 38-digit operands.
#include "Decimal.h"

#include <benchmark/benchmark.h>

#include <vector>

namespace {

constexpr int kItems = 100000;

Decimal parsed(const char* text) {
  return Decimal::fromString(QString::fromLatin1(text)).value();
}

// Rates as people set them and durations spread over a working day.
struct Workload {
  std::vector<Decimal> rates;
  std::vector<Decimal> minutes;

  Workload() {
    const char* rateTexts[] = {"80", "75.50", "120", "95.25", "60"};
    rates.reserve(kItems);
    minutes.reserve(kItems);
    for (int i = 0; i < kItems; ++i) {
      rates.push_back(parsed(rateTexts[i % 5]));
      minutes.push_back(Decimal(1 + (i * 37) % 600));
    }
  }
};

const Workload& workload() {
  static const Workload instance;
  return instance;
}

void BM_CostOf100000Items(benchmark::State& state) {
  const Workload& work = workload();
  const Decimal sixty(60);
  for (auto _ : state) {
    Decimal total;
    for (int i = 0; i < kItems; ++i) total += work.rates[i] * *Decimal::divide(work.minutes[i], sixty);
    benchmark::DoNotOptimize(total);
  }
  state.SetItemsProcessed(state.iterations() * kItems);
}
BENCHMARK(BM_CostOf100000Items)->Unit(benchmark::kMillisecond);

void BM_DivideMinutesBySixty(benchmark::State& state) {
  const Workload& work = workload();
  const Decimal sixty(60);
  int i = 0;
  for (auto _ : state) {
    benchmark::DoNotOptimize(Decimal::divide(work.minutes[i], sixty));
    i = (i + 1) % kItems;
  }
}
BENCHMARK(BM_DivideMinutesBySixty);

void BM_MultiplyRateByFraction(benchmark::State& state) {
  const Decimal rate = parsed("75.50");
  const Decimal fraction = *Decimal::divide(Decimal(7), Decimal(60));  // 38 digits
  for (auto _ : state) benchmark::DoNotOptimize(rate * fraction);
}
BENCHMARK(BM_MultiplyRateByFraction);

void BM_AddCosts(benchmark::State& state) {
  const Decimal a = parsed("9.4375000000000000000000000000000000000");
  const Decimal b = parsed("12.30");
  for (auto _ : state) benchmark::DoNotOptimize(a + b);
}
BENCHMARK(BM_AddCosts);

void BM_DivideFullWidth(benchmark::State& state) {
  const Decimal a = parsed("12345678901234567890123456789012345678");
  const Decimal b = parsed("98765432109876543210987654321.123456789");
  for (auto _ : state) benchmark::DoNotOptimize(Decimal::divide(a, b));
}
BENCHMARK(BM_DivideFullWidth);

void BM_MultiplyFullWidth(benchmark::State& state) {
  const Decimal a = parsed("12345678901234567890123456789012345678");
  const Decimal b = parsed("0.98765432109876543210987654321123456789");
  for (auto _ : state) benchmark::DoNotOptimize(a * b);
}
BENCHMARK(BM_MultiplyFullWidth);

void BM_ParseAndPrint(benchmark::State& state) {
  const QString text = QStringLiteral("-1234.5678");
  for (auto _ : state) benchmark::DoNotOptimize(Decimal::fromString(text)->toString());
}
BENCHMARK(BM_ParseAndPrint);

}  // namespace
