#pragma once

#include "RZDate.h"

#include <QString>

#include <functional>
#include <optional>

class QWidget;

// What a save dialog asks: its title, its name filter, the suffix a typed name gets when it has none and
// the file name it offers first.
struct WTSaveRequest {
  QString title;
  QString filter;
  QString suffix;
  QString suggestedName;
};

// Asks where to save; gives the chosen path, or empty when the user cancelled. Windows that save hold
// one so tests can answer in the dialog's place.
using WTSaveLocationChooser = std::function<QString(QWidget* parent, const WTSaveRequest& request)>;

// The desktop's save dialog, over `parent`.
QString askForSaveLocation(QWidget* parent, const WTSaveRequest& request);

// "Acme 2024-03-01 to 2024-03-31.pdf": what was saved and over which days, the last one included, so that
// a month's reports and exports sort and tell themselves apart in a folder; one day is named once. A
// name's slashes become dashes.
QString suggestedFileName(const QString& subject, const std::optional<RZDate::Range>& period,
                          const QString& suffix);
