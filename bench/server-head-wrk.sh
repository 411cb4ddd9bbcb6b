#!/usr/bin/env bash
# Throughput and latency of "head" polls that bring nothing new, on the SQLite storage, loopback only:
# starts tessal-sync-server on a temporary database, adds a user, runs wrk (50 connections, 10 s by
# default) with bench/server-head-wrk.lua and prints the figures. Target: 2,000 req/s or more, p99
# under 20 ms.
#
#   bench/server-head-wrk.sh [SERVER_BINARY]
# SERVER_BINARY defaults to build-server/server/tessal-sync-server; build it with optimisation
# (-DCMAKE_BUILD_TYPE=RelWithDebInfo) for meaningful figures. WRK_CONNECTIONS, WRK_DURATION and
# WRK_THREADS override the wrk settings; WRK_RECONNECT=1 opens a new connection for every poll (the
# listen backlog's test). Listen queue overflows during the run are printed when nstat is installed.
set -euo pipefail
cd "$(dirname "$0")/.."
server=${1:-build-server/server/tessal-sync-server}
[ -x "$server" ] || { echo "no server binary at $server (build the target tessal-sync-server)" >&2; exit 1; }
command -v wrk >/dev/null || { echo "wrk is not installed (apt-get install wrk)" >&2; exit 1; }

work=$(mktemp -d "${TMPDIR:-/tmp}/tessal-wrk.XXXXXX")
server_pid=""
cleanup() {
  if [ -n "$server_pid" ]; then kill "$server_pid" 2>/dev/null || true; wait "$server_pid" 2>/dev/null || true; fi
  rm -rf "$work"
}
trap cleanup EXIT

export TESSAL_USER=bench@example.com TESSAL_PASSWORD=bench-password TESSAL_ITERATION=0
printf '%s\n' "$TESSAL_PASSWORD" | "$server" add-user "$TESSAL_USER" --db "$work/sync.db" >/dev/null

"$server" serve --listen 127.0.0.1:0 --db "$work/sync.db" >"$work/out" 2>"$work/err" &
server_pid=$!
for _ in $(seq 100); do grep -q listening "$work/out" 2>/dev/null && break; sleep 0.05; done
url=$(sed -n 's/.*listening on \(http:[^ ]*\).*/\1/p' "$work/out")
[ -n "$url" ] || { echo "the server did not start:" >&2; cat "$work/err" >&2; exit 1; }
endpoint="$url/sync/tessal/sync.php"

# One request first: the password verification (Argon2id) happens here, not inside the measurement.
body=$(printf '{"user":"%s","password":"%s","action":"head","iteration":0,"device":"wrk-bench"}' \
  "$TESSAL_USER" "$TESSAL_PASSWORD")
reply=$(curl -s --max-time 10 -X POST -H 'Content-Type: application/json' -d "$body" "$endpoint" 2>/dev/null ||
  printf '%s' "(curl missing or failed)")
echo "first reply: $reply"

echo "wrk: ${WRK_CONNECTIONS:-50} connections, ${WRK_DURATION:-10s}, $endpoint"
overflows() { nstat -az TcpExtListenOverflows 2>/dev/null | awk '/ListenOverflows/ {print $2}'; }
before=$(overflows || true)
wrk -t "${WRK_THREADS:-2}" -c "${WRK_CONNECTIONS:-50}" -d "${WRK_DURATION:-10s}" --latency \
  -s bench/server-head-wrk.lua "$endpoint"
after=$(overflows || true)
if [ -n "$before" ] && [ -n "$after" ]; then echo "listen queue overflows: $((after - before))"; fi
