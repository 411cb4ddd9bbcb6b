#pragma once

#include <QString>

// How the sync manager tells the user that syncing went wrong. The desktop shows alerts; until then,
// and for the command line, RZSyncLogErrorPresenter writes the messages to the log.
class RZSyncErrorPresenter {
 public:
  virtual ~RZSyncErrorPresenter() = default;
  // The server refused a request: the alert "Sync Error" with the informative text `message` (already
  // formatted as "%@ - (Code: %ld)") and one button "Ok". Syncing is off afterwards.
  virtual void presentSyncError(const QString& message) = 0;
  // The exchange with the server failed (no answer, or an answer that is not JSON). Shown once for a
  // run of consecutive failures.
  virtual void presentNetworkError(const QString& message) = 0;
  // The server answers again after a run of failures: a notice of the run that still stands goes.
  virtual void networkRecovered() {}
  // A merge changed what was done here: kept work from a deletion made elsewhere, or replaced a change
  // made here with another device's. `message` says what, `summary` in a few words. Needs no answer.
  virtual void presentMergeNotice(const QString& summary, const QString& message) = 0;
};

// Writes each message to the log as a warning.
class RZSyncLogErrorPresenter final : public RZSyncErrorPresenter {
 public:
  void presentSyncError(const QString& message) override;
  void presentNetworkError(const QString& message) override;
  void presentMergeNotice(const QString& summary, const QString& message) override;
};
