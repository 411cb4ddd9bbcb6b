#pragma once

#include "GXTemplateEngineMatcher.h"

#include <QString>
#include <QStringList>

#include <cstdint>
#include <memory>
#include <optional>
#include <vector>

class GXTemplateEngine;

// The engine's matcher over the regular-expression operations (RXRegex): one pattern built from the
// engine's delimiters finds the next marker ("{% name args | filter args %}") or expression
// ("{{ name | filter args }}") within one line, and its body and filter part are split into arguments.
// What was found from a template position is remembered for the rest of the run, so a loop body read
// again and again costs a table look-up per marker.
class ICUTemplateMatcher : public GXTemplateEngineMatcher {
 public:
  static std::shared_ptr<ICUTemplateMatcher> matcherWithTemplateEngine(GXTemplateEngine* engine);
  // `engine` is not owned and must outlive the matcher's use.
  explicit ICUTemplateMatcher(GXTemplateEngine* engine);

  GXTemplateEngine* engine() const { return engine_; }
  // Copies of the engine's settings, taken by engineSettingsChanged.
  QString markerStart() const { return markerStart_; }
  QString markerEnd() const { return markerEnd_; }
  QString exprStart() const { return exprStart_; }
  QString exprEnd() const { return exprEnd_; }
  QString filterDelimiter() const { return filterDelimiter_; }
  QString templateString() const { return templateString_; }
  // The combined pattern: "(?m)(?:MARKER|EXPRESSION)", capture groups 1-3 for a marker's start delimiter,
  // body and filter part, 4-6 for an expression's.
  QString regex() const { return regex_; }

  // Copies the five delimiters and the template from the engine and rebuilds the pattern.
  void engineSettingsChanged() override;
  // The first marker or expression within `range` of the template: "type" marker or expression, "name"
  // the first argument of the body (none for an empty body), "args" the rest, "filter" and "filterArgs"
  // from the filter part, where a colon and the blanks after it count as one blank ("date_format: "%Y"").
  std::shared_ptr<const GXTemplateMatch> firstMarkerWithinRange(GXRange range) override;

  // Splits at blanks; "double" or 'single' quotes keep blanks (the quotes dropped, backslash escapes kept
  // as written; a quote after a backslash does not close). An empty quoted argument ends the split: it
  // and everything after it are lost.
  QStringList argumentsFromString(const QString& string) const;

  // The character classes of the pattern as ICU reads them: "\s" (the White_Space property) and the
  // line ends that "." does not cross (U+000A-U+000D, U+0085, U+2028, U+2029).
  static bool isPatternSpace(char16_t c);
  static bool isPatternLineEnd(char16_t c);

 private:
  GXTemplateMatch parse(GXRange matchRange) const;
  // `match` when it lies wholly within `range`, else null.
  static std::shared_ptr<const GXTemplateMatch> within(const std::shared_ptr<const GXTemplateMatch>& match,
                                                       GXRange range);
  // Marks the positions where a part (marker or expression) with these delimiters can begin.
  void markPossibleStarts(const QString& start, const QString& end);

  GXTemplateEngine* engine_;
  QString markerStart_;
  QString markerEnd_;
  QString exprStart_;
  QString exprEnd_;
  QString filterDelimiter_;
  QString templateString_;
  QString regex_;
  // What a search from each template position found (the match, not yet checked against a range, or
  // null for nothing), read by the position: foundAt_ holds its index in found_, or -1 before the first
  // search from there. A loop body read again and again finds its markers with one index each.
  std::vector<std::int32_t> foundAt_;
  std::vector<std::shared_ptr<const GXTemplateMatch>> found_;
  // For each template position, whether a match can begin there. A search that fails from a position
  // costs the regular expression time in proportion to the rest of the line for every start delimiter
  // on it (and more with filter delimiters), which lets a hostile template of a few kilobytes run for
  // minutes; the search therefore begins at the first position where a match exists, and is skipped
  // when there is none. What it finds is what a search from the asked position finds.
  std::vector<std::uint8_t> possibleStart_;
};
