#include "WTReportLevelMarker.h"

#include "GXTemplateEngine.h"
#include "GXTemplateEngineMatcher.h"

namespace {

const QString kLevel = QStringLiteral("level");
const QString kEndLevel = QStringLiteral("/level");

}  // namespace

QStringList WTReportLevelMarker::markers() const {
  return {kLevel, kEndLevel};
}

std::optional<QStringList> WTReportLevelMarker::endMarkersForMarker(const QString&) const {
  // No block of the engine's: a part that is read needs no closing, one that is not is jumped over whole.
  return std::nullopt;
}

QVariant WTReportLevelMarker::markerEncountered(const QString& marker, const QStringList& args,
                                                GXRange markerRange, bool&, bool&, bool&, GXRange& nextRange,
                                                const GXBlockInfo*, std::optional<QVariantMap>&) {
  if (marker == kLevel && !readsAtThisLevel(args)) nextRange = rangeAfterPart(markerRange, nextRange);
  return {};
}

bool WTReportLevelMarker::readsAtThisLevel(const QStringList& args) const {
  for (const QString& arg : args) {
    bool isNumber = false;
    const int level = arg.toInt(&isNumber);
    if (isNumber && level == level_) return true;
  }
  return false;
}

GXRange WTReportLevelMarker::rangeAfterPart(GXRange markerRange, GXRange rest) {
  const std::uint64_t end = rest.location + rest.length;
  if (const auto known = resumeAfter_.find(markerRange.location); known != resumeAfter_.end())
    return {known->second, end - known->second};

  std::uint64_t resume = end;
  const auto matcher = engine_ ? engine_->matcher() : nullptr;
  GXRange searched = rest;
  int depth = 0;
  while (matcher && searched.length > 0) {
    const auto match = matcher->firstMarkerWithinRange(searched);
    if (!match) break;
    const std::uint64_t after = match->range.location + match->range.length;
    if (match->isMarker() && match->name == kLevel) {
      ++depth;
    } else if (match->isMarker() && match->name == kEndLevel && depth-- == 0) {
      resume = after;
      break;
    }
    if (after <= searched.location || after > end) break;
    searched = {after, end - after};
  }
  resumeAfter_[markerRange.location] = resume;
  return {resume, end - resume};
}
