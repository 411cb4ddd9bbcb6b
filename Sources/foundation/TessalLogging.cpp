#include "TessalLogging.h"

#include <QtGlobal>

// Info and debug messages are off unless QT_LOGGING_RULES asks for them.
Q_LOGGING_CATEGORY(lcStore, "tessal.store", QtWarningMsg)
Q_LOGGING_CATEGORY(lcSync, "tessal.sync", QtWarningMsg)
Q_LOGGING_CATEGORY(lcExport, "tessal.export", QtWarningMsg)
Q_LOGGING_CATEGORY(lcReport, "tessal.report", QtWarningMsg)
Q_LOGGING_CATEGORY(lcTracking, "tessal.tracking", QtWarningMsg)
Q_LOGGING_CATEGORY(lcApp, "tessal.app", QtWarningMsg)
Q_LOGGING_CATEGORY(lcFoundation, "tessal.foundation", QtWarningMsg)

namespace {
bool diaryKept = true;
}

void TessalLogging::keepNoDiary() {
  // Whoever set rules in the environment asked for lines: theirs win over these, as they always did.
  if (qEnvironmentVariableIsSet("QT_LOGGING_RULES") || qEnvironmentVariableIsSet("QT_LOGGING_CONF")) {
    QLoggingCategory::setFilterRules(QStringLiteral("*.debug=false\n*.info=false"));
    return;
  }
  diaryKept = false;
  // Read only if a category is ever used; from the environment, they win over the configuration files.
  qputenv("QT_LOGGING_RULES", "*.debug=false;*.info=false");
}

bool TessalLogging::keepsDiary() {
  return diaryKept;
}
