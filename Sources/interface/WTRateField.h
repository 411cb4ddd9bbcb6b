#pragma once

#include "Decimal.h"

#include <QDialog>
#include <QString>

#include <optional>

class QLabel;
class QLineEdit;
class WTObject;

// Rates are typed the same way wherever a client, project or task shows one: an empty field inherits
// (and says from what), money in the user's locale is taken, anything else is refused where it was typed.
namespace WTRateField {

// "Inherited: 80.00" for the field of `object`.
QString placeholder(const WTObject* object);

struct Parsed {
  bool valid = false;
  std::optional<Decimal> rate;  // empty: inherit
  QString refusal;              // why the text is not a rate, when it is not
};
// Money in the user's locale and in `currency`, as MoneyFormat::parse reads it, and not negative.
Parsed parse(const QString& text, const QString& currency);

// What a field shows for `rate`: the money format when it reads back as the same rate, else the exact
// number, so that leaving the field untouched never changes a rate by rounding it.
QString text(const Decimal& rate);

// Shows `text` in the empty field, which a line edit's width (seventeen x's) may cut: the field is kept at
// least as wide as the text.
void setPlaceholder(QLineEdit* field, const QString& text);

// Marks the field as holding a value that was not taken, with `reason` as its tool tip; an empty reason
// clears the mark.
void setRefused(QLineEdit* field, const QString& reason);
bool isRefused(const QLineEdit* field);

// Stores the field's text as the rate of `object`; a text that is not a rate changes nothing, marks
// the field and returns false.
bool apply(QLineEdit* field, WTObject* object);

}  // namespace WTRateField

// A small sheet for the rate of a row that has no room for a field of its own (clients, tasks).
class WTRateDialog : public QDialog {
  Q_OBJECT
 public:
  explicit WTRateDialog(WTObject* object, QWidget* parent = nullptr);
  QLineEdit* field() const { return field_; }
  void accept() override;

  // Opens the sheet for `object` and waits for it to be closed.
  static void editRate(WTObject* object, QWidget* parent);

 private:
  WTObject* object_;
  QLineEdit* field_;
  QLabel* message_;
};
