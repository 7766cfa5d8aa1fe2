# Sourced by demo.sh and test.sh: both need root (the sandbox uses
# namespaces and mounts) and a checkout outside /tmp and /run, which the
# sandbox replaces with fresh, empty ones: a checkout there would vanish
# from under its own programs.
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
