#pragma once

#include "Decimal.h"

#include <QString>

#include <unicode/locid.h>

// Money for people: grouped thousands and two places ("#,##0.00") in the user's locale, rounded half
// away from zero from the exact decimal (never through binary floating point).
namespace MoneyFormat {
QString format(const Decimal& amount);
// The same in `locale` rather than in the default locale of the first use.
QString format(const Decimal& amount, const icu::Locale& locale);
// Money typed by a person: the locale's grouping and decimal signs and spaces allowed; none for empty
// text or text that is no number.
std::optional<Decimal> parse(const QString& typed);
}  // namespace MoneyFormat
