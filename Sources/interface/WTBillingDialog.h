#pragma once

#include <QDialog>

class QComboBox;
class QLabel;
class QLineEdit;
class QSpinBox;
class WTObject;

// A small sheet for how a row bills, beside its rate's: a task's or project's budget, and its rounding
// rule. Empty fields inherit or clear. What is typed is checked as the rate is, and a text that is not
// taken keeps the sheet open with the text as typed and the reason in view; nothing is stored then.
class WTBillingDialog : public QDialog {
  Q_OBJECT
 public:
  explicit WTBillingDialog(WTObject* object, QWidget* parent = nullptr);

  // Null where the record has no such field.
  QLineEdit* budgetField() const { return budgetField_; }

  void accept() override;

  // The row menu's title for `object`'s sheet ("Budget and Rounding…").
  static QString menuTitle(const WTObject* object);
  // Opens the sheet for `object` and waits for it to be closed.
  static void editBilling(WTObject* object, QWidget* parent);

 private:
  void refuse(QLineEdit* field, const QString& reason);

  WTObject* object_;
  QLineEdit* budgetField_ = nullptr;
  QLabel* message_;
};
