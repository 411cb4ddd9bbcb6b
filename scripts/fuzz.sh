#!/usr/bin/env bash
# Builds the libFuzzer targets (clang-14, AddressSanitizer and UBSan; tests/fuzz/README.md) and runs each
# for SECONDS (600 unless given) with its dictionary and seed corpus, one after another. New inputs go to a
# scratch corpus under the build folder, never into the seeds kept in the repository. Exits non-zero as
# soon as a target finds something; the input that did it is left in the build folder, named in the log.
#
#   scripts/fuzz.sh [SECONDS]
# TESSAL_FUZZ_BUILD_DIR (build-fuzz) and TESSAL_FUZZ_TARGETS (all of them, by name) narrow it down;
# TESSAL_FUZZ_JOBS runs that many at once (1 unless given: on a shared machine, one core is enough).
set -euo pipefail
cd "$(dirname "$0")/.."
seconds=${1:-600}
build=${TESSAL_FUZZ_BUILD_DIR:-build-fuzz}
command -v clang++-14 >/dev/null || { echo "clang++-14 is not installed (scripts/install-deps.sh)" >&2; exit 1; }

# name, folder of the binary, seeds, dictionary (none: -), longest input
targets=(
  "template_fuzzer GXTemplate corpus template.dict 4096"
  "sync_reply_fuzzer Sources/sync sync-corpus sync.dict 0"
  "journal_fuzzer Sources/sync journal-corpus journal.dict 0"
  "http_request_fuzzer server http-corpus http.dict 0"
  "csv_reader_fuzzer Sources/import csv-corpus import.dict 0"
  "duration_text_fuzzer Sources/foundation duration-corpus typed.dict 64"
  "money_text_fuzzer Sources/foundation money-corpus typed.dict 128"
  "store_record_fuzzer Sources/model store-corpus - 0"
)
selected=()
for target in "${targets[@]}"; do
  name=${target%% *}
  if [ -z "${TESSAL_FUZZ_TARGETS:-}" ] || [[ " $TESSAL_FUZZ_TARGETS " == *" $name "* ]]; then
    selected+=("$target")
  fi
done

source scripts/compiler-cache.sh
# -O1 keeps the fuzzers fast enough to matter; a Debug build keeps Qt's and our assertions on.
cmake -S . -B "$build" -G Ninja -DCMAKE_BUILD_TYPE=Debug -DCMAKE_CXX_FLAGS_DEBUG="-O1 -g1" \
  -DCMAKE_C_COMPILER=clang-14 -DCMAKE_CXX_COMPILER=clang++-14 "${compiler_cache[@]}" \
  -DTESSAL_BUILD_FUZZERS=ON -DTESSAL_BUILD_TESTS=OFF -DTESSAL_BUILD_BENCHMARKS=OFF >/dev/null
names=()
for target in "${selected[@]}"; do names+=("${target%% *}"); done
cmake --build "$build" --target "${names[@]}"

# The store and journal fuzzers write a file per input: on a memory file system where there is one.
if [ -d /dev/shm ] && [ -w /dev/shm ]; then export TMPDIR=/dev/shm; fi
export ASAN_OPTIONS=${ASAN_OPTIONS:-detect_leaks=1:abort_on_error=1}
export UBSAN_OPTIONS=${UBSAN_OPTIONS:-print_stacktrace=1:halt_on_error=1}
export QT_QPA_PLATFORM=offscreen
# One target: its summary when it ends, its log's end and a non-zero status when it found something.
fuzz() {
  local name folder seeds dict length
  read -r name folder seeds dict length <<<"$1"
  local scratch="$build/fuzz-corpus/$name" findings="$build/fuzz-findings/$name"
  mkdir -p "$scratch" "$findings"
  local options=(-max_total_time="$seconds" -timeout=10 -rss_limit_mb=2048 -print_final_stats=1
                 -artifact_prefix="$findings/")
  [ "$dict" != "-" ] && options+=(-dict="tests/fuzz/$dict")
  [ "$length" != 0 ] && options+=(-max_len="$length")
  if ! "$build/$folder/$name" "${options[@]}" "$scratch" "tests/fuzz/$seeds" 2>"$build/$name.log"; then
    tail -n 60 "$build/$name.log" >&2
    echo "== $name found something: $(ls "$findings")" >&2
    return 1
  fi
  echo "== $name: $(grep -E '^stat::number_of_executed_units' "$build/$name.log" | sed 's/.*: *//') runs" \
    "in $seconds s, $(ls "$scratch" | wc -l) new inputs beside $(ls "tests/fuzz/$seeds" | wc -l) seeds"
}

jobs=${TESSAL_FUZZ_JOBS:-1}
status=0
running=0
for target in "${selected[@]}"; do
  if [ "$running" -ge "$jobs" ]; then
    running=$((running - 1))
    wait -n || { status=1; break; }
  fi
  echo "== ${target%% *} for $seconds s"
  fuzz "$target" &
  running=$((running + 1))
done
while [ "$running" -gt 0 ]; do
  running=$((running - 1))
  wait -n || status=1
done
exit $status
