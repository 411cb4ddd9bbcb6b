#include "WTExpense.h"

#include "WTObjectContext.h"
#include "WTStoreRecord.h"
#include "WTTask.h"

WT_ENTITY_CLASS_IMPL(WTExpense)

const WTKeyTable& WTExpense::keys() {
  using namespace WTKeys;
  static const WTKeyTable table(&itemKeys(),
                                {
                                    stored("expense", &WTExpense::expense_, &WTStoreRecord::expense),
                                    refine("cost", nullptr, nullptr, {"duration", "expense"}),
                                });
  return table;
}

void WTExpense::setExpense(const std::optional<Decimal>& amount) {
  setStoredValue(QStringLiteral("expense"), amount ? QVariant::fromValue(*amount) : QVariant());
}

void WTExpense::storedValueDidChange(const QString& key) {
  if (key == QLatin1String("expense") && task()) task()->costDidChange();
}
