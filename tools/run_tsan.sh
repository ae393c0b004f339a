#!/usr/bin/env bash
# ThreadSanitizer pass over the threading model: configures build-tsan with -fsanitize=thread,
# builds the thread stress suite (threads_test; with --all, every unit suite) and runs it with
# halt_on_error, so any data race fails the run. GL runs on Mesa's softpipe (no shader JIT, see
# tests/tsan.supp for why not llvmpipe); tests/tsan.supp is where driver internals would be
# silenced, and it names none.
#
#   bash tools/run_tsan.sh          # threads_test only (what tools/run_tests.sh runs)
#   bash tools/run_tsan.sh --all    # every unit suite but the nosan ones
# Compiler: TESSEL_TSAN_CC / TESSEL_TSAN_CXX (default: the system cc / c++).
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
jobs="${TESSEL_JOBS:-2}"
all=0
[ "${1:-}" = "--all" ] && all=1

compilers=()
[ -n "${TESSEL_TSAN_CC:-}" ] && compilers+=("-DCMAKE_C_COMPILER=$TESSEL_TSAN_CC")
[ -n "${TESSEL_TSAN_CXX:-}" ] && compilers+=("-DCMAKE_CXX_COMPILER=$TESSEL_TSAN_CXX")
cmake -S . -B build-tsan -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo -DTESSEL_WERROR=ON \
      -DTESSEL_SANITIZE=thread "${compilers[@]}" >/dev/null
if [ "$all" = 1 ]; then
  cmake --build build-tsan -j"$jobs"
  selection=(-LE nosan)
else
  cmake --build build-tsan -j"$jobs" --target threads_test
  selection=(-R '^threads_test$')
fi

export TSAN_OPTIONS="halt_on_error=1 second_deadlock_stack=1 suppressions=$PWD/tests/tsan.supp ${TSAN_OPTIONS:-}"
export GALLIUM_DRIVER="${GALLIUM_DRIVER:-softpipe}" MESA_SHADER_CACHE_DISABLE=true
ctest --test-dir build-tsan --output-on-failure -j1 "${selection[@]}"
