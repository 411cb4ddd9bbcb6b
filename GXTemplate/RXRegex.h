#pragma once

#include "GXRange.h"

#include <QList>
#include <QString>
#include <QVariant>

#include <cstdint>
#include <stdexcept>
#include <utility>

// Regular-expression searching of strings over ICU's C interface (ICU pattern syntax, options and capture
// numbering), built around a process-wide cache: 23 compiled expressions keyed by the pattern's hash, each
// remembering the text last set on it, the last range asked for and the last match, so that searching one
// long text with one pattern from advancing positions neither recompiles, nor copies the text again, nor
// restarts the search. One spin lock guards the cache; every operation may be called from any thread.
//
// Ranges are in UTF-16 units. kWholeString, (0, largest unsigned value), searches the whole string: a
// length equal to the largest unsigned value stands for the string's length, so with a location above 0
// such a range exceeds the bounds. A capture that took no part in the match answers (kGXNotFound, 0).
//
// Programming errors raise the exceptions below, always after the lock is released; a pattern that does
// not compile is not an error of that kind: the operation finds nothing and, when asked, describes why.
namespace RXRegex {

inline constexpr GXRange kWholeString{0, kGXMaxLength};

// A compile error: domain "RXICURegexErrorDomain", the ICU status as the code, and the user info in the
// order it was built ("NSLocalizedDescription", "NSLocalizedFailureReason", "RXICURegexRegex",
// "RXICURegexRegexOptions", then, when ICU reported a line, "RXICURegexLine", "RXICURegexOffset",
// "RXICURegexPreContext", "RXICURegexPostContext", "RXICURegexErrorName").
struct Error {
  QString domain;
  qint64 code = 0;
  QList<std::pair<QString, QVariant>> userInfo;

  bool isNull() const { return domain.isNull(); }
  // The value under `key`, or a null variant.
  QVariant value(const QString& key) const;
};

// "The regular expression argument is NULL.", "The capture argument is not valid."
class InvalidArgumentException : public std::invalid_argument {
 public:
  using std::invalid_argument::invalid_argument;
};

// "The search range exceeds the strings bounds."
class RangeException : public std::out_of_range {
 public:
  using std::out_of_range::out_of_range;
};

// "ICU regular expression error #<status>, <name>" for a failure while setting the text or searching;
// "An internal error occured at RXRegex:<line>" for faults of the cache itself.
class InternalInconsistencyException : public std::logic_error {
 public:
  using std::logic_error::logic_error;
};

// Forgets the texts held by all slots and by both character buffers (freeing the heap buffer); the
// compiled expressions stay.
void clearStringCache();

// The number of capture groups of `regex`, or -1 when it does not compile. `error`, when given, is
// cleared and then describes a compile error. A null pattern raises InvalidArgumentException.
int captureCountForRegex(const QString& regex);
int captureCountForRegex(const QString& regex, std::uint32_t options, Error* error);

// True when rangeOfRegex with capture 0 finds something.
bool isMatchedByRegex(const QString& string, const QString& regex);
bool isMatchedByRegex(const QString& string, const QString& regex, std::uint32_t options, GXRange range,
                      Error* error);

// The range of `capture` (0 = the whole match) in the first match of `regex` that starts at or after
// range.location and ends within the range; (kGXNotFound, 0) when there is none. A match that would run
// past the range's end counts as none, even if a shorter match lies wholly inside it.
// Raises InvalidArgumentException for a null pattern or a capture outside 0...captureCount,
// RangeException when the range's end exceeds the string, InternalInconsistencyException when ICU fails.
GXRange rangeOfRegex(const QString& string, const QString& regex);
GXRange rangeOfRegex(const QString& string, const QString& regex, int capture);
GXRange rangeOfRegex(const QString& string, const QString& regex, GXRange range);
GXRange rangeOfRegex(const QString& string, const QString& regex, std::uint32_t options, GXRange range,
                     int capture, Error* error);

// The text of that capture in the first match, or a null QString when nothing is found.
QString stringByMatching(const QString& string, const QString& regex);
QString stringByMatching(const QString& string, const QString& regex, int capture);
QString stringByMatching(const QString& string, const QString& regex, GXRange range);
QString stringByMatching(const QString& string, const QString& regex, std::uint32_t options, GXRange range,
                         int capture, Error* error);

// How many times a pattern has been compiled since the process started (for tests and benchmarks that
// check that the cache does its work).
std::uint64_t compileCount();

}  // namespace RXRegex
