#pragma once

#include <optional>

// The commands `tessal` runs without a window:
//   tessal template TEMPLATE_FILE [--vars VARS.json]   renders a report template (see WTTemplateCommand.h)
//   tessal sync [--timeout SECONDS]                    brings this installation in step with its server
// Returns the exit status of the command named by the first argument, or nothing when the arguments
// name no command and the desktop application should start.
std::optional<int> runCommandLine(int argc, char** argv);
