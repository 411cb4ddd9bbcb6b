#include "WTBudget.h"

namespace WTBudget {

namespace {

bool measurable(const std::optional<Decimal>& budget) {
  return budget && *budget > Decimal();
}

}  // namespace

std::optional<Level> level(const Decimal& billed, const std::optional<Decimal>& budget) {
  if (!measurable(budget)) return std::nullopt;
  if (billed > *budget) return Level::Over;
  // 80 % compared exactly: billed × 5 against budget × 4.
  if (billed * Decimal(5) >= *budget * Decimal(4)) return Level::Warning;
  return Level::Within;
}

std::optional<Level> crossed(const Decimal& before, const Decimal& after,
                             const std::optional<Decimal>& budget) {
  const std::optional<Level> from = level(before, budget);
  const std::optional<Level> to = level(after, budget);
  if (!from || !to || *to <= *from) return std::nullopt;
  return to;
}

std::optional<double> fraction(const Decimal& billed, const std::optional<Decimal>& budget) {
  if (!measurable(budget)) return std::nullopt;
  return billed.toDouble() / budget->toDouble();
}

}  // namespace WTBudget
