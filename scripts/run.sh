#!/usr/bin/env bash
# Installs what Tessal needs, builds it in Release and starts it.
# Without a display (a server, a container) it starts under a virtual X server.
set -euo pipefail
cd "$(dirname "$0")/.."
bash scripts/install-deps.sh
cmake -S . -B build-release -G Ninja -DCMAKE_BUILD_TYPE=Release -DTESSAL_BUILD_TESTS=OFF
cmake --build build-release --target tessal tessal-desktop
app=build-release/Sources/app/tessal
launch=("$app")
if [ -z "${DISPLAY:-}" ] && [ -z "${WAYLAND_DISPLAY:-}" ]; then
  launch=(xvfb-run -a -s "-screen 0 1280x800x24" "$app")
fi
# TESSAL_RUN_SECONDS lets a headless check start the app and end it after that many seconds.
if [ -n "${TESSAL_RUN_SECONDS:-}" ]; then
  status=0
  timeout "$TESSAL_RUN_SECONDS" "${launch[@]}" || status=$?
  [ "$status" -eq 124 ] && { echo "tessal ran for ${TESSAL_RUN_SECONDS}s"; exit 0; }
  exit "$status"
fi
exec "${launch[@]}"
