#!/usr/bin/env bash
# valgrind memcheck over the unit suites: a RelWithDebInfo build in build-valgrind, then every
# *_test executable that CTest registers (except the nosan ones) under
#   valgrind --error-exitcode=1 --leak-check=full --errors-for-leak-kinds=definite
#            --suppressions=tests/valgrind.supp
# so any invalid access, use of uninitialised memory, bad free or definite leak fails the run.
# tests/valgrind.supp allows no leak from the library (the suites free the three strings that
# destroySession deliberately keeps); it covers only the test oracles' own process-lifetime
# allocations (OpenSSL, Mesa/EGL) and one glibc loader false positive.
#
#   bash tools/run_valgrind.sh              # every unit suite, TESSEL_JOBS (default 2) at a time
#   bash tools/run_valgrind.sh codec_test   # only the named suites
#
# Skipped: the nosan suites (the JVM-driven ones run java, and hygiene_test replaces malloc
# itself, which is what memcheck does too). GL runs on llvmpipe with its rasteriser threads off
# (LP_NUM_THREADS=0): under memcheck its JIT-compiled code is several times faster than softpipe.
# The server-side opener's command line, which a few suites run in a forked child (fork without
# exec), is left out of the report: --child-silent-after-fork.
# Per-suite logs: build-valgrind/valgrind/<suite>.log (valgrind) and .out (the suite's output).
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
jobs="${TESSEL_JOBS:-2}"
limit="${TESSEL_VALGRIND_TIMEOUT:-1500}"   # seconds per suite

command -v valgrind >/dev/null || bash tools/setup/setup.sh
cmake -S . -B build-valgrind -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo -DTESSEL_WERROR=ON >/dev/null
cmake --build build-valgrind -j"$jobs"

# Suites whose full run takes too long under memcheck, with the gtest filter used instead
# (none so far), and the slowest suites, started first so the others fill the second slot.
declare -A filters=()
slow_first=(render_surface_test threads_test crypto_rsa_test pattern_differential_test settings_test
            dispatch_types_test)

if [ $# -gt 0 ]; then
  suites=("$@")
else
  mapfile -t suites < <(ctest --test-dir build-valgrind --show-only=json-v1 | python3 -c '
import json, sys
for t in json.load(sys.stdin)["tests"]:
    labels = [v for p in t.get("properties", []) if p["name"] == "LABELS" for v in p["value"]]
    if t["name"].endswith("_test") and "nosan" not in labels:
        print(t["name"])')
  ordered=()
  for s in "${slow_first[@]}"; do
    for t in "${suites[@]}"; do [ "$t" = "$s" ] && ordered+=("$s"); done
  done
  for t in "${suites[@]}"; do
    case " ${slow_first[*]} " in *" $t "*) ;; *) ordered+=("$t") ;; esac
  done
  suites=("${ordered[@]}")
fi

logdir="$PWD/build-valgrind/valgrind"
mkdir -p "$logdir"
rm -f "$logdir"/*.log "$logdir"/*.out
supp="$PWD/tests/valgrind.supp"

run_one() {
  local name="$1" filter="$2" start rc
  start=$(date +%s)
  local args=()
  [ -n "$filter" ] && args+=("--gtest_filter=$filter")
  if (cd build-valgrind/tests && GALLIUM_DRIVER=llvmpipe LP_NUM_THREADS=0 MESA_SHADER_CACHE_DISABLE=true \
      timeout "$limit" valgrind --error-exitcode=1 --leak-check=full --errors-for-leak-kinds=definite \
        --show-leak-kinds=definite --num-callers=40 --child-silent-after-fork=yes --suppressions="$supp" \
        --log-file="$logdir/$name.log" "./$name" "${args[@]}" >"$logdir/$name.out" 2>&1); then
    rc=0
  else
    rc=$?
  fi
  echo "$name $rc $(($(date +%s) - start))"
}
export -f run_one
export logdir supp limit

start=$(date +%s)
results="$logdir/results.txt"
for s in "${suites[@]}"; do printf '%s\t%s\n' "$s" "${filters[$s]:-}"; done |
  xargs -P "$jobs" -d '\n' -n1 bash -c 'IFS=$'"'"'\t'"'"' read -r n f <<<"$1"; run_one "$n" "$f"' _ >"$results"

passed=0 failed=0
while read -r name rc seconds; do
  if [ "$rc" = 0 ]; then
    passed=$((passed + 1))
    printf '  %-28s ok      %4ds\n' "$name" "$seconds"
  else
    failed=$((failed + 1))
    printf '  %-28s FAILED  %4ds (exit %s; see %s)\n' "$name" "$seconds" "$rc" "$logdir/$name.log"
    grep -E "ERROR SUMMARY|definitely lost|Invalid|uninitialised|FAILED" "$logdir/$name.log" "$logdir/$name.out" | head -20 || true
  fi
done < <(sort "$results")
echo "memcheck wall time: $(($(date +%s) - start))s"
echo "valgrind: $passed passed, $failed failed"
[ "$failed" = 0 ]
