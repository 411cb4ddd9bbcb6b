#include "WTRangePopUpButton.h"

#include "RZDate.h"
#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTCustomRangeDialog.h"

WTRangePopUpButton::WTRangePopUpButton(UserDefaults* defaults, QWidget* parent)
    : QComboBox(parent), defaults_(defaults) {
  setObjectName(QStringLiteral("rangeButton"));
  // The custom dates chosen last, else the month up to now.
  const Date now = Date::now();
  customRangeBegin_ = RZDate::addMonth(now, -1);
  customRangeEnd_ = now;
  if (defaults_) {
    const std::optional<Date> begin = defaults_->dateForKey(SettingsKeys::kCustomRangeWindowBegin);
    const std::optional<Date> end = defaults_->dateForKey(SettingsKeys::kCustomRangeWindowEnd);
    if (begin && end) {
      customRangeBegin_ = begin;
      customRangeEnd_ = end;
    }
  }
  setupMenu();
  if (defaults_ && defaults_->dateForKey(SettingsKeys::kCustomRangeWindowBegin)) showCustomDays();
  connect(this, &QComboBox::activated, this, &WTRangePopUpButton::itemActivated);
}

void WTRangePopUpButton::showCustomDays() {
  // The item says which days it holds once there are some to say; choosing it still opens the dialog.
  if (!customRangeBegin_ || !customRangeEnd_) return;
  setItemText(findData(WTRangePredicate::Custom), tr("Custom: %1 – %2")
                                                      .arg(WTCustomRangeDialog::dayText(*customRangeBegin_),
                                                           WTCustomRangeDialog::dayText(*customRangeEnd_)));
}

WTRangePopUpButton::~WTRangePopUpButton() = default;

void WTRangePopUpButton::setupMenu() {
  using namespace WTRangePredicate;
  const std::pair<const char*, int> items[] = {
      {QT_TR_NOOP("Today"), Today},          {QT_TR_NOOP("Yesterday"), Yesterday},
      {QT_TR_NOOP("This week"), ThisWeek},   {QT_TR_NOOP("Last week"), LastWeek},
      {QT_TR_NOOP("This month"), ThisMonth}, {QT_TR_NOOP("Last month"), LastMonth},
      {QT_TR_NOOP("This year"), ThisYear},   {QT_TR_NOOP("Last year"), LastYear},
      {QT_TR_NOOP("Any date"), AnyDate},     {QT_TR_NOOP("Custom..."), Custom},
  };
  for (const auto& [title, tag] : items) {
    if (tag == Custom) insertSeparator(count());
    addItem(tr(title), tag);
  }
}

int WTRangePopUpButton::selectedTag() const {
  const QVariant tag = currentData();
  return tag.isValid() ? tag.toInt() : -1;
}

bool WTRangePopUpButton::selectTag(int tag) {
  const int index = findData(tag);
  if (index < 0) return false;
  setCurrentIndex(index);
  return true;
}

WTItemPredicate WTRangePopUpButton::selectedPredicate() const {
  return WTRangePredicate::predicateForTag(selectedTag(), customRangeBegin_, customRangeEnd_);
}

std::optional<RZDate::Range> WTRangePopUpButton::selectedPeriod() const {
  return WTRangePredicate::boundsForTag(selectedTag(), customRangeBegin_, customRangeEnd_);
}

void WTRangePopUpButton::itemActivated(int index) {
  if (itemData(index).toInt() == WTRangePredicate::Custom) {
    showRangeWindow();
    return;
  }
  emit rangeChosen();
}

WTCustomRangeDialog* WTRangePopUpButton::showRangeWindow() {
  if (!defaults_) return nullptr;
  if (rangeWindow_) return rangeWindow_;
  auto date = [](std::optional<Date> value) { return value ? QVariant::fromValue(*value) : QVariant(); };
  defaults_->setValue(SettingsKeys::kCustomRangeWindowBegin, date(customRangeBegin_));
  defaults_->setValue(SettingsKeys::kCustomRangeWindowEnd, date(customRangeEnd_));
  rangeWindow_ = new WTCustomRangeDialog(defaults_, SettingsKeys::kCustomRangeWindowBegin,
                                         SettingsKeys::kCustomRangeWindowEnd, window());
  rangeWindow_->setAttribute(Qt::WA_DeleteOnClose);
  connect(rangeWindow_, &QDialog::finished, this, &WTRangePopUpButton::didEndRangeWindow);
  rangeWindow_->open();
  return rangeWindow_;
}

void WTRangePopUpButton::didEndRangeWindow() {
  // Whatever ended the dialog, the dates it showed are the range: they were stored as they were chosen.
  customRangeBegin_ = defaults_->dateForKey(SettingsKeys::kCustomRangeWindowBegin);
  customRangeEnd_ = defaults_->dateForKey(SettingsKeys::kCustomRangeWindowEnd);
  showCustomDays();
  emit rangeChosen();
}
