#include "MoneyFormat.h"

#include <QLocale>

#include <unicode/decimfmt.h>
#include <unicode/locid.h>

#include <memory>

namespace MoneyFormat {

QString format(const Decimal& amount) {
  static std::unique_ptr<icu::DecimalFormat> formatter = [] {
    UErrorCode status = U_ZERO_ERROR;
    auto made = std::make_unique<icu::DecimalFormat>(
        icu::UnicodeString(u"#,##0.00"), icu::DecimalFormatSymbols(icu::Locale::getDefault(), status),
        status);
    made->setRoundingMode(icu::DecimalFormat::kRoundHalfUp);
    return U_SUCCESS(status) ? std::move(made) : nullptr;
  }();
  const QByteArray digits = amount.toString().toLatin1();
  if (!formatter) return QString::fromLatin1(digits);
  icu::UnicodeString text;
  UErrorCode status = U_ZERO_ERROR;
  formatter->format(icu::StringPiece(digits.constData(), int32_t(digits.size())), text, nullptr, status);
  if (U_FAILURE(status)) return QString::fromLatin1(digits);
  return QString(reinterpret_cast<const QChar*>(text.getBuffer()), text.length());
}

std::optional<Decimal> parse(const QString& typed) {
  const QLocale locale;
  QString text = typed.trimmed();
  text.remove(locale.groupSeparator());
  text.replace(locale.decimalPoint(), QStringLiteral("."));
  text.remove(u' ');
  if (text.isEmpty()) return std::nullopt;
  return Decimal::fromString(text);
}

}  // namespace MoneyFormat
