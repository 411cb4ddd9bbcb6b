#pragma once

#include "Decimal.h"

#include <optional>

// How much of a task's or project's budget is billed, and the moment a running timer takes it past a
// warning line. Without a budget above zero there is nothing to measure.
namespace WTBudget {

// Within: below 80 %; Warning: from 80 % up to the whole budget; Over: past it.
enum class Level { Within, Warning, Over };

std::optional<Level> level(const Decimal& billed, const std::optional<Decimal>& budget);

// The level reached going from `before` to `after` when it is above the one `before` stood at (Over,
// when a single step passes both lines); none otherwise, and none going down.
std::optional<Level> crossed(const Decimal& before, const Decimal& after,
                             const std::optional<Decimal>& budget);

// billed / budget (1.0 is the whole budget), for drawing; none without a budget.
std::optional<double> fraction(const Decimal& billed, const std::optional<Decimal>& budget);

}  // namespace WTBudget
