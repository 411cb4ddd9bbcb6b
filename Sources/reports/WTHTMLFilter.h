#pragma once

#include "GXTemplateFilter.h"

// "html": the value's text with <, >, & and " written as entities, so a name such as "Smith & <Co>"
// shows as typed in an HTML report instead of breaking it. No value stays no value.
class WTHTMLFilter : public GXTemplateFilter {
 public:
  QStringList filters() const override;
  QVariant filterInvoked(const QString& filter, const QStringList& args, const QVariant& value) override;
};
