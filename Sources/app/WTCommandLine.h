#pragma once

#include <optional>

// The commands `tessal` runs without a window:
//   tessal report ..., tessal export ...              read the store (see WTReportCommand.h)
//   tessal template TEMPLATE_FILE [--vars VARS.json]   renders a report template (see WTTemplateCommand.h)
//   tessal sync [--timeout SECONDS]                    brings this installation in step with its server
//   tessal --help, tessal --version                    print and exit 0
// Returns the exit status of the command named by the first argument (2 for arguments that are neither a
// command nor the desktop application's Qt options, with a usage line on stderr), or nothing when the
// desktop application should start. Never needs a display.
std::optional<int> runCommandLine(int argc, char** argv);
