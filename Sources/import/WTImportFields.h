#pragma once

#include "Decimal.h"

#include <QDate>
#include <QString>
#include <QStringList>
#include <QTime>

#include <optional>

// One field of another tracker's export as the trackers, and the locales they run in, write it: dates,
// times of day, durations, numbers, yes or no, and tags. None is read as anything but what it says.
namespace WTImportFields {

// How a file writes dates with slashes: month first, as the hosted trackers' American default does, or
// day first, as the rest of the world does.
enum class SlashedDates { MonthFirst, DayFirst, OnlyOneWay };

// "2024-03-10", "10.03.2024" or "10-03-2024" (day first), "03/10/2024" (as `slashed` says; unless
// `strictly`, a date that reads only the other way round is read that way: 25/04/2024 is day first).
// A file that writes dates both ways has only those read that can be read one way (OnlyOneWay).
std::optional<QDate> parseDate(const QString& text, SlashedDates slashed = SlashedDates::MonthFirst,
                               bool strictly = false);
// "13:30", "13:30:15", "1:30 PM", "01:30:00 pm", "1:30 p.m.".
std::optional<QTime> parseTime(const QString& text);
// "1:20:00" or "1:20" as seconds.
std::optional<qint64> parseDuration(const QString& text);
// "1,234.50", "1.234,50", "50,00", "1 234,50", "€ 12": none for what is no such number, and for one mark
// alone before three digits ("1,500": 1.5 or 1500?), which sets `ambiguous`.
std::optional<Decimal> parseNumber(const QString& text, bool* ambiguous = nullptr);
// The rate a tracker billed `amount` for `seconds` by, to the cent: of the rates whose cost for that time,
// rounded to `places`, is the amount, the one written with the fewest places (85 for 28.33 over twenty
// minutes, where the amount over the hours is 84.99); the amount over the hours where none of up to two
// places is.
std::optional<Decimal> rateOfAmount(const Decimal& amount, qint64 seconds, int places);
// Why a number column's text is not read: "the rate “1,500” could be 1.5 or 1500".
QString numberProblem(const char* what, const QString& text);
// "yes", "true", "1", "billable" or empty; "no", "false", "0", "non-billable".
std::optional<bool> parseFlag(const QString& text);
// "a, b,,c" as its tags.
QStringList splitTags(const QString& text);

}  // namespace WTImportFields
