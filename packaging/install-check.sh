#!/usr/bin/env bash
# Installs a built package on a machine that lacks the build dependencies (a fresh Debian 12), runs what
# needs no display, verifies the server's unit, removes the package and lists any system file of ours
# left behind. The user's own data in $HOME is theirs and stays, as with every package.
#   bash packaging/install-check.sh ./tessal_VERSION_amd64.deb
# To run it on a fresh machine, put the .deb in a scratch clone of the repository and, from that clone:
#   ../shared/tools/fresh-machine-check 'bash packaging/install-check.sh ./tessal_*.deb'
set -euo pipefail
deb=$1
export DEBIAN_FRONTEND=noninteractive
snapshot() {
  find / -xdev \( -path /proc -o -path /sys -o -path /dev -o -path /root -o -path /home -o -path /tmp \
    -o -path /var/cache -o -path /var/lib/apt -o -path /var/lib/dpkg -o -path /var/log -o -path "$PWD" \) \
    -prune -o -print | sort
}
apt-get update -qq
snapshot >/tmp/before
# systemd only for systemd-analyze: the package itself does not need it.
apt-get install -y -qq "$deb" systemd >/tmp/install.log 2>&1 || { tail -30 /tmp/install.log; exit 1; }
if dpkg -s g++ qt6-base-dev >/dev/null 2>&1; then echo "warning: build dependencies are installed here"; fi
tessal --version
tessal --help >/dev/null
env -u DISPLAY -u WAYLAND_DISPLAY tessal template /dev/null
systemd-analyze verify --man=no /usr/lib/systemd/system/tessal-sync-server.service
status=0
QT_QPA_PLATFORM=offscreen XDG_RUNTIME_DIR=/tmp timeout 3 tessal >/dev/null 2>&1 || status=$?
[ "$status" -eq 124 ] || { echo "the desktop application ended with $status within 3 s"; exit 1; }
# Its first run made "Default Task": the commands work it from the shell, and bash completes its name.
env -u DISPLAY -u WAYLAND_DISPLAY XDG_RUNTIME_DIR=/tmp tessal start "default task"
env -u DISPLAY -u WAYLAND_DISPLAY XDG_RUNTIME_DIR=/tmp tessal status
env -u DISPLAY -u WAYLAND_DISPLAY XDG_RUNTIME_DIR=/tmp tessal stop
completed=$(bash -c 'source /usr/share/bash-completion/completions/tessal; COMP_WORDS=(tessal start Def);
  COMP_CWORD=2; _tessal; printf "%s" "${COMPREPLY[*]}"')
[ "$completed" = 'Default\ Task' ] || { echo "bash completed 'tessal start Def' as '$completed'"; exit 1; }
apt-get remove -y -qq tessal >/dev/null
snapshot >/tmp/after
left=$(comm -13 /tmp/before /tmp/after | grep -i tessal || true)
[ -z "$left" ] || { echo "left behind after removal:"; echo "$left"; exit 1; }
echo "install-check: installed, ran, verified and removed cleanly"
