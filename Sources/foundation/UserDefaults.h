#pragma once

#include "Date.h"
#include "Decimal.h"

#include <QObject>
#include <QSettings>
#include <QVariant>

#include <memory>
#include <optional>

// The user's settings: values the user stored, over defaults registered at start. A registered default
// only stands for a key the user never set. Stored in an INI file; by default
// $XDG_CONFIG_HOME/Tessal/Tessal.conf. Decimal values are stored as their plain text and Date values as
// UTC date-times, so they survive a round trip exactly.
class UserDefaults : public QObject {
  Q_OBJECT
 public:
  // `settingsPath` empty means the default file above.
  explicit UserDefaults(const QString& settingsPath = {}, QObject* parent = nullptr);
  ~UserDefaults() override;

  QString fileName() const;

  // Adds to (or replaces among) the registered defaults; stored values are untouched.
  void registerDefaults(const QVariantMap& defaults);

  // The stored value, else the registered default, else a null variant. A stored Decimal or Date comes
  // back as such; other stored scalars (numbers, booleans) come back as their text, as the file keeps
  // them, so use the typed reads below for those.
  QVariant value(const QString& key) const;
  // Stores a value and writes it out; a null variant removes the stored value.
  void setValue(const QString& key, const QVariant& value);
  void removeValue(const QString& key);
  bool hasStoredValue(const QString& key) const;

  // Typed reads; booleans and integers read "YES"/"true"/"1" and numeric strings (an integer is truncated
  // toward zero). Unset or unreadable values give false, 0, empty text or none.
  bool boolForKey(const QString& key) const;
  qint64 integerForKey(const QString& key) const;
  QString stringForKey(const QString& key) const;
  std::optional<Date> dateForKey(const QString& key) const;
  // Decimal, number or numeric text, parsed exactly; none when unset or not a number.
  std::optional<Decimal> decimalForKey(const QString& key) const;

  void sync();

 signals:
  void valueChanged(const QString& key);

 private:
  std::unique_ptr<QSettings> settings_;
  QVariantMap registered_;
};
