#!/usr/bin/env bash
# The device build (Android.bp) and the host build (CMakeLists.txt) must build
# the same system sources with the same defines, and every system source file
# must be in them.
set -euo pipefail
cd "$(dirname "$0")/.."

cmake_list=$(sed -n '/^set(QUELLBORN_SYSTEM_SOURCES/,/^)/p' CMakeLists.txt | grep -E '^\s+[^ )]+\.cpp' | tr -d ' ' | sort)
bp_list=$(sed -n '/name: "libquellborn"/,/^}/p' Android.bp | grep -oE '"[^"]+\.cpp"' | tr -d '"' | grep -v '^platform/' | sort)
tree_list=$(find vtsp volte_engine mme_jni -name '*.cpp' | sort)

status=0
if [ "$cmake_list" != "$bp_list" ]; then
  echo "check-sources: CMakeLists.txt and Android.bp build different system sources:"
  diff <(echo "$cmake_list") <(echo "$bp_list") || true
  status=1
fi
if [ "$cmake_list" != "$tree_list" ]; then
  echo "check-sources: system sources in the tree that the builds leave out (or the reverse):"
  diff <(echo "$cmake_list") <(echo "$tree_list") || true
  status=1
fi
cmake_defines=$(sed -n '/^set(QUELLBORN_SYSTEM_DEFINES/,/)/p' CMakeLists.txt | { grep -oE -- '-D[A-Za-z0-9_=]+' || true; } | sort)
bp_defines=$(sed -n '/name: "libquellborn"/,/^}/p' Android.bp | { grep -oE -- '"-D[^"]+"' || true; } | tr -d '"' | sort)
if [ "$cmake_defines" != "$bp_defines" ]; then
  echo "check-sources: CMakeLists.txt and Android.bp compile the system with different defines:"
  diff <(echo "$cmake_defines") <(echo "$bp_defines") || true
  status=1
fi
[ $status -eq 0 ] && echo "check-sources: $(echo "$cmake_list" | wc -l) system sources, same list in both builds, defines: $(echo $cmake_defines)"
exit $status
