#include "GXTemplateClassRegistry.h"

#include "GXTemplateStandardFilters.h"
#include "GXTemplateStandardMarkers.h"

GXTemplateClassRegistry::GXTemplateClassRegistry() {
  registerMarkerClass(QStringLiteral("GXTemplateStandardMarkers"), [](GXTemplateEngine* engine) {
    return std::make_shared<GXTemplateStandardMarkers>(engine);
  });
  registerFilterClass(QStringLiteral("GXTemplateStandardFilters"),
                      [] { return std::make_shared<GXTemplateStandardFilters>(); });
}

void GXTemplateClassRegistry::registerFilterClass(const QString& name, FilterFactory factory) {
  if (factory) entries_[name].filter = std::move(factory);
}

void GXTemplateClassRegistry::registerMarkerClass(const QString& name, MarkerFactory factory) {
  if (factory) entries_[name].marker = std::move(factory);
}

std::shared_ptr<GXTemplateFilter> GXTemplateClassRegistry::makeFilter(const QString& name) const {
  const auto entry = entries_.constFind(name);
  return entry != entries_.cend() && entry->filter ? entry->filter() : nullptr;
}

std::shared_ptr<GXTemplateMarker> GXTemplateClassRegistry::makeMarker(const QString& name,
                                                                      GXTemplateEngine* engine) const {
  const auto entry = entries_.constFind(name);
  return entry != entries_.cend() && entry->marker ? entry->marker(engine) : nullptr;
}
