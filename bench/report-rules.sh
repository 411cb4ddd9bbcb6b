#!/usr/bin/env bash
# A year's report as a whole process, with a rounding rule (15 minutes, up) on every client against the
# same store without rules: `tessal report --client Northwind` over the store of report-vs-timew.sh
# (100,000 items, Northwind's 20,000 time entries in 2025), at the level of every item (1) and of days (2).
# Target: with rules within 10 % of without.
#
#   bench/report-rules.sh [BUILD_DIR] [RUNS]
# BUILD_DIR (default build-tests) holds the targets tessal and tessal_make_report_store; RUNS (default
# 20) runs of each, interleaved, after one warm-up run each.
set -euo pipefail
cd "$(dirname "$0")/.."
build=${1:-build-tests}
runs=${2:-20}
tessal=$build/Sources/app/tessal
maker=$build/bench/tessal_make_report_store
for program in "$tessal" "$maker"; do [ -x "$program" ] || { echo "no $program: build it first" >&2; exit 1; }; done

work=$(mktemp -d "${TMPDIR:-/tmp}/tessal-rules.XXXXXX")
trap 'rm -rf "$work"' EXIT
unset DISPLAY WAYLAND_DISPLAY DBUS_SESSION_BUS_ADDRESS
for variant in plain rules; do
  mkdir -p "$work/$variant/data/Tessal2" "$work/$variant/config" "$work/$variant/runtime" "$work/$variant/timew"
  chmod 700 "$work/$variant/runtime"
  "$maker" "$work/$variant/data/Tessal2/Tessal.sqlite" "$work/$variant/timew" \
    $([ "$variant" = rules ] && echo --rules) >/dev/null
  # A built-in template that shows no billed figures yet gets them beside the raw ones, in a copy of its own.
  if ! grep -q billedCost Resources/report.txt; then
    sed -E 's/\{\{ ([a-z.@]+)\.cost \| decimal \}\}/& {{ \1.billedCost | decimal }}/g;
            s/\{\{ ([a-z.@]+)\.duration \| digiclock \}\}/& {{ \1.billedDuration | digiclock }}/g' \
      Resources/report.txt >"$work/$variant/data/Tessal2/report.txt"
  fi
done

python3 - "$tessal" "$runs" "$work" <<'PY'
import os, statistics, subprocess, sys, time
tessal, runs, work = sys.argv[1], int(sys.argv[2]), sys.argv[3]
def environment(variant):
    env = dict(os.environ)
    for name, sub in (("XDG_DATA_HOME", "data"), ("XDG_CONFIG_HOME", "config"), ("XDG_RUNTIME_DIR", "runtime")):
        env[name] = os.path.join(work, variant, sub)
    return env
for mode in ("1", "2"):
    command = [tessal, "report", "--client", "Northwind", "--mode", mode]
    times = {variant: [] for variant in ("plain", "rules")}
    for variant in times:
        subprocess.run(command, stdout=subprocess.DEVNULL, stdin=subprocess.DEVNULL, env=environment(variant), check=True)
    for _ in range(runs):
        for variant in times:
            start = time.perf_counter()
            subprocess.run(command, stdout=subprocess.DEVNULL, stdin=subprocess.DEVNULL, env=environment(variant),
                           check=True)
            times[variant].append((time.perf_counter() - start) * 1000)
    medians = {variant: statistics.median(values) for variant, values in times.items()}
    for variant, values in times.items():
        print(f"mode {mode} {variant:6} median {medians[variant]:7.1f} ms  min {min(values):7.1f} ms")
    print(f"mode {mode} rules / plain: {medians['rules'] / medians['plain']:.3f} (target at most 1.10)")
PY
