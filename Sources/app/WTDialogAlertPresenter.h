#pragma once

#include "RZSyncErrorPresenter.h"
#include "WTAlertPresenter.h"

class QWidget;

// Alerts as modal message boxes over the main window, for the delegate and for the sync.
class WTDialogAlertPresenter final : public WTAlertPresenter, public RZSyncErrorPresenter {
 public:
  void setParentWidget(QWidget* parent) { parent_ = parent; }
  bool presentError(const QString& message) override;
  bool confirmQuitAnyway() override;
  bool confirmDeletion(const QString& question, const QString& detail) override;
  bool offerRestore(const QString& message, const QString& backup) override;
  void presentSyncError(const QString& message) override;
  void presentNetworkError(const QString& message) override;

 private:
  QWidget* parent_ = nullptr;
};
