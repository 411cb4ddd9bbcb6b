#pragma once

#include <QString>

#include <functional>

class QWidget;

// Asks where to save: the dialog's title, its name filter and the suffix a typed name gets when it has
// none. Gives the chosen path, or empty when the user cancelled. Windows that save hold one so tests
// can answer in the dialog's place.
using WTSaveLocationChooser = std::function<QString(QWidget* parent, const QString& title,
                                                    const QString& filter, const QString& suffix)>;

// The desktop's save dialog, over `parent`.
QString askForSaveLocation(QWidget* parent, const QString& title, const QString& filter,
                           const QString& suffix);
