#pragma once

#include "GXBlockInfo.h"
#include "GXRange.h"

#include <QString>
#include <QStringList>
#include <QVariant>
#include <QVariantMap>

#include <optional>

// A handler of markers, registered with the engine under each of the names it serves (the first handler
// loaded for a name keeps it). Made over an engine, which it does not own.
class GXTemplateMarker {
 public:
  virtual ~GXTemplateMarker() = default;
  // The marker names served.
  virtual QStringList markers() const = 0;
  // The names that may close a block opened by `marker`, or none when it opens no block.
  virtual std::optional<QStringList> endMarkersForMarker(const QString& marker) const = 0;
  // Handles one marker. The flags and ranges are the engine's, to be changed in place: blockStarted and
  // blockEnded (both false on entry), outputEnabled (the engine's state on entry), nextRange (where the
  // engine resumes; on entry the template after the marker). currentBlockInfo is the innermost open block
  // when that block was opened by this same handler, else null. newVariables, none on entry, are stored by
  // the engine afterwards (in the frame of a block just opened). Returns the value to write, or a null
  // variant for nothing.
  virtual QVariant markerEncountered(const QString& marker, const QStringList& args, GXRange markerRange,
                                     bool& blockStarted, bool& blockEnded, bool& outputEnabled,
                                     GXRange& nextRange, const GXBlockInfo* currentBlockInfo,
                                     std::optional<QVariantMap>& newVariables) = 0;
  // Called at the end of every run (once per name the handler is registered under): drop per-run state.
  virtual void engineFinishedProcessingTemplate() = 0;
};
