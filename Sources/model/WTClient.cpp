#include "WTClient.h"

#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTStoreRecord.h"

WT_ENTITY_CLASS_IMPL(WTClient)

const WTKeyTable& WTClient::keys() {
  using namespace WTKeys;
  static const WTKeyTable table(
      &objectKeys(), {
                         stored("addressBookUID", &WTClient::addressBookUID_, &WTStoreRecord::addressBookUID),
                         stored("totalsUID", &WTClient::totalsUID_, &WTStoreRecord::totalsUID),
                         refine("inheritedRate", nullptr, nullptr, {"rate"}),
                         toMany("projects", WTKeyType::Unordered, &records<&WTClient::projects>),
                         derived<&WTClient::duration>("duration", {"projects"}),
                         derived<&WTClient::cost>("cost", {"projects"}),
                         derived<&WTClient::tableImage>("tableImage", {"archived"}),
                     });
  return table;
}

void WTClient::setAddressBookUID(const QString& uid) {
  setStoredValue(QStringLiteral("addressBookUID"), uid);
}
void WTClient::setTotalsUID(const QString& uid) {
  setStoredValue(QStringLiteral("totalsUID"), uid);
}

Decimal WTClient::rateFromAbove() const {
  return userDefaultRate().value_or(builtInRate());
}

// Here rather than in the setter, so that a rate put back by undo or redo is announced as a cost too.
void WTClient::storedValueDidChange(const QString& key) {
  if (key == QLatin1String("rate")) costDidChange();
}

int WTClient::duration() const {
  int total = 0;
  for (const WTProject* project : projects_) total += project->duration();
  return total;
}

Decimal WTClient::cost() const {
  Decimal total;
  for (const WTProject* project : projects_) total += project->cost();
  return total;
}

void WTClient::durationDidChange() {
  announce(QStringLiteral("duration"));
  costDidChange();
}

void WTClient::costDidChange() {
  announce(QStringLiteral("cost"));
}

QString WTClient::tableImage() const {
  return archived() ? QStringLiteral("admin_2_32_dis") : QStringLiteral("admin_2_32");
}
