#!/usr/bin/env bash
# Builds libxavoprinter.so.6 with the stand-ins for the appliance's platform
# libraries and installs everything under ./_install (or the prefix given
# as the first argument): the command in bin/, the libraries in lib/ (the
# multiarch lib/<triplet>/ under /usr), the headers in include/, a
# pkg-config file and a CMake package.  Run as root on Debian 12 (it
# installs the build dependencies with apt-get).
set -euo pipefail
cd "$(dirname "$0")/.."
prefix=${1:-$PWD/_install}

bash scripts/install-deps.sh
cmake -S . -B build/release -G Ninja -DCMAKE_BUILD_TYPE=Release -DXAVO_BUILD_TESTS=OFF -DXAVO_BUILD_DEMO=OFF \
      -DCMAKE_INSTALL_PREFIX="$prefix" >/dev/null
cmake --build build/release -j "$(nproc)"
cmake --install build/release >/dev/null

echo "installed under $prefix:"
(cd "$prefix" && find . -type f -o -type l | sort | sed 's/^\.\//  /')
lib=$(find "$prefix" -name libxavoprinter.so.6 | head -n 1)
echo "exported operations of libxavoprinter.so.6: $(nm -D --defined-only "$lib" | grep -c ' T XAVO')"
