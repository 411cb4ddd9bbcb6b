#pragma once

#include "GXTemplateFilter.h"

// The filters of the report window, which loads them for its reports (and the template command with it):
// "digiclock" writes the value's integer value as minutes of duration text ("01:30"), "decimal" writes a
// number as money text ("#,##0.00" in the user's locale). Any other name, and "decimal" of a value that is
// not a number, give no value.
class WTReportFilters : public GXTemplateFilter {
 public:
  QStringList filters() const override;
  QVariant filterInvoked(const QString& filter, const QStringList& args, const QVariant& value) override;
};
