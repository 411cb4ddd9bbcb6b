#pragma once

#include "WTBillingRecord.h"

#include <functional>

class WTProject;

// A client: owns projects (unordered). Its rate tops the inheritance chain below the user's default.
class WTClient final : public WTBillingRecord {
  WT_ENTITY_CLASS(WTClient, Client)
 public:
  explicit WTClient(WTObjectContext* context) : WTBillingRecord(WTEntity::Client, context) {}

  QString addressBookUID() const { return addressBookUID_; }
  void setAddressBookUID(const QString& uid);
  QString totalsUID() const { return totalsUID_; }
  void setTotalsUID(const QString& uid);

  const QList<WTProject*>& projects() const { return projects_; }

  // The ISO 4217 code the client is billed in; null to take the preferences' ("WTCurrency").
  QString currency() const { return currency_; }
  // Takes a three-letter code (in capitals) or an empty or null text for none; other text changes nothing.
  void setCurrency(const QString& currency);
  // Where the client's bills go, as lines of text.
  QString address() const { return address_; }
  void setAddress(const QString& address);

  // `currency`, else the preferences'.
  QString billingCurrency() const override;
  // The sums of its projects' billed minutes and billed costs.
  int billedDuration() const override;
  Decimal billedCost() const override;
  // Announces the client's billed figures (a project's or task's rule changed).
  void billingDidChange();

  // Own rate, else "WTDefaultRate", else builtInRate().
  Decimal rateFromAbove() const override;
  // What a client bills without a rate of its own while the user has set no default: 100.
  static Decimal builtInRate() { return Decimal(100); }

  int duration() const override;
  Decimal cost() const override;
  void durationDidChange();
  void costDidChange();

  // Name of the list image: "admin_2_32", or "admin_2_32_dis" when archived.
  QString tableImage() const;

 protected:
  // A rate announces the client's cost.
  void storedValueDidChange(const QString& key) override;

 private:
  friend class WTProject;
  QString addressBookUID_;
  QString totalsUID_;
  QString currency_;
  QString address_;
  QList<WTProject*> projects_;
};
