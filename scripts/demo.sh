#!/usr/bin/env bash
# The main job: builds the library, the xavoprinter command and the demo,
# then starts the sandbox as a self-contained appliance (private cupsd, a
# simulated USB printer on lp0, a network printer on 127.0.0.1) and walks
# through the printers' life with xavoprinter, printing every command.
# Run as root on Debian 12: it installs what it needs with apt-get, and the
# sandbox uses private mount and network namespaces (nothing reaches the
# host's files or network, and nothing is left running).
#
#   scripts/demo.sh            the walk-through
#   scripts/demo.sh --shell    the same, with a shell in the sandbox
#                                   before the clean-up steps
set -euo pipefail
cd "$(dirname "$0")/.."

. scripts/checks.sh
require_sandbox_host scripts/demo.sh

bash scripts/install-deps.sh
cmake -S . -B build/demo -G Ninja -DCMAKE_BUILD_TYPE=Release -DXAVO_BUILD_TESTS=OFF >/dev/null
cmake --build build/demo -j "$(nproc)" >/dev/null
exec build/demo/demo/xavoprinter-demo "$@"
