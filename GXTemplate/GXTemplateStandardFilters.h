#pragma once

#include "Date.h"
#include "GXTemplateFilter.h"

// The filters every engine loads: "uppercase", "lowercase", "capitalized" (of the value's text),
// "date_format" (a date by one Unicode date pattern) and "color_format" (a colour as "rrggbb" with the one
// argument "hex"). A value a filter does not apply to, and an unknown name, give the value unchanged.
class GXTemplateStandardFilters : public GXTemplateFilter {
 public:
  QStringList filters() const override;
  QVariant filterInvoked(const QString& filter, const QStringList& args, const QVariant& value) override;

  // Each word's first cased letter in title case and the rest in lower case; a word starts after any
  // character that is neither cased nor case-ignorable ("o'neil-smith" is "O'neil-Smith").
  static QString capitalized(const QString& text);
  // "rrggbb" of a colour, each channel times 255 truncated; "000000" for a colour that can't be read.
  static QString hexColor(const QVariant& color);
  // Whether a Unicode date pattern writes only fields of the calendar day (no time of day, no zone).
  static bool patternHasOnlyDayFields(const QString& pattern);

 private:
  // Reports list many items of one day: a pattern of day fields gives the same text for the whole day
  // (in the default zone), so the last text is kept with the day it was made for.
  struct DayText {
    QString pattern;
    bool onlyDayFields = false;
    Date day;
    QString text;
    bool hasText = false;
  };
  QString formatDate(Date date, const QString& pattern);

  DayText lastDay_;
};
