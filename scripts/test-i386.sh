#!/usr/bin/env bash
# The appliance's own target: builds the library, the stand-ins and the
# test suites for 32-bit x86 with cmake/i386-linux-gnu.cmake (Debian's i386
# multiarch packages, installed by scripts/install-deps.sh) and runs the
# whole suite there, plainly.  Called by scripts/test.sh; root (the tests
# enter the sandbox).
set -euo pipefail
cd "$(dirname "$0")/.."

. scripts/checks.sh
build_tree i386 build/i386 --toolchain cmake/i386-linux-gnu.cmake -DCMAKE_BUILD_TYPE=RelWithDebInfo
test_tree i386 build/i386
