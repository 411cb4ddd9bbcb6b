#include "RXRegex.h"

#include <unicode/parseerr.h>
#include <unicode/uregex.h>
#include <unicode/ustring.h>

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <thread>

namespace {

constexpr std::size_t kSlotCount = 23;
constexpr qsizetype kFixedBufferLength = 2048;
constexpr GXRange kNotFoundRange{kGXNotFound, 0};

// A string hash in the manner of the platform's: every unit of a short string, but only the first, middle
// and last 32 units (and the length) of a long one, so that recognising a long template costs no more than
// recognising a short one.
std::size_t stringHash(const QChar* chars, qsizetype length) {
  std::size_t hash = std::size_t(length) * 0x9E3779B97F4A7C15ull;
  auto mix = [&](qsizetype from, qsizetype count) {
    for (qsizetype i = from; i < from + count; ++i) hash = (hash ^ chars[i].unicode()) * 0x100000001B3ull;
  };
  if (length <= 96) {
    mix(0, length);
  } else {
    mix(0, 32);
    mix(length / 2 - 16, 32);
    mix(length - 32, 32);
  }
  return hash ^ (hash >> 29);
}

std::size_t stringHash(const QString& string) {
  return stringHash(string.constData(), string.size());
}

// Which string a set of characters came from: its own characters pointer, hash and length.
struct TextIdentity {
  const QChar* characters = nullptr;
  std::size_t hash = 0;
  qsizetype length = -1;

  bool operator==(const TextIdentity&) const = default;
};

struct Slot {
  QString pattern;  // null when the slot is empty
  std::uint32_t options = 0;
  URegularExpression* regex = nullptr;
  int32_t captureCount = -1;
  // The text currently set on `regex`. `text` keeps owned characters alive while ICU points at them.
  QString text;
  TextIdentity textIdentity;
  const UChar* textCharacters = nullptr;  // what ICU was given: the string's characters or a buffer
  GXRange lastRange = kNotFoundRange;
  GXRange lastMatch = kNotFoundRange;

  void forgetText() {
    text = QString();
    textIdentity = TextIdentity();
    textCharacters = nullptr;
    lastRange = kNotFoundRange;
    lastMatch = kNotFoundRange;
  }

  void reset() {
    forgetText();
    pattern = QString();
    if (regex) uregex_close(regex);
    regex = nullptr;
    captureCount = -1;
  }
};

struct Cache {
  Slot entries[kSlotCount];
  Slot* lastUsed = nullptr;
  // Characters of strings that do not own them (QString::fromRawData, literals): they may vanish once the
  // call returns, so ICU is given a copy. Short ones never cost an allocation.
  UChar fixed[kFixedBufferLength];
  TextIdentity fixedHolder;
  UChar* heap = nullptr;
  qsizetype heapCapacity = 0;
  TextIdentity heapHolder;

  ~Cache() {
    for (Slot& slot : entries) slot.reset();
    std::free(heap);
  }

  // Slots whose ICU text lives in `buffer` must set it again once the buffer holds other characters.
  void forgetTextsIn(const UChar* buffer) {
    for (Slot& slot : entries) {
      if (slot.textCharacters == buffer) slot.forgetText();
    }
  }
};

Cache& cache() {
  static Cache instance;
  return instance;
}

std::atomic_flag gLock = ATOMIC_FLAG_INIT;
std::atomic<std::uint64_t> gCompileCount{0};

// The one lock of the cache; released early (before raising) or at the end of the scope.
class Locker {
 public:
  Locker() {
    while (gLock.test_and_set(std::memory_order_acquire)) std::this_thread::yield();
  }
  ~Locker() { unlock(); }
  void unlock() {
    if (locked_) gLock.clear(std::memory_order_release);
    locked_ = false;
  }

 private:
  bool locked_ = true;
};

QString fromUChars(const UChar* chars) {
  return chars ? QString::fromUtf16(reinterpret_cast<const char16_t*>(chars)) : QString();
}

void describeCompileError(RXRegex::Error* error, UErrorCode status, const UParseError& parseError,
                          const QString& pattern, std::uint32_t options) {
  if (!error) return;
  const QString name = QString::fromLatin1(u_errorName(status));
  error->domain = QStringLiteral("RXICURegexErrorDomain");
  error->code = status;
  error->userInfo.clear();
  error->userInfo.append({QStringLiteral("NSLocalizedDescription"),
                          QStringLiteral("There was an error compiling the regular expression.")});
  const bool hasLine = parseError.line != -1;
  // "occured" is the established spelling of these texts; callers match on it.
  const QString reason = hasLine
                             ? QStringLiteral("The error %1 occured at line %2, column %3: %4<<HERE>>%5")
                                   .arg(name)
                                   .arg(parseError.line)
                                   .arg(parseError.offset)
                                   .arg(fromUChars(parseError.preContext), fromUChars(parseError.postContext))
                             : QStringLiteral("The error %1 occured.").arg(name);
  error->userInfo.append({QStringLiteral("NSLocalizedFailureReason"), reason});
  error->userInfo.append({QStringLiteral("RXICURegexRegex"), pattern});
  error->userInfo.append({QStringLiteral("RXICURegexRegexOptions"), QVariant::fromValue(options)});
  if (!hasLine) return;
  error->userInfo.append({QStringLiteral("RXICURegexLine"), parseError.line});
  error->userInfo.append({QStringLiteral("RXICURegexOffset"), parseError.offset});
  error->userInfo.append({QStringLiteral("RXICURegexPreContext"), fromUChars(parseError.preContext)});
  error->userInfo.append({QStringLiteral("RXICURegexPostContext"), fromUChars(parseError.postContext)});
  error->userInfo.append({QStringLiteral("RXICURegexErrorName"), name});
}

// The slot holding `pattern` compiled with `options`, compiling it when needed; the lock must be held.
// Returns the slot even when its pattern failed to compile (its regex is then null).
Slot* compiledSlot(Cache& c, const QString& pattern, std::uint32_t options, RXRegex::Error* error) {
  if (c.lastUsed && c.lastUsed->pattern == pattern) return c.lastUsed;
  Slot& slot = c.entries[stringHash(pattern) % kSlotCount];
  if (slot.options == options && slot.regex && slot.pattern == pattern) {
    c.lastUsed = &slot;
    return &slot;
  }
  slot.reset();
  // A real copy: the caller's pattern may not own its characters.
  slot.pattern = pattern.data_ptr().isMutable() ? pattern : QString(pattern.constData(), pattern.size());
  slot.options = options;
  UParseError parseError;
  std::memset(&parseError, 0, sizeof parseError);
  parseError.line = -1;
  parseError.offset = -1;
  UErrorCode status = U_ZERO_ERROR;
  ++gCompileCount;
  // ICU refuses an explicit length of 0; the empty pattern goes in as an empty terminated string.
  if (slot.pattern.isEmpty()) {
    slot.regex = uregex_open(u"", -1, options, &parseError, &status);
  } else if (slot.pattern.size() <= INT32_MAX) {
    slot.regex = uregex_open(reinterpret_cast<const UChar*>(slot.pattern.constData()),
                             int32_t(slot.pattern.size()), options, &parseError, &status);
  } else {
    status = U_REGEX_PATTERN_TOO_BIG;
  }
  if (U_FAILURE(status)) {
    if (slot.regex) uregex_close(slot.regex);
    slot.regex = nullptr;
    describeCompileError(error, status, parseError, slot.pattern, options);
    return &slot;
  }
  slot.captureCount = uregex_groupCount(slot.regex, &status);
  if (U_FAILURE(status)) slot.captureCount = -1;
  c.lastUsed = &slot;
  return &slot;
}

// Makes `string` the slot's text unless it already is; the lock must be held. Returns the source line of
// an internal fault (no character buffer), else 0; ICU failures go to `status`.
int setText(Cache& c, Slot& slot, const QString& string, UErrorCode& status) {
  const TextIdentity identity{string.constData(), stringHash(string), string.size()};
  if (slot.textCharacters && slot.textIdentity == identity) return 0;
  slot.forgetText();
  if (identity.length > INT32_MAX) return __LINE__;
  const UChar* characters = nullptr;
  if (string.data_ptr().isMutable()) {
    characters = reinterpret_cast<const UChar*>(string.constData());
  } else if (identity.length < kFixedBufferLength) {
    if (!(c.fixedHolder == identity)) {
      c.forgetTextsIn(c.fixed);
      if (identity.length > 0)
        std::memcpy(c.fixed, string.constData(), size_t(identity.length) * sizeof(UChar));
      c.fixedHolder = identity;
    }
    characters = c.fixed;
  } else {
    if (!(c.heapHolder == identity)) {
      c.forgetTextsIn(c.heap);
      c.heapHolder = TextIdentity();
      if (c.heapCapacity < identity.length) {
        UChar* grown = static_cast<UChar*>(std::realloc(c.heap, size_t(identity.length) * sizeof(UChar)));
        if (!grown) return __LINE__;
        c.heap = grown;
        c.heapCapacity = identity.length;
      }
      std::memcpy(c.heap, string.constData(), size_t(identity.length) * sizeof(UChar));
      c.heapHolder = identity;
    }
    characters = c.heap;
  }
  if (!characters) return __LINE__;
  uregex_setText(slot.regex, characters, int32_t(identity.length), &status);
  if (U_FAILURE(status)) return 0;
  slot.text = string;
  slot.textIdentity = identity;
  slot.textCharacters = characters;
  return 0;
}

// Searches from range.location (continuing the previous search when it ended there) unless the same range
// was asked for last; the lock must be held. Returns the match of group 0, checked against the range.
GXRange search(Slot& slot, GXRange range, UErrorCode& status) {
  if (!(range == slot.lastRange)) {
    slot.lastRange = range;
    const GXRange last = slot.lastMatch;
    bool found = false;
    if (last.location != kGXNotFound &&
        range.location == last.location + last.length + (last.length == 0 ? 1 : 0)) {
      found = uregex_findNext(slot.regex, &status);
    } else {
      found = uregex_find(slot.regex, int32_t(range.location), &status);
    }
    slot.lastMatch = kNotFoundRange;
    if (found && U_SUCCESS(status)) {
      const int32_t start = uregex_start(slot.regex, 0, &status);
      const int32_t end = uregex_end(slot.regex, 0, &status);
      if (U_SUCCESS(status) && start >= 0 && end >= start)
        slot.lastMatch = {std::uint64_t(start), std::uint64_t(end - start)};
    }
  }
  const GXRange match = slot.lastMatch;
  // The search is not bounded by the range's end: a match reaching past it counts as none.
  if (match.location == kGXNotFound || match.location + match.length > range.location + range.length) {
    return kNotFoundRange;
  }
  return match;
}

[[noreturn]] void raiseInternalFault(int line) {
  throw RXRegex::InternalInconsistencyException(QStringLiteral("An internal error occured at %1:%2")
                                                    .arg(QStringLiteral("RXRegex"))
                                                    .arg(line)
                                                    .toStdString());
}

}  // namespace

namespace RXRegex {

QVariant Error::value(const QString& key) const {
  for (const auto& [name, value] : userInfo) {
    if (name == key) return value;
  }
  return {};
}

void clearStringCache() {
  Locker lock;
  Cache& c = cache();
  for (Slot& slot : c.entries) slot.forgetText();
  c.fixedHolder = TextIdentity();
  c.heapHolder = TextIdentity();
  std::free(c.heap);
  c.heap = nullptr;
  c.heapCapacity = 0;
}

int captureCountForRegex(const QString& regex) {
  return captureCountForRegex(regex, 0, nullptr);
}

int captureCountForRegex(const QString& regex, std::uint32_t options, Error* error) {
  if (error) *error = Error();
  if (regex.isNull()) throw InvalidArgumentException("The regular expression argument is NULL.");
  Locker lock;
  const Slot* slot = compiledSlot(cache(), regex, options, error);
  return slot && slot->regex ? slot->captureCount : -1;
}

bool isMatchedByRegex(const QString& string, const QString& regex) {
  return isMatchedByRegex(string, regex, 0, kWholeString, nullptr);
}

bool isMatchedByRegex(const QString& string, const QString& regex, std::uint32_t options, GXRange range,
                      Error* error) {
  return rangeOfRegex(string, regex, options, range, 0, error).location != kGXNotFound;
}

GXRange rangeOfRegex(const QString& string, const QString& regex) {
  return rangeOfRegex(string, regex, 0, kWholeString, 0, nullptr);
}

GXRange rangeOfRegex(const QString& string, const QString& regex, int capture) {
  return rangeOfRegex(string, regex, 0, kWholeString, capture, nullptr);
}

GXRange rangeOfRegex(const QString& string, const QString& regex, GXRange range) {
  return rangeOfRegex(string, regex, 0, range, 0, nullptr);
}

GXRange rangeOfRegex(const QString& string, const QString& regex, std::uint32_t options, GXRange range,
                     int capture, Error* error) {
  if (error) *error = Error();
  if (regex.isNull()) throw InvalidArgumentException("The regular expression argument is NULL.");
  const std::uint64_t length = std::uint64_t(string.size());
  if (range.length == kGXMaxLength) range.length = length;
  // Deliberately without an apostrophe: the text is matched as it stands.
  if (!GXRangeFitsLength(range, length)) throw RangeException("The search range exceeds the strings bounds.");

  UErrorCode status = U_ZERO_ERROR;
  GXRange result = kNotFoundRange;
  int faultLine = 0;
  {
    Locker lock;
    Cache& c = cache();
    Slot* slot = compiledSlot(c, regex, options, error);
    if (!slot || !slot->regex) return kNotFoundRange;
    if (capture < 0 || capture > slot->captureCount) {
      lock.unlock();
      throw InvalidArgumentException("The capture argument is not valid.");
    }
    faultLine = setText(c, *slot, string, status);
    if (faultLine == 0 && U_SUCCESS(status)) {
      result = search(*slot, range, status);
      if (capture > 0 && result.location != kGXNotFound && U_SUCCESS(status)) {
        const int32_t start = uregex_start(slot->regex, capture, &status);
        const int32_t end = uregex_end(slot->regex, capture, &status);
        // A group that took no part in the match has no location either.
        result = start < 0 || end < start ? kNotFoundRange
                                          : GXRange{std::uint64_t(start), std::uint64_t(end - start)};
      }
    }
  }
  if (faultLine != 0) raiseInternalFault(faultLine);
  if (U_FAILURE(status)) {
    throw InternalInconsistencyException(
        QString::asprintf("ICU regular expression error #%d, %s", int(status), u_errorName(status))
            .toStdString());
  }
  return result;
}

QString stringByMatching(const QString& string, const QString& regex) {
  return stringByMatching(string, regex, 0, kWholeString, 0, nullptr);
}

QString stringByMatching(const QString& string, const QString& regex, int capture) {
  return stringByMatching(string, regex, 0, kWholeString, capture, nullptr);
}

QString stringByMatching(const QString& string, const QString& regex, GXRange range) {
  return stringByMatching(string, regex, 0, range, 0, nullptr);
}

QString stringByMatching(const QString& string, const QString& regex, std::uint32_t options, GXRange range,
                         int capture, Error* error) {
  const GXRange found = rangeOfRegex(string, regex, options, range, capture, error);
  if (found.location == kGXNotFound) return QString();
  // Non-null even when empty: an empty capture is still something found.
  QString text = string.mid(qsizetype(found.location), qsizetype(found.length));
  if (text.isNull()) text = QLatin1String("");
  return text;
}

std::uint64_t compileCount() {
  return gCompileCount.load();
}

}  // namespace RXRegex
