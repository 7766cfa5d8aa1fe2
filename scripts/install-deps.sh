#!/bin/sh
# Installs, on a fresh Debian 12 as root, what building the library and
# running its test suites needs.  Safe to run again: packages already
# installed are left as they are and apt's lists are fetched once per run.
#
# The daemons among the test peers (cupsd, snmpd, avahi-daemon, dbus) are
# started by the tests themselves inside their private namespaces, on their
# own configuration.  A copy left running on the host by the package's
# postinst would hold ports and sockets the tests expect free, so service
# starts are refused while installing (policy-rc.d answers 101, "action
# forbidden"); a policy-rc.d that was already there is kept unchanged.
set -eu

if [ "$(id -u)" -ne 0 ]; then
    echo "install-deps.sh: must run as root" >&2
    exit 1
fi

# clang builds the sanitized test variant and the fuzz targets;
# libclang-rt-14-dev brings libFuzzer and clang's sanitizer runtimes, llvm-14
# the symbolizer that puts function names and lines in their reports.
#
# snmp-mibs-downloader is left out on purpose: it fetches the MIBs from the
# network at install time.  The tests hand snmpwalk the few MIB definitions
# they use.
PACKAGES="cmake ninja-build g++ pkg-config libgtest-dev libgmock-dev libsodium-dev
samba-common-bin iproute2 iputils-ping
cups cups-client cups-bsd
cups-ipp-utils cups-backend-bjnp
snmp snmpd
avahi-daemon avahi-utils dbus
psmisc procps
g++-multilib libgtest-dev:i386 libgmock-dev:i386 libsodium-dev:i386
build-essential debhelper lintian abigail-tools
libcli11-dev nlohmann-json3-dev python3 man-db bash-completion ccache
clang libclang-rt-14-dev llvm-14"

missing=""
for p in $PACKAGES; do
    # One status line per installed architecture (i386 multiarch too).
    if ! dpkg-query -W -f='${Status}\n' "$p" 2>/dev/null | grep -q '^install ok installed$'; then
        missing="$missing $p"
    fi
done
if [ -z "$missing" ]; then
    exit 0
fi

export DEBIAN_FRONTEND=noninteractive
POLICY=/usr/sbin/policy-rc.d
made_policy=0
if [ ! -e "$POLICY" ]; then
    printf '#!/bin/sh\nexit 101\n' >"$POLICY"
    chmod 0755 "$POLICY"
    made_policy=1
fi
cleanup() {
    if [ "$made_policy" -eq 1 ]; then
        rm -f "$POLICY"
    fi
}
trap cleanup EXIT INT TERM

# The appliance is 32-bit: the i386 build (cmake/i386-linux-gnu.cmake)
# links Debian's i386 multiarch packages.
if ! dpkg --print-foreign-architectures | grep -qx i386; then
    dpkg --add-architecture i386
fi
# A mirror in the middle of a sync can fail one index ("File has unexpected
# size"); apt then keeps the lists it had.  Try a few times, then go on with
# what was fetched: the install below fails clearly if a package is missing.
for try in 1 2 3; do
    if apt-get update -qq; then
        break
    fi
    echo "install-deps.sh: apt-get update failed (try $try of 3)" >&2
    if [ "$try" -lt 3 ]; then
        sleep 15
    fi
done
# shellcheck disable=SC2086
apt-get install -y -qq --no-install-recommends \
    -o Dpkg::Options::=--force-confdef -o Dpkg::Options::=--force-confold $missing >/dev/null
