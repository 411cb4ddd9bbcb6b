#pragma once

#include "WTEntity.h"

#include <QDialog>

class QComboBox;
class QLabel;
class QLineEdit;
class QPlainTextEdit;
class WTObject;

// A small sheet for how a row bills, beside its rate's: a client's address (for an invoice's head) and
// currency, a task's or project's budget, and the rounding rule of each. Empty fields inherit (and say from
// what) or clear. What is typed is checked as a rate is: a text that is not taken keeps the sheet open with
// the text as typed, marked, and the reason in view; nothing is stored then.
class WTBillingDialog : public QDialog {
  Q_OBJECT
 public:
  explicit WTBillingDialog(WTObject* object, QWidget* parent = nullptr);

  // Null where the record has no such field.
  QLineEdit* budgetField() const { return budgetField_; }
  QComboBox* currencyField() const { return currencyField_; }
  QPlainTextEdit* addressField() const { return addressField_; }
  QLineEdit* roundingMinutesField() const { return minutesField_; }
  QComboBox* roundingModeField() const { return modeField_; }

  void accept() override;

  // The row menu's title for the sheet: "Address, Currency and Rounding…" for a client, else "Budget and
  // Rounding…".
  static QString menuTitle(WTEntity entity);
  // Opens the sheet for `object` and waits for it to be closed.
  static void editBilling(WTObject* object, QWidget* parent);

 private:
  void refuse(QLineEdit* field, const QString& reason);

  WTObject* object_;
  QComboBox* currencyField_ = nullptr;
  QPlainTextEdit* addressField_ = nullptr;
  QLineEdit* budgetField_ = nullptr;
  QLineEdit* minutesField_ = nullptr;
  QComboBox* modeField_ = nullptr;
  QLabel* message_;
};
