#!/usr/bin/env bash
# Installs what Tessal needs, builds every test and runs them all through ctest.
# TESSAL_BUILD_DIR and extra CMake options (TESSAL_CMAKE_ARGS) let CI reuse it for the sanitizer build.
set -euo pipefail
cd "$(dirname "$0")/.."
bash scripts/install-deps.sh
build=${TESSAL_BUILD_DIR:-build-tests}
source scripts/compiler-cache.sh
# shellcheck disable=SC2086
# Line tables (-g1) are all a failing test's stack trace needs; full debug information would double the
# time every file takes to compile on a small machine.
cmake -S . -B "$build" -G Ninja -DCMAKE_BUILD_TYPE="${TESSAL_BUILD_TYPE:-RelWithDebInfo}" \
  -DCMAKE_CXX_FLAGS_RELWITHDEBINFO="-O2 -g1 -DNDEBUG" -DCMAKE_CXX_FLAGS_DEBUG="-O0 -g1" \
  -DTESSAL_BUILD_TESTS=ON -DTESSAL_BUILD_BENCHMARKS=ON -DTESSAL_WERROR=ON "${compiler_cache[@]}" \
  ${TESSAL_CMAKE_ARGS:-}
cmake --build "$build"
# No test may reach the developer's session bus or display. The sync server's tests run against SQLite
# and against a throw-away PostgreSQL cluster that lives only as long as ctest. Runs labelled long (many
# seeds, kill loops) are left out; `ctest -L long` runs them.
env -u DBUS_SESSION_BUS_ADDRESS -u DISPLAY -u WAYLAND_DISPLAY QT_QPA_PLATFORM=offscreen \
  bash scripts/pg-test-cluster.sh run ctest --test-dir "$build" --output-on-failure --timeout 300 -j2 -LE long
