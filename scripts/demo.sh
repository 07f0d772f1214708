#!/usr/bin/env bash
# Builds the native target, makes a fresh demo world in ./demo-world and runs
# the main job in it.
set -euo pipefail
cd "$(dirname "$0")/.."
scripts/deps.sh
cmake --preset default >/dev/null
cmake --build --preset default
world="$PWD/demo-world"
rm -rf "$world"
build/default/sim/kxlsim/kxlsim create "$world"
build/default/sim/kxlsim/kxlsim show "$world"
