#pragma once

#include "RZSyncErrorPresenter.h"
#include "WTAlertPresenter.h"

#include <QString>

#include <functional>

class QWidget;

// Alerts as modal message boxes over the main window, for the delegate and for the sync.
class WTDialogAlertPresenter final : public WTAlertPresenter, public RZSyncErrorPresenter {
 public:
  // Where a notice goes that needs no answer (a summary and its body): the desktop's notifications.
  using NoticeSink = std::function<void(const QString& summary, const QString& body)>;

  void setParentWidget(QWidget* parent) { parent_ = parent; }
  // A sync that cannot reach its server is told there, not in a box that would take the focus from
  // whatever is being typed; without one, a box says it.
  void setNoticeSink(NoticeSink sink) { noticeSink_ = std::move(sink); }
  // Where a notice is taken back once it no longer holds (by its summary).
  void setWithdrawal(std::function<void(const QString& summary)> withdraw) {
    withdraw_ = std::move(withdraw);
  }
  bool presentError(const QString& message) override;
  bool confirmQuitAnyway() override;
  bool confirmDeletion(const QString& question, const QString& detail) override;
  bool offerRestore(const QString& message, const QString& backup) override;
  void presentSyncError(const QString& message) override;
  void presentNetworkError(const QString& message) override;
  void networkRecovered() override;
  void presentMergeNotice(const QString& summary, const QString& message) override;

 private:
  QWidget* parent_ = nullptr;
  NoticeSink noticeSink_;
  std::function<void(const QString&)> withdraw_;
};
