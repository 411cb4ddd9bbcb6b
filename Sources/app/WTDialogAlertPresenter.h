#pragma once

#include "WTAlertPresenter.h"

class QWidget;

// Alerts as modal message boxes over the main window.
class WTDialogAlertPresenter final : public WTAlertPresenter {
 public:
  void setParentWidget(QWidget* parent) { parent_ = parent; }
  bool presentError(const QString& message) override;
  bool confirmQuitAnyway() override;

 private:
  QWidget* parent_ = nullptr;
};
