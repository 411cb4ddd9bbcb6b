#pragma once

#include "WTObject.h"

#include <functional>

class WTProject;

// A client: owns projects (unordered). Its rate tops the inheritance chain below the user's default.
class WTClient final : public WTObject {
  WT_ENTITY_CLASS(WTClient, Client)
 public:
  explicit WTClient(WTObjectContext* context) : WTObject(WTEntity::Client, context) {}

  QString addressBookUID() const { return addressBookUID_; }
  void setAddressBookUID(const QString& uid);
  QString totalsUID() const { return totalsUID_; }
  void setTotalsUID(const QString& uid);

  const QList<WTProject*>& projects() const { return projects_; }

  // Own rate, else "WTDefaultRate", else builtInRate().
  Decimal rateFromAbove() const override;
  // What a client bills without a rate of its own while the user has set no default: 100.
  static Decimal builtInRate() { return Decimal(100); }

  int duration() const;
  Decimal cost() const;
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
  QList<WTProject*> projects_;
};
