# Sourced by the benchmarks that race Timewarrior: checks what they need and makes, in a folder removed
# on exit, the 100,000-item store and Timewarrior's database of the same 20,000 intervals. Sets $tessal
# and $work, and the XDG and Timewarrior folders of both programs.
#   usage (from the benchmark): source bench/timew-store.sh BUILD_DIR
build=$1
tessal=$build/Sources/app/tessal
maker=$build/bench/tessal_make_report_store
for program in "$tessal" "$maker"; do [ -x "$program" ] || { echo "no $program: build it first" >&2; exit 1; }; done
command -v timew >/dev/null || { echo "timewarrior is not installed" >&2; exit 1; }

work=$(mktemp -d "${TMPDIR:-/tmp}/tessal-timew.XXXXXX")
trap 'rm -rf "$work"' EXIT
mkdir -p "$work/data/Tessal2" "$work/config" "$work/runtime" "$work/timew"
chmod 700 "$work/runtime"
export XDG_DATA_HOME=$work/data XDG_CONFIG_HOME=$work/config XDG_RUNTIME_DIR=$work/runtime TIMEWARRIORDB=$work/timew
unset DISPLAY WAYLAND_DISPLAY DBUS_SESSION_BUS_ADDRESS
"$maker" "$work/data/Tessal2/Tessal.sqlite" "$work/timew"
