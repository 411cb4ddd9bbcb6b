#pragma once

#include "GXTemplateMarker.h"

#include <unordered_map>

class GXTemplateEngine;

// "level N …" / "/level": what lies between is read only when the report's level of detail is one of the
// numbers; at any other level the engine resumes after "/level" without reading the part between.
//
// An "if" would not do for this: the engine still runs the loops of a part that is switched off, so a
// report holding all four levels would group and walk every item four times over. "level" parts nest;
// a "level" without its "/level" leaves out the rest of the template. Arguments that are no whole number
// are ignored, so "level" with none of them is read at no level.
class WTReportLevelMarker : public GXTemplateMarker {
 public:
  WTReportLevelMarker(GXTemplateEngine* engine, int level) : engine_(engine), level_(level) {}

  QStringList markers() const override;
  std::optional<QStringList> endMarkersForMarker(const QString& marker) const override;
  QVariant markerEncountered(const QString& marker, const QStringList& args, GXRange markerRange,
                             bool& blockStarted, bool& blockEnded, bool& outputEnabled, GXRange& nextRange,
                             const GXBlockInfo* currentBlockInfo,
                             std::optional<QVariantMap>& newVariables) override;
  void engineFinishedProcessingTemplate() override { resumeAfter_.clear(); }

 private:
  bool readsAtThisLevel(const QStringList& args) const;
  // Where the template goes on after the "/level" that closes the part opened at `markerRange`.
  GXRange rangeAfterPart(GXRange markerRange, GXRange rest);

  GXTemplateEngine* engine_;
  int level_;
  // A part met again (it sits in a loop) is skipped without searching for its end once more.
  std::unordered_map<std::uint64_t, std::uint64_t> resumeAfter_;
};
