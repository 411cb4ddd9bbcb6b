#pragma once
// What the duration and money fuzzers share: the first byte of an input picks the locale it is typed in
// (locales whose signs differ: commas, points, spaces, apostrophes, other digits, marks around the minus).
#include <QString>

#include <unicode/locid.h>

#include <cstddef>
#include <cstdint>
#include <iterator>

namespace localefuzz {

inline const icu::Locale& locale(std::uint8_t byte) {
  static const icu::Locale locales[] = {
      icu::Locale("en_US"), icu::Locale("de_DE"), icu::Locale("fr_FR"), icu::Locale("de_CH"),
      icu::Locale("ar_EG"), icu::Locale("fa_IR"), icu::Locale("hi_IN"), icu::Locale("bn_BD"),
      icu::Locale("es_ES"), icu::Locale("ja_JP"), icu::Locale("pt_BR"), icu::Locale("he_IL"),
  };
  return locales[byte % std::size(locales)];
}

// The rest of the input as text typed by a person.
inline QString text(const std::uint8_t* data, std::size_t size) {
  return QString::fromUtf8(reinterpret_cast<const char*>(data), qsizetype(size));
}

}  // namespace localefuzz
