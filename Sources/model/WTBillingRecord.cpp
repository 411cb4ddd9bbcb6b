#include "WTBillingRecord.h"

#include "WTObjectContext.h"
#include "WTStoreRecord.h"

const WTKeyTable& WTBillingRecord::billingKeys() {
  using namespace WTKeys;
  static const WTKeyTable table(
      &objectKeys(),
      {
          stored("roundingMinutes", &WTBillingRecord::roundingMinutes_, &WTStoreRecord::roundingMinutes),
          stored("roundingMode", &WTBillingRecord::roundingMode_, &WTStoreRecord::roundingMode,
                 [](WTObject& object, const QVariant& value) {
                   const std::optional<QString> mode = WTRoundingRule::storedMode(value);
                   if (mode) static_cast<WTBillingRecord&>(object).setRoundingMode(*mode);
                   return mode.has_value();
                 }),
          derived("roundingRule", WTKeyType::Other,
                  [](const WTObject& object) {
                    return QVariant(
                        static_cast<const WTBillingRecord&>(object).roundingRule().toVariantMap());
                  },
                  {"roundingMinutes", "roundingMode"}),
      });
  return table;
}

std::optional<int> WTBillingRecord::roundingMinutes() const {
  return roundingMinutes_ ? std::optional<int>(int(*roundingMinutes_)) : std::nullopt;
}

void WTBillingRecord::setRoundingMinutes(const std::optional<int>& minutes) {
  setStoredValue(QStringLiteral("roundingMinutes"), minutes ? QVariant(qint64(*minutes)) : QVariant());
}

void WTBillingRecord::setRoundingMode(const QString& mode) {
  if (const std::optional<QString> stored =
          WTRoundingRule::storedMode(mode.isNull() ? QVariant() : QVariant(mode)))
    setStoredValue(QStringLiteral("roundingMode"), stored->isNull() ? QVariant() : QVariant(*stored));
}

WTRoundingRule WTBillingRecord::roundingRuleFromAbove() const {
  return context()->billingDefaults().rule;
}
