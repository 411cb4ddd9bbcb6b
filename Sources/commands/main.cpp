#include "WTCommandLine.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <system_error>

#include <sqlite3.h>
#include <unistd.h>

namespace {

// The executable that links the interface: beside this one in the build tree, in the library folder's
// tessal/ once installed.
std::filesystem::path desktopExecutable() {
  std::error_code error;
  const std::filesystem::path self = std::filesystem::read_symlink("/proc/self/exe", error);
  const std::filesystem::path folder = error ? std::filesystem::path(".") : self.parent_path();
  const std::filesystem::path beside = folder / "tessal-desktop";
  if (std::filesystem::exists(beside, error)) return beside;
  return (folder / TESSAL_DESKTOP_FROM_BINDIR / "tessal-desktop").lexically_normal();
}

}  // namespace

int main(int argc, char** argv) {
  // A command reads and writes a few pages. SQLite's first bulk of page slots would be touched whole on
  // the first read, each slot a fresh page of memory to fault in: about one fault in twenty of a start.
  sqlite3_config(SQLITE_CONFIG_PAGECACHE, nullptr, 0, 0);
  if (const std::optional<int> status = WTCommandLine::run(argc, argv)) return *status;
  // The desktop and the commands that render or sync: the same process goes on as the executable that
  // links them, so its id, its signals and its exit status stay the caller's.
  const std::filesystem::path desktop = desktopExecutable();
  ::execv(desktop.c_str(), argv);
  std::fprintf(stderr, "tessal: cannot start %s: %s\n", desktop.c_str(), std::strerror(errno));
  return 127;
}
