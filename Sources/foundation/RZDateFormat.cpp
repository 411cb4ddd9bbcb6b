#include "RZDate.h"

#include <unicode/smpdtfmt.h>
#include <unicode/timezone.h>

#include <map>

#include <memory>

namespace RZDate {

QString stringWithPattern(Date date, const QString& pattern) {
  // Formatters are dear to make and a few patterns are used over and over; each keeps the zone it was
  // made in, so a change of the default zone makes new ones.
  struct Entry {
    std::unique_ptr<icu::SimpleDateFormat> format;
    std::unique_ptr<icu::TimeZone> zone;
  };
  static std::map<QString, Entry> cache;
  std::unique_ptr<icu::TimeZone> zone(icu::TimeZone::createDefault());
  Entry& entry = cache[pattern];
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
