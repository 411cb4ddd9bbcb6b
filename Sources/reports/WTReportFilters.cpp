#include "WTReportFilters.h"

#include "Decimal.h"
#include "DurationText.h"
#include "GXTemplateEngine.h"
#include "GXTemplateValue.h"
#include "MoneyFormat.h"
#include "WTHTMLFilter.h"
#include "WTItemKindFilter.h"

#include <algorithm>
#include <memory>
#include <optional>

QStringList WTReportFilters::filters() const {
  return {QStringLiteral("digiclock"), QStringLiteral("decimal")};
}

QVariant WTReportFilters::filterInvoked(const QString& filter, const QStringList& args,
                                        const QVariant& value) {
  (void)args;
  if (filter == QLatin1String("digiclock")) {
    return DurationText::stringWithMinutes(GXTemplateValue::intValue(value));
  }
  if (filter == QLatin1String("decimal")) {
    // Numbers only: a number formatter has no text for anything else.
    if (value.typeId() == QMetaType::QString || !GXTemplateValue::answersIntValue(value)) return {};
    const std::optional<Decimal> number = Decimal::fromVariant(value);
    if (!number) return {};
    return MoneyFormat::format(*number);
  }
  return {};
}

namespace {

// A value fit for a money filter: a number, not a text that reads as one.
std::optional<Decimal> number(const QVariant& value) {
  if (value.typeId() == QMetaType::QString || !GXTemplateValue::answersIntValue(value)) return std::nullopt;
  return Decimal::fromVariant(value);
}

bool isCurrencyCode(const QString& text) {
  return text.size() == 3 &&
         std::all_of(text.begin(), text.end(), [](QChar c) { return c >= u'A' && c <= u'Z'; });
}

}  // namespace

QStringList WTMoneyFilter::filters() const {
  return {QStringLiteral("money"), QStringLiteral("rate")};
}

QVariant WTMoneyFilter::filterInvoked(const QString& filter, const QStringList& args, const QVariant& value) {
  const bool rate = filter == QLatin1String("rate");
  if (!rate && filter != QLatin1String("money")) return {};
  const std::optional<Decimal> amount = number(value);
  if (!amount) return {};
  QString currency;
  if (!args.isEmpty()) {
    const QVariant named = engine_ ? engine_->valueForVariable(args.first()) : QVariant();
    currency = GXTemplateValue::isNil(named) ? args.first() : GXTemplateValue::description(named);
  }
  if (!isCurrencyCode(currency)) currency.clear();
  for (const Written& written : written_) {
    if (written.rate == rate && written.amount == *amount && written.currency == currency &&
        !written.text.isNull())
      return written.text;
  }
  QString text = rate                 ? MoneyFormat::formatRate(*amount, currency)
                 : currency.isEmpty() ? MoneyFormat::format(*amount)
                                      : MoneyFormat::format(*amount, currency);
  written_[nextWritten_] = {rate, *amount, currency, text};
  nextWritten_ = (nextWritten_ + 1) % written_.size();
  return text;
}

void loadReportFilters(GXTemplateEngine& engine) {
  engine.loadFilter(std::make_shared<WTReportFilters>());
  engine.loadFilter(std::make_shared<WTMoneyFilter>(&engine));
  engine.loadFilter(std::make_shared<WTHTMLFilter>());
  engine.loadFilter(std::make_shared<WTItemKindFilter>());
}
