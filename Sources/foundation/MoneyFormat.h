#pragma once

#include "Decimal.h"
#include "TypedNumber.h"

#include <QString>

#include <unicode/locid.h>

// Money for people: grouped thousands and two places ("#,##0.00") in the user's locale, rounded half
// away from zero from the exact decimal (never through binary floating point).
namespace MoneyFormat {
QString format(const Decimal& amount);
// The same in `locale` rather than in the default locale of the first use.
QString format(const Decimal& amount, const icu::Locale& locale);
// Money typed by a person, read as TypedNumber::read reads numbers; the locale's currency sign may stand
// before or after the amount. Blank text is taken as no amount.
TypedNumber::Reading parse(const QString& typed, const icu::Locale& locale);
// In the user's locale.
TypedNumber::Reading parse(const QString& typed);
}  // namespace MoneyFormat
