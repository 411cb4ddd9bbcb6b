#include "GXTemplateClassRegistry.h"

#include "GXTemplateStandardFilters.h"
#include "GXTemplateStandardMarkers.h"
#include "WTReportFilters.h"

#include <QHash>
#include <QMutex>

namespace {

struct Entry {
  GXTemplateClassRegistry::FilterFactory filter;
  GXTemplateClassRegistry::MarkerFactory marker;
};

struct Registry {
  QMutex mutex;
  QHash<QString, Entry> entries;

  Registry() { addBuiltIns(); }

  void addBuiltIns() {
    entries[QStringLiteral("GXTemplateStandardMarkers")].marker = [](GXTemplateEngine* engine) {
      return std::make_shared<GXTemplateStandardMarkers>(engine);
    };
    entries[QStringLiteral("GXTemplateStandardFilters")].filter = [] {
      return std::make_shared<GXTemplateStandardFilters>();
    };
    entries[QStringLiteral("WTReportFilters")].filter = [] { return std::make_shared<WTReportFilters>(); };
  }

  static bool isBuiltIn(const QString& name) {
    return name == QLatin1String("GXTemplateStandardMarkers") ||
           name == QLatin1String("GXTemplateStandardFilters") || name == QLatin1String("WTReportFilters");
  }
};

Registry& registry() {
  static Registry instance;
  return instance;
}

Entry entryFor(const QString& name) {
  Registry& r = registry();
  QMutexLocker lock(&r.mutex);
  return r.entries.value(name);
}

}  // namespace

void GXTemplateClassRegistry::registerFilterClass(const QString& name, FilterFactory factory) {
  if (!factory) return;
  Registry& r = registry();
  QMutexLocker lock(&r.mutex);
  r.entries[name].filter = std::move(factory);
}

void GXTemplateClassRegistry::registerMarkerClass(const QString& name, MarkerFactory factory) {
  if (!factory) return;
  Registry& r = registry();
  QMutexLocker lock(&r.mutex);
  r.entries[name].marker = std::move(factory);
}

void GXTemplateClassRegistry::unregisterClass(const QString& name) {
  Registry& r = registry();
  QMutexLocker lock(&r.mutex);
  r.entries.remove(name);
  if (Registry::isBuiltIn(name)) r.addBuiltIns();
}

std::shared_ptr<GXTemplateFilter> GXTemplateClassRegistry::makeFilter(const QString& name) {
  const Entry entry = entryFor(name);
  return entry.filter ? entry.filter() : nullptr;
}

std::shared_ptr<GXTemplateMarker> GXTemplateClassRegistry::makeMarker(const QString& name,
                                                                      GXTemplateEngine* engine) {
  const Entry entry = entryFor(name);
  return entry.marker ? entry.marker(engine) : nullptr;
}

bool GXTemplateClassRegistry::isFilterClass(const QString& name) {
  return bool(entryFor(name).filter);
}

bool GXTemplateClassRegistry::isMarkerClass(const QString& name) {
  return bool(entryFor(name).marker);
}
