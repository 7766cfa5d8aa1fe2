# shellcheck shell=bash
# Sourced by the scripts, from the checkout's top directory: what several
# of them do, written once.

# Whatever enters the sandbox (the demo, the tests, the benchmarks, the
# fuzz runs) needs root (the sandbox uses namespaces and mounts) and a
# checkout outside /tmp and /run, which the sandbox replaces with fresh,
# empty ones: a checkout there would vanish from under its own programs.
require_sandbox_host() {
  local script=$1
  if [ "$(id -u)" -ne 0 ]; then
    echo "$script must run as root (the sandbox uses namespaces)" >&2
    exit 2
  fi
  case "$PWD/" in
    /tmp/*|/run/*)
      echo "$script: run it from a checkout outside /tmp and /run (the sandbox replaces them)" >&2
      exit 2 ;;
  esac
}

# The builds (GCC, clang with sanitizers, i386, the fuzz targets, the
# packages) are of mostly the same sources: ccache, when installed, keeps a
# second run of a command, or a run in another clone, to what changed.
# CMake takes the launcher from the environment; paths are hashed relative
# to the checkout, and the checkout's own directory is left out of the hash
# (ccache adds it for builds with debug information): without that, no
# object of one clone would ever serve another.  The cost: an object taken
# from another clone names that clone's directory in its debug information.
use_ccache() {
  if command -v ccache >/dev/null; then
    export CMAKE_C_COMPILER_LAUNCHER=ccache CMAKE_CXX_COMPILER_LAUNCHER=ccache \
           CCACHE_BASEDIR=$PWD CCACHE_NOHASHDIR=1
  fi
}

# build_tree NAME DIR CMAKE-OPTION...: configures DIR with Ninja (the
# configure output dropped) and builds everything in it on every core.
build_tree() {
  local name=$1 dir=$2
  shift 2
  echo "== $name: configure and build"
  cmake -S . -B "$dir" -G Ninja "$@" >/dev/null
  cmake --build "$dir" -j "$(nproc)"
}

# test_tree NAME DIR: the whole suite of a built tree.  One suite at a
# time: each runs in namespaces of its own, but several start real daemons
# and time signals against real programs, which a loaded machine would only
# make slower to judge.  The sanitizer options matter to a sanitized tree
# only.
test_tree() {
  echo "== $1: test"
  ASAN_OPTIONS=detect_leaks=1:abort_on_error=0 UBSAN_OPTIONS=print_stacktrace=1 \
    ctest --test-dir "$2" --output-on-failure -j 1
}
