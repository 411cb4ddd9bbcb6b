#pragma once

#include "Decimal.h"

#include <QString>
#include <QStringList>

#include <unicode/locid.h>

#include <optional>

// Numbers as a person types them, read strictly in one locale: the locale's decimal sign is the only
// decimal sign, its grouping sign is taken only between whole groups of three digits, and anything
// else is refused with a reason to show, never read as some other number. A comma typed where the
// locale writes a point is thus a mistake to point out, not a thousands sign to drop.
namespace TypedNumber {

struct Reading {
  std::optional<Decimal> value;  // none for blank text, and for refused text
  QString refusal;               // why the text is not taken, for the person who typed it; empty if taken
  bool taken() const { return refusal.isEmpty(); }
};

// Blank text is taken as no value. Accepted: an optional leading minus sign, the locale's digits or
// ASCII ones, its decimal sign, and its grouping sign in the whole part only (a locale grouping with a
// space also takes the other spaces, one grouping with an apostrophe both apostrophes). Refused: every
// other sign, exponents, and more digits than a Decimal holds exactly. With `currency`, the locale's
// currency sign (or code) may stand before or after the number.
Reading read(const QString& typed, const icu::Locale& locale, bool currency = false);
// The same with `currencySigns` (one currency's code and symbols) allowed before or after the number.
Reading read(const QString& typed, const icu::Locale& locale, const QStringList& currencySigns);
// In the user's locale (ICU's default, as everything shown is formatted).
Reading read(const QString& typed);

// `value` exactly, as it would be typed in `locale`: its decimal sign, ASCII digits, no grouping. What
// an editor shows so that taking its text unchanged gives back the same number.
QString editableText(const Decimal& value, const icu::Locale& locale);
QString editableText(const Decimal& value);
// The user's decimal sign.
QString decimalSign();

}  // namespace TypedNumber
