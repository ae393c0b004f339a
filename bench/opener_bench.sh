#!/usr/bin/env bash
# Envelopes opened per second by the C++ opener (OpenSSL) and the Java opener (JDK providers) on
# the same type-48 envelopes, sealed by the device dispatcher for a 1024-bit and a 2048-bit key.
# Rates per second of CPU time on both sides (the JVM warmed up first); the ratio is informative.
# Usage: bench/opener_bench.sh [BUILD_DIR]   (configured with -DTESSEL_BUILD_BENCH=ON)
set -euo pipefail
build=${1:-build}
root=$(cd "$(dirname "$0")/.." && pwd)
ninja -C "$build" opener_bench tessel_server_bench >/dev/null
dir=$(mktemp -d)
trap 'rm -rf "$dir"' EXIT
TESSEL_OPENER_ENVELOPES=$dir "$build/bench/opener_bench" --benchmark_format=json \
  --benchmark_min_time=2 >"$dir/cpp.json"
java -cp "$build/tools/server/java/tessel-server.jar:$build/tools/server/java/tessel-server-bench.jar" OpenerBench \
  "$root/tests/data/dispatch_app_key_1024.pem" "$dir/envelope_1024.txt" 1024 \
  "$root/tests/data/dispatch_enc_key_2048.pem" "$dir/envelope_2048.txt" 2048 >"$dir/java.txt"
python3 - "$dir/cpp.json" "$dir/java.txt" <<'PY'
import json, sys
cpp = {b["name"].split("/")[1]: b["items_per_second"] for b in json.load(open(sys.argv[1]))["benchmarks"]}
java = dict(line.split() for line in open(sys.argv[2]))
print("key bits   C++ opens/s   Java opens/s   Java/C++")
for bits in ("1024", "2048"):
    j = float(java[bits])
    print(f"{bits:>8} {cpp[bits]:>13.0f} {j:>14.0f} {j / cpp[bits]:>10.2f}")
PY
