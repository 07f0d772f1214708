#!/usr/bin/env bash
# Builds the native target, makes a fresh demo world in ./demo-world and runs
# the main job in it: the upgrade of the single-partition instance INST1 from
# the 9.5 copy to the current 10.1 copy. Then shows what changed.
set -euo pipefail
cd "$(dirname "$0")/.."
scripts/deps.sh
cmake --preset default >/dev/null
cmake --build --preset default
kxlsim=build/default/sim/kxlsim/kxlsim
world="$PWD/demo-world"
rm -rf "$world" "$world.before"
"$kxlsim" create "$world" --command build/default/engn/sqo/kxliupgrade
"$kxlsim" show "$world"
"$kxlsim" snapshot "$world" "$world.before"

echo
echo "== KXLIUPGRADE INST1"
rc=0
(cd "$world" && KXLSIM_ROOT="$world" "$world/drive_c/Program Files/ZAV/KXL101/bin/kxliupgrade.exe" INST1) || rc=$?
echo "exit code: $rc"

echo
echo "== what changed"
"$kxlsim" diff "$world.before" "$world" || true
"$kxlsim" show "$world"
exit "$rc"
