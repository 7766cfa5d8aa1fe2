#!/usr/bin/env bash
# Builds libxavoprinter and runs its whole test suite twice: once plainly and
# once under AddressSanitizer, UndefinedBehaviorSanitizer and LeakSanitizer.
# Run as root on Debian 12: it installs what it needs with apt-get, and the
# tests enter private mount and network namespaces (they never touch the
# host's files or network).
# Then the suite once more for the appliance's 32-bit target (test-i386.sh),
# and the install trees and Debian packages as an integrator uses them
# (test-install.sh).
set -euo pipefail
cd "$(dirname "$0")/.."

. scripts/checks.sh
require_sandbox_host scripts/test.sh

bash scripts/install-deps.sh

# Five builds (GCC, clang with sanitizers, i386, the fuzz targets, the
# packages) of mostly the same sources: ccache keeps a second run of the
# command, or a run in another clone, to what changed.  CMake takes the
# launcher from the environment; paths are hashed relative to the checkout.
if command -v ccache >/dev/null; then
  export CMAKE_C_COMPILER_LAUNCHER=ccache CMAKE_CXX_COMPILER_LAUNCHER=ccache CCACHE_BASEDIR=$PWD
fi

jobs=$(nproc)
status=0
for variant in plain asan; do
  dir=build/$variant
  opts=(-DCMAKE_BUILD_TYPE=RelWithDebInfo)
  # The sanitized variant is built with clang, the plain one with GCC: the
  # project stays warning-free under both.
  [ "$variant" = asan ] && opts=(-DCMAKE_BUILD_TYPE=Debug -DXAVO_SANITIZE=ON
                                 -DCMAKE_C_COMPILER=clang -DCMAKE_CXX_COMPILER=clang++)
  echo "== $variant: configure and build"
  cmake -S . -B "$dir" -G Ninja "${opts[@]}" >/dev/null
  cmake --build "$dir" -j "$jobs"
  echo "== $variant: test"
  # One suite at a time: each runs in namespaces of its own, but several
  # start real daemons and time signals against real programs, which a
  # loaded machine would only make slower to judge.  The run takes seconds.
  if ! ASAN_OPTIONS=detect_leaks=1:abort_on_error=0 UBSAN_OPTIONS=print_stacktrace=1 \
       ctest --test-dir "$dir" --output-on-failure -j 1; then
    status=1
  fi
done
bash scripts/test-i386.sh || status=1
bash scripts/test-install.sh || status=1
bash scripts/bench.sh --smoke build/plain || status=1
bash scripts/fuzz.sh --short || status=1
exit $status
