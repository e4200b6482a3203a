#!/usr/bin/env bash
# Runs every fuzz target for SECONDS each, one after the other, starting from
# the seeds in fuzz/corpus/<target>/. New inputs go to BUILD/corpus/<target>/
# (the seeds in the tree stay as they are); a crash leaves its input in
# BUILD/artifacts/. Prints the executions each target reached and exits
# non-zero if any target found something.
# Usage: scripts/run-fuzz.sh BUILD SECONDS
set -uo pipefail
cd "$(dirname "$0")/.."
BUILD=${1:?build directory}
SECONDS_EACH=${2:?seconds per target}
TARGETS=(records transactions zmf_events mvd_events)

status=0
mkdir -p "$BUILD/artifacts"
for target in "${TARGETS[@]}"; do
  exe="$BUILD/fuzz_$target"
  work="$BUILD/corpus/$target"
  log="$BUILD/fuzz_$target.log"
  mkdir -p "$work"
  extra=()
  # Room for a stream of five whole records.
  [ "$target" = records ] && extra+=(-max_len=18320)
  "$exe" -max_total_time="$SECONDS_EACH" -print_final_stats=1 \
    -artifact_prefix="$BUILD/artifacts/${target}-" "${extra[@]}" \
    "$work" "fuzz/corpus/$target" >"$log" 2>&1
  rc=$?
  execs=$(sed -n 's/^stat::number_of_executed_units: *//p' "$log" | tail -1)
  if [ $rc -eq 0 ]; then
    echo "fuzz_$target: ${execs:-?} executions in ${SECONDS_EACH} s"
  else
    status=1
    echo "fuzz_$target: FAILED (exit $rc) after ${execs:-?} executions; log $log:"
    grep -E "ERROR|SUMMARY|runtime error|Test unit written" "$log" | head -20
  fi
done
exit $status
