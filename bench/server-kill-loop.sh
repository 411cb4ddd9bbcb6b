#!/usr/bin/env bash
# The sync server's kill loop on both storages: KILLS (default 200) kills with -9 at random moments while
# DEVICES (default 4) devices save; on PostgreSQL also over REPLICAS (default 3) server processes, one
# killed at a time. A throw-away cluster (scripts/pg-test-cluster.sh) holds the PostgreSQL runs.
#   bench/server-kill-loop.sh [BUILD_DIR]
set -euo pipefail
cd "$(dirname "$0")/.."
build=${1:-build-tests}
kills=${KILLS:-200} devices=${DEVICES:-4} replicas=${REPLICAS:-3}
cmake --build "$build" --target tessal_server_kill_loop tessal-sync-server >/dev/null
loop="$build/bench/tessal_server_kill_loop"
dir=$(mktemp -d)
trap 'rm -rf "$dir"' EXIT
status=0
"$loop" "$dir/sync.db" "$kills" "$devices" 1 || status=1
# The runs on PostgreSQL each get a schema of their own in the throw-away cluster.
# shellcheck disable=SC2016
bash scripts/pg-test-cluster.sh run bash -c '
  set -e
  psql -qX "$TESSAL_TEST_POSTGRES" -c "CREATE SCHEMA one; CREATE SCHEMA several"
  "$0" "$TESSAL_TEST_POSTGRES&options=-csearch_path%3Done" "$1" "$2" 1
  "$0" "$TESSAL_TEST_POSTGRES&options=-csearch_path%3Dseveral" "$1" "$2" "$3"' \
  "$loop" "$kills" "$devices" "$replicas" || status=1
exit "$status"
