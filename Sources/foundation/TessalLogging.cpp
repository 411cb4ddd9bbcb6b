#include "TessalLogging.h"

// Info and debug messages are off unless QT_LOGGING_RULES asks for them.
Q_LOGGING_CATEGORY(lcStore, "tessal.store", QtWarningMsg)
Q_LOGGING_CATEGORY(lcSync, "tessal.sync", QtWarningMsg)
Q_LOGGING_CATEGORY(lcExport, "tessal.export", QtWarningMsg)
Q_LOGGING_CATEGORY(lcReport, "tessal.report", QtWarningMsg)
Q_LOGGING_CATEGORY(lcTracking, "tessal.tracking", QtWarningMsg)
Q_LOGGING_CATEGORY(lcApp, "tessal.app", QtWarningMsg)
Q_LOGGING_CATEGORY(lcFoundation, "tessal.foundation", QtWarningMsg)
