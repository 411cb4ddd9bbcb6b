#include "WTHTMLFilter.h"

#include "GXTemplateValue.h"

QStringList WTHTMLFilter::filters() const {
  return {QStringLiteral("html")};
}

QVariant WTHTMLFilter::filterInvoked(const QString& filter, const QStringList& args, const QVariant& value) {
  (void)args;
  if (filter != QLatin1String("html") || GXTemplateValue::isNil(value)) return {};
  return GXTemplateValue::description(value).toHtmlEscaped();
}
