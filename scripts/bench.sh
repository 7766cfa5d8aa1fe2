#!/usr/bin/env bash
# Runs every benchmark of bench/ and prints one line "NAME: ratio R (goal G)"
# per figure (see the README's "Benchmarks").  Exit 0 when every goal
# holds, 1 when one does not, 2 when a benchmark could not run.
#
#   scripts/bench.sh [--smoke] [build dir]      (default build/plain)
#
# The benchmarks are built by the CMake build (XAVO_BUILD_BENCHMARKS, on
# with the tests); this script builds their target in the given tree if
# needed.  Each one enters the sandbox itself, so it runs as root like the
# tests.  --smoke runs each for a couple of rounds only, so that the test
# command keeps them working: goals are not judged then, only a benchmark
# that fails to run fails the smoke run.
set -uo pipefail
cd "$(dirname "$0")/.."

. scripts/checks.sh
require_sandbox_host scripts/bench.sh

smoke=()
dir=build/plain
for arg in "$@"; do
  case "$arg" in
    --smoke) smoke=(--smoke) ;;
    *) dir=$arg ;;
  esac
done

if ! cmake --build "$dir" --target benchmarks >/dev/null; then
  echo "bench.sh: cannot build the benchmarks in $dir (configure it first, e.g. scripts/test.sh)" >&2
  exit 2
fi

missed=0
broken=0
run() {  # name, command...
  local name=$1
  shift
  echo "== $name"
  "$@"
  local rc=$?
  case $rc in
    0) ;;
    1) missed=1 ;;
    *) broken=1; echo "bench.sh: $name could not run (exit $rc)" >&2 ;;
  esac
}

for bench in cups_checks_bench exec_bench conf_setup_bench tables_bench mixed_calls_bench; do
  run "$bench" "$dir/bench/$bench" "${smoke[@]}"
done
run stripped_size bench/stripped_size.sh "$dir" build/i386

if [ $broken -ne 0 ]; then exit 2; fi
if [ ${#smoke[@]} -gt 0 ]; then
  echo "bench.sh: smoke run done (figures of a couple of rounds; goals not judged)"
  exit 0
fi
exit $missed
