#pragma once

#include <optional>

// The commands of the executable that links the interface (see WTCommandLine.h): report, export,
// template and sync. Returns the exit status of the command named by the first argument, or nothing when
// the arguments name none of them.
std::optional<int> runDesktopCommand(int argc, char** argv);
