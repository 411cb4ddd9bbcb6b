#!/usr/bin/env bash
# Builds the Debian package from a Release build folder and checks what a distribution would:
# exactly the expected files, icons of the size their folder names, valid desktop entry, metainfo and
# systemd unit, and library dependencies found by dpkg-shlibdeps; and that the installed `tessal` finds
# the desktop executable and stays lean.
#   scripts/package-check.sh [BUILD_DIR]     (default build-release, already built)
set -euo pipefail
cd "$(dirname "$0")/.."
build=${1:-build-release}
(cd "$build" && cpack -G DEB >/dev/null)
deb=$(ls "$build"/tessal_*_amd64.deb)
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
fail() { echo "package-check: $*" >&2; exit 1; }

dpkg-deb -c "$deb" | awk '$1 !~ /^d/ {sub(/^\./, "", $6); print $6}' | sort >"$work/files"
sort packaging/expected-files.txt >"$work/expected"
if ! diff -u "$work/expected" "$work/files"; then fail "the package's files differ from packaging/expected-files.txt"; fi

dpkg-deb -x "$deb" "$work/root"
for png in "$work"/root/usr/share/icons/hicolor/*x*/apps/tessal.png; do
  size=$(basename "$(dirname "$(dirname "$png")")")
  # Width and height are the big-endian words at bytes 16 and 20 of a PNG.
  actual=$(od -An -tu1 -j16 -N8 "$png" | awk '{printf "%dx%d", $3*256+$4, $7*256+$8}')
  [ "$actual" = "$size" ] || fail "$png is $actual, not $size"
done
desktop-file-validate "$work/root/usr/share/applications/tessal.desktop"
appstreamcli validate --no-net "$work/root/usr/share/metainfo/io.github.tessal.Tessal.metainfo.xml" >/dev/null
# The unit as installed, with its program where this build has it (nothing is installed here).
sed "s|/usr/bin/tessal-sync-server|$work/root/usr/bin/tessal-sync-server|" \
  "$work/root/usr/lib/systemd/system/tessal-sync-server.service" >"$work/tessal-sync-server.service"
systemd-analyze verify --man=no "$work/tessal-sync-server.service"
depends=$(dpkg-deb -f "$deb" Depends)
# SQLite is linked in unless the build chose its shared library (TESSAL_STATIC_SQLITE=OFF).
sqlite=
case "$(readelf -d "$work/root/usr/bin/tessal")" in *libsqlite3*) sqlite=libsqlite3-0 ;; esac
for lib in libqt6widgets6 libicu72 $sqlite libsodium23 libpq5 qt6-qpa-plugins; do
  case "$depends" in *"$lib"*) ;; *) fail "Depends lacks $lib: $depends" ;; esac
done
"$work/root/usr/bin/tessal" --version >/dev/null
# `tessal` finds the desktop executable from where it is installed, and stays lean itself.
env -u DISPLAY -u WAYLAND_DISPLAY "$work/root/usr/bin/tessal" template /dev/null
if readelf -d "$work/root/usr/bin/tessal" | grep -E 'NEEDED.*(Qt6Gui|Qt6Widgets|Qt6DBus|Qt6Network)'; then
  fail "usr/bin/tessal links a GUI, D-Bus or network library"
fi
echo "package-check: $(basename "$deb") holds $(wc -l <"$work/files") files as expected"
