#pragma once

#include <QString>

// How the delegate speaks to the user: the desktop shows dialogs, tests record what was said.
class WTAlertPresenter {
 public:
  virtual ~WTAlertPresenter() = default;
  // Shows an error; returns true when the user dealt with it (a recovery was chosen).
  virtual bool presentError(const QString& message) = 0;
  // Asks "Could not save changes while quitting. Quit anyway?"; true for "Quit anyway".
  virtual bool confirmQuitAnyway() = 0;
  // Asks `question` ("Delete “General” and its 14 items?"), with `detail` under it when not empty;
  // true for "Delete".
  virtual bool confirmDeletion(const QString& question, const QString& detail) = 0;
  // Says `message` (the store cannot be opened for damage) and offers to put back the copy at `backup`;
  // true for "Restore Backup". By default only the message is shown.
  virtual bool offerRestore(const QString& message, const QString& backup) {
    Q_UNUSED(backup);
    return presentError(message);
  }
};
