#!/usr/bin/env bash
# Builds the libFuzzer targets of fuzz/ (clang, AddressSanitizer + UndefinedBehaviorSanitizer) and
# runs each one for a fixed time. Exits non-zero when any target reports a crash, a sanitizer
# error, a leak, a timeout or running out of memory.
#
#   tools/run_fuzz.sh smoke [targets...]          about 12 s per target on the committed seeds
#                                                 (fuzz/corpus/<target>); what tools/run_tests.sh runs
#   tools/run_fuzz.sh long [seconds] [targets...] `seconds` per target (default 600), one target at
#                                                 a time at nice 19, growing a working corpus kept
#                                                 outside the repository in build-fuzz/corpus-work/
#
# Targets default to all of der codec pattern dispatch session opener. The build directory is build-fuzz
# (TESSEL_FUZZ_BUILD overrides it). Per target: the full libFuzzer log in
# build-fuzz/fuzz-logs/<mode>-<target>.log, crash inputs in build-fuzz/artifacts/<target>/; a
# summary line per target (runs, exec/s, cov, ft, corpus) is printed at the end.
# Reproduce a crash with: build-fuzz/fuzz/<target>_fuzzer <artifact file>
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

mode="${1:-smoke}"
shift || true
seconds=12
case "$mode" in
  smoke) ;;
  long)
    if [[ $# -gt 0 && "$1" =~ ^[0-9]+$ ]]; then seconds=$1; shift; else seconds=600; fi ;;
  *) sed -n '2,17p' "$0" >&2; exit 2 ;;
esac
targets=("$@")
[[ ${#targets[@]} -eq 0 ]] && targets=(der codec pattern dispatch session opener)

build="${TESSEL_FUZZ_BUILD:-build-fuzz}"
jobs="${TESSEL_JOBS:-2}"

echo "== fuzz targets: build ($build)"
CC=clang CXX=clang++ cmake -S . -B "$build" -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo \
  -DTESSEL_BUILD_FUZZ=ON -DTESSEL_SANITIZE=address,undefined \
  -DTESSEL_BUILD_TESTS=OFF -DTESSEL_BUILD_TOOLS=OFF >/dev/null
cmake --build "$build" --target fuzzers -j"$jobs"

mkdir -p "$build/fuzz-logs"
summary=()
failed=()
for t in "${targets[@]}"; do
  fuzzer="$build/fuzz/${t}_fuzzer"
  seeds="fuzz/corpus/$t"
  [[ -x "$fuzzer" && -d "$seeds" ]] || { echo "unknown fuzz target: $t" >&2; exit 2; }
  # New units go to the first corpus directory: a scratch one for smoke runs (the committed
  # seeds stay as they are), the persistent working corpus for long runs.
  if [[ "$mode" == smoke ]]; then
    work="$build/corpus-smoke/$t"
    rm -rf "$work"
    nice_cmd=()
  else
    work="$build/corpus-work/$t"
    nice_cmd=(nice -n 19)
  fi
  mkdir -p "$work" "$build/artifacts/$t"
  log="$build/fuzz-logs/$mode-$t.log"
  echo "== $t: $seconds s ($mode), log $log"
  status=0
  "${nice_cmd[@]}" "$fuzzer" -max_total_time="$seconds" -timeout=25 -rss_limit_mb=2560 \
      -print_final_stats=1 -artifact_prefix="$build/artifacts/$t/" "$work" "$seeds" >"$log" 2>&1 || status=$?
  # The last status line carries the coverage figures; the final stats the execution counts.
  last=$(grep -E '^#[0-9]+' "$log" | tail -n 1 || true)
  cov=$(sed -n 's/.* cov: \([0-9]*\).*/\1/p' <<<"$last")
  ft=$(sed -n 's/.* ft: \([0-9]*\).*/\1/p' <<<"$last")
  corp=$(sed -n 's/.* corp: \([0-9]*\/[0-9a-zA-Z]*\).*/\1/p' <<<"$last")
  runs=$(sed -n 's/^stat::number_of_executed_units: *//p' "$log")
  rate=$(sed -n 's/^stat::average_exec_per_sec: *//p' "$log")
  rss=$(sed -n 's/^stat::peak_rss_mb: *//p' "$log")
  line=$(printf '%-9s %5ss  runs %-10s exec/s %-7s cov %-5s ft %-6s corpus %-12s rss %sMB' \
         "$t" "$seconds" "${runs:-?}" "${rate:-?}" "${cov:-?}" "${ft:-?}" "${corp:-?}" "${rss:-?}")
  if [[ $status -ne 0 ]]; then
    line="$line  FAILED (exit $status)"
    failed+=("$t")
    grep -E 'ERROR|invariant violated|SUMMARY|Test unit written' "$log" | head -n 8 >&2 || true
  fi
  echo "$line"
  summary+=("$line")
done

echo "== fuzz summary ($mode)"
printf '%s\n' "${summary[@]}"
if [[ ${#failed[@]} -ne 0 ]]; then
  echo "fuzzing found problems in: ${failed[*]} (inputs in $build/artifacts/)" >&2
  exit 1
fi
