#include "WTBillingDialog.h"

#include "MoneyFormat.h"
#include "WTBudget.h"
#include "WTClient.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTRateField.h"
#include "WTRoundingRule.h"
#include "WTTask.h"

#include <QComboBox>
#include <QCompleter>
#include <QDialogButtonBox>
#include <QFormLayout>
#include <QHBoxLayout>
#include <QLabel>
#include <QLineEdit>
#include <QPlainTextEdit>
#include <QVBoxLayout>

#include <unicode/ucurr.h>
#include <unicode/uenum.h>

namespace {

bool hasBudget(const WTObject* object) {
  return object->entity() == WTEntity::Task || object->entity() == WTEntity::Project;
}

void setBudget(WTObject* object, const std::optional<Decimal>& budget) {
  if (object->entity() == WTEntity::Task) static_cast<WTTask*>(object)->setBudget(budget);
  if (object->entity() == WTEntity::Project) static_cast<WTProject*>(object)->setBudget(budget);
}

// The sheet is opened for clients, projects and tasks: the records that set a rounding rule.
WTBillingRecord* billingRecord(WTObject* object) {
  return static_cast<WTBillingRecord*>(object);
}

template <class T>
struct Parsed {
  bool valid = false;
  T value;
  QString refusal;
};

// Money in the user's locale and `currency`, as a rate is read, and not below zero; empty: no budget.
Parsed<std::optional<Decimal>> parseBudget(const QString& typed, const QString& currency) {
  const TypedNumber::Reading reading = MoneyFormat::parse(typed, currency);
  if (!reading.taken()) return {false, std::nullopt, reading.refusal};
  if (reading.value && reading.value->isNegative())
    return {false, std::nullopt, QObject::tr("Not a budget: a budget is never below zero")};
  return {true, reading.value, {}};
}

// Whole minutes from 1 to a day, typed in the user's locale; empty or 0: inherit.
Parsed<std::optional<int>> parseMinutes(const QString& typed) {
  const TypedNumber::Reading reading = TypedNumber::read(typed);
  if (!reading.taken()) return {false, std::nullopt, reading.refusal};
  if (!reading.value || reading.value->isZero()) return {true, std::nullopt, {}};
  const Decimal& minutes = *reading.value;
  if (minutes.isNegative() || !(minutes.rounded(0) == minutes) || minutes > Decimal(24 * 60))
    return {false, std::nullopt,
            QObject::tr("Not a rounding: whole minutes from 1 to 1440, or empty to inherit")};
  return {true, int(minutes.toInt64()), {}};
}

// The ISO 4217 codes in use today, as ICU knows them.
const QStringList& currencyCodes() {
  static const QStringList codes = [] {
    QStringList list;
    UErrorCode status = U_ZERO_ERROR;
    UEnumeration* all = ucurr_openISOCurrencies(UCURR_COMMON | UCURR_NON_DEPRECATED, &status);
    const char* code = nullptr;
    while (U_SUCCESS(status) && all && (code = uenum_next(all, nullptr, &status)))
      list.append(QString::fromLatin1(code));
    if (all) uenum_close(all);
    list.sort();
    return list;
  }();
  return codes;
}

// A known code (any case); empty: inherit.
Parsed<QString> parseCurrency(const QString& typed) {
  const QString code = typed.trimmed().toUpper();
  if (code.isEmpty()) return {true, QString(), {}};
  if (!currencyCodes().contains(code))
    return {false, QString(),
            QObject::tr("Not a currency: type an ISO 4217 code such as EUR, or leave it empty")};
  return {true, code, {}};
}

}  // namespace

WTBillingDialog::WTBillingDialog(WTObject* object, QWidget* parent) : QDialog(parent), object_(object) {
  setObjectName(QStringLiteral("billingDialog"));
  setWindowTitle(tr("Billing of %1").arg(object->name().isEmpty() ? tr("Untitled") : object->name()));
  auto* layout = new QVBoxLayout(this);
  auto* form = new QFormLayout;
  layout->addLayout(form);
  const auto clearsRefusal = [this](QLineEdit* field) {
    connect(field, &QLineEdit::textEdited, this, [this, field] { refuse(field, {}); });
  };

  if (object->entity() == WTEntity::Client) {
    const auto* client = static_cast<const WTClient*>(object);
    addressField_ = new QPlainTextEdit(client->address(), this);
    addressField_->setObjectName(QStringLiteral("addressField"));
    addressField_->setTabChangesFocus(true);
    addressField_->setPlaceholderText(tr("Street, town, country: shown in the head of a report"));
    // Four lines of an address without a scroll bar, not a page.
    addressField_->setFixedHeight(addressField_->fontMetrics().lineSpacing() * 5);
    form->addRow(tr("Address:"), addressField_);
    currencyField_ = new QComboBox(this);
    currencyField_->setObjectName(QStringLiteral("currencyField"));
    currencyField_->setEditable(true);
    currencyField_->setInsertPolicy(QComboBox::NoInsert);
    currencyField_->addItem(QString());
    currencyField_->addItems(currencyCodes());
    currencyField_->completer()->setCaseSensitivity(Qt::CaseInsensitive);
    currencyField_->lineEdit()->setPlaceholderText(
        tr("Inherited: %1").arg(object->context()->billingDefaults().currency));
    currencyField_->setCurrentText(client->currency());
    clearsRefusal(currencyField_->lineEdit());
    form->addRow(tr("Currency (empty to inherit):"), currencyField_);
  }
  if (hasBudget(object)) {
    budgetField_ = new QLineEdit(this);
    budgetField_->setObjectName(QStringLiteral("budgetField"));
    budgetField_->setAlignment(Qt::AlignRight);
    budgetField_->setPlaceholderText(tr("No budget"));
    if (const std::optional<Decimal> budget = WTBudget::budget(object))
      budgetField_->setText(WTRateField::text(*budget));
    clearsRefusal(budgetField_);
    form->addRow(tr("Budget (empty for none):"), budgetField_);
  }

  const WTBillingRecord* record = billingRecord(object);
  const WTRoundingRule above = record->roundingRuleFromAbove();
  minutesField_ = new QLineEdit(this);
  minutesField_->setObjectName(QStringLiteral("roundingMinutesField"));
  minutesField_->setAlignment(Qt::AlignRight);
  // A minute is no rounding at all, as Preferences says it.
  const bool rounds = above.minutes > 1;
  WTRateField::setPlaceholder(minutesField_,
                              rounds ? tr("Inherited: %1").arg(above.minutes) : tr("Inherited: none"));
  if (record->roundingMinutes().value_or(0) > 0)
    minutesField_->setText(QLocale().toString(*record->roundingMinutes()));
  clearsRefusal(minutesField_);
  modeField_ = new QComboBox(this);
  modeField_->setObjectName(QStringLiteral("roundingModeField"));
  const auto modeTitle = [](WTRoundingRule::Mode mode) {
    switch (mode) {
      case WTRoundingRule::Mode::Up:
        return tr("up");
      case WTRoundingRule::Mode::Down:
        return tr("down");
      default:
        return tr("to the nearest");
    }
  };
  modeField_->addItem(rounds ? tr("Inherited: %1").arg(modeTitle(above.mode)) : tr("Inherited"), QString());
  for (const auto mode :
       {WTRoundingRule::Mode::Up, WTRoundingRule::Mode::Nearest, WTRoundingRule::Mode::Down})
    modeField_->addItem(modeTitle(mode), WTRoundingRule::nameOfMode(mode));
  modeField_->setCurrentIndex(std::max(0, modeField_->findData(record->roundingMode())));
  auto* rounding = new QHBoxLayout;
  rounding->addWidget(minutesField_, 1);
  rounding->addWidget(new QLabel(tr("minutes,"), this));
  rounding->addWidget(modeField_, 2);
  form->addRow(tr("Round time entries to:"), rounding);

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
  // Every field is read before anything is stored; the first refused keeps the sheet open with the text
  // as typed, so nothing is lost and the reason is in view.
  Parsed<QString> currency{true, {}, {}};
  if (currencyField_) {
    currency = parseCurrency(currencyField_->currentText());
    if (!currency.valid) return refuse(currencyField_->lineEdit(), currency.refusal);
  }
  Parsed<std::optional<Decimal>> budget{true, std::nullopt, {}};
  if (budgetField_) {
    // In the currency the dialog sets, when it sets one.
    QString billedIn = billingRecord(object_)->billingCurrency();
    if (currencyField_)
      billedIn = currency.value.isEmpty() ? object_->context()->billingDefaults().currency : currency.value;
    budget = parseBudget(budgetField_->text(), billedIn);
    if (!budget.valid) return refuse(budgetField_, budget.refusal);
  }
  const Parsed<std::optional<int>> minutes = parseMinutes(minutesField_->text());
  if (!minutes.valid) return refuse(minutesField_, minutes.refusal);

  const WTUndoManager::NamedStep step(object_->context()->undoManager(), tr("Change Billing"));
  if (currencyField_) {
    auto* client = static_cast<WTClient*>(object_);
    if (client->currency() != currency.value) client->setCurrency(currency.value);
    // Trailing blank lines are what a return at the end leaves, not part of the address.
    QString address = addressField_->toPlainText();
    while (address.endsWith(u'\n') || address.endsWith(u' ')) address.chop(1);
    if (client->address() != address && !(address.isEmpty() && client->address().isNull()))
      client->setAddress(address);
  }
  if (budgetField_ && WTBudget::budget(object_) != budget.value) setBudget(object_, budget.value);
  WTBillingRecord* record = billingRecord(object_);
  if (record->roundingMinutes() != minutes.value) record->setRoundingMinutes(minutes.value);
  if (const QString mode = modeField_->currentData().toString(); record->roundingMode() != mode)
    record->setRoundingMode(mode);
  QDialog::accept();
}

QString WTBillingDialog::menuTitle(WTEntity entity) {
  return entity == WTEntity::Client ? tr("Address, Currency and Rounding…") : tr("Budget and Rounding…");
}

void WTBillingDialog::editBilling(WTObject* object, QWidget* parent) {
  WTBillingDialog dialog(object, parent);
  dialog.exec();
}
