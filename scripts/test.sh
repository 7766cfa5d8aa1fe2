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

use_ccache

status=0
for variant in plain asan; do
  opts=(-DCMAKE_BUILD_TYPE=RelWithDebInfo)
  # The sanitized variant is built with clang, the plain one with GCC: the
  # project stays warning-free under both.
  [ "$variant" = asan ] && opts=(-DCMAKE_BUILD_TYPE=Debug -DXAVO_SANITIZE=ON
                                 -DCMAKE_C_COMPILER=clang -DCMAKE_CXX_COMPILER=clang++)
  build_tree "$variant" "build/$variant" "${opts[@]}"
  test_tree "$variant" "build/$variant" || status=1
done
bash scripts/test-i386.sh || status=1
bash scripts/test-install.sh || status=1
bash scripts/bench.sh --smoke build/plain || status=1
bash scripts/fuzz.sh --short || status=1
exit $status
