#pragma once

#include "Decimal.h"

#include <QString>
#include <QVariant>

#include <cstdint>
#include <optional>

class WTObject;

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

// Whole percents of the budget billed, of the exact quotient: cut below the budget, so that "80 %" never
// shows before that line is reached, and raised past it, so that "100 %" never shows past it. None without
// a budget.
std::optional<std::int64_t> percent(const Decimal& billed, const std::optional<Decimal>& budget);

// What a task or project bills, and its budget; nothing for other records.
Decimal billed(const WTObject* object);
std::optional<Decimal> budget(const WTObject* object);
// Where `object` stands, for people: "72 % of the budget of 1,000.00 · 280.00 left" ("… · 40.00 over"
// past it); empty without a budget.
QString standing(const WTObject* object);
// The same as a report's "budgetStanding": no value at all without a budget, since an empty text would
// pass a template's "if".
QVariant reportedStanding(const WTObject* object);

}  // namespace WTBudget
