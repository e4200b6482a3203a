#!/usr/bin/env bash
# Mutation run: applies each small fault listed in scripts/mutants.list to
# the system code, one at a time, rebuilds what changed, runs the suites that
# cover that file and reports the mutant as killed (some test failed or hung)
# or survived. The source is restored after every mutant, whatever happens.
#
#   scripts/mutants.sh [BUILD_DIR] [FILTER]
#     BUILD_DIR  defaults to build-mutants (configured here on first use)
#     FILTER     only mutants whose id or file matches this extended regex
#   scripts/mutants.sh --check   every listed search text occurs exactly once
#
# List format, one mutant a line, fields separated by " ~~ ":
#   id ~~ file ~~ text to find (once) ~~ replacement ~~ ctest -R regex ~~ what it breaks
# "\n" in the texts stands for a newline; lines starting with # are comments.
set -uo pipefail
cd "$(dirname "$0")/.."

LIST=scripts/mutants.list
TEST_TIMEOUT=${MUTANT_TEST_TIMEOUT:-60}

fields() {  # splits one list line into the array F
  local line=$1
  F=()
  while [[ "$line" == *" ~~ "* ]]; do
    F+=("${line%% ~~ *}")
    line=${line#* ~~ }
  done
  F+=("$line")
}

# The suites of each subsystem, by the names their cases have in CTest.
suites_of() {
  local r=$1
  r=${r//@vtsp/^(CmdBuffer|CmdLockQueue|CameraCodecParameter|StreamInfoMvdTest|CmdCallbackMvdTest|VtspManagerTest|VtspFaultTest)\\.}
  r=${r//@engine/^(CallTest|CallbackTest|CameraTest|ClientFaultTest|ListenerTest|LoopbackTest|RenderTest|ServiceTest|StressTest|DumpTest)\\.}
  r=${r//@jvm/^(CallEndToEndTest|LoadHookTest|MmeSystemTest|MmeTimerTest|MmeVideoEventTest|ScreenOrientationTest)\\.}
  r=${r//@tools/^(vce-sim|vtsp|StepSyntax|RecordDecoder|SimulatorPlay|ModemActorPipe)}
  printf '%s' "$r"
}

# The build targets those suites need: a mutant rebuilds only these.
targets_of() {
  local t=""
  [[ $1 == *@vtsp* ]] && t+=" vtsp_tests"
  [[ $1 == *@engine* ]] && t+=" engine_tests"
  [[ $1 == *@jvm* ]] && t+=" jvm_tests quellborn"
  [[ $1 == *@tools* ]] && t+=" tools_tests vce-sim vtsp"
  printf '%s' "${t:-all}"
}

occurrences() {  # file text -> how often text occurs
  python3 - "$1" "$2" <<'EOF'
import sys
text = sys.argv[2].replace("\\n", "\n")
print(open(sys.argv[1]).read().count(text))
EOF
}

apply() {  # file find replace
  python3 - "$1" "$2" "$3" <<'EOF'
import sys
path, find, repl = sys.argv[1], sys.argv[2].replace("\\n", "\n"), sys.argv[3].replace("\\n", "\n")
src = open(path).read()
open(path, "w").write(src.replace(find, repl, 1))
EOF
}

if [ "${1:-}" = "--check" ]; then
  bad=0; n=0
  while IFS= read -r line; do
    [[ -z "$line" || "$line" == \#* ]] && continue
    fields "$line"; n=$((n + 1))
    if [ ${#F[@]} -ne 6 ]; then echo "malformed: $line"; bad=$((bad + 1)); continue; fi
    c=$(occurrences "${F[1]}" "${F[2]}")
    [ "$c" = 1 ] || { echo "${F[0]}: '${F[2]}' occurs $c times in ${F[1]}"; bad=$((bad + 1)); }
  done < "$LIST"
  echo "mutants: $n listed, $bad not applicable"
  exit $((bad > 0))
fi

BUILD=${1:-build-mutants}
FILTER=${2:-.}
export CMAKE_CXX_COMPILER_LAUNCHER=${CMAKE_CXX_COMPILER_LAUNCHER:-$(command -v ccache || true)}
if [ ! -f "$BUILD/CMakeCache.txt" ]; then
  cmake -S . -B "$BUILD" -DCMAKE_BUILD_TYPE=RelWithDebInfo > /dev/null || exit 1
fi
echo "mutants: building the unmutated tree in $BUILD"
cmake --build "$BUILD" -j"$(nproc)" > "$BUILD/mutants-build.log" 2>&1 || { echo "the unmutated tree does not build"; exit 1; }

backup=$(mktemp)
current=""
restore() { [ -n "$current" ] && cp "$backup" "$current" && touch "$current"; current=""; }
trap 'restore; rm -f "$backup"' EXIT INT TERM

killed=0; survived=0; skipped=0; start=$(date +%s)
survivors=()
while IFS= read -r line <&3; do
  [[ -z "$line" || "$line" == \#* ]] && continue
  fields "$line"
  [ ${#F[@]} -eq 6 ] || { echo "malformed: $line"; continue; }
  id=${F[0]} file=${F[1]} find=${F[2]} repl=${F[3]} suites=$(suites_of "${F[4]}") what=${F[5]}
  targets=$(targets_of "${F[4]}")
  [[ "$id $file" =~ $FILTER ]] || continue
  if [ "$(occurrences "$file" "$find")" != 1 ]; then
    printf '%-6s %-9s %s\n' "$id" "SKIPPED" "text not found once in $file"; skipped=$((skipped + 1)); continue
  fi
  cp "$file" "$backup"; current=$file
  apply "$file" "$find" "$repl"
  t0=$(date +%s)
  # shellcheck disable=SC2086  # one word per target
  if ! cmake --build "$BUILD" -j"$(nproc)" --target $targets > "$BUILD/mutant-$id.log" 2>&1; then
    verdict="SKIPPED"; note="does not compile (see $BUILD/mutant-$id.log)"; skipped=$((skipped + 1))
  elif (cd "$BUILD" && ctest -R "$suites" --timeout "$TEST_TIMEOUT" -j"$(nproc)" >> "mutant-$id.log" 2>&1); then
    verdict="SURVIVED"; note=$what; survived=$((survived + 1)); survivors+=("$id")
  else
    verdict="killed"; note=$what; killed=$((killed + 1))
  fi
  restore
  printf '%-6s %-9s %4ss  %s: %s\n' "$id" "$verdict" "$(( $(date +%s) - t0 ))" "$file" "$note"
done 3< "$LIST"

# Leave the build matching the unmutated source.
cmake --build "$BUILD" -j"$(nproc)" > /dev/null 2>&1
total=$((killed + survived))
echo "mutants: $killed killed, $survived survived, $skipped skipped of $((total + skipped)) in $(( $(date +%s) - start )) s"
[ $total -gt 0 ] && echo "score: $(( 100 * killed / total ))% killed"
[ ${#survivors[@]} -gt 0 ] && echo "survivors: ${survivors[*]}"
exit 0
