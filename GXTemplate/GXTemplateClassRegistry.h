#pragma once

#include <QString>
#include <QStringList>

#include <functional>
#include <memory>

class GXTemplateEngine;
class GXTemplateFilter;
class GXTemplateMarker;

// Marker and filter classes by name, for the "load" marker: the stand-in for looking a class up by its
// name. The library's own classes (GXTemplateStandardMarkers, GXTemplateStandardFilters, WTReportFilters)
// are always known; the application registers its own before running templates that load them.
// Process-wide; safe to use from any thread.
class GXTemplateClassRegistry {
 public:
  using FilterFactory = std::function<std::shared_ptr<GXTemplateFilter>()>;
  using MarkerFactory = std::function<std::shared_ptr<GXTemplateMarker>(GXTemplateEngine*)>;

  // Makes `name` a filter class, a marker class, or both (a class that is both is loaded as a filter).
  // A later registration under the same name replaces the earlier one. Empty factories are ignored.
  static void registerFilterClass(const QString& name, FilterFactory factory);
  static void registerMarkerClass(const QString& name, MarkerFactory factory);
  // Forgets what the application registered under `name` (the library's own classes stay).
  static void unregisterClass(const QString& name);

  // A new filter of the class named `name`, or null when it names no filter class.
  static std::shared_ptr<GXTemplateFilter> makeFilter(const QString& name);
  // A new marker handler of the class named `name` over `engine`, or null when it names no marker class.
  static std::shared_ptr<GXTemplateMarker> makeMarker(const QString& name, GXTemplateEngine* engine);
  static bool isFilterClass(const QString& name);
  static bool isMarkerClass(const QString& name);
};
