#pragma once

#include "Decimal.h"
#include "GXTemplateFilter.h"

#include <QString>

#include <array>

// The filters of the report window, which loads them for its reports (and the template command with it):
// "digiclock" writes the value's integer value as minutes of duration text ("01:30"), "decimal" writes a
// number as money text ("#,##0.00" in the user's locale). Any other name, and "decimal" of a value that is
// not a number, give no value.
class WTReportFilters : public GXTemplateFilter {
 public:
  QStringList filters() const override;
  QVariant filterInvoked(const QString& filter, const QStringList& args, const QVariant& value) override;
};

class GXTemplateEngine;

// "money: CURRENCY": a number as an amount of CURRENCY, in the user's locale with the currency's minor
// unit (none for JPY, three for KWD) and no sign. CURRENCY is the key path of a variable of the run
// (`{{ task.billedCost | money: task.billingCurrency }}`) or an ISO 4217 code as written (`money: EUR`);
// without one, or when the variable has no value, the amount gets two places, as "decimal" writes it.
// "rate: CURRENCY" writes a rate the same way, with more places where the rate has them (85.5 yen, not
// 86). Anything but a number gives no value. Loaded on each engine that renders a report; the engine
// must outlive the filter's use.
class WTMoneyFilter : public GXTemplateFilter {
 public:
  explicit WTMoneyFilter(GXTemplateEngine* engine) : engine_(engine) {}
  QStringList filters() const override;
  QVariant filterInvoked(const QString& filter, const QStringList& args, const QVariant& value) override;

 private:
  // A text written lately. A report writes its task's rate on every line and the same few amounts on many
  // lines; the text of an amount in a currency does not change while a report is written.
  struct Written {
    bool rate = false;
    Decimal amount;
    QString currency;
    QString text;
  };

  GXTemplateEngine* engine_;
  std::array<Written, 8> written_;
  size_t nextWritten_ = 0;
};

// Loads every filter a report uses (these two, "html" and "item_kind") on `engine`: the report and the
// template command render the same template alike.
void loadReportFilters(GXTemplateEngine& engine);
