#pragma once

#include "Decimal.h"
#include "TypedNumber.h"

#include <QString>

#include <unicode/locid.h>

// Money for people: grouped thousands and two places ("#,##0.00") in the user's locale, rounded half
// away from zero from the exact decimal (never through binary floating point).
namespace MoneyFormat {
QString format(const Decimal& amount);
// The same with the places of `currency`'s minor unit (none for JPY, three for KWD), without its sign.
QString format(const Decimal& amount, const QString& currency);
// A code written out ("JPY") is a currency, not a locale's name.
inline QString format(const Decimal& amount, const char* currency) {
  return format(amount, QString::fromLatin1(currency));
}
// The same in `locale`.
QString format(const Decimal& amount, const QString& currency, const icu::Locale& locale);
// A rate for people: in the places of `currency`'s minor unit, and more where the rate has them (85.50 yen
// an hour is "85.5", not a rounded "86" that the billed amounts would not follow), up to six.
QString formatRate(const Decimal& rate, const QString& currency);
// How many places a currency (ISO 4217 code) bills to, as ICU knows it; 2 for a code it does not know.
int minorUnitDigits(const QString& currency);
// The currency of the user's locale (its ISO 4217 code); "USD" where the locale names none.
QString localeCurrency();
// `amount` rounded half away from zero to `currency`'s minor unit, exactly (12.345 EUR gives 12.35).
Decimal billed(const Decimal& amount, const QString& currency);
// The same in `locale` rather than in the default locale of the first use.
QString format(const Decimal& amount, const icu::Locale& locale);
// Money typed by a person, read as TypedNumber::read reads numbers; the locale's currency sign may stand
// before or after the amount. Blank text is taken as no amount.
TypedNumber::Reading parse(const QString& typed, const icu::Locale& locale);
// In the user's locale.
TypedNumber::Reading parse(const QString& typed);
// Money typed for what bills in `currency` (ISO 4217): its code or its signs in `locale` may stand around
// the amount; another currency's sign is refused, saying which currency it bills in, never taken as this
// one's.
TypedNumber::Reading parse(const QString& typed, const QString& currency,
                           const icu::Locale& locale = icu::Locale::getDefault());
// The same for an amount billed as typed (an expense): refused too when finer than `currency` bills, as
// half a yen is.
TypedNumber::Reading parseAmount(const QString& typed, const QString& currency);
}  // namespace MoneyFormat
