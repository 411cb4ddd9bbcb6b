#!/usr/bin/env bash
# A year's report as a whole process against Timewarrior's summary of the same intervals, in one run:
# `tessal report --client Northwind --mode 2` over a store of 100,000 items from five years, of which
# Northwind's are 20,000 time entries in 2025, and `timew summary` over the same 20,000 intervals.
# Target: tessal at least 3 times faster than timew.
#
#   bench/report-vs-timew.sh [BUILD_DIR] [RUNS]
# BUILD_DIR (default build-tests) holds the targets tessal and tessal_make_report_store; RUNS (default
# 20) runs of each, interleaved, after one warm-up run each. Needs timewarrior (apt-get install timewarrior).
set -euo pipefail
cd "$(dirname "$0")/.."
build=${1:-build-tests}
runs=${2:-20}
source bench/timew-store.sh "$build"

# Both must give the same year: 20,000 entries of 20 minutes are 6,666 hours 40 minutes.
"$tessal" report --client Northwind --mode 2 --out "$work/report.csv"
tessal_minutes=$(awk -F'","' '{ split($4, t, ":"); sum += t[1] * 60 + t[2] } END { print sum }' "$work/report.csv")
timew_total=$(timew summary 2025-01-01 - 2026-01-01 </dev/null | awk 'NF == 1 && $1 ~ /:/ { total = $1 } END { print total }')
echo "tessal: $tessal_minutes minutes in the report; timew: $timew_total"
[ "$tessal_minutes" = 400000 ] && [ "$timew_total" = 6666:40:00 ] || { echo "the two disagree" >&2; exit 1; }

python3 - "$tessal" "$runs" <<'PY'
import statistics, subprocess, sys, time
tessal, runs = sys.argv[1], int(sys.argv[2])
commands = {
    "tessal report --client Northwind --mode 2": [tessal, "report", "--client", "Northwind", "--mode", "2"],
    "timew summary 2025": ["timew", "summary", "2025-01-01", "-", "2026-01-01"],
}
times = {name: [] for name in commands}
for name, command in commands.items():
    subprocess.run(command, stdout=subprocess.DEVNULL, stdin=subprocess.DEVNULL, check=True)
for _ in range(runs):
    for name, command in commands.items():
        start = time.perf_counter()
        subprocess.run(command, stdout=subprocess.DEVNULL, stdin=subprocess.DEVNULL, check=True)
        times[name].append((time.perf_counter() - start) * 1000)
medians = {}
for name, values in times.items():
    medians[name] = statistics.median(values)
    print(f"{name:45} median {medians[name]:7.1f} ms  min {min(values):7.1f} ms")
ours, theirs = medians.values()
print(f"timew / tessal: {theirs / ours:.2f}x")
PY
