#!/usr/bin/env bash
# Builds and runs every test: the release build with warnings as errors (unit, JVM, GL and
# window suites), the layout suites with the hardened layout option, the thread stress suite
# under ThreadSanitizer, a libFuzzer smoke run, the whole unit suite again under
# AddressSanitizer + UndefinedBehaviorSanitizer, and the compact artwork build's suite.
#
# Every stage runs even when an earlier one failed, so the closing summary is complete: one row
# per stage (result, wall time, CTest counts), then "N passed, N failed" over all stages' CTest
# suites. Exits non-zero if any stage failed. A stage is one line at the bottom:
#   stage NAME COMMAND...     (COMMAND runs under `set -e` from the repository root)
set -uo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
bash tools/setup/setup.sh || exit 1
jobs="${TESSEL_JOBS:-2}"
logs=$(mktemp -d)
trap 'rm -rf "$logs"' EXIT
names=() results=() times=() counts=()
total_passed=0 total_failed=0

# Runs one stage, echoing its output, and records its row of the summary. The counts come from
# CTest's closing line, "X% tests passed, Y tests failed out of Z" (summed if a stage has several).
stage() {
  local name="$1" log="$logs/${#names[@]}.log" start=$SECONDS status passed=0 failed=0 ran=0 line
  shift
  echo "== $name"
  ( set -e; "$@" ) 2>&1 | tee "$log"
  status=${PIPESTATUS[0]}
  while read -r line; do
    local y z
    y=$(sed -E 's/.* ([0-9]+) tests? failed out of ([0-9]+).*/\1/' <<<"$line")
    z=$(sed -E 's/.* ([0-9]+) tests? failed out of ([0-9]+).*/\2/' <<<"$line")
    passed=$((passed + z - y)) failed=$((failed + y)) ran=1
  done < <(grep -E '[0-9]+% tests passed, [0-9]+ tests? failed out of [0-9]+' "$log")
  total_passed=$((total_passed + passed)) total_failed=$((total_failed + failed))
  names+=("$name")
  results+=("$([ "$status" -eq 0 ] && echo ok || echo "FAILED ($status)")")
  times+=("$(printf '%dm%02ds' $(((SECONDS - start) / 60)) $(((SECONDS - start) % 60)))")
  counts+=("$([ "$ran" = 1 ] && echo "$passed passed, $failed failed" || echo "-")")
}

release() {
  cmake -S . -B build -G Ninja -DCMAKE_BUILD_TYPE=Release -DTESSEL_WERROR=ON >/dev/null
  cmake --build build -j"$jobs"
  ctest --test-dir build --output-on-failure -j"$jobs"
}

# The hardened layout option: the suites that draw layouts, built with it. The other layout
# suite checks the default generator's exact draws, so it stays out of this build.
strong_layout() {
  local suites="input_layout_random_test session_test input_typing_test"
  cmake -S . -B build-strong -G Ninja -DCMAKE_BUILD_TYPE=Release -DTESSEL_WERROR=ON \
        -DTESSEL_STRONG_LAYOUT_RANDOM=ON -DTESSEL_ALLOW_DEMO_KEYS=ON >/dev/null
  cmake --build build-strong -j"$jobs" --target $suites
  ctest --test-dir build-strong --output-on-failure -j"$jobs" -R "^(${suites// /|})\$"
}

# The compact artwork build: its library's size (text + data, as `size` reports them) and its
# suite (uploads byte for byte those of the raw pixels, the failure paths), in a release build
# and under ASan+UBSan.
compact_artwork() {
  local targets="TesselVIP compact_artwork compact_artwork_raw" options="-DTESSEL_WERROR=ON -DTESSEL_BUILD_TOOLS=OFF"
  cmake -S . -B build-compact -G Ninja -DCMAKE_BUILD_TYPE=Release $options -DTESSEL_COMPACT_ARTWORK=ON >/dev/null
  cmake --build build-compact -j"$jobs" --target $targets
  size build-compact/libTesselVIP.so | awk 'NR == 2 { print "libTesselVIP.so: text + data", $1 + $2, "bytes (at most 600 KB)"
                                                      exit ($1 + $2 > 600000) }'
  ctest --test-dir build-compact --output-on-failure
  cmake -S . -B build-compact-asan -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo $options -DTESSEL_COMPACT_ARTWORK=ON \
        -DTESSEL_SANITIZE=address,undefined >/dev/null
  cmake --build build-compact-asan -j"$jobs" --target $targets
  ASAN_OPTIONS=detect_leaks=1 UBSAN_OPTIONS=print_stacktrace=1 \
    LSAN_OPTIONS=suppressions="$PWD/tests/lsan.supp":print_suppressions=0 \
    ctest --test-dir build-compact-asan --output-on-failure
}

# Suites labelled nosan (the allocator-wrapping hygiene suite, the demos) run in the release
# pass only.
asan_ubsan() {
  cmake -S . -B build-asan -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo -DTESSEL_WERROR=ON \
        -DTESSEL_SANITIZE=address,undefined >/dev/null
  cmake --build build-asan -j"$jobs"
  ASAN_OPTIONS=detect_leaks=1:strict_string_checks=1 UBSAN_OPTIONS=print_stacktrace=1 \
    LSAN_OPTIONS=suppressions="$PWD/tests/lsan.supp":print_suppressions=0 \
    ctest --test-dir build-asan --output-on-failure -j"$jobs" -LE nosan
}

stage "release build and tests" release
stage "strong layout randomness build" strong_layout
stage "ThreadSanitizer: UI/GL thread stress" bash tools/run_tsan.sh
stage "libFuzzer smoke run (~12 s per target)" bash tools/run_fuzz.sh smoke
stage "ASan+UBSan build and tests" asan_ubsan
stage "compact artwork build, release + ASan" compact_artwork

echo
echo "== summary"
printf '%-42s %-12s %-8s %s\n' stage result time ctest
for k in "${!names[@]}"; do
  printf '%-42s %-12s %-8s %s\n' "${names[$k]}" "${results[$k]}" "${times[$k]}" "${counts[$k]}"
done
echo "$total_passed passed, $total_failed failed"
for result in "${results[@]}"; do
  [ "$result" = ok ] || exit 1
done
exit 0
