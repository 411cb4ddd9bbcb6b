#pragma once

// Every category the program logs under. By default only warnings and errors reach stderr; the rest is
// for a developer or a bug report: QT_LOGGING_RULES="tessal.*.debug=true" (or "tessal.sync.debug=true"
// for one room) turns it on. tessal.passwords lives beside the password store.
#include <QLoggingCategory>

Q_DECLARE_LOGGING_CATEGORY(lcStore)       // "tessal.store": saves of the object context and the writer lock
Q_DECLARE_LOGGING_CATEGORY(lcSync)        // "tessal.sync": the journal, the protocol and the merges
Q_DECLARE_LOGGING_CATEGORY(lcExport)      // "tessal.export": CSV written
Q_DECLARE_LOGGING_CATEGORY(lcReport)      // "tessal.report": template errors of reports
Q_DECLARE_LOGGING_CATEGORY(lcTracking)    // "tessal.tracking": sleep and wake
Q_DECLARE_LOGGING_CATEGORY(lcApp)         // "tessal.app": the desktop shell and its single-instance socket
Q_DECLARE_LOGGING_CATEGORY(lcFoundation)  // "tessal.foundation": calendar and text helpers refusing work

namespace TessalLogging {
// The commands keep no diary: what they print is for people and scripts, unless the environment asks for
// log lines. Debug lines on a command's ordinary way ask keepsDiary() before their category, because the
// first use of a category reads Qt's logging configuration files: half a millisecond of every command.
void keepNoDiary();
bool keepsDiary();
}  // namespace TessalLogging
