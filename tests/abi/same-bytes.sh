#!/usr/bin/env bash
# same-bytes.sh REFERENCE COMMAND
#
# Runs abi-bytes from two builds (REFERENCE a program path, COMMAND a shell
# command, so an emulator can run it) and passes when both write a bind
# request, a command dump and notification parcels, byte for byte the same.
set -uo pipefail
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
"$1" > "$work/reference" || { echo "the reference build's abi-bytes failed"; exit 1; }
bash -c "$2" > "$work/this" || { echo "this build's abi-bytes failed"; exit 1; }
for kind in bind dump parcel; do
  grep -q "^$kind " "$work/reference" || { echo "the reference wrote no $kind line"; exit 1; }
done
if ! diff "$work/reference" "$work/this" > "$work/diff"; then
  echo "the builds write different bytes (< reference, > this build):"
  cat "$work/diff"
  exit 1
fi
echo "same bytes: $(cut -d' ' -f1 "$work/reference" | sort | uniq -c | tr -s ' ' | paste -sd, -)"
