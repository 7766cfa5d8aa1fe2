#!/usr/bin/env bash
# Builds the Debian packages described in debian/ (libxavoprinter6,
# libxavoprinter-dev, xavoprinter and the platform stand-ins) with
# `dpkg-buildpackage -us -uc -b`, from a copy of the source tree:
# dpkg-buildpackage writes the .deb and .changes files beside the tree it
# builds, and everything must stay under build/.  The packages land in
# build/deb/; build/deb/src/debian/tmp is the /usr tree staged by the
# package build (DESTDIR).  Needs what scripts/install-deps.sh installs.
set -euo pipefail
cd "$(dirname "$0")/.."

out=build/deb
rm -rf "$out"
mkdir -p "$out/src"
# The tree without build outputs, install trees or the repository itself.
tar -C . --exclude=./.git --exclude='./build*' --exclude='./_*' -cf - . | tar -C "$out/src" -xf -

# Reused objects make a rebuild of unchanged sources cheap; the package is
# the same without.
. scripts/checks.sh
use_ccache
export DEB_BUILD_OPTIONS="parallel=$(nproc) ${DEB_BUILD_OPTIONS:-}"
(cd "$out/src" && dpkg-buildpackage -us -uc -b) >"$out/build.log" 2>&1 || {
  tail -n 40 "$out/build.log" >&2
  echo "build-debs.sh: dpkg-buildpackage failed (whole log: $out/build.log)" >&2
  exit 1
}
ls "$out"/*.deb
