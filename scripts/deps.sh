#!/usr/bin/env bash
# Installs the Debian packages the build needs, when they are missing.
# Usage: scripts/deps.sh [--windows]   (--windows adds the cross compiler and Wine,
# the host's unixODBC library, without which Wine's odbc32 fails every call, and
# wixl, which builds the Windows Installer packages of the parity suite)
set -euo pipefail
pkgs=(cmake ninja-build g++ libgtest-dev libgmock-dev googletest nlohmann-json3-dev gettext libbenchmark-dev)
if [ "${1:-}" = "--windows" ]; then
  pkgs+=(g++-mingw-w64-x86-64 wine64 libodbc2 wixl)
fi
missing=()
for p in "${pkgs[@]}"; do
  dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed" || missing+=("$p")
done
[ ${#missing[@]} -eq 0 ] && exit 0
sudo=""
[ "$(id -u)" -eq 0 ] || sudo="sudo"
echo "Installing: ${missing[*]}"
$sudo apt-get update -qq
DEBIAN_FRONTEND=noninteractive $sudo apt-get install -y -qq --no-install-recommends "${missing[@]}" >/dev/null
