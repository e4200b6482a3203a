#!/usr/bin/env bash
# check-run.sh STATUS COMMAND ABSENT PRESENT...
#
# Runs COMMAND through bash (so pipes work) and passes when it exits with
# STATUS, its output (stdout and stderr) matches every extended regex
# PRESENT, and matches no ABSENT ("-" for no such check). The output is
# shown on failure.
set -uo pipefail
status=$1 command=$2 absent=$3
shift 3
output=$(bash -c "$command" 2>&1)
actual=$?
fail() { printf '%s\n--- output of: %s\n%s\n' "$1" "$command" "$output"; exit 1; }
[ "$actual" -eq "$status" ] || fail "exit status $actual, expected $status"
for present in "$@"; do
  grep -Eq -- "$present" <<<"$output" || fail "output does not match: $present"
done
if [ "$absent" != "-" ] && grep -Eq -- "$absent" <<<"$output"; then fail "output matches: $absent"; fi
exit 0
