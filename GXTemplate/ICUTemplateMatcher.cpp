#include "ICUTemplateMatcher.h"

#include "GXTemplateEngine.h"
#include "RXRegex.h"

#include <unicode/uchar.h>

#include <limits>

namespace {

// Start delimiter, optional blanks, the body (lazy, so the first filter delimiter ends it), an optional
// filter part after the filter delimiter, optional blanks, end delimiter. "." stops at line ends.
const QString kPartPattern =
    QStringLiteral(R"((\Q%1\E)(?:\s+)?(.*?)(?:(?:\s+)?\Q%2\E(?:\s+)?(.*?))?(?:\s+)?\Q%3\E)");
const QString kArgumentPattern = QStringLiteral(R"RX("(.*?)(?<!\\)"|'(.*?)(?<!\\)'|(\S+))RX");
const QString kFilterColonPattern = QStringLiteral(R"(:(?:\s+)?)");

bool isFound(GXRange range) {
  return range.location != kGXNotFound;
}
bool isNonEmpty(GXRange range) {
  return isFound(range) && range.length > 0;
}

QString textOf(const QString& string, GXRange range) {
  return string.mid(qsizetype(range.location), qsizetype(range.length));
}

}  // namespace

std::shared_ptr<ICUTemplateMatcher> ICUTemplateMatcher::matcherWithTemplateEngine(GXTemplateEngine* engine) {
  return std::make_shared<ICUTemplateMatcher>(engine);
}

ICUTemplateMatcher::ICUTemplateMatcher(GXTemplateEngine* engine) : engine_(engine) {}

void ICUTemplateMatcher::engineSettingsChanged() {
  found_.clear();
  foundAt_.clear();
  if (!engine_) return;
  markerStart_ = engine_->markerStartDelimiter();
  markerEnd_ = engine_->markerEndDelimiter();
  exprStart_ = engine_->expressionStartDelimiter();
  exprEnd_ = engine_->expressionEndDelimiter();
  filterDelimiter_ = engine_->filterDelimiter();
  templateString_ = engine_->templateContents();
  // The multi-argument arg() substitutes in one pass, so a delimiter holding "%1" stays as it is.
  const QString markerPattern = kPartPattern.arg(markerStart_, filterDelimiter_, markerEnd_);
  const QString expressionPattern = kPartPattern.arg(exprStart_, filterDelimiter_, exprEnd_);
  regex_ = QStringLiteral("(?m)(?:%1|%2)").arg(markerPattern, expressionPattern);
  // A template too long for the index is searched afresh from every position.
  if (templateString_.size() < std::numeric_limits<std::int32_t>::max())
    foundAt_.assign(size_t(templateString_.size()) + 1, -1);
  possibleStart_.assign(size_t(templateString_.size()) + 1, 0);
  markPossibleStarts(markerStart_, markerEnd_);
  markPossibleStarts(exprStart_, exprEnd_);
}

bool ICUTemplateMatcher::isPatternSpace(char16_t c) {
  // ICU's "\s" is the White_Space property.
  if (c < 0x80) return c == u' ' || (c >= 0x09 && c <= 0x0d);
  return u_hasBinaryProperty(UChar32(c), UCHAR_WHITE_SPACE);
}

bool ICUTemplateMatcher::isPatternLineEnd(char16_t c) {
  return (c >= 0x0a && c <= 0x0d) || c == 0x85 || c == 0x2028 || c == 0x2029;
}

void ICUTemplateMatcher::markPossibleStarts(const QString& start, const QString& end) {
  // The part after the start delimiter is  \s* BODY (\s* FILTER \s* BODY)? \s* END  where a BODY is any
  // run of characters without a line end. Whether it can match from position i is worked out from the
  // end of the template backwards, one flag per step of the pattern; a match can begin at p when the
  // start delimiter stands there and the rest can match right after it.
  const QStringView text(templateString_);
  const QStringView filter(filterDelimiter_);
  const qsizetype n = text.size();
  auto at = [&](QStringView literal, qsizetype i) {
    return i + literal.size() <= n && text.sliced(i, literal.size()) == literal;
  };
  std::vector<std::uint8_t> afterStart(size_t(n) + 2, 0);  // \s* BODY ... END
  std::vector<std::uint8_t> filterBody(size_t(n) + 2, 0);  // \s* BODY \s* END, after the filter delimiter
  bool toEnd = false, bodyToEnd = false, toFilter = false, bodyThenRest = false;
  for (qsizetype i = n; i >= 0; --i) {
    const bool inText = i < n;
    const bool space = inText && isPatternSpace(text[i].unicode());
    const bool dot = inText && !isPatternLineEnd(text[i].unicode());
    toEnd = at(QStringView(end), i) || (space && toEnd);                        // \s* END
    bodyToEnd = toEnd || (dot && bodyToEnd);                                    // BODY \s* END
    filterBody[size_t(i)] = bodyToEnd || (space && filterBody[size_t(i) + 1]);  // \s* BODY \s* END
    toFilter =
        (at(filter, i) && filterBody[size_t(i + filter.size())]) || (space && toFilter);  // \s* FILTER ...
    const bool rest = toFilter || toEnd;           // (\s* FILTER ...)? \s* END
    bodyThenRest = rest || (dot && bodyThenRest);  // BODY then the rest
    afterStart[size_t(i)] = bodyThenRest || (space && afterStart[size_t(i) + 1]);
  }
  for (qsizetype p = 0; p + start.size() <= n; ++p) {
    if (at(QStringView(start), p) && afterStart[size_t(p + start.size())]) possibleStart_[size_t(p)] = 1;
  }
}

std::shared_ptr<const GXTemplateMatch> ICUTemplateMatcher::firstMarkerWithinRange(GXRange range) {
  const std::uint64_t length = std::uint64_t(templateString_.size());
  if (range.length == kGXMaxLength) range.length = length;
  if (!GXRangeFitsLength(range, length)) {
    // Out of bounds: let the search raise as it does for any caller.
    RXRegex::rangeOfRegex(templateString_, regex_, 0, range, 0, nullptr);
    return nullptr;
  }
  // The search is not bounded by the range's end, so what it finds from a position is the same for every
  // range starting there; only the check against the end differs.
  const bool indexed = range.location < foundAt_.size();
  if (!indexed || foundAt_[range.location] < 0) {
    std::shared_ptr<const GXTemplateMatch> found;
    std::uint64_t from = range.location;
    while (from < possibleStart_.size() && !possibleStart_[from]) ++from;
    if (from < possibleStart_.size()) {
      const GXRange toEnd{from, length - from};
      const GXRange match = RXRegex::rangeOfRegex(templateString_, regex_, 0, toEnd, 0, nullptr);
      if (isFound(match)) found = std::make_shared<const GXTemplateMatch>(parse(match));
    }
    if (!indexed) return within(found, range);
    foundAt_[range.location] = std::int32_t(found_.size());
    found_.push_back(std::move(found));
  }
  return within(found_[size_t(foundAt_[range.location])], range);
}

std::shared_ptr<const GXTemplateMatch> ICUTemplateMatcher::within(
    const std::shared_ptr<const GXTemplateMatch>& match, GXRange range) {
  if (!match || match->range.location + match->range.length > range.location + range.length) return nullptr;
  return match;
}

GXTemplateMatch ICUTemplateMatcher::parse(GXRange matchRange) const {
  GXTemplateMatch result;
  result.range = matchRange;
  // The groups of the match just found: asking with the same range reuses it.
  const GXRange searched{matchRange.location, std::uint64_t(templateString_.size()) - matchRange.location};
  auto group = [&](int capture) {
    return RXRegex::rangeOfRegex(templateString_, regex_, 0, searched, capture, nullptr);
  };
  const bool isMarker = isNonEmpty(group(1));
  result.type = isMarker ? QStringLiteral("marker") : QStringLiteral("expression");
  const GXRange body = group(isMarker ? 2 : 5);
  if (!isNonEmpty(body)) return result;
  const GXRange filterPart = group(isMarker ? 3 : 6);

  const QStringList arguments = argumentsFromString(textOf(templateString_, body));
  if (!arguments.isEmpty()) {
    result.name = arguments.first();
    if (arguments.size() >= 2) result.args = arguments.mid(1);
  }
  if (!isNonEmpty(filterPart)) return result;
  QString filterText = textOf(templateString_, filterPart);
  // "date_format: "%d.%m.%Y"" reads as date_format and its argument.
  const GXRange colon = RXRegex::rangeOfRegex(filterText, kFilterColonPattern);
  if (isFound(colon)) {
    filterText = filterText.left(qsizetype(colon.location)) + QLatin1Char(' ') +
                 filterText.mid(qsizetype(colon.location + colon.length));
  }
  const QStringList filterArguments = argumentsFromString(filterText);
  if (!filterArguments.isEmpty()) {
    result.filter = filterArguments.first();
    if (filterArguments.size() >= 2) result.filterArgs = filterArguments.mid(1);
  }
  return result;
}

QStringList ICUTemplateMatcher::argumentsFromString(const QString& string) const {
  QStringList arguments;
  const std::uint64_t length = std::uint64_t(string.size());
  std::uint64_t position = 0;
  while (position <= length) {
    const GXRange rest{position, length - position};
    const GXRange whole = RXRegex::rangeOfRegex(string, kArgumentPattern, 0, rest, 0, nullptr);
    if (!isFound(whole)) break;
    GXRange chosen{kGXNotFound, 0};
    for (int capture = 1; capture <= 3 && !isFound(chosen); ++capture) {
      const GXRange part = RXRegex::rangeOfRegex(string, kArgumentPattern, 0, rest, capture, nullptr);
      if (isNonEmpty(part)) chosen = part;
    }
    // An empty quoted argument has no non-empty capture: the split ends there.
    if (!isFound(chosen)) break;
    arguments.append(textOf(string, chosen));
    position = whole.location + whole.length + (whole.length == 0 ? 1 : 0);
  }
  return arguments;
}
