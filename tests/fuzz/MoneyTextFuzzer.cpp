// libFuzzer target over typed money and decimal text (see README.md). The first byte picks the locale,
// the second the currency. What is taken reads back the same from the editor's text, and as the
// amount billed from the text a list shows; what Decimal reads, it writes back to text of the same value.
#include "Decimal.h"
#include "FuzzCheck.h"
#include "LocaleFuzzInput.h"
#include "MoneyFormat.h"
#include "TypedNumber.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 2) return 0;
  static const QString currencies[] = {QStringLiteral("EUR"), QStringLiteral("JPY"), QStringLiteral("KWD"),
                                       QStringLiteral("CLF"), QStringLiteral("XXX")};
  const icu::Locale& locale = localefuzz::locale(data[0]);
  const QString& currency = currencies[data[1] % std::size(currencies)];
  const QString typed = localefuzz::text(data + 2, size - 2);

  if (const std::optional<Decimal> plain = Decimal::fromString(typed)) {
    const std::optional<Decimal> again = Decimal::fromString(plain->toString());
    check(again && *again == *plain && (plain->exponent() > 0 || again->isIdenticalTo(*plain)));
  }

  const TypedNumber::Reading reading = MoneyFormat::parse(typed, locale);
  check(reading.taken() || !reading.value);
  if (!reading.value) return 0;
  const Decimal& amount = *reading.value;
  // Typed text has no exponent: the editor's text gives back the very same decimal, places included.
  const TypedNumber::Reading edited = TypedNumber::read(TypedNumber::editableText(amount, locale), locale);
  check(edited.value && edited.value->isIdenticalTo(amount));
  const TypedNumber::Reading shown =
      MoneyFormat::parse(MoneyFormat::format(amount, currency, locale), locale);
  check(shown.value && *shown.value == amount.rounded(MoneyFormat::minorUnitDigits(currency)));
  return 0;
}
