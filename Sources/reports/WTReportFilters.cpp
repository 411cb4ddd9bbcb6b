#include "WTReportFilters.h"

#include "Decimal.h"
#include "DurationText.h"
#include "GXTemplateValue.h"
#include "MoneyFormat.h"

QStringList WTReportFilters::filters() const {
  return {QStringLiteral("digiclock"), QStringLiteral("decimal")};
}

QVariant WTReportFilters::filterInvoked(const QString& filter, const QStringList& args,
                                        const QVariant& value) {
  (void)args;
  if (filter == QLatin1String("digiclock")) {
    return DurationText::stringWithMinutes(GXTemplateValue::intValue(value));
  }
  if (filter == QLatin1String("decimal")) {
    // Numbers only: a number formatter has no text for anything else.
    if (value.typeId() == QMetaType::QString || !GXTemplateValue::answersIntValue(value)) return {};
    const std::optional<Decimal> number = Decimal::fromVariant(value);
    if (!number) return {};
    return MoneyFormat::format(*number);
  }
  return {};
}
