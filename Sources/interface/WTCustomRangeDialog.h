#pragma once

#include "Date.h"

#include <QDialog>

class QDateEdit;
class UserDefaults;

// Two calendar days, from and to, kept in the settings under the keys it is given as they change, so
// the dates stand however the dialog is closed.
class WTCustomRangeDialog : public QDialog {
  Q_OBJECT
 public:
  // `defaults` is not owned and must outlive the dialog.
  WTCustomRangeDialog(UserDefaults* defaults, const QString& beginKey, const QString& endKey,
                      QWidget* parent = nullptr);

  QDateEdit* beginEdit() const { return begin_; }
  QDateEdit* endEdit() const { return end_; }

  // A day as the range shows it: the locale's short form, with the whole year (a two-digit year typed
  // as "2026" would read 2020).
  static QString dayFormat();
  static QString dayText(Date date);

 protected:
  void done(int result) override;

 private:
  void load();
  void store(const QString& key, QDate day);

  UserDefaults* defaults_;
  QString beginKey_;
  QString endKey_;
  QDateEdit* begin_;
  QDateEdit* end_;
};
