#!/usr/bin/env bash
# Cross-builds the core library, libTesselVIP.so and every unit suite for 64-bit ARM (the CPU of
# most Android devices: unsigned plain char, its own vectorisation and thread stack limits) and
# runs the suites under user-mode QEMU through CTest. Exits non-zero on any failure.
#
#   tools/run_aarch64_tests.sh                 # everything that can run emulated
#   tools/run_aarch64_tests.sh -LE 'noemu|gpu'  # quick pass without the Mesa rendering suites
#
# Extra arguments go to ctest. Installs what it needs, only when missing: the host packages of
# tools/setup/packages.txt, the cross compiler and QEMU, then the arm64 architecture and the
# target's libraries from Debian multiarch (those cannot be listed in packages.txt: the
# architecture must be added first). Build directory: build-aarch64.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
bash tools/setup/setup.sh
jobs="${TESSEL_JOBS:-2}"

sudo_cmd=""
[ "$(id -u)" -ne 0 ] && sudo_cmd="sudo"
installed() { dpkg-query -W -f='${Status}' "$1" 2>/dev/null | grep -q "install ok installed"; }

host_packages=(g++-aarch64-linux-gnu)
command -v qemu-aarch64 >/dev/null || command -v qemu-aarch64-static >/dev/null || host_packages+=(qemu-user)
# The suites' oracles and GL stack for the target: OpenSSL libcrypto, EGL + GLES 1.1 with Mesa's
# software rasteriser, GoogleTest, PCRE2 and libpng.
target_packages=(libssl-dev:arm64 libgles-dev:arm64 libegl-dev:arm64 libegl-mesa0:arm64
                 libgl1-mesa-dri:arm64 libgtest-dev:arm64 libpcre2-dev:arm64 libpng-dev:arm64)
missing=()
for pkg in "${host_packages[@]}" "${target_packages[@]}"; do
  installed "$pkg" || missing+=("$pkg")
done
if [ ${#missing[@]} -gt 0 ]; then
  echo "aarch64: installing ${missing[*]}"
  if ! dpkg --print-foreign-architectures | grep -qx arm64; then
    $sudo_cmd dpkg --add-architecture arm64
  fi
  $sudo_cmd apt-get update -qq
  DEBIAN_FRONTEND=noninteractive $sudo_cmd apt-get install -y -qq --no-install-recommends \
    "${missing[@]}" >/dev/null
fi

echo "== aarch64 cross build"
# Tools stay on for the server-side opener (tools/server) the dispatch suites link.
cmake -S . -B build-aarch64 -G Ninja -DCMAKE_TOOLCHAIN_FILE="$PWD/cmake/aarch64-linux-gnu.cmake" \
      -DCMAKE_BUILD_TYPE=Release -DTESSEL_WERROR=ON -DTESSEL_BUILD_TOOLS=ON >/dev/null
cmake --build build-aarch64 -j"$jobs"

echo "== aarch64 tests under QEMU"
# noemu: suites that cannot run emulated (the host JVM, the demo's X11 window); see
# tests/emulated.cmake. A later -LE among the arguments replaces this one.
ctest --test-dir build-aarch64 --output-on-failure -j"$jobs" -LE noemu "$@"
