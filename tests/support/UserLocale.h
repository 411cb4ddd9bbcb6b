#pragma once

// The user's locale while it lives, ICU's and Qt's together; "C" is ICU's en_US_POSIX.
#include <QLocale>

#include <unicode/locid.h>

#include <cstring>

class UserLocale {
 public:
  explicit UserLocale(const char* name) {
    const bool c = std::strcmp(name, "C") == 0;
    UErrorCode status = U_ZERO_ERROR;
    icu::Locale::setDefault(icu::Locale(c ? "en_US_POSIX" : name), status);
    QLocale::setDefault(c ? QLocale::c() : QLocale(QString::fromLatin1(name)));
  }
  ~UserLocale() {
    UErrorCode status = U_ZERO_ERROR;
    icu::Locale::setDefault(icu_, status);
    QLocale::setDefault(qt_);
  }
  UserLocale(const UserLocale&) = delete;
  UserLocale& operator=(const UserLocale&) = delete;

  // The locales people here type money in.
  static constexpr const char* kNames[] = {"C", "en_US", "de_DE", "fr_FR", "de_CH"};

 private:
  icu::Locale icu_ = icu::Locale::getDefault();
  QLocale qt_;
};
