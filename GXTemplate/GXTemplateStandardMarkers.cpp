#include "GXTemplateStandardMarkers.h"

#include "Date.h"
#include "Decimal.h"
#include "GXTemplateEngine.h"
#include "GXTemplateValue.h"
#include "VariantNumbers.h"

#include <algorithm>
#include <limits>

namespace {

const QString kCurrentLoop = QStringLiteral("currentLoop");
const QString kParentLoop = QStringLiteral("parentLoop");
const QString kStartIndex = QStringLiteral("startIndex");
const QString kEndIndex = QStringLiteral("endIndex");
const QString kCurrentIndex = QStringLiteral("currentIndex");
const QString kReversed = QStringLiteral("reversed");

// Whether a number is true: any non-zero value.
std::optional<bool> numberTruth(const QVariant& value) {
  const int type = value.typeId();
  if (type == QMetaType::Bool) return value.toBool();
  if (VariantNumbers::isSignedInteger(type) || VariantNumbers::isUnsignedInteger(type))
    return value.toLongLong() != 0 || value.toULongLong() != 0;
  if (VariantNumbers::isFloatingPoint(type)) return value.toDouble() != 0.0;
  if (type == QMetaType::fromType<Decimal>().id()) return !value.value<Decimal>().isZero();
  return std::nullopt;
}

enum class Marker {
  None,
  For,
  EndFor,
  Section,
  EndSection,
  If,
  Else,
  EndIf,
  Now,
  Comment,
  EndComment,
  Load,
  Cycle,
  Set
};

// The marker a name stands for: its length narrows the candidates to one or a few comparisons.
Marker markerKind(const QString& name) {
  auto is = [&name](QStringView text) { return QStringView(name) == text; };
  switch (name.size()) {
    case 2:
      return is(u"if") ? Marker::If : Marker::None;
    case 3:
      return is(u"for")   ? Marker::For
             : is(u"/if") ? Marker::EndIf
             : is(u"now") ? Marker::Now
             : is(u"set") ? Marker::Set
                         : Marker::None;
    case 4:
      return is(u"/for")   ? Marker::EndFor
             : is(u"else") ? Marker::Else
             : is(u"load") ? Marker::Load
                          : Marker::None;
    case 5:
      return is(u"cycle") ? Marker::Cycle : Marker::None;
    case 7:
      return is(u"section") ? Marker::Section : is(u"comment") ? Marker::Comment : Marker::None;
    case 8:
      return is(u"/section") ? Marker::EndSection : is(u"/comment") ? Marker::EndComment : Marker::None;
    default:
      return Marker::None;
  }
}

int clampToInt(qint64 value) {
  return int(std::clamp<qint64>(value, std::numeric_limits<int>::min(), std::numeric_limits<int>::max()));
}

}  // namespace

GXTemplateStandardMarkers::GXTemplateStandardMarkers(GXTemplateEngine* engine) : engine_(engine) {}

QStringList GXTemplateStandardMarkers::markers() const {
  return {QStringLiteral("for"),      QStringLiteral("/for"), QStringLiteral("section"),
          QStringLiteral("/section"), QStringLiteral("if"),   QStringLiteral("else"),
          QStringLiteral("/if"),      QStringLiteral("now"),  QStringLiteral("comment"),
          QStringLiteral("/comment"), QStringLiteral("load"), QStringLiteral("cycle"),
          QStringLiteral("set")};
}

std::optional<QStringList> GXTemplateStandardMarkers::endMarkersForMarker(const QString& marker) const {
  // Every block of a run asks: the lists are shared, not made each time.
  static const QStringList forEnds{QStringLiteral("/for")};
  static const QStringList sectionEnds{QStringLiteral("/section")};
  static const QStringList ifEnds{QStringLiteral("/if"), QStringLiteral("else")};
  static const QStringList commentEnds{QStringLiteral("/comment")};
  if (marker == QLatin1String("for")) return forEnds;
  if (marker == QLatin1String("section")) return sectionEnds;
  if (marker == QLatin1String("if")) return ifEnds;
  if (marker == QLatin1String("comment")) return commentEnds;
  return std::nullopt;
}

void GXTemplateStandardMarkers::engineFinishedProcessingTemplate() {
  forStack_.clear();
  sectionStack_.clear();
  ifStack_.clear();
  commentStack_.clear();
  cycles_.clear();
}

bool GXTemplateStandardMarkers::currentBlock(const GXBlockInfo* block, const GXRange* topMarkerRange) {
  if (!block || !topMarkerRange) return false;
  return block->startMarkerRange == *topMarkerRange;
}

bool GXTemplateStandardMarkers::argIsTrue(const QString& arg) {
  if (arg.isNull() || !engine_) return false;
  return truthOf(engine_->resolveVariable(arg));
}

bool GXTemplateStandardMarkers::truthOf(const QVariant& resolved) {
  if (GXTemplateValue::isNil(resolved)) return false;
  return numberTruth(resolved).value_or(true);
}

bool GXTemplateStandardMarkers::isNumericText(const QString& text, int* intValue) {
  bool numeric = false;
  int value = 0;
  if (!text.isEmpty()) {
    value = GXTemplateValue::intValue(QStringView(text));
    // "0" counts although its value is 0; any other text needs a non-zero value.
    numeric = text.front() == u'0' || value != 0;
  }
  if (intValue) *intValue = numeric ? value : 0;
  return numeric;
}

bool GXTemplateStandardMarkers::isNumericArg(const QString& arg, const QVariant& resolved, int* intValue) {
  if (isNumericText(arg, intValue)) return true;
  // Otherwise the text of the value it names, when that value has an integer value. An integer's text is
  // always numeric and reads back as the integer (saturated), so none is written for it.
  const int type = resolved.typeId();
  if (!arg.isEmpty() && (VariantNumbers::isSignedInteger(type) || VariantNumbers::isUnsignedInteger(type) ||
                         type == QMetaType::Bool)) {
    if (intValue) *intValue = GXTemplateValue::intValue(resolved);
    return true;
  }
  if (!arg.isEmpty() && !GXTemplateValue::isNil(resolved) && GXTemplateValue::answersIntValue(resolved)) {
    return isNumericText(GXTemplateValue::description(resolved), intValue);
  }
  return false;
}

bool GXTemplateStandardMarkers::argIsNumeric(const QString& arg, int* intValue, bool checkVariables) {
  if (isNumericText(arg, intValue)) return true;
  if (arg.isEmpty() || !checkVariables || !engine_) return false;
  return isNumericArg(arg, engine_->resolveVariable(arg), intValue);
}

QVariant GXTemplateStandardMarkers::markerEncountered(const QString& marker, const QStringList& args,
                                                      GXRange markerRange, bool& blockStarted,
                                                      bool& blockEnded, bool& outputEnabled,
                                                      GXRange& nextRange, const GXBlockInfo* currentBlockInfo,
                                                      std::optional<QVariantMap>& newVariables) {
  switch (markerKind(marker)) {
    case Marker::For: {
      if (args.size() < 3) return {};
      blockStarted = true;
      return forMarker(args, markerRange, outputEnabled, nextRange, currentBlockInfo, newVariables);
    }
    case Marker::EndFor: {
      endForMarker(blockEnded, outputEnabled, nextRange, currentBlockInfo, newVariables);
      return {};
    }
    case Marker::Section: {
      if (args.size() != 1) return {};
      blockStarted = true;
      sectionStack_.push_back({markerRange});
      return {};
    }
    case Marker::EndSection: {
      if (!sectionStack_.empty() && currentBlock(currentBlockInfo, &sectionStack_.back().markerRange)) {
        sectionStack_.pop_back();
      }
      blockEnded = true;
      return {};
    }
    case Marker::If: {
      // One or three arguments only: "if not x" is never evaluated and starts no block.
      if (args.size() != 1 && args.size() != 3) return {};
      blockStarted = true;
      // Inside a disabled region the outcome is never used (neither the branch nor its "else" can enable
      // output), so the condition is not evaluated there.
      const bool result = outputEnabled && condition(args);
      const bool wasEnabled = outputEnabled;
      if (outputEnabled && !result) outputEnabled = false;
      ifStack_.push_back({markerRange, result, wasEnabled, false});
      return {};
    }
    case Marker::Else: {
      if (!ifStack_.empty() && currentBlock(currentBlockInfo, &ifStack_.back().markerRange)) {
        ConditionalRecord& conditional = ifStack_.back();
        if (!conditional.elseEncountered) {
          if (conditional.shouldDisableOutput) outputEnabled = !conditional.argumentTrue;
          conditional.elseEncountered = true;
        }
      }
      return {};
    }
    case Marker::EndIf: {
      if (!ifStack_.empty() && currentBlock(currentBlockInfo, &ifStack_.back().markerRange)) {
        if (ifStack_.back().shouldDisableOutput) outputEnabled = true;
        ifStack_.pop_back();
      }
      blockEnded = true;
      return {};
    }
    case Marker::Now:
      return QVariant::fromValue(Date::now());
    case Marker::Comment: {
      if (!args.isEmpty()) return {};
      blockStarted = true;
      const bool wasEnabled = outputEnabled;
      if (outputEnabled) outputEnabled = false;
      commentStack_.push_back({markerRange, wasEnabled});
      return {};
    }
    case Marker::EndComment: {
      if (!commentStack_.empty() && currentBlock(currentBlockInfo, &commentStack_.back().markerRange)) {
        if (commentStack_.back().shouldDisableOutput) outputEnabled = true;
        commentStack_.pop_back();
      }
      blockEnded = true;
      return {};
    }
    case Marker::Load: {
      load(args);
      return {};
    }
    case Marker::Cycle: {
      if (args.isEmpty()) return {};
      // Keyed by the marker's position, so one cycle marker inside a loop advances from pass to pass.
      const QString key = GXStringFromRange(markerRange);
      auto it = cycles_.find(key);
      if (it == cycles_.end()) {
        cycles_.emplace(key, CycleRecord{args, 0});
        return args.first();
      }
      CycleRecord& cycle = it->second;
      qsizetype next = cycle.lastIndex + 1;
      if (next >= cycle.value.size()) next = 0;
      cycle.lastIndex = next;
      return cycle.value.at(next);
    }
    case Marker::Set: {
      if (args.size() == 2 && outputEnabled) newVariables = QVariantMap{{args[0], args[1]}};
      return {};
    }
    case Marker::None:
      break;
  }
  return {};
}

QVariant GXTemplateStandardMarkers::forMarker(const QStringList& args, GXRange markerRange,
                                              bool& outputEnabled, const GXRange& nextRange,
                                              const GXBlockInfo* currentBlockInfo,
                                              std::optional<QVariantMap>& newVariables) {
  const bool overCollection = args[1] == QLatin1String("in");
  const bool reversed = args.size() == 4 && args[3] == QLatin1String("reversed");
  LoopRecord record;
  record.markerRange = markerRange;
  record.remainingRange = nextRange;

  int startIndex = 0;
  int endIndex = 0;
  bool runs = false;
  std::optional<QVariantList> items;
  bool reversibleItems = false;
  if (overCollection) {
    const QVariant collection = engine_ ? engine_->resolveVariable(args[2]) : QVariant();
    items = GXTemplateValue::elements(collection);
    // Only lists enumerate backwards; a map keeps its order even when reversed.
    reversibleItems = GXTemplateValue::isList(collection);
    if (items && !items->isEmpty()) {
      runs = true;
      endIndex = clampToInt(items->size());
    }
  } else {
    // "for 1 to 5": the word in the middle is not checked.
    runs = argIsNumeric(args[0], &startIndex, true) && argIsNumeric(args[2], &endIndex, true) &&
           startIndex <= endIndex;
  }

  if (!runs) {
    record.disabledOutput = true;
    forStack_.push_back(record);
    outputEnabled = false;
    return {};
  }

  QVariantMap currentLoop{{kStartIndex, startIndex},
                          {kEndIndex, endIndex},
                          {kCurrentIndex, reversed ? endIndex : startIndex},
                          {kReversed, reversed}};
  if (currentBlockInfo && engine_) {
    const QVariant parentLoop = engine_->resolveVariable(kCurrentLoop);
    if (!GXTemplateValue::isNil(parentLoop)) currentLoop.insert(kParentLoop, parentLoop);
  }
  QVariantMap variables{{kCurrentLoop, currentLoop}};
  if (overCollection) {
    record.hasEnumerator = true;
    record.items = std::move(*items);
    record.reverseItems = reversed && reversibleItems;
    record.enumeratorVariable = args[0];
    record.nextItem = 1;
    variables.insert(args[0], record.reverseItems ? record.items.last() : record.items.first());
  }
  forStack_.push_back(std::move(record));
  newVariables = std::move(variables);
  return {};
}

void GXTemplateStandardMarkers::endForMarker(bool& blockEnded, bool& outputEnabled, GXRange& nextRange,
                                             const GXBlockInfo* currentBlockInfo,
                                             std::optional<QVariantMap>& newVariables) {
  if (forStack_.empty() || !currentBlock(currentBlockInfo, &forStack_.back().markerRange)) {
    blockEnded = true;
    return;
  }
  LoopRecord& record = forStack_.back();
  if (record.disabledOutput) {
    // Unconditionally: inside a region already disabled this turns output back on early.
    outputEnabled = true;
    blockEnded = true;
    forStack_.pop_back();
    return;
  }
  if (currentBlockInfo->vars.isEmpty()) {
    blockEnded = true;
    return;
  }
  // Read where it is: a copy would make the change below copy the whole map.
  static const QVariantMap kNoLoop;
  const auto loopEntry = currentBlockInfo->vars.constFind(kCurrentLoop);
  const QVariantMap& currentLoop =
      loopEntry != currentBlockInfo->vars.cend() && loopEntry->typeId() == QMetaType::QVariantMap
          ? *static_cast<const QVariantMap*>(loopEntry->constData())
          : kNoLoop;
  const bool reversed = currentLoop.value(kReversed).toBool();
  const qint64 currentIndex = GXTemplateValue::intValue(currentLoop.value(kCurrentIndex));
  QVariant nextItem;
  bool ended = false;
  if (record.hasEnumerator) {
    if (record.nextItem < record.items.size()) {
      nextItem =
          record.items.at(record.reverseItems ? record.items.size() - 1 - record.nextItem : record.nextItem);
      ++record.nextItem;
    } else {
      ended = true;
    }
  } else if (reversed) {
    ended = currentIndex <= GXTemplateValue::intValue(currentLoop.value(kStartIndex));
  } else {
    ended = currentIndex >= GXTemplateValue::intValue(currentLoop.value(kEndIndex));
  }
  if (ended) {
    blockEnded = true;
    forStack_.pop_back();
    return;
  }
  nextRange = record.remainingRange;
  const int nextIndex = clampToInt(reversed ? currentIndex - 1 : currentIndex + 1);
  // The next round changes the loop's own frame in place, as storing the two values would, without
  // making a new "currentLoop" map and a map of new variables for every round.
  const bool enumerates = record.hasEnumerator;
  if (engine_ && &currentLoop != &kNoLoop && (!enumerates || !GXTemplateValue::isNil(nextItem))) {
    QVariant* loopValue = engine_->variableInInnermostBlock(kCurrentLoop);
    QVariant* itemValue = enumerates ? engine_->variableInInnermostBlock(record.enumeratorVariable) : nullptr;
    if (loopValue && loopValue->typeId() == QMetaType::QVariantMap && (!enumerates || itemValue)) {
      static_cast<QVariantMap*>(loopValue->data())->insert(kCurrentIndex, nextIndex);
      if (itemValue) *itemValue = nextItem;
      return;
    }
  }
  QVariantMap loop = currentLoop;
  loop.insert(kCurrentIndex, nextIndex);
  QVariantMap variables{{kCurrentLoop, loop}};
  if (enumerates) variables.insert(record.enumeratorVariable, nextItem);
  newVariables = std::move(variables);
}

bool GXTemplateStandardMarkers::condition(const QStringList& args) {
  if (args.size() == 1) return argIsTrue(args[0]);
  // Most operators are symbols: no lowered copy for those.
  const QString& written = args[1];
  const bool lettered = std::any_of(written.cbegin(), written.cend(), [](QChar c) { return c.isUpper(); });
  const QString op = lettered ? written.toLower() : written;
  const bool logical = op == QLatin1String("and") || op == QLatin1String("&&") || op == QLatin1String("or") ||
                       op == QLatin1String("||");
  const bool textual = op == QLatin1String("equalsstring") || op == QLatin1String("notequalsstring");
  // Each side is resolved at most once, and only when the operator reads its value: a number written as
  // a number is its own value for a comparison, whatever a variable of that name holds.
  struct Side {
    QVariant resolved;
    bool truth = false;
    int number = 0;
  };
  auto sideOf = [&](const QString& arg) {
    Side side;
    if (!logical && !textual && isNumericText(arg, &side.number)) return side;
    side.resolved = engine_ ? engine_->resolveVariable(arg) : QVariant();
    side.truth = truthOf(side.resolved);
    // A side that is not numeric counts as 1 when it names a variable, else 0.
    if (!isNumericArg(arg, side.resolved, &side.number))
      side.number = GXTemplateValue::isNil(side.resolved) ? 0 : 1;
    return side;
  };
  const Side left = sideOf(args[0]);
  const Side right = sideOf(args[2]);

  if (op == QLatin1String("and") || op == QLatin1String("&&")) return left.truth && right.truth;
  if (op == QLatin1String("or") || op == QLatin1String("||")) return left.truth || right.truth;
  if (op == QLatin1String("=") || op == QLatin1String("==")) return left.number == right.number;
  if (op == QLatin1String("!=") || op == QLatin1String("<>")) return left.number != right.number;
  if (op == QLatin1String(">")) return left.number > right.number;
  if (op == QLatin1String("<")) return left.number < right.number;
  if (op == QLatin1String(">=")) return left.number >= right.number;
  if (op == QLatin1String("<=")) return left.number <= right.number;
  // Modulo by zero has no value; the condition is then false.
  if (op == QLatin1String("%")) return right.number != 0 && qint64(left.number) % qint64(right.number) > 0;
  if (textual) {
    auto text = [](const QString& arg, const Side& side) {
      return GXTemplateValue::isNil(side.resolved) ? arg : GXTemplateValue::description(side.resolved);
    };
    const bool equal = text(args[0], left) == text(args[2], right);
    return op == QLatin1String("equalsstring") ? equal : !equal;
  }
  return false;
}

void GXTemplateStandardMarkers::load(const QStringList& names) {
  if (!engine_) return;
  for (const QString& name : names) {
    if (std::shared_ptr<GXTemplateFilter> filter = engine_->classRegistry().makeFilter(name)) {
      engine_->loadFilter(std::move(filter));
    } else if (std::shared_ptr<GXTemplateMarker> marker =
                   engine_->classRegistry().makeMarker(name, engine_)) {
      engine_->loadMarker(std::move(marker));
    }
  }
}
