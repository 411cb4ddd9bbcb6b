#!/usr/bin/env bash
# Starting and stopping a timer as whole processes against Timewarrior doing the same, in one run:
# `tessal start "Task 7" && tessal stop "Task 7"` on a store of 100,000 items (the year-report store of
# bench/report-vs-timew.sh) against `timew start "Task 7" && timew stop` over the same 20,000 intervals.
# Target: tessal within 2 times timew.
#
#   bench/start-stop-vs-timew.sh [BUILD_DIR] [RUNS]
# BUILD_DIR (default build-tests) holds the targets tessal and tessal_make_report_store; RUNS (default
# 20) pairs of each, interleaved, after one warm-up pair each. Needs timewarrior (apt-get install timewarrior).
set -euo pipefail
cd "$(dirname "$0")/.."
build=${1:-build-tests}
runs=${2:-20}
source bench/timew-store.sh "$build"

python3 - "$tessal" "$runs" <<'PY'
import statistics, subprocess, sys, time
tessal, runs = sys.argv[1], int(sys.argv[2])
pairs = {
    "tessal start + stop": [[tessal, "start", "Task 7"], [tessal, "stop", "Task 7"]],
    # Timewarrior refuses an interval that ends in the second it began, so its timer starts a minute ago
    # (:adjust lets it overlap the previous run's).
    "timew start + stop": [["timew", "start", "1min", "ago", "Task 7", ":adjust"], ["timew", "stop"]],
}
def run(commands):
    for command in commands:
        subprocess.run(command, stdout=subprocess.DEVNULL, stdin=subprocess.DEVNULL, check=True)
times = {name: [] for name in pairs}
for commands in pairs.values():
    run(commands)
for _ in range(runs):
    for name, commands in pairs.items():
        start = time.perf_counter()
        run(commands)
        times[name].append((time.perf_counter() - start) * 1000)
medians = {}
for name, values in times.items():
    medians[name] = statistics.median(values)
    print(f"{name:25} median {medians[name]:7.1f} ms  min {min(values):7.1f} ms")
ours, theirs = medians.values()
print(f"tessal / timew: {ours / theirs:.2f}x")
PY
