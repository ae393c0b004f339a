#!/usr/bin/env bash
# Runs every benchmark program once (each benchmark repeated, ours and its peer in the same
# program) and regenerates the performance table of README.md from that run: bench output ->
# markdown with the date, the machine, its load average before and after, ranges where the
# repetitions vary, and the ratios (tools/perf_table.py has the rows). render_bench runs again from
# a compact artwork build (render_bench_compact). Each repetition runs for 0.2 s of CPU time:
# about 1 minute on an idle 2-core machine, 4 to 5 with a load average of 15.
#
#   bash tools/perf_table.sh            # build-bench, then README.md's table
#   TESSEL_PERF_REPETITIONS=5 TESSEL_PERF_MIN_TIME=0.5 bash tools/perf_table.sh
# The raw output stays in build-bench/perf/ (<program>.txt as printed, <program>.json).
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
command -v python3 >/dev/null || { echo "perf_table: needs python3 (apt-get install python3)" >&2; exit 1; }
bash tools/setup/setup.sh
jobs="${TESSEL_JOBS:-2}"
repetitions="${TESSEL_PERF_REPETITIONS:-3}"
min_time="${TESSEL_PERF_MIN_TIME:-0.2}"

cmake -S . -B build-bench -G Ninja -DCMAKE_BUILD_TYPE=Release -DTESSEL_BUILD_BENCH=ON \
      -DTESSEL_BUILD_TESTS=OFF -DTESSEL_BUILD_TOOLS=OFF >/dev/null
cmake --build build-bench -j"$jobs"
# The compact artwork build: its own configuration, for the start-up rows and the library's size.
cmake -S . -B build-bench-compact -G Ninja -DCMAKE_BUILD_TYPE=Release -DTESSEL_BUILD_BENCH=ON \
      -DTESSEL_BUILD_TESTS=OFF -DTESSEL_BUILD_TOOLS=OFF -DTESSEL_COMPACT_ARTWORK=ON >/dev/null
cmake --build build-bench-compact -j"$jobs" --target render_bench TesselVIP

out=build-bench/perf
rm -rf "$out"
mkdir -p "$out"
cores=$(nproc)
cpu=$(sed -n 's/^model name[[:space:]]*: //p' /proc/cpuinfo | head -n 1)
{
  echo "date=$(date -u '+%Y-%m-%d %H:%M UTC')"
  echo "machine=${cpu:-an unknown CPU}, $cores cores"
  echo "load_before=$(cut -d ' ' -f 1-3 /proc/loadavg)"
  echo "repetitions=$repetitions"
  echo "min_time=$min_time"
  # text + data of libTesselVIP.so as `size` reports them (bss is zero-filled at load, not shipped)
  echo "so_size=$(size build-bench/libTesselVIP.so | awk 'NR == 2 { print $1 + $2 }')"
  echo "so_size_compact=$(size build-bench-compact/libTesselVIP.so | awk 'NR == 2 { print $1 + $2 }')"
} >"$out/meta.txt"
for program in build-bench/bench/*_bench build-bench-compact/bench/render_bench; do
  [ -x "$program" ] || continue
  name=$(basename "$program")
  if [[ $program == build-bench-compact/* ]]; then name=${name}_compact; fi
  echo "== $name ($repetitions repetitions)" >&2
  start=$SECONDS
  "$program" --benchmark_repetitions="$repetitions" --benchmark_min_time="$min_time" --benchmark_out="$out/$name.json" \
             --benchmark_out_format=json >"$out/$name.txt" 2>&1
  echo "   $((SECONDS - start)) s, output in $out/$name.txt" >&2
done
# The Java opener's timing classes (same classes and statistics as opener_timing_bench), when
# the JDK is there.
if [ -f tools/server/java/bench/timing_bench.sh ] && command -v java >/dev/null; then
  echo "== Java opener timing" >&2
  bash tools/server/java/bench/timing_bench.sh >"$out/java_opener_timing.txt" 2>&1 || true
fi
echo "load_after=$(cut -d ' ' -f 1-3 /proc/loadavg)" >>"$out/meta.txt"
python3 tools/perf_table.py "$out" README.md
