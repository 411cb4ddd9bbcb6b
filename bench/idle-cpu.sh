#!/usr/bin/env bash
# CPU the desktop copy uses while it only keeps a timer running: Tessal on its own X server (Xvfb) with a
# tray (trayer) and one timer started, left alone for SECONDS (60 by default) after a settling pause, its
# user and system time read from /proc/PID/stat before and after. Target: under 0.1 % of one core.
#
#   bench/idle-cpu.sh [TESSAL_BINARY] [SECONDS]
# TESSAL_BINARY defaults to build-tests/Sources/app/tessal. Needs Xvfb and trayer (scripts/install-deps.sh).
set -euo pipefail
cd "$(dirname "$0")/.."
tessal=$(realpath "${1:-build-tests/Sources/app/tessal}")
seconds=${2:-60}
[ -x "$tessal" ] || { echo "no tessal binary at $tessal" >&2; exit 1; }
for tool in Xvfb trayer; do command -v "$tool" >/dev/null || { echo "$tool is not installed" >&2; exit 1; }; done

work=$(mktemp -d "${TMPDIR:-/tmp}/tessal-idle.XXXXXX")
pids=()
cleanup() {
  for pid in "${pids[@]}"; do kill "$pid" 2>/dev/null || true; done
  wait 2>/dev/null || true
  rm -rf "$work"
}
trap cleanup EXIT
mkdir -p "$work/data" "$work/config" "$work/runtime"
chmod 700 "$work/runtime"
export XDG_DATA_HOME=$work/data XDG_CONFIG_HOME=$work/config XDG_RUNTIME_DIR=$work/runtime
unset WAYLAND_DISPLAY QT_QPA_PLATFORM DBUS_SESSION_BUS_ADDRESS

display=:$(( 600 + RANDOM % 300 ))
Xvfb "$display" -screen 0 1280x800x24 -nolisten tcp 2>/dev/null &
pids+=($!)
export DISPLAY=$display
for _ in $(seq 50); do [ -S "/tmp/.X11-unix/X${display#:}" ] && break; sleep 0.1; done
trayer --edge top --align right --widthtype request --height 28 2>/dev/null &
pids+=($!)
sleep 0.5

# The first run makes "Default Project" with "Default Task"; its timer is the one left running.
"$tessal" 2>/dev/null &
app=$!
pids+=($app)
for _ in $(seq 100); do [ -S "$XDG_RUNTIME_DIR/tessal.socket" ] && break; sleep 0.1; done
sleep 2
"$tessal" start "Default Task" >/dev/null
sleep 5

ticks=$(getconf CLK_TCK)
cpu() { awk '{ print $14 + $15 }' "/proc/$app/stat"; }
before=$(cpu)
start=$(date +%s.%N)
sleep "$seconds"
after=$(cpu)
end=$(date +%s.%N)
"$tessal" status | tail -n 1
python3 - "$before" "$after" "$ticks" "$start" "$end" <<'PY'
import sys
before, after, ticks, start, end = (float(v) for v in sys.argv[1:])
used = (after - before) / ticks
wall = end - start
print(f"tessal used {used * 1000:.0f} ms of CPU in {wall:.1f} s: {100 * used / wall:.3f} % of one core")
PY
