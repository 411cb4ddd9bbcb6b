#pragma once

#include "GXRange.h"

#include <QString>
#include <QStringList>

#include <memory>

// What a matcher found: one marker ("{% name args | filter filterArgs %}") or expression
// ("{{ name | filter filterArgs }}") of the template.
struct GXTemplateMatch {
  GXRange range;           // the whole marker or expression text
  QString type;            // "marker" or "expression"
  QString name;            // null when the body was empty
  QStringList args;        // empty when there were none
  QString filter;          // null when there was no filter part
  QStringList filterArgs;  // empty when there were none

  bool isMarker() const { return QStringView(type) == QStringView(u"marker"); }
};

// Finds markers and expressions for the engine. Made over an engine, which it does not own.
class GXTemplateEngineMatcher {
 public:
  virtual ~GXTemplateEngineMatcher() = default;
  // Called by the engine at the start of every run: read the delimiters and the template again.
  virtual void engineSettingsChanged() = 0;
  // The first marker or expression lying wholly within `range` of the template, or null when there is none.
  virtual std::shared_ptr<const GXTemplateMatch> firstMarkerWithinRange(GXRange range) = 0;
};
