#pragma once

#include "GXRange.h"

#include <QString>
#include <QStringList>
#include <QVariantMap>

// One open block of a template run, innermost last on the engine's stack: the marker that opened it, the
// markers that may close it, the opening marker's arguments and range, and the block's variable frame.
struct GXBlockInfo {
  QString name;              // the marker name that opened the block
  QStringList endNames;      // marker names that may close it (from endMarkersForMarker)
  QStringList args;          // the opening marker's arguments; empty when it had none
  GXRange startMarkerRange;  // where the opening marker stands in the template
  QVariantMap vars;          // the block's variables
};
