#!/usr/bin/env bash
# Stripped size of libxavoprinter.so.6 on x86-64 and i386: the library as
# it would ship, without symbols.  Goal: at most 256 KiB on each.  Reads
# the build trees only (no sandbox needed: nothing is run).
#   bench/stripped_size.sh [x86-64 build dir] [i386 build dir]
# The i386 figure needs the i386 build (cmake/i386-linux-gnu.cmake into
# build/i386); without it the line says it was skipped.
set -uo pipefail
cd "$(dirname "$0")/.."
goal_kib=256
status=0

report() {  # arch, build dir
  local lib="$2/libxavoprinter.so.6"
  if [ ! -e "$lib" ]; then
    echo "stripped libxavoprinter.so.6 on $1, KiB: skipped (no $1 build in $2)"
    return
  fi
  local tmp
  tmp=$(mktemp) || return 2
  # objcopy reads both ELF classes; strip --strip-all is what packaging does.
  if ! strip --strip-all -o "$tmp" "$lib"; then
    rm -f "$tmp"
    echo "stripped libxavoprinter.so.6 on $1: cannot strip $lib" >&2
    status=2
    return
  fi
  local bytes kib
  bytes=$(stat -c %s "$tmp")
  rm -f "$tmp"
  kib=$(awk -v b="$bytes" 'BEGIN { printf "%.2f", b / 1024 }')
  echo "stripped libxavoprinter.so.6 on $1, KiB: ratio $kib (goal $goal_kib.00)"
  if ! awk -v k="$kib" -v g="$goal_kib" 'BEGIN { exit !(k <= g) }'; then
    [ $status -eq 0 ] && status=1
  fi
}

report x86-64 "${1:-build/plain}"
report i386 "${2:-build/i386}"
exit $status
