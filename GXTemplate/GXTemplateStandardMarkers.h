#pragma once

#include "GXTemplateMarker.h"
#include "GXTemplateValue.h"

#include <QString>
#include <QStringList>
#include <QVariant>

#include <unordered_map>
#include <vector>

class GXTemplateEngine;

// The markers report templates use: for/for-in loops (optionally reversed) with "currentLoop" and
// "parentLoop", section, if/else with one or three arguments, now, comment, load, cycle and set. Every
// closing marker closes only the block its own opening marker started (matched by marker range).
class GXTemplateStandardMarkers : public GXTemplateMarker {
 public:
  // `engine` is not owned.
  explicit GXTemplateStandardMarkers(GXTemplateEngine* engine);

  // "for", "/for", "section", "/section", "if", "else", "/if", "now", "comment", "/comment", "load",
  // "cycle", "set".
  QStringList markers() const override;
  // for → /for; section → /section; if → /if, else; comment → /comment; others none.
  std::optional<QStringList> endMarkersForMarker(const QString& marker) const override;
  // Returns the current date for "now", the next argument for "cycle", nothing for the others.
  QVariant markerEncountered(const QString& marker, const QStringList& args, GXRange markerRange,
                             bool& blockStarted, bool& blockEnded, bool& outputEnabled, GXRange& nextRange,
                             const GXBlockInfo* currentBlockInfo,
                             std::optional<QVariantMap>& newVariables) override;
  // Empties the stacks and the cycle table.
  void engineFinishedProcessingTemplate() override;

  // Whether the block is the one the innermost record of a stack (whose marker range is given) opened.
  static bool currentBlock(const GXBlockInfo* block, const GXRange* topMarkerRange);
  // The truth of an argument: it names a variable whose value is a true number or any other value.
  bool argIsTrue(const QString& arg);
  // Whether an argument is numeric: "0..." or text with a non-zero integer value; otherwise, when asked,
  // the text of the variable it names (if that has an integer value) is tested the same way.
  bool argIsNumeric(const QString& arg, int* intValue, bool checkVariables);

 private:
  struct LoopRecord {
    GXRange markerRange;
    GXRange remainingRange;
    bool disabledOutput = false;
    bool hasEnumerator = false;
    QVariantList items;  // the collection as it was when the loop began
    qsizetype nextItem = 0;
    bool reverseItems = false;
    QString enumeratorVariable;
  };
  struct SectionRecord {
    GXRange markerRange;
  };
  struct ConditionalRecord {
    GXRange markerRange;
    bool argumentTrue = false;
    bool shouldDisableOutput = false;
    bool elseEncountered = false;
  };
  struct CommentRecord {
    GXRange markerRange;
    bool shouldDisableOutput = false;
  };
  struct CycleRecord {
    QStringList value;
    qsizetype lastIndex = 0;
  };

  QVariant forMarker(const QStringList& args, GXRange markerRange, bool& outputEnabled,
                     const GXRange& nextRange, const GXBlockInfo* currentBlockInfo,
                     std::optional<QVariantMap>& newVariables);
  void endForMarker(bool& blockEnded, bool& outputEnabled, GXRange& nextRange,
                    const GXBlockInfo* currentBlockInfo, std::optional<QVariantMap>& newVariables);
  bool condition(const QStringList& args);
  static bool truthOf(const QVariant& resolved);
  // The numeric test of a text alone, and of an argument whose variable value is already known.
  static bool isNumericText(const QString& text, int* intValue);
  static bool isNumericArg(const QString& arg, const QVariant& resolved, int* intValue);
  void load(const QStringList& names);

  GXTemplateEngine* engine_;
  std::vector<LoopRecord> forStack_;
  std::vector<SectionRecord> sectionStack_;
  std::vector<ConditionalRecord> ifStack_;
  std::vector<CommentRecord> commentStack_;
  std::unordered_map<QString, CycleRecord, GXTemplateValue::StringHash> cycles_;
};
