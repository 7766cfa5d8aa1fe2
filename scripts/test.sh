#!/usr/bin/env bash
# Builds libxavoprinter and runs its whole test suite twice: once plainly and
# once under AddressSanitizer, UndefinedBehaviorSanitizer and LeakSanitizer.
# Run as root on Debian 12: it installs what it needs with apt-get, and the
# tests enter private mount and network namespaces (they never touch the
# host's files or network).
set -euo pipefail
cd "$(dirname "$0")/.."

if [ "$(id -u)" -ne 0 ]; then
  echo "scripts/test.sh must run as root (the test sandbox uses namespaces)" >&2
  exit 2
fi

# The sandbox gives every suite a fresh, empty /tmp and /run: a checkout
# there would vanish from under its own tests.
case "$PWD/" in
  /tmp/*|/run/*)
    echo "scripts/test.sh: run it from a checkout outside /tmp and /run (the test sandbox replaces them)" >&2
    exit 2 ;;
esac

bash scripts/install-deps.sh

jobs=$(nproc)
status=0
for variant in plain asan; do
  dir=build/$variant
  opts=(-DCMAKE_BUILD_TYPE=RelWithDebInfo)
  [ "$variant" = asan ] && opts=(-DCMAKE_BUILD_TYPE=Debug -DXAVO_SANITIZE=ON)
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
exit $status
