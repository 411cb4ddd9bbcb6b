#pragma once

#include <QString>

// A two-button question the tracking code puts to the user: the idle alert and the quit prompt.
struct WTTrackingAlert {
  QString messageText;
  QString informativeText;
  QString defaultButton;
  QString alternateButton;
};

enum class WTTrackingAlertAnswer { Default, Alternate };

// Shows a WTTrackingAlert and returns the button chosen. The desktop answers with a dialog (which may
// run a nested event loop: the caller copes with being re-entered meanwhile); tests answer directly.
class WTTrackingAlertPresenter {
 public:
  virtual ~WTTrackingAlertPresenter() = default;
  virtual WTTrackingAlertAnswer runAlert(const WTTrackingAlert& alert) = 0;
};
