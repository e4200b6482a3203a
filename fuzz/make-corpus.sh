#!/usr/bin/env bash
# Rebuilds the seed corpora under fuzz/corpus/ from the cases the tests use.
# Records come from the record tool's step syntax (the build's `vtsp`);
# the other inputs are little-endian words written with printf.
# Usage: fuzz/make-corpus.sh [path/to/vtsp]   (default build-fuzz/vtsp)
set -euo pipefail
cd "$(dirname "$0")/.."
VTSP=${1:-build-fuzz/vtsp}
C=fuzz/corpus
rm -rf "$C"
mkdir -p "$C"/records "$C"/transactions "$C"/zmf_events "$C"/mvd_events

# One little-endian 32-bit word per argument, as raw bytes.
words() {
  local v
  for v in "$@"; do
    v=$(( v & 0xffffffff ))
    printf "\\x$(printf %02x $(( v & 255 )))\\x$(printf %02x $(( (v >> 8) & 255 )))"
    printf "\\x$(printf %02x $(( (v >> 16) & 255 )))\\x$(printf %02x $(( (v >> 24) & 255 )))"
  done
}

# records: whole 3664-byte records, alone and as streams.
"$VTSP" encode -o "$C"/records/start \
  'start stream=1 dir=sendrecv local=10.0.0.1:6000 remote=192.168.1.2:5000 pt=96 bw=500'
"$VTSP" encode -o "$C"/records/call \
  'start stream=1 dir=sendrecv local=10.0.0.1:6000 remote=192.168.1.2:5000 pt=96 bw=500 ext=3' \
  'config stream=1 rtcp=0x1f' \
  'modify stream=1 dir=inactive local=10.0.0.1:6000 remote=192.168.1.2:5000 pt=96' \
  'modify stream=1 dir=sendrecv local=10.0.0.1:6000 remote=192.168.1.2:5002 pt=96 bw=300' \
  'end stream=1'
"$VTSP" encode -o "$C"/records/ipv6 \
  'start stream=5 dir=recvonly local=[2001:db8::1]:6000 remote=[fe80::1]:5000 pt=97,96 rbw=300 ext=3:urn:3gpp:video-orientation rtcp-ports=6001:5001'
"$VTSP" encode -o "$C"/records/routing \
  'raw target=8' 'raw target=0 type=1 code=81' 'raw target=1' 'raw target=0 code=15' \
  'start stream=2 dir=sendonly local=10.0.0.1:6000 remote=none pt=96'
"$VTSP" encode -o "$C"/records/two-streams \
  'start stream=1 local=10.0.0.1:6000 remote=192.168.1.2:5000' \
  'start stream=2 local=10.0.0.1:6002 remote=192.168.1.2:5002 dir=recvonly' \
  'end stream=1' 'modify stream=2 dir=ended' 'end stream=7'

# transactions: a code, then the request's int32 fields (and a C string).
t() { local name=$1; shift; words "$@" > "$C/transactions/$name"; }
t init 0
t engine-init 4 0 0
t set-camera 9 1
t camera-size 10 2
t orientation 11 90 0 1
t uplink-qos 17 500
t clean-surface 7 1
t release 8
t set-surface 1 0
t silent 18
t unknown 99 1 2 3
{ words 16 1; printf '/sdcard/img.jpg\0'; } > "$C"/transactions/hide-image
words 16 0 > "$C"/transactions/show-image
# A dump whose argument count runs past its bytes: the platform's own reader
# would add a billion empty arguments, so the target skips it.
{ words 0x5f444d50 0x444d5006; printf '_\0'; } > "$C"/transactions/dump-count-past-the-bytes

# zmf_events: an event number, then the JSON text the library sends.
z() { local name=$1 event=$2 json=$3; { words "$event"; printf '%s' "$json"; } > "$C/zmf_events/$name"; }
z capture-started 20 '{"Capture":"Camera 1, Facing front, Orientation 270","Width":640,"Height":480,"FrameRate":30}'
z capture-stopped 21 '{"Capture":"Camera 1, Facing front, Orientation 270"}'
z capture-face 22 '{"Capture":"Camera 0, Facing back, Orientation 90","Face":1,"Width":320,"Height":240}'
z render-added 25 '{"Render":"RemoteView","SourceType":0,"Width":640,"Height":480}'
z render-size 28 '{"Render":"RemoteView","SourceType":0,"Window":140000,"Width":480,"Height":640}'
z render-removed 29 '{"Render":"RemoteView","SourceType":1,"Window":140000}'
z capture-size 30 '{"Capture":"Camera 1, Facing front, Orientation 270","Width":1280,"Height":720,"FrameRate":15}'

# mvd_events: sixteen words (word 0 the event), then the cookie.
m() { local name=$1; shift; words "$@" > "$C/mvd_events/$name"; }
m cap-size       6 0 0 0 0 0 0 0 0 640 480 0 0 0 0 0   7
m codec-changed  7 1 0 0 0 0 0 96 600000 0 0 0 0 0 0 0  7
m render-ornt   17 1 0 90 1 0 0 0 0 0 0 0 0 0 0 0       7
m rtp-first     21 1 0 0 0 0 0 0 0 0 0 0 0 0 0 0        7
m rtp-break     22 1 0 0 0 0 0 0 0 0 0 0 0 0 0 0        7
m rtp-recved    23 1 0 0 0 0 0 0 0 0 0 0 0 0 0 0        7
m rtpext-app    28 1 0 0 0 0 3 0 0 0 0 0 0 0 0 0        7
m unknown       99 0 0 0 0 0 0 0 0 0 0 0 0 0 0 0        0
