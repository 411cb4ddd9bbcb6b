#pragma once

#include <QString>
#include <QStringList>
#include <QVariant>

// A handler of filters, registered with the engine under each of the names it serves (the first handler
// loaded for a name keeps it).
class GXTemplateFilter {
 public:
  virtual ~GXTemplateFilter() = default;
  // The filter names served.
  virtual QStringList filters() const = 0;
  // The value that `filter` makes of `value`; `args` is empty when the filter part had no arguments.
  // A null variant writes nothing.
  virtual QVariant filterInvoked(const QString& filter, const QStringList& args, const QVariant& value) = 0;
};
