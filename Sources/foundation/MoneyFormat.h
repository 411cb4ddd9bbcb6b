#pragma once

#include "Decimal.h"

#include <QString>

// Money for people: grouped thousands and two places ("#,##0.00") in the user's locale, rounded half
// away from zero from the exact decimal (never through binary floating point).
namespace MoneyFormat {
QString format(const Decimal& amount);
// Money typed by a person: the locale's grouping and decimal signs and spaces allowed; none for empty
// text or text that is no number.
std::optional<Decimal> parse(const QString& typed);
}  // namespace MoneyFormat
