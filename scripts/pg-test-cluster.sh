#!/usr/bin/env bash
# A throw-away PostgreSQL cluster for the sync server's tests: its own data directory, socket directory
# and port in a temp folder, trust authentication, gone after use. Never touches a system cluster.
#
#   scripts/pg-test-cluster.sh run COMMAND [ARGS...]
#       starts a cluster, runs COMMAND with TESSAL_TEST_POSTGRES set to its connection string, stops and
#       removes the cluster (also when COMMAND fails) and exits with COMMAND's status.
#   eval "$(scripts/pg-test-cluster.sh start)"
#       starts a cluster and prints the exports TESSAL_TEST_POSTGRES and TESSAL_PG_CLUSTER_DIR.
#   scripts/pg-test-cluster.sh stop [DIR]
#       stops and removes the cluster in DIR (default $TESSAL_PG_CLUSTER_DIR).
#
# PostgreSQL refuses to run as root; as root the cluster runs as the user "postgres" (from Debian's
# package) or "nobody". PG_BIN overrides the folder of initdb and pg_ctl.
set -euo pipefail

PG_BIN=${PG_BIN:-/usr/lib/postgresql/15/bin}
ROLE=tessal

as_owner() {
  if [ "$(id -u)" -eq 0 ]; then
    runuser -u "$RUN_AS" -- "$@"
  else
    "$@"
  fi
}

pick_user() {
  RUN_AS=$(id -un)
  if [ "$(id -u)" -eq 0 ]; then
    if id postgres >/dev/null 2>&1; then RUN_AS=postgres; else RUN_AS=nobody; fi
  fi
}

free_port() {
  python3 -c 'import socket; s=socket.socket(); s.bind(("127.0.0.1", 0)); print(s.getsockname()[1]); s.close()'
}

start_cluster() {
  [ -x "$PG_BIN/initdb" ] || { echo "initdb not found in $PG_BIN (install the postgresql package)" >&2; exit 1; }
  pick_user
  local dir port
  dir=$(mktemp -d "${TMPDIR:-/tmp}/tessal-pg.XXXXXX")
  chmod 700 "$dir"
  [ "$(id -u)" -eq 0 ] && chown "$RUN_AS" "$dir"
  as_owner "$PG_BIN/initdb" -D "$dir/data" -U "$ROLE" --auth=trust -E UTF8 --locale=C.UTF-8 >"$dir/initdb.log" 2>&1 ||
    { cat "$dir/initdb.log" >&2; rm -rf "$dir"; exit 1; }
  # A port taken between the probe and the start makes pg_ctl fail: try a few.
  local tries=0
  while :; do
    port=$(free_port)
    if as_owner "$PG_BIN/pg_ctl" -D "$dir/data" -l "$dir/server.log" -w -t 30 \
      -o "-c listen_addresses=127.0.0.1 -p $port -k $dir -c fsync=off -c synchronous_commit=off -c full_page_writes=off" \
      start >/dev/null; then
      break
    fi
    tries=$((tries + 1))
    if [ "$tries" -ge 5 ]; then cat "$dir/server.log" >&2; rm -rf "$dir"; exit 1; fi
  done
  echo "$port" >"$dir/port"
  CLUSTER_DIR=$dir
  CONNINFO="postgresql://$ROLE@/postgres?host=$dir&port=$port"
}

stop_cluster() {
  local dir=$1
  [ -n "$dir" ] && [ -d "$dir/data" ] || return 0
  pick_user
  as_owner "$PG_BIN/pg_ctl" -D "$dir/data" -m immediate -w stop >/dev/null 2>&1 || true
  rm -rf "$dir"
}

case "${1:-}" in
  run)
    shift
    [ $# -gt 0 ] || { echo "usage: $0 run COMMAND [ARGS...]" >&2; exit 2; }
    start_cluster
    trap 'stop_cluster "$CLUSTER_DIR"' EXIT
    status=0
    TESSAL_TEST_POSTGRES=$CONNINFO "$@" || status=$?
    exit "$status"
    ;;
  start)
    start_cluster
    printf 'export TESSAL_TEST_POSTGRES=%q\nexport TESSAL_PG_CLUSTER_DIR=%q\n' "$CONNINFO" "$CLUSTER_DIR"
    ;;
  stop)
    stop_cluster "${2:-${TESSAL_PG_CLUSTER_DIR:-}}"
    ;;
  *)
    echo "usage: $0 run COMMAND... | start | stop [DIR]" >&2
    exit 2
    ;;
esac
