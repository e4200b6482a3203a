#!/usr/bin/env bash
# A short chaos run for CI: a few fixed seeds, then one fresh seed (printed,
# so a failure can be played again with --seed), about a minute in all.
#   scripts/chaos-run.sh BUILD_DIR [SECONDS_FOR_THE_FRESH_SEED]
# A violation leaves its scenarios (the steps, and the shrunk ones) in
# BUILD_DIR/chaos/ and makes the run fail.
set -uo pipefail
build=$1
fresh_seconds=${2:-30}
out=$build/chaos
mkdir -p "$out"
status=0
for seed in 1 2 3; do
  "$build/vce-sim" --chaos --seed "$seed" --steps 60 --out "$out" || status=1
done
"$build/vce-sim" --chaos --seed 4 --steps 60 --actors 3 --out "$out" || status=1
seed=$(od -An -N4 -tu4 /dev/urandom | tr -d ' ')
echo "chaos-run: fresh seed $seed (replay: $build/vce-sim --chaos --seed $seed --seconds $fresh_seconds)"
"$build/vce-sim" --chaos --seed "$seed" --seconds "$fresh_seconds" --out "$out" || status=1
exit $status
