#include "RZDate.h"

#include <QVarLengthArray>

#include <unicode/numsys.h>
#include <unicode/smpdtfmt.h>
#include <unicode/timezone.h>

#include <cstring>
#include <map>
#include <memory>
#include <optional>
#include <vector>

namespace RZDate {

namespace {

// A pattern of numeric fields and punctuation only ("yyyy-MM-dd HH:mm"), written without a formatter:
// reports format one date per row, and ICU's formatter costs more than the rest of such a row.
class NumericPattern {
 public:
  // None for a pattern with anything else in it: names of months or days, quoted text, eras, zones…
  static std::optional<NumericPattern> parse(const QString& pattern) {
    NumericPattern parsed;
    for (qsizetype i = 0; i < pattern.size();) {
      const QChar c = pattern[i];
      const bool letter = (c >= u'a' && c <= u'z') || (c >= u'A' && c <= u'Z');
      if (c == u'\'') return std::nullopt;
      if (!letter) {
        parsed.parts_.push_back({c.unicode(), 0});
        ++i;
        continue;
      }
      qsizetype count = 1;
      while (i + count < pattern.size() && pattern[i + count] == c) ++count;
      const bool known = (c == u'y' && (count == 1 || count == 2 || count == 4)) ||
                         (std::strchr("MdHms", char(c.unicode())) && count <= 2);
      if (!known) return std::nullopt;
      parsed.parts_.push_back({c.unicode(), int(count)});
      i += count;
    }
    return parsed;
  }

  // None outside the years whose numbers ICU writes the same way.
  std::optional<QString> format(Date date) const {
    DateComponents f;
    assignFlags(date, AllFields, f);
    if (f.year < 1583 || f.year > 9999) return std::nullopt;
    // Written into a buffer and made a string once: a character at a time, a string costs a call each.
    QVarLengthArray<char16_t, 32> text;
    for (const Part& part : parts_) {
      if (part.count == 0) {
        text.append(part.symbol);
        continue;
      }
      int value = 0;
      int width = part.count;
      switch (part.symbol) {
        case u'y':
          value = part.count == 2 ? f.year % 100 : f.year;
          break;
        case u'M': value = f.month; break;
        case u'd': value = f.day; break;
        case u'H': value = f.hour; break;
        case u'm': value = f.minute; break;
        default: value = f.second; break;
      }
      appendNumber(text, value, width);
    }
    return QString(reinterpret_cast<const QChar*>(text.constData()), text.size());
  }

 private:
  struct Part {
    char16_t symbol;  // the field's letter, or the character itself
    int count;        // letters in a row; 0 for a character written as it is
  };

  static void appendNumber(QVarLengthArray<char16_t, 32>& text, int value, int width) {
    char digits[12];
    int n = 0;
    do {
      digits[n++] = char('0' + value % 10);
      value /= 10;
    } while (value > 0);
    for (int pad = n; pad < width; ++pad) text.append(u'0');
    while (n > 0) text.append(char16_t(digits[--n]));
  }

  std::vector<Part> parts_;
};

bool localeWritesLatinDigits() {
  UErrorCode status = U_ZERO_ERROR;
  std::unique_ptr<icu::NumberingSystem> system(icu::NumberingSystem::createInstance(status));
  return U_SUCCESS(status) && system && std::strcmp(system->getName(), "latn") == 0 &&
         system->getRadix() == 10 && !system->isAlgorithmic();
}

}  // namespace

QString stringWithPattern(Date date, const QString& pattern) {
  // Formatters are dear to make and a few patterns are used over and over; each keeps the zone it was
  // made in, so a change of the default zone makes new ones. A numeric pattern in a locale writing
  // Latin digits needs no formatter at all (the calendar fields follow the zone themselves).
  struct Entry {
    std::unique_ptr<icu::SimpleDateFormat> format;
    std::unique_ptr<icu::TimeZone> zone;
    std::optional<NumericPattern> numeric;
    bool numericChecked = false;
  };
  static std::map<QString, Entry> cache;
  Entry& entry = cache[pattern];
  if (!entry.numericChecked) {
    entry.numericChecked = true;
    if (localeWritesLatinDigits()) entry.numeric = NumericPattern::parse(pattern);
  }
  if (entry.numeric) {
    if (std::optional<QString> text = entry.numeric->format(date)) return *text;
  }
  std::unique_ptr<icu::TimeZone> zone(icu::TimeZone::createDefault());
  if (!entry.format || !entry.zone || *entry.zone != *zone) {
    UErrorCode status = U_ZERO_ERROR;
    const icu::UnicodeString icuPattern(reinterpret_cast<const UChar*>(pattern.utf16()),
                                        int32_t(pattern.size()));
    entry.format = std::make_unique<icu::SimpleDateFormat>(icuPattern, status);
    if (U_FAILURE(status)) {
      entry.format.reset();
      return {};
    }
    entry.format->setTimeZone(*zone);
    entry.zone = std::move(zone);
  }
  icu::UnicodeString text;
  entry.format->format(date.secondsSince1970() * 1000.0, text);
  return QString(reinterpret_cast<const QChar*>(text.getBuffer()), text.length());
}

}  // namespace RZDate
