#!/bin/sh
# The ABI baseline of libxavoprinter.so.6: the 47 exported operations and
# the records they take, as libabigail reads them from the library's debug
# information, restricted to what the public headers declare.
#
#   abi-baseline.sh check  LIB BASELINE   fails on any difference (ctest abi_baseline)
#   abi-baseline.sh update LIB BASELINE   rewrites BASELINE from LIB
#
# There is one baseline per architecture (abi/libxavoprinter.so.6.ARCH.abi,
# ARCH as in x86_64 or i386): sizes and alignments differ between them.  An
# intended change of the interface updates both in the same commit:
#   scripts/abi-baseline.sh update build/plain/libxavoprinter.so.6 abi/libxavoprinter.so.6.x86_64.abi
#   scripts/abi-baseline.sh update build/i386/libxavoprinter.so.6 abi/libxavoprinter.so.6.i386.abi
set -eu
top=$(cd "$(dirname "$0")/.." && pwd)
mode=${1:-}
lib=${2:-}
baseline=${3:-}
if [ -z "$lib" ] || [ -z "$baseline" ]; then
    echo "usage: $0 check|update LIB BASELINE" >&2
    exit 2
fi
# Public types only (the private ones differ between build types and
# compilers without changing the interface), reached from exported
# functions only.
public="--headers-dir $top/include --headers-dir $top/platform --drop-private-types --exported-interfaces-only"

case $mode in
update)
    # shellcheck disable=SC2086
    abidw $public --no-corpus-path --no-show-locs --type-id-style hash "$lib" |
        sed "s/ comp-dir-path='[^']*'//" >"$baseline"
    ;;
check)
    if [ ! -f "$baseline" ]; then
        echo "no ABI baseline $baseline: create it with $0 update $lib $baseline" >&2
        exit 1
    fi
    # The baseline holds the public interface only; the library's side is
    # cut to what its exported functions reach.  (Filtering that side by
    # headers as well would hide a changed record: the baseline keeps no
    # locations that tell it public.)  abidiff exits non-zero on any
    # change, compatible additions included: the baseline describes the
    # library exactly.
    if ! abidiff --exported-interfaces-only --no-show-locs "$baseline" "$lib"; then
        echo "libxavoprinter.so.6 differs from $baseline (above). An intended change updates the" >&2
        echo "baselines in the same commit: see $0." >&2
        exit 1
    fi
    echo "libxavoprinter.so.6 matches $(basename "$baseline")"
    ;;
*)
    echo "usage: $0 check|update LIB BASELINE" >&2
    exit 2
    ;;
esac
