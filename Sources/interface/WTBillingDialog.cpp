#include "WTBillingDialog.h"

#include "MoneyFormat.h"
#include "WTBudget.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTRateField.h"
#include "WTTask.h"

#include <QDialogButtonBox>
#include <QFormLayout>
#include <QLabel>
#include <QLineEdit>
#include <QVBoxLayout>

namespace {

bool hasBudget(const WTObject* object) {
  return object->entity() == WTEntity::Task;
}

void setBudget(WTObject* object, const std::optional<Decimal>& budget) {
  if (object->entity() == WTEntity::Task) static_cast<WTTask*>(object)->setBudget(budget);
}

struct ParsedBudget {
  bool valid = false;
  std::optional<Decimal> budget;
  QString refusal;
};

// Money in the user's locale, as a rate is read, and not below zero; empty: no budget.
ParsedBudget parseBudget(const QString& typed) {
  const TypedNumber::Reading reading = MoneyFormat::parse(typed);
  if (!reading.taken()) return {false, std::nullopt, reading.refusal};
  if (reading.value && reading.value->isNegative())
    return {false, std::nullopt, QObject::tr("Not a budget: a budget is never below zero")};
  return {true, reading.value, {}};
}

}  // namespace

WTBillingDialog::WTBillingDialog(WTObject* object, QWidget* parent) : QDialog(parent), object_(object) {
  setObjectName(QStringLiteral("billingDialog"));
  setWindowTitle(tr("Billing of %1").arg(object->name().isEmpty() ? tr("Untitled") : object->name()));
  auto* layout = new QVBoxLayout(this);
  auto* form = new QFormLayout;
  layout->addLayout(form);
  if (hasBudget(object)) {
    budgetField_ = new QLineEdit(this);
    budgetField_->setObjectName(QStringLiteral("budgetField"));
    budgetField_->setAlignment(Qt::AlignRight);
    budgetField_->setPlaceholderText(tr("No budget"));
    if (const std::optional<Decimal> budget = WTBudget::budget(object))
      budgetField_->setText(WTRateField::text(*budget));
    connect(budgetField_, &QLineEdit::textEdited, this, [this] { refuse(budgetField_, {}); });
    form->addRow(tr("Budget (empty for none):"), budgetField_);
  }
  message_ = new QLabel(this);
  message_->setObjectName(QStringLiteral("billingMessage"));
  message_->setStyleSheet(QStringLiteral("color: #d03030;"));
  message_->setWordWrap(true);
  message_->hide();
  auto* buttons = new QDialogButtonBox(QDialogButtonBox::Ok | QDialogButtonBox::Cancel, this);
  connect(buttons, &QDialogButtonBox::accepted, this, &WTBillingDialog::accept);
  connect(buttons, &QDialogButtonBox::rejected, this, &WTBillingDialog::reject);
  layout->addWidget(message_);
  layout->addWidget(buttons);
}

void WTBillingDialog::refuse(QLineEdit* field, const QString& reason) {
  WTRateField::setRefused(field, reason);
  message_->setText(reason);
  message_->setVisible(!reason.isEmpty());
  if (reason.isEmpty()) return;
  field->setFocus();
  field->selectAll();
}

void WTBillingDialog::accept() {
  ParsedBudget budget;
  if (budgetField_) {
    budget = parseBudget(budgetField_->text());
    // The sheet stays open with the text as typed, so nothing is lost and the reason is in view.
    if (!budget.valid) return refuse(budgetField_, budget.refusal);
  }
  const WTUndoManager::NamedStep step(object_->context()->undoManager(), tr("Change Billing"));
  if (budgetField_ && WTBudget::budget(object_) != budget.budget) setBudget(object_, budget.budget);
  QDialog::accept();
}

QString WTBillingDialog::menuTitle(const WTObject*) {
  return tr("Budget and Rounding…");
}

void WTBillingDialog::editBilling(WTObject* object, QWidget* parent) {
  WTBillingDialog dialog(object, parent);
  dialog.exec();
}
