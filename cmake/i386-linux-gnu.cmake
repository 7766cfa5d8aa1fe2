# The appliance's own target: 32-bit x86 Linux, built on an amd64 Debian 12
# with its multilib compiler and the i386 multiarch packages that
# scripts/install-deps.sh installs.
#   cmake -S . -B build/i386 -G Ninja --toolchain cmake/i386-linux-gnu.cmake
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR i686)
set(CMAKE_LIBRARY_ARCHITECTURE i386-linux-gnu)

set(CMAKE_C_FLAGS_INIT "-m32")
set(CMAKE_CXX_FLAGS_INIT "-m32")
set(CMAKE_EXE_LINKER_FLAGS_INIT "-m32")
set(CMAKE_SHARED_LINKER_FLAGS_INIT "-m32")
set(CMAKE_MODULE_LINKER_FLAGS_INIT "-m32")

# Libraries and their pkg-config files from the i386 multiarch directories
# only; programs (cmake, pkg-config, the test peers) stay the host's.
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(ENV{PKG_CONFIG_LIBDIR} "/usr/lib/i386-linux-gnu/pkgconfig:/usr/share/pkgconfig")
set(ENV{PKG_CONFIG_PATH} "")

# Programs of the host's own class run inside the test sandbox too: the
# sandbox's preload shim is built for them as well (sandbox/CMakeLists.txt).
set(XAVO_HOST_LIBRARY_ARCHITECTURE x86_64-linux-gnu)
set(XAVO_HOST_ARCH_FLAGS -m64)
