#include "WTRateField.h"

#include "MoneyFormat.h"
#include "WTClient.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTTask.h"

#include <QDialogButtonBox>
#include <QLabel>
#include <QLineEdit>
#include <QVBoxLayout>

namespace WTRateField {

namespace {

const char* const kRefusedProperty = "rateRefused";

}  // namespace

QString placeholder(const WTObject* object) {
  return QObject::tr("Inherited: %1").arg(MoneyFormat::format(object->rateFromAbove()));
}

Parsed parse(const QString& typed) {
  if (typed.trimmed().isEmpty()) return {true, std::nullopt};
  const std::optional<Decimal> rate = MoneyFormat::parse(typed);
  if (!rate || *rate < Decimal(0)) return {false, std::nullopt};
  return {true, rate};
}

void setRefused(QLineEdit* field, bool refused) {
  if (isRefused(field) == refused) return;
  field->setProperty(kRefusedProperty, refused);
  field->setStyleSheet(refused ? QStringLiteral("QLineEdit { border: 2px solid #d03030; }") : QString());
  field->setToolTip(refused
                        ? QObject::tr("Not a rate: type an amount such as %1, or leave it empty to inherit")
                              .arg(MoneyFormat::format(Decimal(80)))
                        : QString());
}

bool isRefused(const QLineEdit* field) {
  return field->property(kRefusedProperty).toBool();
}

bool apply(QLineEdit* field, WTObject* object) {
  const Parsed parsed = parse(field->text());
  setRefused(field, !parsed.valid);
  if (!parsed.valid) return false;
  if (object->storedRate() != parsed.rate) object->setRate(parsed.rate);
  return true;
}

}  // namespace WTRateField

WTRateDialog::WTRateDialog(WTObject* object, QWidget* parent) : QDialog(parent), object_(object) {
  setObjectName(QStringLiteral("rateDialog"));
  setWindowTitle(tr("Rate of %1").arg(object->name().isEmpty() ? tr("Untitled") : object->name()));
  auto* layout = new QVBoxLayout(this);
  auto* label = new QLabel(tr("Hourly rate (empty to inherit):"), this);
  field_ = new QLineEdit(this);
  field_->setObjectName(QStringLiteral("rateField"));
  field_->setAlignment(Qt::AlignRight);
  field_->setPlaceholderText(WTRateField::placeholder(object));
  if (object->storedRate()) field_->setText(MoneyFormat::format(*object->storedRate()));
  label->setBuddy(field_);
  message_ = new QLabel(this);
  message_->setObjectName(QStringLiteral("rateMessage"));
  message_->setStyleSheet(QStringLiteral("color: #d03030;"));
  message_->hide();
  auto* buttons = new QDialogButtonBox(QDialogButtonBox::Ok | QDialogButtonBox::Cancel, this);
  connect(buttons, &QDialogButtonBox::accepted, this, &WTRateDialog::accept);
  connect(buttons, &QDialogButtonBox::rejected, this, &WTRateDialog::reject);
  connect(field_, &QLineEdit::textEdited, this, [this] {
    WTRateField::setRefused(field_, false);
    message_->hide();
  });
  layout->addWidget(label);
  layout->addWidget(field_);
  layout->addWidget(message_);
  layout->addWidget(buttons);
}

void WTRateDialog::accept() {
  if (!WTRateField::apply(field_, object_)) {
    // The sheet stays open with the text as typed, so nothing is lost and the reason is in view.
    message_->setText(field_->toolTip());
    message_->show();
    field_->setFocus();
    field_->selectAll();
    return;
  }
  QDialog::accept();
}

void WTRateDialog::editRate(WTObject* object, QWidget* parent) {
  WTRateDialog dialog(object, parent);
  dialog.exec();
}
