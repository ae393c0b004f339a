#!/usr/bin/env bash
# Builds and runs every test: the release build with warnings as errors (unit, JVM, GL and
# window suites), the thread stress suite under ThreadSanitizer, a libFuzzer smoke run, and the
# whole unit suite again under AddressSanitizer + UndefinedBehaviorSanitizer.
# Exits non-zero on any failure.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
bash tools/setup/setup.sh
jobs="${TESSEL_JOBS:-2}"

echo "== release build and tests"
cmake -S . -B build -G Ninja -DCMAKE_BUILD_TYPE=Release -DTESSEL_WERROR=ON >/dev/null
cmake --build build -j"$jobs"
ctest --test-dir build --output-on-failure -j"$jobs"

echo "== strong layout randomness (-DTESSEL_STRONG_LAYOUT_RANDOM=ON): the suites that draw layouts"
# The other layout suite checks the default generator's exact draws, so it stays out of this build.
strong_suites="input_layout_random_test session_test input_typing_test"
cmake -S . -B build-strong -G Ninja -DCMAKE_BUILD_TYPE=Release -DTESSEL_WERROR=ON \
      -DTESSEL_STRONG_LAYOUT_RANDOM=ON -DTESSEL_ALLOW_DEMO_KEYS=ON >/dev/null
cmake --build build-strong -j"$jobs" --target $strong_suites
ctest --test-dir build-strong --output-on-failure -j"$jobs" -R "^(${strong_suites// /|})\$"

echo "== ThreadSanitizer: the UI/GL thread stress suite"
bash tools/run_tsan.sh

echo "== libFuzzer smoke run (clang, ASan+UBSan, about 12 s per target on fuzz/corpus)"
bash tools/run_fuzz.sh smoke

echo "== AddressSanitizer + UndefinedBehaviorSanitizer build and tests"
# Suites labelled nosan (the allocator-wrapping hygiene suite, the window demo) run in the
# release pass only.
cmake -S . -B build-asan -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo -DTESSEL_WERROR=ON \
      -DTESSEL_SANITIZE=address,undefined >/dev/null
cmake --build build-asan -j"$jobs"
ASAN_OPTIONS=detect_leaks=1:strict_string_checks=1 UBSAN_OPTIONS=print_stacktrace=1 \
  LSAN_OPTIONS=suppressions="$PWD/tests/lsan.supp":print_suppressions=0 \
  ctest --test-dir build-asan --output-on-failure -j"$jobs" -LE nosan
