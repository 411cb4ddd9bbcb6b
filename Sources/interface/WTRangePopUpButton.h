#pragma once

#include "Date.h"
#include "WTCustomRangeDialog.h"
#include "WTRangePredicate.h"

#include <QComboBox>
#include <QPointer>

#include <optional>

class UserDefaults;

// The date-range chooser of the export: fixed ranges (today … last year), any date, and a custom range
// edited in a small dialog. Each item's data is its tag (see WTRangePredicate::Tag); selectedPredicate()
// turns the choice into a test over items, read at the moment it is asked.
class WTRangePopUpButton : public QComboBox {
  Q_OBJECT
 public:
  // `defaults` (not owned, may be null) carries the custom dates to and from the dialog under
  // "WTCustomRangeWindowBegin" and "WTCustomRangeWindowEnd"; the button starts with those chosen last.
  explicit WTRangePopUpButton(UserDefaults* defaults, QWidget* parent = nullptr);
  ~WTRangePopUpButton() override;

  std::optional<Date> customRangeBegin() const { return customRangeBegin_; }
  std::optional<Date> customRangeEnd() const { return customRangeEnd_; }

  // The tag of the chosen item.
  int selectedTag() const;
  // Chooses the item with `tag`; false when there is none.
  bool selectTag(int tag);
  // The chosen range as a test; empty when the choice gives none (a custom range without both dates).
  WTItemPredicate selectedPredicate() const;
  // The chosen range as a billing period (see WTRangePredicate::startsIn); none for any date.
  std::optional<RZDate::Range> selectedPeriod() const;

  // Hands the custom dates to the dialog through the settings and opens it over the window; whichever
  // way it is closed, the dates it shows become the custom range and rangeChosen() follows.
  WTCustomRangeDialog* showRangeWindow();

 signals:
  // The user chose a range (after the custom dialog closed, for "Custom…"): read selectedPredicate().
  void rangeChosen();

 private:
  void setupMenu();
  void showCustomDays();
  void itemActivated(int index);
  void didEndRangeWindow();

  UserDefaults* defaults_;
  std::optional<Date> customRangeBegin_;
  std::optional<Date> customRangeEnd_;
  QPointer<WTCustomRangeDialog> rangeWindow_;
};
