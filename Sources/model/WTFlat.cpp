#include "WTFlat.h"

#include "WTObjectContext.h"
#include "WTStoreRecord.h"
#include "WTTask.h"

WT_ENTITY_CLASS_IMPL(WTFlat)

const WTKeyTable& WTFlat::keys() {
  using namespace WTKeys;
  static const WTKeyTable table(&itemKeys(),
                                {
                                    stored("minutes", &WTFlat::minutes_, &WTStoreRecord::minutes),
                                    refine("duration", nullptr, nullptr, {"minutes"}),
                                });
  return table;
}

void WTFlat::setMinutes(const std::optional<qint64>& minutes) {
  setStoredValue(QStringLiteral("minutes"), minutes ? QVariant(*minutes) : QVariant());
}

void WTFlat::storedValueDidChange(const QString& key) {
  if (key == QLatin1String("minutes") && task()) task()->durationDidChange();
}
