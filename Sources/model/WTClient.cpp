#include "WTClient.h"

#include "MoneyFormat.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTStoreRecord.h"

#include <algorithm>

WT_ENTITY_CLASS_IMPL(WTClient)

namespace {

// A currency as the client stores it: three letters in capitals, or a null text for none (a null or
// empty value); none for anything else, which is refused.
std::optional<QString> currencyCode(const QVariant& value) {
  if (value.isNull()) return QString();
  if (value.typeId() != QMetaType::QString) return std::nullopt;
  const QString code = value.toString().trimmed().toUpper();
  if (code.isEmpty()) return QString();
  const bool letters = code.size() == 3 &&
                       std::all_of(code.begin(), code.end(), [](QChar c) { return c >= u'A' && c <= u'Z'; });
  return letters ? std::optional<QString>(code) : std::nullopt;
}

}  // namespace

const WTKeyTable& WTClient::keys() {
  using namespace WTKeys;
  static const WTKeyTable table(
      &billingKeys(),
      {
          stored("addressBookUID", &WTClient::addressBookUID_, &WTStoreRecord::addressBookUID),
          stored("totalsUID", &WTClient::totalsUID_, &WTStoreRecord::totalsUID),
          stored("currency", &WTClient::currency_, &WTStoreRecord::currency,
                 [](WTObject& object, const QVariant& value) {
                   const std::optional<QString> code = currencyCode(value);
                   if (code) static_cast<WTClient&>(object).setCurrency(*code);
                   return code.has_value();
                 }),
          stored("address", &WTClient::address_, &WTStoreRecord::address),
          refine("inheritedRate", nullptr, nullptr, {"rate"}),
          toMany("projects", WTKeyType::Unordered, &records<&WTClient::projects>),
          derived<&WTClient::duration>("duration", {"projects"}),
          derived<&WTClient::cost>("cost", {"projects"}),
          derived<&WTClient::tableImage>("tableImage", {"archived"}),
          derived<&WTClient::billingCurrency>("billingCurrency", {"currency"}),
          derived<&WTClient::billedDuration>("billedDuration", {"projects", "duration", "roundingRule"}),
          derived<&WTClient::billedCost>("billedCost",
                                         {"projects", "cost", "billedDuration", "billingCurrency"}),
      });
  return table;
}

void WTClient::setAddressBookUID(const QString& uid) {
  setStoredValue(QStringLiteral("addressBookUID"), uid);
}
void WTClient::setTotalsUID(const QString& uid) {
  setStoredValue(QStringLiteral("totalsUID"), uid);
}

void WTClient::setCurrency(const QString& currency) {
  if (const std::optional<QString> code = currencyCode(currency.isNull() ? QVariant() : QVariant(currency)))
    setStoredValue(QStringLiteral("currency"), code->isNull() ? QVariant() : QVariant(*code));
}

void WTClient::setAddress(const QString& address) {
  setStoredValue(QStringLiteral("address"), address);
}

QString WTClient::billingCurrency() const {
  return currency_.isEmpty() ? context()->billingDefaults().currency : currency_;
}

int WTClient::billedDuration() const {
  int total = 0;
  for (const WTProject* project : projects_) total += project->billedDuration();
  return total;
}

Decimal WTClient::billedCost() const {
  Decimal total = Decimal().rounded(MoneyFormat::minorUnitDigits(billingCurrency()));
  for (const WTProject* project : projects_) total += project->billedCost();
  return total;
}

void WTClient::billingDidChange() {
  announce(QStringLiteral("billedDuration"));
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
