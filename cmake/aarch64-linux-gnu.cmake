# Cross toolchain for 64-bit ARM Linux (Debian's g++-aarch64-linux-gnu), used to build the core
# library and the unit suites for the CPU most Android devices have and to run them under
# user-mode QEMU (tools/run_aarch64_tests.sh). Plain char is unsigned there, long and pointers are
# 64-bit, unaligned access is allowed but the compiler vectorises differently: the run catches
# code that only works on x86-64.
#
# Target libraries come from Debian multiarch (libssl-dev:arm64, libgles-dev:arm64, ...), which
# installs them under /usr/lib/aarch64-linux-gnu with the shared headers in /usr/include; the
# cross C library lives under /usr/aarch64-linux-gnu.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR aarch64)
set(CMAKE_LIBRARY_ARCHITECTURE aarch64-linux-gnu)

set(CMAKE_C_COMPILER aarch64-linux-gnu-gcc)
set(CMAKE_CXX_COMPILER aarch64-linux-gnu-g++)
set(CMAKE_ASM_COMPILER aarch64-linux-gnu-gcc)

# "/" is a root too so that the multiarch directories (/usr/lib/aarch64-linux-gnu,
# /usr/include/aarch64-linux-gnu) and the architecture-independent JNI headers are found;
# CMAKE_LIBRARY_ARCHITECTURE makes every library search look in the aarch64 directory, never in
# the host's x86_64 one.
set(CMAKE_FIND_ROOT_PATH /usr/aarch64-linux-gnu /usr/lib/aarch64-linux-gnu /)
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)

# pkg-config (PCRE2) must read the target's .pc files, not the host's.
set(ENV{PKG_CONFIG_LIBDIR} "/usr/lib/aarch64-linux-gnu/pkgconfig:/usr/share/pkgconfig")
set(ENV{PKG_CONFIG_SYSROOT_DIR} "")

# add_test() commands naming an executable target run through user-mode QEMU. The loader prefix
# is "/", not /usr/aarch64-linux-gnu: the multiarch libraries pull in libc6:arm64, whose
# libc.so.6 the loader finds in /lib/aarch64-linux-gnu either way, and the cross package's older
# ld-linux-aarch64.so.1 paired with that newer libc.so.6 hangs in the first pthread_create.
# With "/" the loader and the C library come from the same package.
find_program(TESSEL_QEMU_AARCH64 NAMES qemu-aarch64 qemu-aarch64-static)
if(NOT TESSEL_QEMU_AARCH64)
  set(TESSEL_QEMU_AARCH64 qemu-aarch64)
endif()
set(CMAKE_CROSSCOMPILING_EMULATOR ${TESSEL_QEMU_AARCH64};-L;/)
