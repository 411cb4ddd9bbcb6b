#!/usr/bin/env bash
# Installs the Debian 12 packages Tessal needs to build, test and run.
# Works as root or through sudo; safe to run again.
set -euo pipefail
SUDO=""
if [ "$(id -u)" -ne 0 ]; then SUDO="sudo"; fi
export DEBIAN_FRONTEND=noninteractive
packages=(
  g++ cmake ninja-build pkg-config
  clang-14 libclang-rt-14-dev
  qt6-base-dev qt6-svg-dev libgl-dev libxcb-screensaver0-dev libwayland-dev wayland-protocols libicu-dev libsqlite3-dev nlohmann-json3-dev
  libgtest-dev libgmock-dev libbenchmark-dev
  libcpp-httplib-dev libsodium-dev libpq-dev postgresql wrk qtkeychain-qt6-dev libsecret-1-0
  sqlite3 python3 python3-jinja2
  xvfb xauth xdotool trayer gnome-keyring imagemagick dbus-x11 fonts-dejavu-core
  dpkg-dev file appstream desktop-file-utils systemd poppler-utils
)
missing=()
for p in "${packages[@]}"; do
  dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed" || missing+=("$p")
done
if [ ${#missing[@]} -gt 0 ]; then
  $SUDO apt-get update -qq
  $SUDO apt-get install -y -qq --no-install-recommends "${missing[@]}"
fi
