#include "WTBudget.h"

#include "MoneyFormat.h"
#include "WTProject.h"
#include "WTTask.h"

#include <QLocale>
#include <QObject>

namespace WTBudget {

namespace {

bool measurable(const std::optional<Decimal>& budget) {
  return budget && *budget > Decimal();
}

}  // namespace

std::optional<Level> level(const Decimal& billed, const std::optional<Decimal>& budget) {
  if (!measurable(budget)) return std::nullopt;
  if (billed > *budget) return Level::Over;
  // 80 % compared exactly: billed × 5 against budget × 4.
  if (billed * Decimal(5) >= *budget * Decimal(4)) return Level::Warning;
  return Level::Within;
}

std::optional<Level> crossed(const Decimal& before, const Decimal& after,
                             const std::optional<Decimal>& budget) {
  const std::optional<Level> from = level(before, budget);
  const std::optional<Level> to = level(after, budget);
  if (!from || !to || *to <= *from) return std::nullopt;
  return to;
}

std::optional<double> fraction(const Decimal& billed, const std::optional<Decimal>& budget) {
  if (!measurable(budget)) return std::nullopt;
  return billed.toDouble() / budget->toDouble();
}

std::optional<std::int64_t> percent(const Decimal& billed, const std::optional<Decimal>& budget) {
  if (!measurable(budget)) return std::nullopt;
  // In decimals: as a double, 57 of 100 is 56.99… percent.
  const Decimal exact = Decimal::divide(billed * Decimal(100), *budget).value_or(Decimal());
  std::int64_t whole = exact.toInt64();  // toward zero
  if (billed > *budget) {
    if (Decimal(whole) < exact) ++whole;
  } else if (Decimal(whole) > exact) {
    --whole;
  }
  return whole;
}

Decimal billed(const WTObject* object) {
  const bool budgeted = object->entity() == WTEntity::Task || object->entity() == WTEntity::Project;
  return budgeted ? static_cast<const WTBillingRecord*>(object)->billedCost() : Decimal();
}

std::optional<Decimal> budget(const WTObject* object) {
  switch (object->entity()) {
    case WTEntity::Task:
      return static_cast<const WTTask*>(object)->budget();
    case WTEntity::Project:
      return static_cast<const WTProject*>(object)->budget();
    default:
      return std::nullopt;
  }
}

QString standing(const WTObject* object) {
  const std::optional<Decimal> limit = budget(object);
  const Decimal spent = billed(object);
  const std::optional<std::int64_t> whole = percent(spent, limit);
  if (!whole) return {};
  const Decimal left = *limit - spent;
  const QString percentText = QLocale().toString(qint64(*whole));
  const QString currency = static_cast<const WTBillingRecord*>(object)->billingCurrency();
  const QString rest = left.isNegative() ? QObject::tr("%1 over").arg(MoneyFormat::format(-left, currency))
                                         : QObject::tr("%1 left").arg(MoneyFormat::format(left, currency));
  return QObject::tr("%1 % of the budget of %2 · %3")
      .arg(percentText, MoneyFormat::format(*limit, currency), rest);
}

QVariant reportedStanding(const WTObject* object) {
  const QString text = standing(object);
  return text.isEmpty() ? QVariant() : QVariant(text);
}

}  // namespace WTBudget
