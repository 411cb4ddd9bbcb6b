#!/usr/bin/env bash
# Line and branch coverage of Sources/, GXTemplate/ and server/ by the whole suite, or by the suites of
# the named test binaries (e.g. `scripts/coverage.sh ui_tests app_tests`): a gcovr JSON report in
# build-coverage/ and a summary. Compare two reports with scripts/coverage-compare.py.
# Needs gcovr (apt-get install gcovr). COVERAGE_BUILD_DIR picks another build folder.
set -euo pipefail
cd "$(dirname "$0")/.."
build=${COVERAGE_BUILD_DIR:-build-coverage}
source scripts/compiler-cache.sh
cmake -S . -B "$build" -G Ninja -DCMAKE_BUILD_TYPE=Debug -DCMAKE_CXX_FLAGS_DEBUG="-O0 --coverage -DTESSAL_COVERAGE" \
  -DCMAKE_EXE_LINKER_FLAGS=--coverage -DCMAKE_SHARED_LINKER_FLAGS=--coverage \
  -DTESSAL_BUILD_TESTS=ON -DTESSAL_BUILD_BENCHMARKS=OFF "${compiler_cache[@]}" >/dev/null
if [ $# -eq 0 ]; then
  cmake --build "$build"
  name=all
  filter=()
else
  cmake --build "$build" --target "$@" tessal tessal-desktop
  name=$(IFS=-; echo "$*")
  # The suites those binaries hold, as a ctest name pattern (parameterised ones carry a prefix).
  suites=$(for binary in "$@"; do "$build/tests/$binary" --gtest_list_tests | grep -v '^ ' | sed 's/\.$//; s#^.*/##'; done |
    sort -u | paste -sd'|')
  filter=(-R "^([^.]*/)?(${suites})\\.")
fi
find "$build" -name '*.gcda' -delete
# Notes of objects the build no longer makes (a test file removed, a source moved to another target) would
# be read beside the current ones and stop gcovr.
ninja -C "$build" -t cleandead >/dev/null
find "$build" -name '*.gcno' | while read -r notes; do [ -f "${notes%.gcno}.o" ] || rm -f "$notes"; done
env -u DBUS_SESSION_BUS_ADDRESS -u DISPLAY -u WAYLAND_DISPLAY QT_QPA_PLATFORM=offscreen \
  bash scripts/pg-test-cluster.sh run ctest --test-dir "$build" --timeout 600 -j2 -LE long "${filter[@]}" >"$build/ctest-$name.log" ||
  echo "some tests failed: $build/ctest-$name.log" >&2
report="$build/coverage-$name.json"
gcovr --root . --object-directory "$build" --filter 'Sources/' --filter 'GXTemplate/' --filter 'server/' \
  --exclude-unreachable-branches --exclude-throw-branches --gcov-ignore-parse-errors --json "$report" \
  --print-summary
echo "report: $report"
