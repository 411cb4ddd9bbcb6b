#pragma once

#include "WTTrackingAlert.h"

#include <QPointer>
#include <QWidget>

// Asks with a modal message box on the desktop: the default button is the one Return chooses; Escape
// chooses nothing, so the user has to pick one of the two. The box runs a nested event loop, so the
// ticker's other work (and the tray) keep going meanwhile.
class WTDialogTrackingAlertPresenter final : public WTTrackingAlertPresenter {
 public:
  // `parent` (may be null) is the window the box is centred over.
  explicit WTDialogTrackingAlertPresenter(QWidget* parent = nullptr) : parent_(parent) {}

  WTTrackingAlertAnswer runAlert(const WTTrackingAlert& alert) override;

 private:
  QPointer<QWidget> parent_;
};
