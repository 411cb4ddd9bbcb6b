#pragma once

#include <QHash>
#include <QString>

#include <functional>
#include <memory>

class GXTemplateEngine;
class GXTemplateFilter;
class GXTemplateMarker;

// Marker and filter classes by name, for the "load" marker: the stand-in for looking a class up by its
// name. Each engine has its own. It knows the library's own classes (GXTemplateStandardMarkers,
// GXTemplateStandardFilters); whoever runs templates that load classes of their own registers them on the
// engine it uses, so nothing depends on what else was linked in or ran before.
class GXTemplateClassRegistry {
 public:
  using FilterFactory = std::function<std::shared_ptr<GXTemplateFilter>()>;
  using MarkerFactory = std::function<std::shared_ptr<GXTemplateMarker>(GXTemplateEngine*)>;

  GXTemplateClassRegistry();

  // Makes `name` a filter class, a marker class, or both (a class that is both is loaded as a filter).
  // A later registration under the same name replaces the earlier one. Empty factories are ignored.
  void registerFilterClass(const QString& name, FilterFactory factory);
  void registerMarkerClass(const QString& name, MarkerFactory factory);

  // A new filter of the class named `name`, or null when it names no filter class.
  std::shared_ptr<GXTemplateFilter> makeFilter(const QString& name) const;
  // A new marker handler of the class named `name` over `engine`, or null when it names no marker class.
  std::shared_ptr<GXTemplateMarker> makeMarker(const QString& name, GXTemplateEngine* engine) const;

 private:
  struct Entry {
    FilterFactory filter;
    MarkerFactory marker;
  };
  QHash<QString, Entry> entries_;
};
