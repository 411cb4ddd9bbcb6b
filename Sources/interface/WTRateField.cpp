#include "WTRateField.h"

#include "MoneyFormat.h"
#include "WTClient.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTUndoManager.h"

#include <QCoreApplication>
#include <QDialogButtonBox>
#include <QLabel>
#include <QLineEdit>
#include <QStyle>
#include <QStyleOptionFrame>
#include <QVBoxLayout>

namespace WTRateField {

namespace {

const char* const kRefusedProperty = "rateRefused";

}  // namespace

// The currency the record bills in (every client, project and task answers it).
QString currencyOf(const WTObject* object) {
  return object->valueForKey(QStringLiteral("billingCurrency")).toString();
}

QString placeholder(const WTObject* object) {
  return QObject::tr("Inherited: %1")
      .arg(MoneyFormat::formatRate(object->rateFromAbove(), currencyOf(object)));
}

Parsed parse(const QString& typed, const QString& currency) {
  const TypedNumber::Reading reading = MoneyFormat::parse(typed, currency);
  if (!reading.taken()) return {false, std::nullopt, reading.refusal};
  if (reading.value && reading.value->isNegative())
    return {false, std::nullopt, QObject::tr("Not a rate: a rate is never below zero")};
  return {true, reading.value, {}};
}

QString text(const Decimal& rate) {
  const QString formatted = MoneyFormat::format(rate);
  const TypedNumber::Reading back = MoneyFormat::parse(formatted);
  return back.value == rate ? formatted : TypedNumber::editableText(rate);
}

void setPlaceholder(QLineEdit* field, const QString& text) {
  field->setPlaceholderText(text);
  QStyleOptionFrame option;
  option.initFrom(field);
  option.lineWidth = field->style()->pixelMetric(QStyle::PM_DefaultFrameWidth, &option, field);
  const QMargins margins = field->textMargins();
  // The line edit's own margin of 2 on each side, and a pixel for the caret.
  const QSize content(field->fontMetrics().horizontalAdvance(text) + 4 + 1 + margins.left() + margins.right(),
                      field->fontMetrics().height());
  field->setMinimumWidth(
      field->style()->sizeFromContents(QStyle::CT_LineEdit, &option, content, field).width());
}

void setRefused(QLineEdit* field, const QString& reason) {
  const bool refused = !reason.isEmpty();
  if (!refused && !isRefused(field)) return;
  field->setProperty(kRefusedProperty, refused);
  field->setStyleSheet(refused ? QStringLiteral("QLineEdit { border: 2px solid #d03030; }") : QString());
  field->setToolTip(reason);
}

bool isRefused(const QLineEdit* field) {
  return field->property(kRefusedProperty).toBool();
}

bool apply(QLineEdit* field, WTObject* object) {
  const Parsed parsed = parse(field->text(), currencyOf(object));
  setRefused(field, parsed.refusal);
  if (!parsed.valid) return false;
  if (object->storedRate() != parsed.rate) {
    const WTUndoManager::NamedStep step(object->context()->undoManager(),
                                        QCoreApplication::translate("WTRateField", "Change Rate"));
    object->setRate(parsed.rate);
  }
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
  WTRateField::setPlaceholder(field_, WTRateField::placeholder(object));
  if (object->storedRate()) field_->setText(WTRateField::text(*object->storedRate()));
  label->setBuddy(field_);
  message_ = new QLabel(this);
  message_->setObjectName(QStringLiteral("rateMessage"));
  message_->setStyleSheet(QStringLiteral("color: #d03030;"));
  message_->hide();
  auto* buttons = new QDialogButtonBox(QDialogButtonBox::Ok | QDialogButtonBox::Cancel, this);
  connect(buttons, &QDialogButtonBox::accepted, this, &WTRateDialog::accept);
  connect(buttons, &QDialogButtonBox::rejected, this, &WTRateDialog::reject);
  connect(field_, &QLineEdit::textEdited, this, [this] {
    WTRateField::setRefused(field_, {});
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
