#!/usr/bin/env bash
# Builds the libFuzzer targets of fuzz/ with clang (build/fuzz) and runs
# each one on its seed corpus (fuzz/corpus/<target>).
#
#   scripts/fuzz.sh --short     every target for a few seconds (the test command)
#   scripts/fuzz.sh [--runs N]  every target for N executions, 10 million by
#                               default (the long run: hours; the file round
#                               trips cost about a millisecond an execution
#                               once their corpus holds long files)
#   scripts/fuzz.sh --record    records the seed corpora again from the real
#                               tools (fuzz/record_corpus.cc)
#   FUZZ_TARGETS="a b" limits a run to some targets.
#   FUZZ_WORKERS=N runs each target of a long run in N processes at once
#     (libFuzzer's fork mode: one corpus, executions counted together).
#
# Inputs that add coverage go to build/fuzz/corpus/<target>, never into the
# seeds; an input that fails a target is saved under
# build/fuzz/findings/<target>/ and the script fails.  Each target runs in
# private mount and network namespaces with a /dev/shm of its own (the file
# round trips write there), so a run leaves nothing on the host.
set -euo pipefail
cd "$(dirname "$0")/.."

. scripts/checks.sh
require_sandbox_host scripts/fuzz.sh

mode=long
runs=10000000
short_seconds=6
case "${1:-}" in
  --short) mode=short ;;
  --record) mode=record ;;
  --runs) runs=${2:?--runs needs a number} ;;
  "") ;;
  *) sed -n '2,20p' "$0" >&2; exit 2 ;;
esac

if [ "$mode" = record ]; then
  cmake -S . -B build/plain -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo >/dev/null
  cmake --build build/plain --target xavo_fuzz_record
  exec build/plain/fuzz/xavo_fuzz_record "$PWD/fuzz/corpus"
fi

dir=build/fuzz
echo "== fuzz: configure and build (clang)"
CC=clang CXX=clang++ cmake -S . -B "$dir" -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo \
  -DXAVO_BUILD_FUZZ=ON -DXAVO_BUILD_TESTS=OFF -DXAVO_BUILD_DEMO=OFF >/dev/null
targets=${FUZZ_TARGETS:-$(cat "$dir/fuzz-targets.txt")}
# shellcheck disable=SC2046
cmake --build "$dir" -j "$(nproc)" --target $(printf 'fuzz_%s ' $targets)

if [ "$mode" = short ]; then
  limit=(-max_total_time="$short_seconds")
else
  limit=(-runs="$runs")
  workers=${FUZZ_WORKERS:-1}
  [ "$workers" -gt 1 ] && limit+=(-fork="$workers")
fi
status=0
for t in $targets; do
  mkdir -p "$dir/corpus/$t" "$dir/findings/$t" "$dir/logs" "fuzz/corpus/$t"
  log=$dir/logs/$t.log
  # -timeout: no input of these parsers takes a second; one that hangs is a
  # finding.  -max_len: the tools' lines are read 1023 bytes at a time, so
  # 4 KiB covers several whole lines and the long-line cuts.  The file round
  # trips read a file several times an input (1.5 KiB holds several
  # sections, as many as the appliance's files hold) and the mDNS reader
  # copies every field of a line: for them 1.5 KiB, a long line and more.
  max_len=4096
  case $t in section_file|keyvalue_file|avahi_lines) max_len=1536 ;; esac
  if ASAN_OPTIONS=detect_leaks=1 UBSAN_OPTIONS=print_stacktrace=1 \
     unshare --mount --net -- sh -c 'mount -t tmpfs -o size=64m fuzzshm /dev/shm && exec "$@"' sh \
       "$dir/fuzz/fuzz_$t" "${limit[@]}" -max_len="$max_len" -timeout=10 -rss_limit_mb=2048 \
       -print_final_stats=1 -artifact_prefix="$dir/findings/$t/" \
       "$dir/corpus/$t" "fuzz/corpus/$t" >"$log" 2>&1; then
    found=0
  else
    found=1
    status=1
  fi
  executed=$(sed -n 's/^stat::number_of_executed_units: *//p' "$log" | tail -1)
  # In fork mode only the parent's progress lines ("#N: cov: ...") count
  # the executions of all its workers.
  [ -n "$executed" ] || executed=$(sed -n 's/^#\([0-9]*\): cov:.*/\1/p' "$log" | tail -1)
  echo "fuzz $t: ${executed:-?} executions, $found findings"
  [ "$found" -eq 0 ] || { echo "fuzz $t failed (log: $log):"; grep -E 'ERROR|property failed|SUMMARY' "$log" | head -5; }
done
exit $status
