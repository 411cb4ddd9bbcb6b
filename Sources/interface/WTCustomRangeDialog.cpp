#include "WTCustomRangeDialog.h"

#include "RZDate.h"
#include "UserDefaults.h"

#include <QDateEdit>
#include <QDialogButtonBox>
#include <QFormLayout>
#include <QKeyEvent>
#include <QLineEdit>
#include <QLocale>
#include <QVBoxLayout>

#include <algorithm>

namespace {

// A day typed in full ("26.11.2026") is the day typed. Two digits take the field on to the next part by
// themselves; the separator typed after them would otherwise skip that part too, and the month typed
// would land in the year.
class DayEdit final : public QDateEdit {
 public:
  using QDateEdit::QDateEdit;

 protected:
  void keyPressEvent(QKeyEvent* event) override {
    const QString typed = event->text();
    const QLineEdit* line = lineEdit();
    const int at = line->hasSelectedText() ? line->selectionStart() : line->cursorPosition();
    if (typed.size() == 1 && !typed[0].isLetterOrNumber() && at > 0 && line->text().at(at - 1) == typed[0])
      return;
    QDateEdit::keyPressEvent(event);
  }
};

// Days are the user's calendar days (the calendar's zone), not the system clock's.
QDate dayOf(Date date) {
  RZDate::DateComponents components;
  RZDate::assignFlags(date, RZDate::DayUnits, components);
  return QDate(components.year, components.month, components.day);
}

Date midnightOf(QDate day) {
  RZDate::DateComponents components;
  components.year = day.year();
  components.month = day.month();
  components.day = day.day();
  return RZDate::dateFromComponents(components);
}

}  // namespace

WTCustomRangeDialog::WTCustomRangeDialog(UserDefaults* defaults, const QString& beginKey,
                                         const QString& endKey, QWidget* parent)
    : QDialog(parent), defaults_(defaults), beginKey_(beginKey), endKey_(endKey) {
  setObjectName(QStringLiteral("customRangeWindow"));
  setWindowTitle(tr("Custom Range"));
  auto* layout = new QVBoxLayout(this);
  auto* form = new QFormLayout;
  begin_ = new DayEdit(this);
  begin_->setObjectName(QStringLiteral("rangeBegin"));
  end_ = new DayEdit(this);
  end_->setObjectName(QStringLiteral("rangeEnd"));
  for (QDateEdit* edit : {begin_, end_}) {
    edit->setCalendarPopup(true);
    edit->setDisplayFormat(dayFormat());
  }
  form->addRow(tr("From:"), begin_);
  form->addRow(tr("To:"), end_);
  layout->addLayout(form);
  auto* buttons = new QDialogButtonBox(QDialogButtonBox::Ok, this);
  connect(buttons, &QDialogButtonBox::accepted, this, &QDialog::accept);
  layout->addWidget(buttons);

  load();
  // A range never ends before it begins: a later first day takes the last along. A last day typed before
  // the first becomes the first when the dialog closes, not as it is typed: a field bounded below refuses
  // the digits of such a day one by one and makes another year of what is left.
  connect(begin_, &QDateEdit::dateChanged, this, [this](QDate day) {
    store(beginKey_, day);
    if (end_->date() < day) end_->setDate(day);
  });
  connect(end_, &QDateEdit::dateChanged, this, [this](QDate day) { store(endKey_, day); });
}

void WTCustomRangeDialog::done(int result) {
  if (end_->date() < begin_->date()) end_->setDate(begin_->date());
  QDialog::done(result);
}

QString WTCustomRangeDialog::dayFormat() {
  QString format = QLocale().dateFormat(QLocale::ShortFormat);
  if (!format.contains(QLatin1String("yyyy"))) format.replace(QLatin1String("yy"), QLatin1String("yyyy"));
  return format;
}

QString WTCustomRangeDialog::dayText(Date date) {
  return QLocale().toString(dayOf(date), dayFormat());
}

void WTCustomRangeDialog::load() {
  const Date now = Date::now();
  begin_->setDate(dayOf(defaults_->dateForKey(beginKey_).value_or(RZDate::addMonth(now, -1))));
  end_->setDate(std::max(begin_->date(), dayOf(defaults_->dateForKey(endKey_).value_or(now))));
  // What the dialog shows is the range, even when it is closed untouched.
  store(beginKey_, begin_->date());
  store(endKey_, end_->date());
}

void WTCustomRangeDialog::store(const QString& key, QDate day) {
  if (day.isValid()) defaults_->setValue(key, QVariant::fromValue(midnightOf(day)));
}
