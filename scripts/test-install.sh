#!/usr/bin/env bash
# The library as an integrator gets it, in three forms:
#   1. build/plain installed to a prefix of its own, as scripts/build.sh
#      installs to ./_install;
#   2. the Debian package build (scripts/build-debs.sh, configured for /usr
#      and staged under DESTDIR), and lintian on its packages;
#   3. those packages installed with dpkg inside a sandbox, whose /usr,
#      /etc and /var are throwaway layers.
# Each tree must hold: a command that starts without LD_LIBRARY_PATH,
# shared libraries without a run path, a pkg-config file whose includedir
# holds xavoprinter.h (the platform headers in xavo/ below it) and whose
# libdir holds libxavoprinter.so, and a C caller that builds and runs with
# pkg-config and with the CMake package.
# Called by scripts/test.sh after its plain build; root (the sandbox).
set -euo pipefail
cd "$(dirname "$0")/.."

src=$PWD
work=$src/build/install-test
rm -rf "$work"
mkdir -p "$work"

fail() {
  echo "test-install: $*" >&2
  exit 1
}

# check_operator_files DATADIR LABEL: the manual page renders and the bash
# completion loads and offers the command's groups.
check_operator_files() {
  local share=$1 label=$2 page
  page=$(find "$share/man/man1" -name 'xavoprinter.1*' 2>/dev/null | head -n 1)
  [ -n "$page" ] || fail "$label: no manual page under $share/man/man1"
  man -l "$page" 2>/dev/null | grep -q 'xavoprinter' || fail "$label: man does not render $page"
  local comp=$share/bash-completion/completions/xavoprinter
  [ -f "$comp" ] || fail "$label: no bash completion at $comp"
  bash -c '. "$1"; COMP_WORDS=(xavoprinter ""); COMP_CWORD=1; COMP_LINE="xavoprinter "; COMP_POINT=${#COMP_LINE}
           f=$(complete -p xavoprinter | sed "s/.*-F \([^ ]*\).*/\1/"); "$f" xavoprinter "" xavoprinter
           printf "%s\n" "${COMPREPLY[@]}"' sh "$comp" | grep -qx usb ||
    fail "$label: the bash completion does not offer the command's groups"
}

# check_tree STAGE PREFIX LABEL: the tree installed for PREFIX, found under
# the staging directory STAGE ("" when installed in place).
check_tree() {
  local stage=$1 prefix=$2 label=$3
  local root=$stage$prefix out=$work/$label
  mkdir -p "$out"
  env -u LD_LIBRARY_PATH "$root/bin/xavoprinter" --help >/dev/null ||
    fail "$label: the installed command does not start"
  env -u LD_LIBRARY_PATH "$root/bin/xavoprinter" --version | grep -q '^xavoprinter [0-9]' ||
    fail "$label: the installed command has no --version"
  check_operator_files "$root/share" "$label"
  local pc
  pc=$(find "$root" -path '*/pkgconfig/xavoprinter.pc' | head -n 1)
  [ -n "$pc" ] || fail "$label: no xavoprinter.pc under $root"
  # pkg-config prefixes the staging directory to every path it prints.
  local pkgconf=(env PKG_CONFIG_LIBDIR="$(dirname "$pc")" PKG_CONFIG_PATH= PKG_CONFIG_SYSROOT_DIR="$stage"
                 PKG_CONFIG_ALLOW_SYSTEM_CFLAGS=1 PKG_CONFIG_ALLOW_SYSTEM_LIBS=1 pkg-config)
  local includedir libdir
  includedir=$("${pkgconf[@]}" --variable=includedir xavoprinter)
  libdir=$("${pkgconf[@]}" --variable=libdir xavoprinter)
  [ -f "$includedir/xavoprinter.h" ] || fail "$label: no xavoprinter.h in pkg-config's includedir $includedir"
  [ -f "$includedir/xavo/xavocore.h" ] && [ ! -e "$includedir/xavocore.h" ] ||
    fail "$label: the platform headers are not in $includedir/xavo alone"
  [ -e "$libdir/libxavoprinter.so" ] || fail "$label: no libxavoprinter.so in pkg-config's libdir $libdir"
  local lib
  for lib in "$libdir"/lib*.so.6; do
    if readelf -d "$lib" | grep -qE 'RPATH|RUNPATH'; then fail "$label: $(basename "$lib") carries a run path"; fi
  done
  # Under DESTDIR pkg-config moves -I and -L into the stage, but not the
  # linker's -rpath-link for the libraries' own dependencies: given here.
  local staged=()
  [ -z "$stage" ] || staged=(-Wl,-rpath-link,"$libdir")
  # shellcheck disable=SC2046
  cc -std=c99 -Wall -Wextra -Wpedantic -Werror -o "$out/caller-pc" "$src/tests/install/caller.c" \
    $("${pkgconf[@]}" --cflags --libs xavoprinter) "${staged[@]}" ||
    fail "$label: the pkg-config caller does not build"
  LD_LIBRARY_PATH=$libdir "$out/caller-pc" >/dev/null || fail "$label: the pkg-config caller fails"
  cmake -S "$src/tests/install" -B "$out/cmake" -G Ninja -DCMAKE_PREFIX_PATH="$root" >/dev/null &&
    cmake --build "$out/cmake" >/dev/null || fail "$label: the CMake package caller does not build"
  LD_LIBRARY_PATH=$libdir "$out/cmake/caller" >/dev/null || fail "$label: the CMake package caller fails"
  echo "== install: $label: command, pkg-config and CMake callers work"
}

# 1. A prefix of its own, from the plain build.
cmake --install build/plain --prefix "$work/_install" >/dev/null
check_tree "" "$work/_install" prefix

# 2. The package build: /usr, multiarch libdir, staged under DESTDIR.
bash scripts/build-debs.sh >/dev/null
check_tree "$src/build/deb/src/debian/tmp" /usr destdir
echo "== packages: lintian"
lintian --fail-on error build/deb/*.changes || fail "lintian reports errors"

# 3. The packages installed for real, in a sandbox.
echo "== packages: dpkg -i in the sandbox"
build/plain/sandbox/xavo-sandbox-run /bin/sh -euc '
  export DEBIAN_FRONTEND=noninteractive
  dpkg -i "$1"/libxavoprinter6_*.deb "$1"/libxavoprinter-dev_*.deb "$1"/xavoprinter_*.deb \
          "$1"/libxavoprinter-platform-standins_*.deb >/dev/null
  cd /tmp
  env -u LD_LIBRARY_PATH xavoprinter --help >/dev/null
  xavoprinter list >/dev/null
  man -w xavoprinter >/dev/null
  cc -std=c99 -o caller "$2" $(pkg-config --cflags --libs xavoprinter)
  ./caller' sh "$src/build/deb" "$src/tests/install/caller.c" ||
  fail "the installed packages do not work"
echo "== packages: installed; xavoprinter and a pkg-config caller work"
